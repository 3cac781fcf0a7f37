#include "commands/sensors.h"

#include <algorithm>
#include <cinttypes>
#include <climits>
#include <cmath>
#include <cstdio>

#include "commands/command_util.h"
#include "commands/worker.h"
#include "core/transport.h"
#include "platform/device_services.h"
#include "platform/platform.h"
#include "services/ulda_nvram.h"

std::atomic<bool> gsensor_test_exit{false};
std::atomic<pthread_t> gsensor_z_thread{NO_THREAD};

namespace {

constexpr const char* kGsensorCalFlag = "persist.sys.gs_cal_flag";

// One run of a sensor test; true when it passed (`success` 1).
bool run_sensor_test(int test, sensor_test_result& result) {
  result.success = 0;
  result.values[0] = 0;
  pemu_sensor_factory_test(test, &result, 0, 0);
  show_sensor_test_result(&result);
  if (result.success != 1) ATCI_LOGE("sensor test %d failed: %d", test, result.success);
  return result.success == 1;
}

bool sensor_test_passes(int test) {
  sensor_test_result result;
  return run_sensor_test(test, result);
}

double value(const sensor_test_result& result, int n) { return result.values[n - 1]; }

void answer_xyz(char* response, const sensor_test_result& result) {
  std::snprintf(response, RESPONSE_SIZE, "\"%.f,%.f,%.f\"\r\n", value(result, 1), value(result, 2),
                value(result, 3));
}

// A reading with three values: on failure the accelerometer's calibration flag says so.
int xyz_reading(int test, char* response) {
  sensor_test_result result;
  if (!run_sensor_test(test, result)) {
    property_set(kGsensorCalFlag, "2");
    return RESULT_ERROR;
  }
  answer_xyz(response, result);
  return RESULT_OK;
}

// One cycle of the Z stream: false when the reading failed, which ends it.
bool write_z_line() {
  const WorkerCycle cycle;
  sensor_test_result result;
  if (!run_sensor_test(49, result)) return false;
  char line[10];
  const int n = std::snprintf(line, sizeof line, "\r\n%.f", value(result, 3));
  write_unsolicited({line, static_cast<size_t>(std::min(n, static_cast<int>(sizeof line) - 1))});
  return true;
}

void gsensor_z_body() { run_stream(gsensor_test_exit, write_z_line, 200000); }

int gsensor_calibrate() {
  sensor_test_result result;
  const bool ok = run_sensor_test(48, result) &&
                  update_ulda_nvram("gsensor_calibrate", [&](ulda_nvram& record) {
                    record.gsensor_cali_flag = 1;
                    record.gsensor_offset_x = sensor_value_to_int(result.values[0]);
                    record.gsensor_offset_y = sensor_value_to_int(result.values[1]);
                    record.gsensor_offset_z = sensor_value_to_int(result.values[2]);
                    return true;
                  }) == RESULT_OK;
  property_set(kGsensorCalFlag, ok ? "0" : "2");
  return result_of(ok);
}

int start_z_stream() {
  gsensor_test_exit = false;
  if (gsensor_z_thread.load() != NO_THREAD) return LOGGED_ERROR("g-sensor stream already recorded");
  pthread_t thread;
  if (start_worker(&thread, gsensor_z_body, true) != 0) return RESULT_ERROR;
  gsensor_z_thread = thread;
  return RESULT_OK;
}

// A test whose only outcome is pass or fail.
struct SelfTest {
  const char* variant;
  int test;
};

int run_self_test(const SelfTest* tests, size_t count, const char* cmdline) {
  for (size_t i = 0; i < count; ++i)
    if (line_is(cmdline, tests[i].variant)) return result_of(sensor_test_passes(tests[i].test));
  return REJECT_COMMAND_LINE(cmdline);
}

template <size_t N>
int run_self_test(const SelfTest (&tests)[N], const char* cmdline) {
  return run_self_test(tests, N, cmdline);
}

}  // namespace

int sensor_value_to_int(float v) {
  if (std::isnan(v)) return 0;
  if (v >= 2147483647.0f) return INT32_MAX;
  if (v <= -2147483648.0f) return INT32_MIN;
  return static_cast<int>(v);
}

int jvzljc_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVZLJC=0,1")) return start_z_stream();
  if (line_is(cmdline, "AT+JVZLJC=0,0")) {
    gsensor_test_exit = true;
    gsensor_z_thread = NO_THREAD;
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVZLJC=0,2")) {
    ulda_nvram record;
    if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
    std::snprintf(response, RESPONSE_SIZE, "\"%d\"\r\n", record.gsensor_cali_flag);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVZLJC=0,3")) return xyz_reading(49, response);
  if (line_is(cmdline, "AT+JVZLJC=0,5")) return gsensor_calibrate();
  static constexpr SelfTest kSelfTest[] = {{"AT+JVZLJC=0,6", 51}};
  return run_self_test(kSelfTest, cmdline);
}

