#include "commands/sensors.h"

#include <climits>

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"
#include "tests/unit/worker_port.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kGsFlag = "prop:persist.sys.gs_cal_flag";
const std::string kRecordFails = "/persist/ulda_nvram.tmp/x";  // the new record cannot be written

// A sensor test's result file: passed with these values, or failed.
Pairs passed(int test, const std::string& values, Pairs more = {}) {
  more.push_back({"/.emu/sensor/" + std::to_string(test), "success=1\nvalues=" + values + "\n"});
  return more;
}
Pairs failed(int test) { return {{"/.emu/sensor/" + std::to_string(test), "success=0\n"}}; }

const HandlerCase kRows[] = {
    // A failed reading of three values marks the accelerometer's calibration failed; a failed
    // self test does not.
    {"accel_reading", jvzljc_handler, "AT+JVZLJC=0,3", passed(49, "0.05 -0.3 9.79"), OK, "\"0,-0,10\"\r\n", {}, {{kGsFlag, ""}}},
    {"accel_reading_failed", jvzljc_handler, "AT+JVZLJC=0,3", failed(49), ERR, "", {}, {{kGsFlag, "2"}}},
    {"accel_self_test_failed", jvzljc_handler, "AT+JVZLJC=0,6", failed(51), ERR, "", {}, {{kGsFlag, ""}}},
    {"accel_calibrate", jvzljc_handler, "AT+JVZLJC=0,5", passed(48, "1.9 -2.9 9.99"), OK, "", {}, {{kGsFlag, "0"}}, nullptr,
     [](ulda_nvram& r) { r.gsensor_cali_flag = 1; r.gsensor_offset_x = 1; r.gsensor_offset_y = -2; r.gsensor_offset_z = 9; }},
    {"accel_calibrate_failed", jvzljc_handler, "AT+JVZLJC=0,5", failed(48), ERR, "", {}, {{kGsFlag, "2"}}},
    {"accel_record_fails", jvzljc_handler, "AT+JVZLJC=0,5", passed(48, "1 2 3", {{kRecordFails, ""}}), ERR, "", {}, {{kGsFlag, "2"}}},
    {"accel_flag", jvzljc_handler, "AT+JVZLJC=0,2", {}, OK, "\"7\"\r\n", {}, {}, [](ulda_nvram& r) { r.gsensor_cali_flag = 7; }},
    {"mag_1", jvdzlp_handler, "AT+JVDZLP=1", passed(67, "1 2 3"), OK, "\"1,2,3\"\r\n"},
    {"mag_3_trailing", jvdzlp_handler, "AT+JVDZLP=3,XYZ", passed(64, "7 8 9"), OK, "\"7,8,9\"\r\n"},
    {"prox_calibrate", jvhwkj_handler, "AT+JVHWKJ=1", passed(32, "123.9"), OK, "\"123\"\r\n", {},
     {{"prop:persist.sys.base_threshold_prox", "123"}, {"prop:persist.sys.ps_cali_flag", "1"}}, nullptr,
     [](ulda_nvram& r) { r.ps_base_threshold = 123; r.ps_cali_flag = 1; }},
    // A record that cannot be written keeps the body and the properties already set.
    {"prox_record_fails", jvhwkj_handler, "AT+JVHWKJ=1", passed(32, "55", {{kRecordFails, ""}}), ERR, "\"55\"\r\n", {},
     {{"prop:persist.sys.base_threshold_prox", "55"}}},
    {"prox_reading", jvhwkj_handler, "AT+JVHWKJ=2", passed(33, "88.6"), OK, "\"89,40\"\r\n", {}, {}, [](ulda_nvram& r) { r.ps_base_threshold = 40; }},
    {"prox_near", jvhwkj_handler, "AT+JVHWKJ=3", passed(37, "0.7"), OK, ""},
    {"prox_away", jvhwkj_handler, "AT+JVHWKJ=3", passed(37, "1"), ERR, ""},
    {"light_calibrate", jvgm_handler, "AT+JVGM=1", passed(16, "200.5", {{"prop:ro.build.version.kro", "KRO-1"}}), OK, "\"200\"\r\n", {},
     {{"prop:persist.sys.light_threshold", "200"}, {"prop:persist.sys.als_cali_flag", "1"}, {"prop:sys.als.cali.ver", "KRO-1"}}, nullptr,
     [](ulda_nvram& r) { r.als_cali_data = 200; r.als_cali_flag = 1; }},
    {"light_ratio_pass", jvgm_handler, "AT+JVGM=2", passed(17, "190"), OK, "\"190,475\"", {}, {}, [](ulda_nvram& r) { r.als_cali_data = 200; }},
    {"light_ratio_fail", jvgm_handler, "AT+JVGM=2", passed(17, "240"), ERR, "\"240,600\"", {}, {}, [](ulda_nvram& r) { r.als_cali_data = 200; }},
    {"light_ratio_64_bit", jvgm_handler, "AT+JVGM=2", passed(17, "3e9"), ERR, "\"2147483647,1073741823500\"", {}, {},
     [](ulda_nvram& r) { r.als_cali_data = 1; }},
    {"light_uncalibrated", jvgm_handler, "AT+JVGM=2", passed(17, "190"), ERR, "\"Not clibration\"\r\n", {}, {},
     [](ulda_nvram& r) { r.als_cali_data = 0; }},
    {"gyro_calibrate", jvtly_handler, "AT+JVTLY=0", passed(80, "-3e10 3e10 nan"), OK, "", {}, {}, nullptr,
     [](ulda_nvram& r) { r.gyro_cali_flag = 1; r.gyro_offset_x = INT_MIN; r.gyro_offset_y = INT_MAX; r.gyro_offset_z = 0; }},
};

INSTANTIATE_TEST_SUITE_P(Sensors, HandlerTable, ::testing::ValuesIn(kRows), case_name);

class ZStream : public WorkerPortTest {};

TEST_F(ZStream, RunsOnceAndStopsWithoutWaiting) {
  write_file("/.emu/sensor/49", "success=1\nvalues=0.05 -0.12 9.79\n");
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,1").status, RESULT_ERROR);
  EXPECT_EQ(running_workers(), 1);
  EXPECT_EQ(next_write(), "\r\n10");
  write_file("/.emu/sensor/49", "success=1\nvalues=0 0 -123456789\n");
  EXPECT_TRUE(wait_until([&] { return next_write() == "\r\n-123456"; }));  // cut at 9 bytes
  EXPECT_EQ(call_handler(jvzljc_handler, "AT+JVZLJC=0,0").status, RESULT_OK);
  EXPECT_EQ(gsensor_z_thread.load(), NO_THREAD);
}

}  // namespace
