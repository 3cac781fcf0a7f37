// Qualcomm's audio factory-test library (libaudio-ftm).
#pragma once

#include <cstdint>

namespace vendor {
extern "C" {

// Runs one test case on (1) or off (0) at a volume; 0, or the library's error.
int audio_ftm_process(int test_case, int on, uint32_t volume);
// Releases the audio hardware the tests opened.
int ftm_hw_deinit(void);

}  // extern "C"
}  // namespace vendor
