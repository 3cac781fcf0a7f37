#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "commands/battery.h"
#include "commands/worker.h"
#include "core/command.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/worker_port.h"

namespace {

using Files = std::vector<std::pair<std::string, std::string>>;

struct BatteryCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Files before;  // device path -> content
  int status;
  std::string body;
  Files after;  // expected content afterwards
};
void PrintTo(const BatteryCase& c, std::ostream* os) { *os << c.name; }

const std::string kPsy = "/sys/class/power_supply/";
const std::string kCharge = "sys/bus/platform/devices/pm8921-charger/charge";
const std::string kTempSet = "/sys/devices/platform/battery/Charging_TemputerSet";
const std::string kCmsDebug = "/sys/kernel/debug/cms/debug";
const std::string kChargeCurrent = "/data/data/com.ulda.engineermode/files/ChargeCurrent";

std::vector<BatteryCase> battery_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const Files battery = {{kPsy + "battery/voltage_now", "3850000\n"}, {kPsy + "battery/capacity", "57\n"}};
  return {
      {"ac_current", eadc_handler, "AT+EADC=2", {{kPsy + "cms/current_ac_avg_now", "1234\n"}}, OK, "\"1.23\"", {}},
      {"ac_current_no_integer", eadc_handler, "AT+EADC=2", {{kPsy + "cms/current_ac_avg_now", "abc\n"}}, ERR, "", {}},
      {"ac_current_missing", eadc_handler, "AT+EADC=2", {}, ERR, "", {}},
      {"charge_current", eadc_handler, "AT+EADC=3", {{kChargeCurrent, "1500"}}, OK, "\r\n\"1500\"\r\n", {}},
      {"charge_current_first_20", eadc_handler, "AT+EADC=3", {{kChargeCurrent, std::string(30, '7')}}, OK, "\r\n\"" + std::string(20, '7') + "\"\r\n", {}},
      {"charge_current_one_byte", eadc_handler, "AT+EADC=3", {{kChargeCurrent, "1"}}, ERR, "", {}},
      {"eadc_other", eadc_handler, "AT+EADC=4", {}, ERR, "", {}},

      {"voltage_level", jvdlj_handler, "AT+JVDLJ=1", battery, OK, "\"3.85,57%\"\r\n", {}},
      {"voltage_level_no_capacity", jvdlj_handler, "AT+JVDLJ=1", {battery[0]}, ERR, "", {}},

      {"charging", jvcharge_handler, "AT+JVCHARGE=0", {{kPsy + "battery/status", "Charging\n"}}, OK, "", {}},
      {"full", jvcharge_handler, "AT+JVCHARGE=0", {{kPsy + "battery/status", "Full\n"}}, OK, "", {}},
      {"not_charging", jvcharge_handler, "AT+JVCHARGE=0", {{kPsy + "battery/status", "Not charging\n"}}, ERR, "", {}},
      {"status_missing", jvcharge_handler, "AT+JVCHARGE=0", {}, ERR, "", {}},

      {"charger_off", jvcharg_handler, "AT+JVCHARG=0", {{kCharge, "1\n"}}, OK, "", {{kCharge, "0"}}},
      {"charger_on_created", jvcharg_handler, "AT+JVCHARG=1", {{"sys/bus/platform/devices/pm8921-charger/x", ""}}, OK, "", {{kCharge, "1"}}},
      {"charger_no_directory", jvcharg_handler, "AT+JVCHARG=1", {}, ERR, "", {}},
      {"charger_other", jvcharg_handler, "AT+JVCHARG=2", {{kCharge, "1\n"}}, ERR, "", {{kCharge, "1\n"}}},
      {"protection_off", rmchargep_handler, "AT+RMCHARGEP=0", {{kPsy + "cms/present", "1\n"}}, OK, "", {{kPsy + "cms/present", "0"}}},
      {"high_temp_on", jvqxgwbh_handler, "AT+JVQXGWBH=1,1", {{kTempSet, "0\n"}}, OK, "", {{kTempSet, "1"}}},
      {"high_temp_other", jvqxgwbh_handler, "AT+JVQXGWBH=0,1", {{kTempSet, "1\n"}}, ERR, "", {{kTempSet, "1\n"}}},
      {"cutoff", jvdisrecharge_handler, "AT+JVDISRECHARGE=0", {{kCmsDebug, ""}}, OK, "", {{kCmsDebug, "chg-cutoff"}}},
      {"open", jvdisrecharge_handler, "AT+JVDISRECHARGE=1", {{kCmsDebug, "chg-cutoff"}}, OK, "", {{kCmsDebug, "chg-open"}}},

      {"authentic", jvdljcs_handler, "AT+JVDLJCS=2", {{kPsy + "bms/authentic", "1\n"}}, OK, "", {}},
      {"not_authentic", jvdljcs_handler, "AT+JVDLJCS=2", {{kPsy + "bms/authentic", "0\n"}}, ERR, "", {}},
  };
}

class BatteryCommand : public WorkerPortTest, public ::testing::WithParamInterface<BatteryCase> {};

TEST_P(BatteryCommand, AnswersAndWritesExactly) {
  const BatteryCase& c = GetParam();
  for (const auto& [path, content] : c.before) write_file(path, content);
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  for (const auto& [path, content] : c.after) EXPECT_EQ(read_file(path), content) << path;
  EXPECT_EQ(next_write(0), "");
}

INSTANTIATE_TEST_SUITE_P(Cases, BatteryCommand, ::testing::ValuesIn(battery_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class AdcStream : public WorkerPortTest {
 protected:
  void write_battery(const std::string& temp) {
    write_file(kPsy + "battery/voltage_now", "4200000\n");
    if (!temp.empty()) write_file(kPsy + "battery/temp", temp);
    write_file(kPsy + "battery/current_now", "1500000\n");
  }
  void stop() {
    EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=0").status, RESULT_OK);
    EXPECT_EQ(adc_test_thread.load(), NO_THREAD);
  }
};

TEST_F(AdcStream, SecondStartKeepsOneStreamUntilStopped) {
  write_battery("305\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 1);
  const std::string line = "+EADC: \"4.20,30.50,0.58,1500.00,4.50\"\r\n";
  EXPECT_EQ(next_write(), line);
  EXPECT_EQ(next_write(), line);
  stop();
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  while (!next_write(0).empty()) {
  }
  EXPECT_EQ(next_write(700), "");  // nothing follows once the stream has ended
}

TEST_F(AdcStream, MissingBatteryFileEndsTheStreamAndKeepsItRecorded) {
  write_battery("");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  EXPECT_NE(adc_test_thread.load(), NO_THREAD);
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 0);  // still recorded: nothing started
  EXPECT_EQ(next_write(0), "");
  stop();
}

TEST_F(AdcStream, NoIntegerInABatteryFileEndsTheStream) {
  write_battery("warm\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  EXPECT_EQ(next_write(0), "");
  stop();
}

TEST_F(AdcStream, LongValuesAreCutAtTheLineLimit) {
  write_file(kPsy + "battery/voltage_now", "-2147483648\n");
  write_file(kPsy + "battery/temp", "2147483647\n");
  write_file(kPsy + "battery/current_now", "-2147483648\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  const std::string line = next_write();
  stop();
  EXPECT_EQ(line, std::string("+EADC: \"-2147.48,214748364.80,0.58,-2147483.65,4.50\"").substr(0, 49));
}

}  // namespace
