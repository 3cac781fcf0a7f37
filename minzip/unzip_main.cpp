// atcid-unzip: the daemon's zip reader as a host tool, for tests, fuzzing and benchmarks.
//   atcid-unzip ARCHIVE ENTRY OUTFILE   extracts ENTRY into OUTFILE
//   atcid-unzip -l ARCHIVE              one line per entry, in index order
// The reader's own messages stay on standard output, as the daemon prints them.
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

void list_entries(const ZipArchive& archive) {
  for (unsigned int i = 0; i < archive.num_entries; ++i) {
    const ZipEntry& e = archive.entries[i];
    std::printf("%u %u %u %08x %08x %04x %08x %u %.*s\n", e.method, e.compressed_size,
                e.uncompressed_size, e.crc, e.mod_time, e.made_by, e.external_attributes,
                e.data_offset, static_cast<int>(e.name_length), e.name);
  }
}

// The output file is made only once the entry is whole in memory.
bool extract_entry(const ZipArchive& archive, const char* name, const char* out_path) {
  const ZipEntry* entry = zip_find_entry(&archive, name);
  if (entry == nullptr) {
    std::printf("atcid-unzip: no entry '%s'\n", name);
    return false;
  }
  std::unique_ptr<unsigned char, decltype(&std::free)> buffer(
      static_cast<unsigned char*>(std::malloc(entry->uncompressed_size + size_t{1})), &std::free);
  if (buffer == nullptr) {
    std::printf("atcid-unzip: out of memory for '%s'\n", name);
    return false;
  }
  if (!zip_extract_entry_to_buffer(&archive, entry, buffer.get())) return false;
  UniqueFile out(std::fopen(out_path, "wb"));
  if (out == nullptr) {
    std::printf("atcid-unzip: cannot write '%s'\n", out_path);
    return false;
  }
  return std::fwrite(buffer.get(), 1, entry->uncompressed_size, out.get()) ==
             entry->uncompressed_size &&
         std::fclose(out.release()) == 0;
}

int run(const char* path, const char* name, const char* out_path) {
  MemMapping map{};
  const UniqueFd fd(::open(path, O_RDONLY | O_CLOEXEC));
  if (sys_map_fd(fd.get(), path, &map) != 0) return 1;
  ZipArchive archive{};
  int status = 1;
  if (zip_open_archive(&map, &archive) == 0) {
    if (name == nullptr) {
      list_entries(archive);
      status = 0;
    } else if (extract_entry(archive, name, out_path)) {
      status = 0;
    }
    zip_close_archive(&archive);
  }
  sys_release_map(&map);
  return status;
}

}  // namespace

int main(int argc, char** argv) {
  int status;
  if (argc == 3 && std::strcmp(argv[1], "-l") == 0) {
    status = run(argv[2], nullptr, nullptr);
  } else if (argc == 4) {
    status = run(argv[1], argv[2], argv[3]);
  } else {
    std::fprintf(stderr, "usage: atcid-unzip ARCHIVE ENTRY OUTFILE | atcid-unzip -l ARCHIVE\n");
    status = 2;
  }
  std::fflush(stdout);
  return status;
}
