// Resolving a device path inside the root. openat2(RESOLVE_IN_ROOT) does it in the kernel;
// kernels before 5.6, seccomp filters and qemu-user lack it, and there the same walk is done
// here, one component at a time from the root's descriptor.
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <linux/openat2.h>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

#include "platform/host/host_root.h"

namespace {

// As the kernel's limit on links followed in one lookup.
constexpr int kMaxLinks = 40;

bool g_walk = false;

int resolve_in_kernel(const char* path, int flags, mode_t mode) {
  open_how how{};
  how.flags = static_cast<unsigned>(flags | O_CLOEXEC);
  how.mode = (flags & O_CREAT) ? mode : 0;
  how.resolve = RESOLVE_IN_ROOT | RESOLVE_NO_MAGICLINKS;
  for (;;) {
    const long fd = ::syscall(SYS_openat2, host_root_fd(), path, &how, sizeof how);
    // RESOLVE_IN_ROOT asks for a retry when a rename raced the walk.
    if (fd >= 0 || errno != EAGAIN) return static_cast<int>(fd);
  }
}

// Components still to walk, the next one last, so a link's target is pushed in front.
void push_components(std::vector<std::string>& pending, std::string_view path) {
  std::vector<std::string_view> parts;
  while (!path.empty()) {
    const size_t slash = path.find('/');
    const std::string_view part = path.substr(0, slash);
    if (!part.empty() && part != ".") parts.push_back(part);
    if (slash == std::string_view::npos) break;
    path.remove_prefix(slash + 1);
  }
  for (auto it = parts.rbegin(); it != parts.rend(); ++it) pending.emplace_back(*it);
}

// The walk: `dirs` holds the directories from the root down to the current one, so ".."
// pops (never above the root) and an absolute link target starts again from the root.
int resolve_by_walk(const char* path, int flags, mode_t mode) {
  std::vector<UniqueFd> dirs;
  dirs.emplace_back(::openat(host_root_fd(), ".", O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!dirs.back().ok()) return -1;
  std::vector<std::string> pending;
  push_components(pending, path);
  const bool wants_dir = std::string_view(path).ends_with('/');
  int links = 0;

  auto follow = [&](int dir, const std::string& name) {
    char target[4096];
    const ssize_t n = ::readlinkat(dir, name.c_str(), target, sizeof target);
    if (n < 0 || static_cast<size_t>(n) >= sizeof target) {
      if (n >= 0) errno = ENAMETOOLONG;
      return false;
    }
    if (++links > kMaxLinks) {
      errno = ELOOP;
      return false;
    }
    if (target[0] == '/') dirs.resize(1);
    push_components(pending, std::string_view(target, static_cast<size_t>(n)));
    return true;
  };

  while (!pending.empty()) {
    const std::string name = std::move(pending.back());
    pending.pop_back();
    const int dir = dirs.back().get();
    if (name == "..") {
      if (dirs.size() > 1) dirs.pop_back();
      continue;
    }
    struct stat st {};
    const bool found = ::fstatat(dir, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) == 0;
    const bool last = pending.empty();
    if (found && S_ISLNK(st.st_mode) && !(last && (flags & O_NOFOLLOW))) {
      if (!follow(dir, name)) return -1;
      continue;
    }
    if (last) {
      const int extra = wants_dir && !(flags & O_CREAT) ? O_DIRECTORY : 0;
      const int fd = ::openat(dir, name.c_str(), flags | extra | O_NOFOLLOW | O_CLOEXEC, mode);
      // A link put in place since the look: take it as a link, as the kernel walk would.
      if (fd < 0 && errno == ELOOP && !(flags & O_NOFOLLOW)) {
        if (!follow(dir, name)) return -1;
        continue;
      }
      return fd;
    }
    if (!found) return -1;
    if (!S_ISDIR(st.st_mode)) {
      errno = ENOTDIR;
      return -1;
    }
    UniqueFd next(::openat(dir, name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!next.ok()) return -1;
    dirs.push_back(std::move(next));
  }
  // The path named a directory already walked into (or the root).
  return ::openat(dirs.back().get(), ".", (flags & ~(O_CREAT | O_EXCL)) | O_CLOEXEC);
}

}  // namespace

void host_choose_resolver() {
  const char* forced = std::getenv("ATCID_RESOLVER");
  if (forced != nullptr && std::string_view(forced) == "walk") {
    g_walk = true;
    return;
  }
  const int fd = resolve_in_kernel(".", O_PATH | O_DIRECTORY, 0);
  g_walk = fd < 0 && (errno == ENOSYS || errno == EPERM);
  if (fd >= 0) ::close(fd);
}

void host_use_walk_resolver(bool walk) { g_walk = walk; }
bool host_walk_resolver_in_use() { return g_walk; }

int host_resolve(const char* path, int flags, mode_t mode) {
  if (path == nullptr || *path == '\0') {
    errno = ENOENT;
    return -1;
  }
  return g_walk ? resolve_by_walk(path, flags, mode) : resolve_in_kernel(path, flags, mode);
}
