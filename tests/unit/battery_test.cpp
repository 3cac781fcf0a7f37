#include "commands/battery.h"

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"
#include "tests/unit/worker_port.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kPsy = "/sys/class/power_supply/";
const std::string kAc = kPsy + "cms/current_ac_avg_now";
const std::string kVoltage = kPsy + "battery/voltage_now";
const std::string kStatus = kPsy + "battery/status";
const std::string kCharge = "sys/bus/platform/devices/pm8921-charger/charge";
const std::string kTempSet = "/sys/devices/platform/battery/Charging_TemputerSet";
const std::string kCmsDebug = "/sys/kernel/debug/cms/debug";
const std::string kChargeCurrent = "/data/data/com.ulda.engineermode/files/ChargeCurrent";

const HandlerCase kRows[] = {
    {"ac_current", eadc_handler, "AT+EADC=2", {{kAc, "1234\n"}}, OK, "\"1.23\""},
    {"ac_current_no_integer", eadc_handler, "AT+EADC=2", {{kAc, "abc\n"}}, ERR, ""},
    {"charge_current", eadc_handler, "AT+EADC=3", {{kChargeCurrent, "15"}}, OK, "\r\n\"15\"\r\n"},
    {"charge_current_first_20", eadc_handler, "AT+EADC=3", {{kChargeCurrent, std::string(30, '7')}}, OK, "\r\n\"" + std::string(20, '7') + "\"\r\n"},
    {"charge_current_one_byte", eadc_handler, "AT+EADC=3", {{kChargeCurrent, "1"}}, ERR, ""},
    {"voltage_level", jvdlj_handler, "AT+JVDLJ=1", {{kVoltage, "3850000\n"}, {kPsy + "battery/capacity", "57\n"}}, OK, "\"3.85,57%\"\r\n"},
    {"voltage_level_no_capacity", jvdlj_handler, "AT+JVDLJ=1", {{kVoltage, "3850000\n"}}, ERR, ""},
    {"charging", jvcharge_handler, "AT+JVCHARGE=0", {{kStatus, "Charging\n"}}, OK, ""},
    {"full", jvcharge_handler, "AT+JVCHARGE=0", {{kStatus, "Full\n"}}, OK, ""},
    {"not_charging", jvcharge_handler, "AT+JVCHARGE=0", {{kStatus, "Not charging\n"}}, ERR, ""},
    // Charger controls: created in an existing directory, truncated.
    {"charger_off", jvcharg_handler, "AT+JVCHARG=0", {{kCharge, "1\n"}}, OK, "", {}, {{kCharge, "0"}}},
    {"charger_on_created", jvcharg_handler, "AT+JVCHARG=1", {{"sys/bus/platform/devices/pm8921-charger/x", ""}}, OK, "", {}, {{kCharge, "1"}}},
    {"charger_no_directory", jvcharg_handler, "AT+JVCHARG=1", {}, ERR, ""},
    {"protection_off", rmchargep_handler, "AT+RMCHARGEP=0", {{kPsy + "cms/present", "1\n"}}, OK, "", {}, {{kPsy + "cms/present", "0"}}},
    {"high_temp_on", jvqxgwbh_handler, "AT+JVQXGWBH=1,1", {{kTempSet, "0\n"}}, OK, "", {}, {{kTempSet, "1"}}},
    {"high_temp_off", jvqxgwbh_handler, "AT+JVQXGWBH=1,0", {{kTempSet, "1\n"}}, OK, "", {}, {{kTempSet, "0"}}},
    {"cutoff", jvdisrecharge_handler, "AT+JVDISRECHARGE=0", {{kCmsDebug, ""}}, OK, "", {}, {{kCmsDebug, "chg-cutoff"}}},
    {"open", jvdisrecharge_handler, "AT+JVDISRECHARGE=1", {{kCmsDebug, "chg-cutoff"}}, OK, "", {}, {{kCmsDebug, "chg-open"}}},
    {"authentic", jvdljcs_handler, "AT+JVDLJCS=2", {{kPsy + "bms/authentic", "1\n"}}, OK, ""},
    {"not_authentic", jvdljcs_handler, "AT+JVDLJCS=2", {{kPsy + "bms/authentic", "0\n"}}, ERR, ""},
};

INSTANTIATE_TEST_SUITE_P(Battery, HandlerTable, ::testing::ValuesIn(kRows), case_name);

class AdcStream : public WorkerPortTest {
 protected:
  void write_battery(const std::string& voltage, const std::string& temp, const std::string& current) {
    write_file(kVoltage, voltage);
    if (!temp.empty()) write_file(kPsy + "battery/temp", temp);
    write_file(kPsy + "battery/current_now", current);
  }
  void stop() {
    EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=0").status, RESULT_OK);
    EXPECT_EQ(adc_test_thread.load(), NO_THREAD);
  }
};

TEST_F(AdcStream, SecondStartKeepsOneStreamUntilStopped) {
  write_battery("4200000\n", "305\n", "1500000\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 1);
  const std::string line = "+EADC: \"4.20,30.50,0.58,1500.00,4.50\"\r\n";
  EXPECT_EQ(next_write(), line);
  EXPECT_EQ(next_write(), line);
  stop();
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  while (!next_write(0).empty()) continue;
  EXPECT_EQ(next_write(700), "");  // nothing follows once the stream has ended
}

TEST_F(AdcStream, MissingBatteryFileEndsTheStreamAndKeepsItRecorded) {
  write_battery("4200000\n", "", "1500000\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  EXPECT_NE(adc_test_thread.load(), NO_THREAD);
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 0);  // still recorded: nothing started
  EXPECT_EQ(next_write(0), "");
  stop();
}

TEST_F(AdcStream, LongValuesAreCutAtTheLineLimit) {
  write_battery("-2147483648\n", "2147483647\n", "-2147483648\n");
  EXPECT_EQ(call_handler(eadc_handler, "AT+EADC=1").status, RESULT_OK);
  const std::string line = next_write();
  stop();
  EXPECT_EQ(line, std::string("+EADC: \"-2147.48,214748364.80,0.58,-2147483.65,4.50\"").substr(0, 49));
}

}  // namespace
