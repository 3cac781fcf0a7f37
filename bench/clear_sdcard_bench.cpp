// The programs of bench/clear_sdcard_bench.py.
//   clear_sdcard_bench build ROOT   makes ROOT/storage/sdcard0: kDirs directories of kFiles files
//                                   and a keep list that keeps a few of them
//   clear_sdcard_bench clear ROOT REPORT
//                                   runs clear_sdcard with ROOT as the device root; writes to
//                                   REPORT the resident memory before and the peak after, in KiB
//   clear_sdcard_bench unlink ROOT  removes what clear_sdcard removes from a tree made by
//                                   build, knowing every name in advance: no directory is read,
//                                   nothing but the removals themselves (the floor)
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "commands/storage.h"
#include "platform/platform.h"

namespace {

constexpr int kDirs = 1000;
constexpr int kFilesPerDir = 100;
// dir_0500 is cleaned, not removed: its sub/ and one file stay. Everything else goes but the
// keep list and top.txt, so rm -rf of the card removes only five entries more.
constexpr int kCleanedDir = 500;
constexpr int kKeptFile = 42;
constexpr const char* kKeepList =
    "f .clear_sdcard.cfg\n"
    "d dir_0500/sub\n"
    "f dir_0500/file_042.dat\n"
    "f top.txt\n";

std::string dir_name(int d) {
  char name[32];
  std::snprintf(name, sizeof name, "dir_%04d", d);
  return name;
}

std::string file_name(int f) {
  char name[32];
  std::snprintf(name, sizeof name, "file_%03d.dat", f);
  return name;
}

bool write_text(int dir, const std::string& name, const char* text) {
  const int fd = ::openat(dir, name.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  if (fd < 0) return false;
  const size_t length = std::strlen(text);
  const bool ok = ::write(fd, text, length) == static_cast<ssize_t>(length);
  ::close(fd);
  return ok;
}

int build(const std::string& root) {
  const std::string card = root + "/storage/sdcard0";
  if (::mkdir((root + "/storage").c_str(), 0755) != 0 || ::mkdir(card.c_str(), 0755) != 0) {
    std::perror("mkdir");
    return 1;
  }
  const int top = ::open(card.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (top < 0 || !write_text(top, ".clear_sdcard.cfg", kKeepList) || !write_text(top, "top.txt", "t"))
    return 1;
  for (int d = 0; d < kDirs; ++d) {
    if (::mkdirat(top, dir_name(d).c_str(), 0755) != 0) return 1;
    const int dir = ::openat(top, dir_name(d).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir < 0) return 1;
    for (int f = 0; f < kFilesPerDir; ++f) {
      if (!write_text(dir, file_name(f), "0123456789abcdef")) return 1;
    }
    if (d == kCleanedDir && ::mkdirat(dir, "sub", 0755) != 0) return 1;
    ::close(dir);
  }
  ::close(top);
  return 0;
}

// Resident memory now and at its peak, in KiB, from /proc/self/status.
void memory_kib(long* now, long* peak) {
  FILE* status = std::fopen("/proc/self/status", "r");
  char line[256];
  while (status != nullptr && std::fgets(line, sizeof line, status) != nullptr) {
    if (std::strncmp(line, "VmRSS:", 6) == 0) *now = std::atol(line + 6);
    if (std::strncmp(line, "VmHWM:", 6) == 0) *peak = std::atol(line + 6);
  }
  if (status != nullptr) std::fclose(status);
}

int clear(const std::string& root, const char* report) {
  ::setenv("ATCID_ROOT", root.c_str(), 1);
  if (platform_init() != 0) return 1;
  long before = 0, peak = 0, after = 0;
  memory_kib(&before, &peak);
  const int cleared = clear_sdcard(nullptr);
  memory_kib(&after, &peak);
  FILE* out = std::fopen(report, "w");
  if (out == nullptr) return 1;
  std::fprintf(out, "%ld %ld\n", before, peak);
  return std::fclose(out) == 0 && cleared == 1 ? 0 : 1;
}

int unlink_all(const std::string& root) {
  const int top = ::open((root + "/storage/sdcard0").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (top < 0) return 1;
  for (int d = 0; d < kDirs; ++d) {
    const int dir = ::openat(top, dir_name(d).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir < 0) return 1;
    for (int f = 0; f < kFilesPerDir; ++f) {
      if (d == kCleanedDir && f == kKeptFile) continue;
      if (::unlinkat(dir, file_name(f).c_str(), 0) != 0) return 1;
    }
    ::close(dir);
    if (d != kCleanedDir && ::unlinkat(top, dir_name(d).c_str(), AT_REMOVEDIR) != 0) return 1;
  }
  ::close(top);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 3 && std::strcmp(argv[1], "build") == 0) return build(argv[2]);
  if (argc == 4 && std::strcmp(argv[1], "clear") == 0) return clear(argv[2], argv[3]);
  if (argc == 3 && std::strcmp(argv[1], "unlink") == 0) return unlink_all(argv[2]);
  std::fprintf(stderr, "usage: %s build ROOT | clear ROOT REPORT | unlink ROOT\n", argv[0]);
  return 2;
}
