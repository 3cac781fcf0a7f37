// System properties of the emulated phone: one file per property under
// /dev/__properties__, holding the value exactly, with Android's rules.
//
// Opening a property file took more time than the rest of a short command. Values read are kept
// while an inotify watch on the directory reports no change in it; every change there (a write,
// a rename, a new or removed file, from the daemon or from outside) drops them all. Only plain
// files with one link, in a directory reached without links, are kept: a change made through
// another path would not be reported.
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <mutex>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unordered_map>
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

struct Cache {
  std::mutex mutex;
  int watch = -1;  // the inotify descriptor, -1 while the directory is not watched
  std::string root;  // the root whose directory is watched: unit tests change roots
  std::unordered_map<std::string, std::string> values;  // a missing file keeps ""
};

Cache& cache() {
  static Cache* const c = new Cache;  // never destroyed: threads may read properties at exit
  return *c;
}

bool is_plain_directory(int root, const char* relative) {
  struct stat st {};
  return ::fstatat(root, relative, &st, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(st.st_mode);
}

// Under the cache's lock: true when the kept values still hold.
bool cache_valid(Cache& c) {
  if (c.watch >= 0 && c.root != host_root_path()) {
    ::close(c.watch);
    c.watch = -1;
  }
  if (c.watch < 0) {
    const int root = host_root_fd();
    if (root < 0 || !is_plain_directory(root, "dev") ||
        !is_plain_directory(root, "dev/__properties__")) {
      return false;
    }
    c.watch = ::inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    if (c.watch < 0) return false;
    const std::string dir = host_root_path() + kPropertyDir;
    constexpr uint32_t kChanges = IN_MODIFY | IN_ATTRIB | IN_CLOSE_WRITE | IN_MOVED_FROM |
                                  IN_MOVED_TO | IN_CREATE | IN_DELETE | IN_DELETE_SELF |
                                  IN_MOVE_SELF | IN_DONT_FOLLOW | IN_ONLYDIR;
    if (::inotify_add_watch(c.watch, dir.c_str(), kChanges) < 0) {
      ::close(c.watch);
      c.watch = -1;
      return false;
    }
    c.values.clear();
    c.root = host_root_path();
    return true;
  }
  alignas(inotify_event) char events[4096];
  bool changed = false;
  bool gone = false;
  for (;;) {
    const ssize_t n = ::read(c.watch, events, sizeof events);
    if (n <= 0) break;
    changed = true;
    for (ssize_t at = 0; at < n;) {
      const auto* event = reinterpret_cast<const inotify_event*>(events + at);
      if (event->mask & (IN_IGNORED | IN_DELETE_SELF | IN_MOVE_SELF | IN_Q_OVERFLOW)) gone = true;
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
    }
  }
  if (changed) c.values.clear();
  if (gone) {
    ::close(c.watch);
    c.watch = -1;
    return false;
  }
  return true;
}

// The property file's bytes into `value` (at most PROPERTY_VALUE_MAX - 1); their count, 0 when
// there is no file. `keep` tells whether the file may be kept in the cache.
int read_property(const char* key, char* value, bool* keep) {
  const std::string path = property_path(key);
  UniqueFd fd(host_resolve(path.c_str(), O_RDONLY));
  struct stat st {};
  if (!fd.ok()) {
    *keep = errno == ENOENT &&
            ::fstatat(host_root_fd(), path.c_str() + 1, &st, AT_SYMLINK_NOFOLLOW) != 0;
    return 0;
  }
  *keep = ::fstatat(host_root_fd(), path.c_str() + 1, &st, AT_SYMLINK_NOFOLLOW) == 0 &&
          S_ISREG(st.st_mode) && st.st_nlink == 1;
  const ssize_t n = ::read(fd.get(), value, PROPERTY_VALUE_MAX - 1);
  return n > 0 ? static_cast<int>(n) : 0;
}

}  // namespace

int property_get(const char* key, char* value, const char* default_value) {
  int len = 0;
  if (valid_key(key)) {
    Cache& c = cache();
    const std::lock_guard lock(c.mutex);
    const bool valid = cache_valid(c);
    const auto kept = valid ? c.values.find(key) : c.values.end();
    if (kept != c.values.end()) {
      len = static_cast<int>(kept->second.size());
      std::memcpy(value, kept->second.data(), len);
    } else {
      bool keep = false;
      len = read_property(key, value, &keep);
      if (valid && keep) c.values.emplace(key, std::string(value, len));
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
