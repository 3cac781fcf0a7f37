// Device paths of the emulated phone: every path resolves inside $ATCID_ROOT.
#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <unistd.h>

#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

UniqueFd g_root;
std::string g_root_path;

// The serial ports may be links to the machine's pseudo-terminals and are followed as the
// machine resolves them.
bool is_serial_port(std::string_view path) {
  return path == "/dev/ttyGS0" || path == "/dev/ttyHSL0";
}

// Splits a path into its parent directory, opened inside the root, and the last name.
// The last name "." or ".." is refused: nothing may address the root's parent.
int open_parent(const char* path, std::string& name) {
  std::string_view p(path);
  while (p.size() > 1 && p.back() == '/') p.remove_suffix(1);
  const size_t slash = p.rfind('/');
  std::string dir = slash == std::string_view::npos ? std::string(".")
                    : slash == 0                    ? std::string("/")
                                                    : std::string(p.substr(0, slash));
  name = std::string(slash == std::string_view::npos ? p : p.substr(slash + 1));
  if (name.empty() || name == "." || name == "..") {
    errno = EINVAL;
    return -1;
  }
  return host_resolve(dir.c_str(), O_PATH | O_DIRECTORY);
}

int open_flags_of(const char* mode) {
  int flags = 0;
  switch (mode[0]) {
    case 'r': flags = O_RDONLY; break;
    case 'w': flags = O_WRONLY | O_CREAT | O_TRUNC; break;
    case 'a': flags = O_WRONLY | O_CREAT | O_APPEND; break;
    default: return -1;
  }
  for (const char* c = mode + 1; *c; ++c) {
    if (*c == '+') flags = (flags & ~(O_RDONLY | O_WRONLY)) | O_RDWR;
    if (*c == 'x') flags |= O_EXCL;
  }
  return flags;
}

}  // namespace

int host_root_fd() { return g_root.get(); }
const std::string& host_root_path() { return g_root_path; }

int platform_init() {
  const char* root = std::getenv("ATCID_ROOT");
  if (root == nullptr || *root == '\0') {
    std::fprintf(stderr,
                 "atcid: ATCID_ROOT is not set. A host build serves an emulated phone and needs "
                 "the directory that plays its root (see emulator/).\n");
    return -1;
  }
  UniqueFd fd(::open(root, O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!fd.ok() || ::fchdir(fd.get()) != 0) {
    std::fprintf(stderr, "atcid: cannot use ATCID_ROOT '%s': %s\n", root, std::strerror(errno));
    return -1;
  }
  char real[4096];
  g_root_path = ::realpath(root, real) ? real : root;
  g_root = std::move(fd);
  host_choose_resolver();
  return 0;
}

int host_make_dirs(const char* path) {
  std::string partial;
  std::string_view rest(path);
  while (!rest.empty()) {
    const size_t slash = rest.find('/');
    partial.append(rest.substr(0, slash));
    if (!partial.empty() && partial != "/") dev_mkdir(partial.c_str(), 0755);
    if (slash == std::string_view::npos) break;
    partial.push_back('/');
    rest.remove_prefix(slash + 1);
  }
  struct stat st {};
  return dev_stat(path, &st) == 0 && S_ISDIR(st.st_mode) ? 0 : -1;
}

int dev_open(const char* path, int flags, mode_t mode) {
  if (path != nullptr && is_serial_port(path))
    return ::open((g_root_path + path).c_str(), flags | O_CLOEXEC, mode);
  return host_resolve(path, flags, mode);
}

FILE* dev_fopen(const char* path, const char* mode) {
  const int flags = open_flags_of(mode);
  if (flags < 0) {
    errno = EINVAL;
    return nullptr;
  }
  UniqueFd fd(host_resolve(path, flags, 0666));
  if (!fd.ok()) return nullptr;
  FILE* f = ::fdopen(fd.get(), mode);
  if (f != nullptr) fd.release();
  return f;
}

DIR* dev_opendir(const char* path) {
  UniqueFd fd(host_resolve(path, O_RDONLY | O_DIRECTORY));
  if (!fd.ok()) return nullptr;
  DIR* d = ::fdopendir(fd.get());
  if (d != nullptr) fd.release();
  return d;
}

int dev_stat(const char* path, struct stat* st) {
  UniqueFd fd(host_resolve(path, O_PATH));
  return fd.ok() ? ::fstat(fd.get(), st) : -1;
}

int dev_lstat(const char* path, struct stat* st) {
  std::string name;
  UniqueFd dir(open_parent(path, name));
  if (!dir.ok()) {
    // The root itself has no parent to look from.
    UniqueFd fd(host_resolve(path, O_PATH | O_NOFOLLOW));
    return fd.ok() ? ::fstat(fd.get(), st) : -1;
  }
  return ::fstatat(dir.get(), name.c_str(), st, AT_SYMLINK_NOFOLLOW);
}

int dev_access(const char* path, int mode) {
  UniqueFd fd(host_resolve(path, O_PATH));
  return fd.ok() ? ::faccessat(fd.get(), "", mode, AT_EMPTY_PATH) : -1;
}

int dev_unlink(const char* path) {
  std::string name;
  UniqueFd dir(open_parent(path, name));
  return dir.ok() ? ::unlinkat(dir.get(), name.c_str(), 0) : -1;
}

int dev_rmdir(const char* path) {
  std::string name;
  UniqueFd dir(open_parent(path, name));
  return dir.ok() ? ::unlinkat(dir.get(), name.c_str(), AT_REMOVEDIR) : -1;
}

int dev_mkdir(const char* path, mode_t mode) {
  std::string name;
  UniqueFd dir(open_parent(path, name));
  return dir.ok() ? ::mkdirat(dir.get(), name.c_str(), mode) : -1;
}

int dev_rename(const char* from, const char* to) {
  std::string from_name, to_name;
  UniqueFd from_dir(open_parent(from, from_name));
  if (!from_dir.ok()) return -1;
  UniqueFd to_dir(open_parent(to, to_name));
  if (!to_dir.ok()) return -1;
  return ::renameat(from_dir.get(), from_name.c_str(), to_dir.get(), to_name.c_str());
}

// The emulated storage reports the size of the machine's file system unless /.emu/statfs
// names another: lines of "PATH BLOCKS", matched against the path exactly as asked. This is
// how a stand-in tool (vdc) makes a calibrated card report a new size.
void apply_statfs_override(const char* path, struct statfs* st) {
  UniqueFile table(dev_fopen("/.emu/statfs", "r"));
  if (!table) return;
  char line[512];
  while (std::fgets(line, sizeof line, table.get()) != nullptr) {
    std::string_view text(line);
    const size_t blank = text.find(' ');
    if (blank == std::string_view::npos || text.substr(0, blank) != path) continue;
    char* end = nullptr;
    const unsigned long long blocks = std::strtoull(line + blank + 1, &end, 10);
    if (end == line + blank + 1) continue;
    st->f_blocks = blocks;
    st->f_bfree = std::min<unsigned long long>(st->f_bfree, blocks);
    st->f_bavail = std::min<unsigned long long>(st->f_bavail, blocks);
  }
}

int dev_statfs(const char* path, struct statfs* st) {
  UniqueFd fd(host_resolve(path, O_PATH));
  if (!fd.ok() || ::fstatfs(fd.get(), st) != 0) return -1;
  apply_statfs_override(path, st);
  return 0;
}

ssize_t dev_readlink(const char* path, char* buf, size_t size) {
  std::string name;
  UniqueFd dir(open_parent(path, name));
  return dir.ok() ? ::readlinkat(dir.get(), name.c_str(), buf, size) : -1;
}
