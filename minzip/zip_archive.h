// Read-only zip archive reader over a memory mapping: the central directory is parsed once,
// entries are kept sorted by name and indexed by a hash table, and one entry at a time is
// extracted (stored or deflated) into a caller's buffer.
#pragma once

#include <cstddef>
#include <cstdint>

#include "minzip/file_mapper.h"

inline constexpr uint16_t kZipStored = 0;
inline constexpr uint16_t kZipDeflated = 8;

// Pointer first and the two 16-bit fields last: 40 bytes a record instead of 48.
struct ZipEntry {
  const char* name;  // into the mapping, not NUL-terminated
  uint32_t name_length;
  uint32_t data_offset;
  uint32_t compressed_size;
  uint32_t uncompressed_size;
  uint32_t mod_time;
  uint32_t crc;  // kept, never compared
  uint32_t external_attributes;
  uint16_t method;
  uint16_t made_by;
};
static_assert(sizeof(ZipEntry) == 40 || sizeof(void*) != 8);

struct HashSlot {
  uint32_t hash;
  ZipEntry* entry;  // null when empty, 0xcbcacccd when removed
};

struct HashTable {
  int table_size;  // a power of two
  int num_entries;
  int num_dead_entries;
  HashSlot* slots;
};

struct ZipArchive {
  const unsigned char* addr;
  size_t length;
  unsigned int num_entries;
  ZipEntry* entries;  // sorted by name
  HashTable* hash;
};

uint32_t zip_name_hash(const char* name, size_t length);

// 0 and a filled archive, or an errno value (EINVAL for a malformed archive, ENOMEM) with
// nothing left allocated. The archive borrows the mapping.
int zip_open_archive(const MemMapping* map, ZipArchive* archive);
void zip_close_archive(ZipArchive* archive);
const ZipEntry* zip_find_entry(const ZipArchive* archive, const char* name);
// `buffer` holds entry->uncompressed_size bytes; true when exactly that many were produced.
bool zip_extract_entry_to_buffer(const ZipArchive* archive, const ZipEntry* entry,
                                 unsigned char* buffer);
