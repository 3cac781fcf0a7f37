// The phone maker's sensor test library (libpemusensortest).
#pragma once

namespace vendor {
extern "C" {

// Fills the caller's 116-byte result block: int32 success (1 passed), then 32-bit values.
int pemu_sensor_factory_test(int test, void* result, int reserved, int argument);
// Writes the result block to the log.
void show_sensor_test_result(void* result);

}  // extern "C"
}  // namespace vendor
