// clear_sdcard on a large card. Run through clear_sdcard_bench.sh, which builds the same tree
// twice and compares against rm -rf.
//   clear_sdcard_bench build ROOT   makes ROOT/storage/sdcard0: DIRS directories of FILES files
//                                   and a keep list of a few entries
//   clear_sdcard_bench clear ROOT   runs clear_sdcard with ROOT as the device root
#include <chrono>
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
constexpr const char* kKeepList =
    "f .clear_sdcard.cfg\n"
    "d dir_0007\n"
    "d dir_0500/sub\n"
    "f dir_0900/file_042.dat\n"
    "f top.txt\n";

bool write_text(const std::string& path, const char* text) {
  const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
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
  if (!write_text(card + "/.clear_sdcard.cfg", kKeepList) || !write_text(card + "/top.txt", "t"))
    return 1;
  char name[64];
  for (int d = 0; d < kDirs; ++d) {
    std::snprintf(name, sizeof name, "/dir_%04d", d);
    const std::string dir = card + name;
    if (::mkdir(dir.c_str(), 0755) != 0) return 1;
    for (int f = 0; f < kFilesPerDir; ++f) {
      std::snprintf(name, sizeof name, "/file_%03d.dat", f);
      if (!write_text(dir + name, "0123456789abcdef")) return 1;
    }
  }
  if (::mkdir((card + "/dir_0500/sub").c_str(), 0755) != 0) return 1;
  return 0;
}

int clear(const std::string& root) {
  ::setenv("ATCID_ROOT", root.c_str(), 1);
  if (platform_init() != 0) return 1;
  const auto start = std::chrono::steady_clock::now();
  const int cleared = clear_sdcard(nullptr);
  const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;
  std::printf("clear_sdcard %.3f s\n", took.count());
  return cleared == 1 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 3 && std::strcmp(argv[1], "build") == 0) return build(argv[2]);
  if (argc == 3 && std::strcmp(argv[1], "clear") == 0) return clear(argv[2]);
  std::fprintf(stderr, "usage: %s build|clear ROOT\n", argv[0]);
  return 2;
}
