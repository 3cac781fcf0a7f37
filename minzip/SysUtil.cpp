#include "minzip/SysUtil.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/platform.h"
#include "platform/unique_fd.h"

namespace {

int map_descriptor(int fd, MemMapping* map) {
  const off_t start = ::lseek(fd, 0, SEEK_CUR);
  const off_t end = start < 0 ? -1 : ::lseek(fd, 0, SEEK_END);
  if (end < 0 || ::lseek(fd, start, SEEK_SET) != start) {
    std::puts("sysutil: could not determine length of file");
    return -1;
  }
  const size_t length = static_cast<size_t>(end - start);
  if (length == 0) {
    std::puts("sysutil: file is empty");
    return -1;
  }
  void* addr = ::mmap(nullptr, length, PROT_READ, MAP_PRIVATE, fd, start);
  if (addr == MAP_FAILED) {
    std::printf("sysutil: mmap(%d, R, PRIVATE, %d, %d) failed: %s\n", static_cast<int>(length), fd,
                static_cast<int>(start), std::strerror(errno));
    return -1;
  }
  auto* range = static_cast<MappedRange*>(std::malloc(sizeof(MappedRange)));
  if (range == nullptr) {
    std::printf("sysutil: malloc failed: %s\n", std::strerror(errno));
    ::munmap(addr, length);
    return -1;
  }
  *range = {addr, length};
  *map = {static_cast<unsigned char*>(addr), length, range, 1};
  return 0;
}

}  // namespace

int sys_map_fd(int fd, const char* name, MemMapping* map) {
  if (fd < 0) std::printf("sysutil: Unable to open '%s': %s\n", name, std::strerror(errno));
  if (fd < 0 || map_descriptor(fd, map) != 0) {
    std::printf("sysutil: Map of '%s' failed\n", name);
    return -1;
  }
  return 0;
}

int sys_map_file(const char* path, MemMapping* map) {
  const UniqueFd fd(dev_open(path, O_RDONLY | O_CLOEXEC));
  return sys_map_fd(fd.get(), path, map);
}

void sys_release_map(MemMapping* map) {
  for (unsigned int i = 0; i < map->range_count; ++i) {
    MappedRange& range = map->ranges[i];
    if (::munmap(range.addr, range.length) != 0) {
      std::printf("sysutil: munmap(%p, %d) failed: %s\n", range.addr, static_cast<int>(range.length),
                  std::strerror(errno));
    }
  }
  std::free(map->ranges);
  *map = {};
}
