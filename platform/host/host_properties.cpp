// System properties of the emulated phone: one file per property under
// /dev/__properties__, holding the value exactly, with Android's rules.
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <unistd.h>

#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

constexpr char kPropertyDir[] = "/dev/__properties__";

// Property names are dotted words; anything that could name another file is refused.
bool valid_key(const char* key) {
  if (key == nullptr || key[0] == '\0' || key[0] == '.') return false;
  const std::string_view k(key);
  if (k.size() > 255) return false;
  for (const char c : k) {
    const bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                    c == '.' || c == '_' || c == '-' || c == ':' || c == '@';
    if (!ok) return false;
  }
  return true;
}

std::string property_path(const char* key) { return std::string(kPropertyDir) + "/" + key; }

}  // namespace

int property_get(const char* key, char* value, const char* default_value) {
  int len = 0;
  if (valid_key(key)) {
    UniqueFd fd(host_resolve(property_path(key).c_str(), O_RDONLY));
    if (fd.ok()) {
      const ssize_t n = ::read(fd.get(), value, PROPERTY_VALUE_MAX - 1);
      len = n > 0 ? static_cast<int>(n) : 0;
    }
  }
  if (len == 0 && default_value != nullptr) {
    len = static_cast<int>(strnlen(default_value, PROPERTY_VALUE_MAX - 1));
    std::memcpy(value, default_value, len);
  }
  value[len] = '\0';
  return len;
}

int property_set(const char* key, const char* value) {
  if (!valid_key(key) || value == nullptr) return -1;
  const size_t len = std::strlen(value);
  if (len >= static_cast<size_t>(PROPERTY_VALUE_MAX)) return -1;
  const std::string path = property_path(key);
  struct stat st {};
  if (std::strncmp(key, "ro.", 3) == 0 && dev_stat(path.c_str(), &st) == 0) return -1;
  if (host_make_dirs(kPropertyDir) != 0) return -1;

  // A reader sees the old value or the new one: write aside, then rename over.
  static std::atomic<unsigned> counter{0};
  char tmp[512];
  std::snprintf(tmp, sizeof tmp, "%s/.%s.%d.%u", kPropertyDir, key, static_cast<int>(::getpid()),
                counter.fetch_add(1, std::memory_order_relaxed));
  {
    UniqueFd fd(host_resolve(tmp, O_WRONLY | O_CREAT | O_TRUNC, 0644));
    if (!fd.ok()) return -1;
    if (::write(fd.get(), value, len) != static_cast<ssize_t>(len)) {
      dev_unlink(tmp);
      return -1;
    }
  }
  if (dev_rename(tmp, path.c_str()) != 0) {
    dev_unlink(tmp);
    return -1;
  }
  return 0;
}
