#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "commands/sensors.h"
#include "commands/worker.h"
#include "core/command.h"
#include "services/ulda_nvram.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/worker_port.h"

namespace {

using Pairs = std::vector<std::pair<std::string, std::string>>;
using Fields = std::vector<std::pair<size_t, int32_t>>;  // record offset -> value

constexpr char kFill = '\x5a';  // every byte of the record before a test
const std::string kRecord = "/persist/ulda_nvram";

struct SensorCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Pairs tests;     // sensor test number -> result file
  Fields before;   // fields set over a record filled with kFill
  int status;
  std::string body;
  Fields after;    // fields changed; every other byte keeps kFill
  Pairs properties;
};
void PrintTo(const SensorCase& c, std::ostream* os) { *os << c.name; }

std::string pass(const std::string& values) { return "success=1\nvalues=" + values + "\n"; }
const std::string kFail = "success=0\n";

std::vector<SensorCase> sensor_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const Pairs gs_failed = {{"persist.sys.gs_cal_flag", "2"}};
  return {
      {"accel_reading", jvzljc_handler, "AT+JVZLJC=0,3", {{"49", pass("0.05 -0.3 9.79")}}, {}, OK, "\"0,-0,10\"\r\n", {}, {}},
      {"accel_reading_failed", jvzljc_handler, "AT+JVZLJC=0,3", {{"49", kFail}}, {}, ERR, "", {}, gs_failed},
      {"accel_calibrate", jvzljc_handler, "AT+JVZLJC=0,5", {{"48", pass("1.9 -2.9 9.99")}}, {}, OK, "", {{0, 1}, {76, 1}, {80, -2}, {84, 9}}, {{"persist.sys.gs_cal_flag", "0"}}},
      {"accel_calibrate_failed", jvzljc_handler, "AT+JVZLJC=0,5", {{"48", kFail}}, {}, ERR, "", {}, gs_failed},
      {"accel_flag", jvzljc_handler, "AT+JVZLJC=0,2", {}, {{0, 7}}, OK, "\"7\"\r\n", {{0, 7}}, {}},
      {"accel_self_test_failed", jvzljc_handler, "AT+JVZLJC=0,6", {{"51", kFail}}, {}, ERR, "", {}, {}},
      {"accel_other", jvzljc_handler, "AT+JVZLJC=0,4", {}, {}, ERR, "", {}, {}},

      {"mag_1", jvdzlp_handler, "AT+JVDZLP=1", {{"67", pass("1 2 3")}}, {}, OK, "\"1,2,3\"\r\n", {}, {}},
      {"mag_3_trailing", jvdzlp_handler, "AT+JVDZLP=3,XYZ", {{"64", pass("7 8 9")}}, {}, OK, "\"7,8,9\"\r\n", {}, {}},
      {"mag_failed", jvdzlp_handler, "AT+JVDZLP=1", {{"67", kFail}}, {}, ERR, "", {}, gs_failed},
      {"mag_4_failed", jvdzlp_handler, "AT+JVDZLP=4", {{"66", kFail}}, {}, ERR, "", {}, {}},
      {"mag_other", jvdzlp_handler, "AT+JVDZLP=5", {}, {}, ERR, "", {}, {}},

      {"prox_calibrate", jvhwkj_handler, "AT+JVHWKJ=1", {{"32", pass("123.9")}}, {}, OK, "\"123\"\r\n", {{68, 123}, {96, 1}}, {{"persist.sys.base_threshold_prox", "123"}, {"persist.sys.ps_cali_flag", "1"}}},
      {"prox_reading", jvhwkj_handler, "AT+JVHWKJ=2", {{"33", pass("88.6")}}, {{68, 40}}, OK, "\"89,40\"\r\n", {{68, 40}}, {}},
      {"prox_near", jvhwkj_handler, "AT+JVHWKJ=3", {{"37", pass("0.7")}}, {}, OK, "", {}, {}},
      {"prox_away", jvhwkj_handler, "AT+JVHWKJ=3", {{"37", pass("1")}}, {}, ERR, "", {}, {}},
      {"prox_other", jvhwkj_handler, "AT+JVHWKJ=4", {}, {}, ERR, "", {}, {}},

      {"light_calibrate", jvgm_handler, "AT+JVGM=1", {{"16", pass("200.5")}}, {}, OK, "\"200\"\r\n", {{72, 200}, {92, 1}}, {{"persist.sys.light_threshold", "200"}, {"persist.sys.als_cali_flag", "1"}, {"sys.als.cali.ver", "KRO-1"}}},
      {"light_ratio_pass", jvgm_handler, "AT+JVGM=2", {{"17", pass("190")}}, {{72, 200}}, OK, "\"190,475\"", {{72, 200}}, {}},
      {"light_ratio_fail", jvgm_handler, "AT+JVGM=2", {{"17", pass("240")}}, {{72, 200}}, ERR, "\"240,600\"", {{72, 200}}, {}},
      {"light_ratio_64_bit", jvgm_handler, "AT+JVGM=2", {{"17", pass("3e9")}}, {{72, 1}}, ERR, "\"2147483647,1073741823500\"", {{72, 1}}, {}},
      {"light_uncalibrated", jvgm_handler, "AT+JVGM=2", {{"17", pass("190")}}, {{72, 0}}, ERR, "\"Not clibration\"\r\n", {{72, 0}}, {}},
      {"light_self_test", jvgm_handler, "AT+JVGM=0", {{"18", kFail}}, {}, ERR, "", {}, {}},

      {"gyro_calibrate", jvtly_handler, "AT+JVTLY=0", {{"80", pass("-0.5 3e10 nan")}}, {}, OK, "", {{120, 1}, {124, 0}, {128, INT_MAX}, {132, 0}}, {}},
      {"gyro_other", jvtly_handler, "AT+JVTLY=1", {}, {}, ERR, "", {}, {}},
  };
}

