#include "core/log.h"

#include <cstdarg>
#include <cstdio>

#include "platform/platform.h"

// silent, silent, fatal, error, warn, info, info, debug
constinit const int android_log_lvl_convert[8] = {8, 8, 7, 6, 5, 4, 4, 3};

namespace {

constexpr char kTag[] = "ATCID";

int priority_of(int level) { return android_log_lvl_convert[level < 0 ? 0 : level > 7 ? 7 : level]; }

}  // namespace

void atci_log(int level, int line, const char* func, const char* fmt, ...) {
  char text[8192];
  int n = std::snprintf(text, sizeof text, "%d:%s(): ", line, func);
  if (n < 0) n = 0;
  va_list args;
  va_start(args, fmt);
  std::vsnprintf(text + n, sizeof text - n, fmt, args);
  va_end(args);
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
