// The audio factory-test library of the emulated phone: every call is appended to
// /.emu/audio/calls.log; a test case's result comes from /.emu/audio/ftm_result.CASE, else
// /.emu/audio/ftm_result, else 0.
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <unistd.h>

#include "platform/audio.h"
#include "platform/host/host_emu_state.h"
#include "platform/host/host_root.h"

namespace {

void record_call(const std::string& text) {
  if (host_make_dirs("/.emu/audio") != 0) return;
  std::string line;
  for (const char c : text) {
    if (c == '\n')
      line += "\\n";
    else
      line += c;
  }
  line += '\n';
  UniqueFd fd(host_resolve("/.emu/audio/calls.log", O_WRONLY | O_CREAT | O_APPEND, 0644));
  if (fd.ok()) [[maybe_unused]] const ssize_t n = ::write(fd.get(), line.data(), line.size());
}

// 1 with the integer read, 0 when the file is missing, -1 when it holds no integer.
int read_result_file(const char* path, int* result) {
  char text[32];
  const int found = emu_read_line(path, text, sizeof text);
  if (found == 0) return 0;
  char* end = nullptr;
  const long value = std::strtol(text, &end, 10);
  *result = found > 0 && end != text && *end == '\0' ? static_cast<int>(value) : -1;
  return 1;
}

}  // namespace

int audio_ftm_process(int test_case, int on, uint32_t volume) {
  char line[64];
  std::snprintf(line, sizeof line, "audio_ftm_process %d %d %u", test_case, on, volume);
  record_call(line);
  char path[48];
  std::snprintf(path, sizeof path, "/.emu/audio/ftm_result.%d", test_case);
  int result = 0;
  if (read_result_file(path, &result) == 0) read_result_file("/.emu/audio/ftm_result", &result);
  return result;
}

int ftm_hw_deinit() {
  record_call("ftm_hw_deinit");
  return 0;
}

void audio_set_parameters(const char* text) {
  record_call(std::string("setParameters ") + (text != nullptr ? text : ""));
}