int jvdzlp_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVDZLP=1")) return xyz_reading(67, response);
  if (line_is(cmdline, "AT+JVDZLP=2")) return xyz_reading(65, response);
  if (line_starts_with(cmdline, "AT+JVDZLP=3")) return xyz_reading(64, response);
  static constexpr SelfTest kSelfTests[] = {{"AT+JVDZLP=4", 66}, {"AT+JVDZLP=0", 68}};
  return run_self_test(kSelfTests, cmdline);
}

int jvhwkj_handler(char* cmdline, int, char* response) {
  sensor_test_result result;
  if (line_is(cmdline, "AT+JVHWKJ=1")) {
    if (!run_sensor_test(32, result)) return RESULT_ERROR;
    return update_ulda_nvram(__func__, [&](ulda_nvram& record) {
      const int threshold = sensor_value_to_int(result.values[0]);
      record.ps_cali_flag = 1;
      record.ps_base_threshold = threshold;
      char text[10];
      std::snprintf(text, sizeof text, "%d", threshold);
      property_set("persist.sys.base_threshold_prox", text);
      property_set("persist.sys.ps_cali_flag", "1");
      std::snprintf(response, RESPONSE_SIZE, "\"%d\"\r\n", threshold);
      return true;
    });
  }
  if (line_is(cmdline, "AT+JVHWKJ=2")) {
    if (!run_sensor_test(33, result)) return RESULT_ERROR;
    ulda_nvram record;
    if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
    std::snprintf(response, RESPONSE_SIZE, "\"%.f,%d\"\r\n", value(result, 1),
                  record.ps_base_threshold);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVHWKJ=3"))  // 0 near, 1 away
    return result_of(run_sensor_test(37, result) && sensor_value_to_int(result.values[0]) == 0);
  static constexpr SelfTest kSelfTest[] = {{"AT+JVHWKJ=0", 38}};
  return run_self_test(kSelfTest, cmdline);
}

int jvgm_handler(char* cmdline, int, char* response) {
  sensor_test_result result;
  if (line_is(cmdline, "AT+JVGM=1")) {
    if (!run_sensor_test(16, result)) return RESULT_ERROR;
    return update_ulda_nvram(__func__, [&](ulda_nvram& record) {
      record.als_cali_flag = 1;
      record.als_cali_data = sensor_value_to_int(result.values[0]);
      char text[PROPERTY_VALUE_MAX];
      property_get("ro.build.version.kro", text, " ");
      property_set("sys.als.cali.ver", text);
      std::snprintf(text, sizeof text, "%d", record.als_cali_data);
      property_set("persist.sys.light_threshold", text);
      property_set("persist.sys.als_cali_flag", "1");
      std::snprintf(response, RESPONSE_SIZE, "\"%d\"\r\n", record.als_cali_data);
      return true;
    });
  }
  if (line_is(cmdline, "AT+JVGM=2")) {
    if (!run_sensor_test(17, result)) return RESULT_ERROR;
    ulda_nvram record;
    if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
    if (record.als_cali_data == 0) {
      std::snprintf(response, RESPONSE_SIZE, "\"Not clibration\"\r\n");
      return RESULT_ERROR;
    }
    const int reading = sensor_value_to_int(result.values[0]);
    const int64_t ratio = int64_t{reading} * 500 / record.als_cali_data;
    std::snprintf(response, RESPONSE_SIZE, "\"%d,%" PRId64 "\"", reading, ratio);
    return result_of(ratio >= 450 && ratio <= 550);
  }
  static constexpr SelfTest kSelfTest[] = {{"AT+JVGM=0", 18}};
  return run_self_test(kSelfTest, cmdline);
}

int jvtly_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVTLY=0")) {
    sensor_test_result result;
    if (!run_sensor_test(80, result)) return RESULT_ERROR;
    return update_ulda_nvram(__func__, [&](ulda_nvram& record) {
      record.gyro_cali_flag = 1;
      record.gyro_offset_x = sensor_value_to_int(result.values[0]);
      record.gyro_offset_y = sensor_value_to_int(result.values[1]);
      record.gyro_offset_z = sensor_value_to_int(result.values[2]);
      return true;
    });
  }
  static constexpr SelfTest kSelfTest[] = {{"AT+JVTLY=2", 83}};
  return run_self_test(kSelfTest, cmdline);
}
