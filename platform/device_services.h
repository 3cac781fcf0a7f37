// The phone maker's services that the daemon reaches through its libraries: the factory
// service, the camera and setup-wizard state, and the sensor self-tests. A host build answers
// them from state kept under /.emu/ in the root (docs/emulator.md).
#pragma once

#include <cstddef>
#include <cstdint>

// Sensor self-tests: a 116-byte record, int32 `success` (1 passed) then 32-bit values.
inline constexpr int SENSOR_RESULT_SIZE = 116;
struct sensor_test_result {
  int32_t success;
  float values[28];  // values[n - 1] is word n of the record
};
static_assert(sizeof(sensor_test_result) == SENSOR_RESULT_SIZE);

// Runs one sensor test and fills the whole record. 0, or -1 when `result` is null.
int pemu_sensor_factory_test(int test, sensor_test_result* result, int reserved, int argument);
void show_sensor_test_result(const sensor_test_result* result);

// Copies the factory service's answer to a one-word request into `answer` (NUL-terminated).
// 0, or -1 when there is no answer; `answer` then holds "".
int factory_service_request(const char* request, char* answer, size_t size);
// The setup wizard's state as the factory library reports it (2: the check fails).
int setupwizard_state();
// Bit set of connected cameras: bit 0 back, bit 1 front.
int camera_connected_mask();
