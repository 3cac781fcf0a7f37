// The floor of bench/zip_bench.py: what reading a whole archive through a mapping costs before
// any parsing. It maps the archive as the zip reader does (read-only, private, the whole file)
// and reads one byte of every page, as the reader does when it checks the local header of every
// entry (in an archive of small entries every page holds one). Same arguments as atcid-unzip's
// extraction (ARCHIVE ENTRY OUTFILE); ENTRY and OUTFILE are ignored.
#include <cstdio>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: zip_floor ARCHIVE ENTRY OUTFILE\n");
    return 2;
  }
  const int fd = ::open(argv[1], O_RDONLY | O_CLOEXEC);
  const off_t length = fd < 0 ? -1 : ::lseek(fd, 0, SEEK_END);
  if (length <= 0) return 1;
  void* addr = ::mmap(nullptr, static_cast<size_t>(length), PROT_READ, MAP_PRIVATE, fd, 0);
  ::close(fd);
  if (addr == MAP_FAILED) return 1;
  const auto* bytes = static_cast<const volatile unsigned char*>(addr);
  const auto page = static_cast<off_t>(::sysconf(_SC_PAGESIZE));
  unsigned sum = 0;
  for (off_t at = 0; at < length; at += page) sum += bytes[at];
  ::munmap(addr, static_cast<size_t>(length));
  return sum == 0xffffffffu ? 1 : 0;  // keeps the reads
}
