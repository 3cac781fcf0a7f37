#include "platform/android/vendor/audio_ftm.h"

#include <cstdlib>

namespace vendor {

int audio_ftm_process(int, int, uint32_t) { std::abort(); }
int ftm_hw_deinit(void) { std::abort(); }

}  // namespace vendor
