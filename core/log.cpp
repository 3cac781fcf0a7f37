#include "core/log.h"

#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "platform/platform.h"

// silent, silent, fatal, error, warn, info, info, debug
constinit const int android_log_lvl_convert[8] = {8, 8, 7, 6, 5, 4, 4, 3};

namespace {

constexpr char kTag[] = "ATCID";

int priority_of(int level) { return android_log_lvl_convert[level < 0 ? 0 : level > 7 ? 7 : level]; }

// "%d:%s(): " without a formatting pass: every line of the daemon starts so.
int call_site(char* text, size_t size, int line, const char* func) {
  const size_t func_len = std::strlen(func);
  if (line < 0 || func_len + 16 >= size) return std::snprintf(text, size, "%d:%s(): ", line, func);
  char digits[16];
  int d = 0;
  do {
    digits[d++] = static_cast<char>('0' + line % 10);
    line /= 10;
  } while (line > 0);
  int n = 0;
  while (d > 0) text[n++] = digits[--d];
  text[n++] = ':';
  std::memcpy(text + n, func, func_len);
  n += static_cast<int>(func_len);
  std::memcpy(text + n, "(): ", 4);
  return n + 4;
}

}  // namespace

void atci_log(int level, int line, const char* func, const char* fmt, ...) {
  char text[8192];
  int n = call_site(text, sizeof text, line, func);
  if (n < 0) n = 0;
  if (n >= static_cast<int>(sizeof text)) n = sizeof text - 1;
  if (std::strchr(fmt, '%') == nullptr) {  // a fixed text, as many are: no formatting pass
    const size_t len = strnlen(fmt, sizeof text - n - 1);
    std::memcpy(text + n, fmt, len);
    text[n + len] = '\0';
  } else {
    va_list args;
    va_start(args, fmt);
    std::vsnprintf(text + n, sizeof text - n, fmt, args);
    va_end(args);
  }
  platform_log_write(priority_of(level), kTag, text);
}

void atci_log_untagged(int level, const char* fmt, ...) {
  char text[8192];
  va_list args;
  va_start(args, fmt);
  std::vsnprintf(text, sizeof text, fmt, args);
  va_end(args);
  platform_log_write(priority_of(level), nullptr, text);
}
