// Wake locks and frame-buffer blanking of the emulated phone: nothing to power down, so each
// request is appended to a log under /.emu/ for station developers and tests to read.
#include <cstdarg>
#include <cstdio>
#include <fcntl.h>
#include <unistd.h>

#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

int append_line(const char* log, const char* fmt, ...) __attribute__((format(printf, 2, 3)));

int append_line(const char* log, const char* fmt, ...) {
  char line[160];
  va_list args;
  va_start(args, fmt);
  const int n = std::vsnprintf(line, sizeof line, fmt, args);
  va_end(args);
  if (n < 0 || static_cast<size_t>(n) >= sizeof line) return -1;
  if (host_make_dirs("/.emu") != 0) return -1;
  UniqueFd fd(host_resolve(log, O_WRONLY | O_CREAT | O_APPEND, 0644));
  if (!fd.ok()) return -1;
  return ::write(fd.get(), line, static_cast<size_t>(n)) == n ? 0 : -1;
}

}  // namespace

int acquire_wake_lock(int type, const char* name) {
  if (name == nullptr) return -1;
  return append_line("/.emu/wake_lock.log", "acquire %d %s\n", type, name);
}

int release_wake_lock(const char* name) {
  if (name == nullptr) return -1;
  return append_line("/.emu/wake_lock.log", "release %s\n", name);
}

// Never an ioctl: the descriptor is an ordinary file of the root.
int platform_fb_blank(int fd, int mode) {
  if (fd < 0 || ::fcntl(fd, F_GETFD) == -1) return -1;
  return append_line("/.emu/framebuffer.log", "blank %d\n", mode);
}
