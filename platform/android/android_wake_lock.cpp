#include "platform/android/android_wake_lock.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "platform/unique_fd.h"

namespace {

int write_name(const char* power_dir, const char* file, const char* id) {
  if (id == nullptr || *id == '\0') return -EINVAL;
  char path[128];
  std::snprintf(path, sizeof path, "%s/%s", power_dir, file);
  UniqueFd fd(::open(path, O_WRONLY | O_CLOEXEC));
  if (!fd.ok()) return -errno;
  const ssize_t n = ::write(fd.get(), id, std::strlen(id));
  return n < 0 ? -errno : static_cast<int>(n);
}

}  // namespace

int wake_lock_acquire_in(const char* power_dir, int lock, const char* id) {
  if (lock != PARTIAL_WAKE_LOCK) return -EINVAL;
  return write_name(power_dir, "wake_lock", id);
}

int wake_lock_release_in(const char* power_dir, const char* id) {
  return write_name(power_dir, "wake_unlock", id);
}
