// The phone's audio test interfaces: the Qualcomm audio factory-test library (libaudio-ftm)
// and the audio system's parameter setter (libmedia). A host build plays nothing; it records
// every call under /.emu/audio/ in the root (docs/emulator.md).
#pragma once

#include <cstdint>

// Runs one factory test case on (1) or off (0). 0, or the library's error.
int audio_ftm_process(int test_case, int on, uint32_t volume);
// Releases the audio hardware after the speaker playback; callers ignore the result.
int ftm_hw_deinit();
// AudioSystem::setParameters for the default I/O handle (0); its result is never read.
void audio_set_parameters(const char* text);