class SensorTest : public WorkerPortTest {
 protected:
  void SetUp() override {
    WorkerPortTest::SetUp();
    write_file("/dev/__properties__/ro.build.version.kro", "KRO-1");
    write_file(kRecord, std::string(ULDA_NVRAM_SIZE, kFill));
  }
  void set_field(size_t offset, int32_t value) {
    std::string record = read_file(kRecord);
    std::memcpy(record.data() + offset, &value, 4);
    write_file(kRecord, record);
  }
};

class SensorCommand : public SensorTest, public ::testing::WithParamInterface<SensorCase> {};

TEST_P(SensorCommand, AnswersAndRecordsExactly) {
  const SensorCase& c = GetParam();
  for (const auto& [test, content] : c.tests) write_file("/.emu/sensor/" + test, content);
  for (const auto& [offset, value] : c.before) set_field(offset, value);
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  std::string expected(ULDA_NVRAM_SIZE, kFill);
  for (const auto& [offset, value] : c.after) std::memcpy(expected.data() + offset, &value, 4);
  EXPECT_EQ(read_file(kRecord), expected);
  for (const auto& [name, value] : c.properties) EXPECT_EQ(get_property(name), value) << name;
  if (c.properties.empty()) {
    EXPECT_FALSE(exists("/dev/__properties__/persist.sys.gs_cal_flag"));
  }
}

INSTANTIATE_TEST_SUITE_P(Cases, SensorCommand, ::testing::ValuesIn(sensor_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(SensorValue, TruncatesAndSaturates) {
  EXPECT_EQ(sensor_value_to_int(-1.9f), -1);
  EXPECT_EQ(sensor_value_to_int(2147483520.0f), 2147483520);
  EXPECT_EQ(sensor_value_to_int(2147483648.0f), INT_MAX);
  EXPECT_EQ(sensor_value_to_int(-2147483648.0f), INT_MIN);
  EXPECT_EQ(sensor_value_to_int(-std::numeric_limits<float>::infinity()), INT_MIN);
  EXPECT_EQ(sensor_value_to_int(std::nanf("")), 0);
}

TEST_F(SensorTest, FailedRecordWriteKeepsBodyAndProperties) {
  write_file("/.emu/sensor/32", pass("55"));
  make_dir("/persist/ulda_nvram.tmp");  // the new record cannot be written
  const HandlerAnswer answer = call_handler(jvhwkj_handler, "AT+JVHWKJ=1");
  EXPECT_EQ(answer.status, RESULT_ERROR);
  EXPECT_EQ(answer.body, "\"55\"\r\n");
  EXPECT_EQ(get_property("persist.sys.base_threshold_prox"), "55");
  EXPECT_EQ(read_file(kRecord), std::string(ULDA_NVRAM_SIZE, kFill));
  write_file("/.emu/sensor/48", pass("1 2 3"));
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,5").status, RESULT_ERROR);
  EXPECT_EQ(get_property("persist.sys.gs_cal_flag"), "2");
}

TEST_F(SensorTest, ZStreamRunsOnceAndStopsWithoutWaiting) {
  write_file("/.emu/sensor/49", pass("0.05 -0.12 9.79"));
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_ERROR);
  EXPECT_EQ(running_workers(), 1);
  EXPECT_EQ(next_write(), "\r\n10");
  write_file("/.emu/sensor/49", pass("0 0 -123456789"));
  EXPECT_TRUE(wait_until([&] { return next_write() == "\r\n-123456"; }));  // cut at 9 bytes
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,0").status, RESULT_OK);
  EXPECT_EQ(gsensor_z_thread.load(), NO_THREAD);
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
}

TEST_F(SensorTest, FailedReadingEndsTheZStreamAndKeepsItRecorded) {
  write_file("/.emu/sensor/49", kFail);
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_OK);
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  EXPECT_EQ(next_write(0), "");
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,0").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 0);
}

}  // namespace
