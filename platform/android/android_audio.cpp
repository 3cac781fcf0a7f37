// Audio tests on the phone: libaudio-ftm and the audio system's parameters.
#include "platform/android/vendor/audio_ftm.h"
#include "platform/android/vendor/audio_system.h"
#include "platform/audio.h"

int audio_ftm_process(int test_case, int on, uint32_t volume) {
  return vendor::audio_ftm_process(test_case, on, volume);
}

int ftm_hw_deinit() { return vendor::ftm_hw_deinit(); }

void audio_set_parameters(const char* text) {
  android::AudioSystem::setParameters(0, android::String8(text));
}
