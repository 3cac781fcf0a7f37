// The Android log of a host build: logcat-style lines on standard error.
#include <cstdio>
#include <cstring>
#include <ctime>
#include <sys/time.h>
#include <unistd.h>

#include "platform/platform.h"

void platform_log_write(int priority, const char* tag, const char* text) {
  static constexpr char kLetters[] = "??VDIWEFS";
  const char letter = priority >= 0 && priority <= 8 ? kLetters[priority] : '?';
  timeval tv{};
  ::gettimeofday(&tv, nullptr);
  tm local{};
  ::localtime_r(&tv.tv_sec, &local);
  size_t len = std::strlen(text);
  while (len > 0 && (text[len - 1] == '\n' || text[len - 1] == '\r')) --len;

  char line[4096];
  int n = std::snprintf(line, sizeof line, "%02d-%02d %02d:%02d:%02d.%03d %5d %5d %c %-8s: %.*s\n",
                        local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec,
                        static_cast<int>(tv.tv_usec / 1000), static_cast<int>(::getpid()),
                        static_cast<int>(::gettid()), letter, tag ? tag : "",
                        static_cast<int>(len), text);
  if (n < 0) return;
  if (n >= static_cast<int>(sizeof line)) {
    n = sizeof line;
    line[n - 1] = '\n';
  }
  // One write per line keeps lines of several threads apart.
  [[maybe_unused]] const ssize_t w = ::write(STDERR_FILENO, line, n);
}
