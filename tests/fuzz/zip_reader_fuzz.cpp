// libFuzzer target for the zip reader: open any bytes as an archive and extract every entry.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "minzip/zip_archive.h"

namespace {
// Declared sizes beyond this are skipped instead of allocated; the reader refuses them anyway.
constexpr uint32_t kMaxExtract = 1 << 22;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  // An exact-size heap copy, so any read past the archive is caught.
  std::vector<unsigned char> copy(data, data + size);
  MemMapping map{copy.data(), size, nullptr, 0};
  ZipArchive archive{};
  if (zip_open_archive(&map, &archive) != 0) return 0;
  for (unsigned int i = 0; i < archive.num_entries; ++i) {
    const ZipEntry& entry = archive.entries[i];
    char name[4096];
    std::memcpy(name, entry.name, entry.name_length);
    name[entry.name_length] = '\0';
    const ZipEntry* found = zip_find_entry(&archive, name);
    if (found == nullptr || found->name_length != entry.name_length) std::abort();
    if (entry.uncompressed_size > kMaxExtract) continue;
    std::vector<unsigned char> out(entry.uncompressed_size);
    zip_extract_entry_to_buffer(&archive, &entry, out.data());
  }
  zip_close_archive(&archive);
  return 0;
}
