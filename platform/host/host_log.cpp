// The Android log of a host build: logcat-style lines on standard error.
#include <cstdio>
#include <cstring>
#include <ctime>
#include <mutex>
#include <string>
#include <sys/time.h>
#include <unistd.h>

#include "platform/platform.h"

namespace {

std::mutex g_log_mutex;
// The last two texts: a reader spinning on a lost connection logs the same pair forever,
// which logcat's ring buffer absorbs on a phone but would fill a host's disk.
std::string g_recent[2];
unsigned long g_suppressed = 0;

void write_line(int priority, const char* tag, const char* text, size_t len) {
  static constexpr char kLetters[] = "??VDIWEFS";
  const char letter = priority >= 0 && priority <= 8 ? kLetters[priority] : '?';
  timeval tv{};
  ::gettimeofday(&tv, nullptr);
  tm local{};
  ::localtime_r(&tv.tv_sec, &local);
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

}  // namespace

void platform_log_write(int priority, const char* tag, const char* text) {
  size_t len = std::strlen(text);
  while (len > 0 && (text[len - 1] == '\n' || text[len - 1] == '\r')) --len;
  const std::string_view message(text, len);

  const std::lock_guard lock(g_log_mutex);
  if (message == g_recent[0] || message == g_recent[1]) {
    ++g_suppressed;
    return;
  }
  if (g_suppressed > 0) {
    char note[96];
    const int n = std::snprintf(note, sizeof note, "(the %lu lines before repeated the two above)",
                                g_suppressed);
    write_line(priority, tag, note, n);
    g_suppressed = 0;
  }
  g_recent[0] = std::move(g_recent[1]);
  g_recent[1] = message;
  write_line(priority, tag, text, len);
}
