// atcid-unzip: the daemon's zip reader as a host tool, for tests and benchmarks.
//   atcid-unzip -l ARCHIVE          one line per entry, in index order
//   atcid-unzip ARCHIVE ENTRY...    the entries' bytes, concatenated
// Data goes to standard output; the reader's own messages are moved to standard error.
// Exit status: 0 done, 1 failure, 2 usage.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <unistd.h>

#include "minzip/SysUtil.h"
#include "minzip/Zip.h"
#include "platform/unique_fd.h"

namespace {

void list_entries(const ZipArchive& archive, FILE* out) {
  for (unsigned int i = 0; i < archive.num_entries; ++i) {
    const ZipEntry& e = archive.entries[i];
    std::fprintf(out, "%u %u %u %08x %08x %04x %08x %u %.*s\n", e.method, e.compressed_size,
                 e.uncompressed_size, e.crc, e.mod_time, e.made_by, e.external_attributes,
                 e.data_offset, static_cast<int>(e.name_length), e.name);
  }
}

bool extract_entry(const ZipArchive& archive, const char* name, FILE* out) {
  const ZipEntry* entry = zip_find_entry(&archive, name);
  if (entry == nullptr) {
    std::fprintf(stderr, "atcid-unzip: no entry '%s'\n", name);
    return false;
  }
  std::unique_ptr<unsigned char, decltype(&std::free)> buffer(
      static_cast<unsigned char*>(std::malloc(entry->uncompressed_size + size_t{1})), &std::free);
  if (buffer == nullptr) {
    std::fprintf(stderr, "atcid-unzip: out of memory for '%s'\n", name);
    return false;
  }
  if (!zip_extract_entry_to_buffer(&archive, entry, buffer.get())) return false;
  return std::fwrite(buffer.get(), 1, entry->uncompressed_size, out) == entry->uncompressed_size;
}

int run(const char* path, char** names, int count, bool list, FILE* out) {
  MemMapping map{};
  const UniqueFd fd(::open(path, O_RDONLY | O_CLOEXEC));
  if (sys_map_fd(fd.get(), path, &map) != 0) return 1;
  ZipArchive archive{};
  int status = 1;
  if (zip_open_archive(&map, &archive) == 0) {
    status = 0;
    if (list) list_entries(archive, out);
    for (int i = 0; i < count && status == 0; ++i) {
      if (!extract_entry(archive, names[i], out)) status = 1;
    }
    zip_close_archive(&archive);
  }
  sys_release_map(&map);
  return status;
}

}  // namespace

int main(int argc, char** argv) {
  const bool list = argc == 3 && std::strcmp(argv[1], "-l") == 0;
  if (!list && argc < 3) {
    std::fprintf(stderr, "usage: atcid-unzip -l ARCHIVE | atcid-unzip ARCHIVE ENTRY...\n");
    return 2;
  }
  const int data_fd = ::dup(STDOUT_FILENO);
  FILE* out = data_fd < 0 ? nullptr : ::fdopen(data_fd, "w");
  if (out == nullptr || ::dup2(STDERR_FILENO, STDOUT_FILENO) < 0) {
    std::perror("atcid-unzip");
    return 1;
  }
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  const int status = list ? run(argv[2], nullptr, 0, true, out) : run(argv[1], argv + 2, argc - 2, false, out);
  if (std::fclose(out) != 0) return 1;
  std::fflush(stdout);
  return status;
}
