#include "minzip/zip_archive.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <sys/mman.h>
#include <unistd.h>
#include <zlib.h>

namespace {

constexpr uint32_t kLocalSignature = 0x04034b50;
constexpr uint32_t kCentralSignature = 0x02014b50;
constexpr uint32_t kEndSignature = 0x06054b50;

constexpr size_t kLocalHeaderLength = 30;
constexpr size_t kLocalNameLength = 26;
constexpr size_t kLocalExtraLength = 28;

constexpr size_t kCentralHeaderLength = 46;
constexpr size_t kCentralMadeBy = 4;
constexpr size_t kCentralMethod = 10;
constexpr size_t kCentralModTime = 12;
constexpr size_t kCentralCrc = 16;
constexpr size_t kCentralCompressedSize = 20;
constexpr size_t kCentralUncompressedSize = 24;
constexpr size_t kCentralNameLength = 28;
constexpr size_t kCentralExtraLength = 30;
constexpr size_t kCentralCommentLength = 32;
constexpr size_t kCentralExternalAttributes = 38;
constexpr size_t kCentralLocalOffset = 42;

constexpr size_t kEndLength = 22;
constexpr size_t kEndEntryCount = 8;
constexpr size_t kEndDirectoryOffset = 16;

// The last field of each fixed record ends where the record does.
static_assert(kLocalExtraLength + 2 == kLocalHeaderLength);
static_assert(kCentralLocalOffset + 4 == kCentralHeaderLength);
static_assert(kEndDirectoryOffset + 4 + 2 == kEndLength);  // then the comment length

constexpr size_t kMaxNameLength = 4095;
constexpr size_t kInflateWindow = 32768;

uint16_t get16(const unsigned char* p) { return static_cast<uint16_t>(p[0] | p[1] << 8); }
uint32_t get32(const unsigned char* p) {
  return p[0] | p[1] << 8 | p[2] << 16 | static_cast<uint32_t>(p[3]) << 24;
}

// ---- name hash: hash * 31 + byte from 2, eight bytes a step ----

constexpr std::array<uint32_t, 9> kPower31 = [] {
  std::array<uint32_t, 9> powers{};
  uint32_t power = 1;
  for (uint32_t& p : powers) {
    p = power;
    power *= 31;
  }
  return powers;
}();

// Eight bytes in name order, the first in the low byte.
uint64_t load_eight(const unsigned char* p) {
  uint64_t w;
  std::memcpy(&w, p, 8);
  if constexpr (std::endian::native == std::endian::big) w = __builtin_bswap64(w);
  return w;
}

// b0 * 31^7 + b1 * 31^6 + ... + b7, b0 the low byte of `w`: bytes to pairs, pairs to quads, in
// one multiplication for all lanes each (no lane outgrows its width), then the two quads.
uint32_t fold_eight(uint64_t w) {
  constexpr uint64_t kEvenBytes = 0x00ff00ff00ff00ff;
  constexpr uint64_t kEvenPairs = 0x0000ffff0000ffff;
  const uint64_t pairs = (w & kEvenBytes) * kPower31[1] + (w >> 8 & kEvenBytes);
  const uint64_t quads = (pairs & kEvenPairs) * kPower31[2] + (pairs >> 16 & kEvenPairs);
  return static_cast<uint32_t>(quads) * kPower31[4] + static_cast<uint32_t>(quads >> 32);
}

// The entry array and the hash table run to megabytes for a large archive, and every page of
// them is written while the directory is parsed. Such a block starts on a 2 MiB boundary, asks
// for huge pages and is made present in one call: each whole 2 MiB of it costs a fraction of
// the faults and zeroed pages of 4 KiB ones. It ends where the array does, so the tail past its
// last whole huge page is ordinary pages and the block holds no memory it does not use. A
// kernel without transparent huge pages or page population still hands out zeroed memory.
constexpr size_t kHugePage = size_t{2} << 20;
constexpr size_t kLargeBlock = size_t{1} << 20;

void* zeroed_array(size_t count, size_t size) {
  if (count > SIZE_MAX / size) return nullptr;
  const size_t bytes = count * size;
  if (bytes < kLargeBlock) return std::calloc(count, size);
  const auto page = static_cast<size_t>(::sysconf(_SC_PAGESIZE));
  const size_t length = (bytes + page - 1) / page * page;
  // Over-allocate by one huge page and trim both ends to the aligned block.
  void* area = ::mmap(nullptr, length + kHugePage, PROT_READ | PROT_WRITE,
                      MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (area == MAP_FAILED) return nullptr;
  const auto raw = reinterpret_cast<uintptr_t>(area);
  const uintptr_t start = (raw + kHugePage - 1) & ~uintptr_t{kHugePage - 1};
  if (start > raw) ::munmap(area, start - raw);
  ::munmap(reinterpret_cast<void*>(start + length), raw + kHugePage - start);
  auto* block = reinterpret_cast<void*>(start);
  ::madvise(block, length, MADV_HUGEPAGE);
  ::madvise(block, length, MADV_POPULATE_WRITE);
  return block;
}

void free_array(void* block, size_t count, size_t size) {
  if (block == nullptr) return;
  if (count * size < kLargeBlock) {
    std::free(block);
  } else {
    ::munmap(block, count * size);
  }
}

// ---- hash table over the entries ----

ZipEntry* tombstone() { return reinterpret_cast<ZipEntry*>(uintptr_t{0xcbcacccd}); }

bool same_name(const ZipEntry* entry, const char* name, uint32_t length) {
  return entry->name_length == length && std::memcmp(entry->name, name, length) == 0;
}

HashTable* hash_create(size_t size) {
  auto* table = static_cast<HashTable*>(std::calloc(1, sizeof(HashTable)));
  if (table == nullptr) return nullptr;
  table->slots = static_cast<HashSlot*>(zeroed_array(size, sizeof(HashSlot)));
  if (table->slots == nullptr) {
    std::free(table);
    return nullptr;
  }
  table->table_size = static_cast<int>(size);
  return table;
}

void hash_free(HashTable* table) {
  if (table == nullptr) return;
  free_array(table->slots, static_cast<size_t>(table->table_size), sizeof(HashSlot));
  std::free(table);
}

// The slot holding `name`, or the empty slot that ends its probe sequence.
HashSlot* hash_probe(const HashTable* table, uint32_t hash, const char* name, uint32_t length) {
  const uint32_t mask = static_cast<uint32_t>(table->table_size) - 1;
  for (uint32_t i = hash & mask;; i = (i + 1) & mask) {
    HashSlot* slot = &table->slots[i];
    if (slot->entry == nullptr) return slot;
    if (slot->entry != tombstone() && slot->hash == hash && same_name(slot->entry, name, length)) {
      return slot;
    }
  }
}

void hash_resize(HashTable* table, size_t new_size) {
  auto* slots = static_cast<HashSlot*>(zeroed_array(new_size, sizeof(HashSlot)));
  if (slots == nullptr) {
    std::puts("minzip: Dalvik hash resize failure");
    std::abort();
  }
  HashSlot* old = table->slots;
  const int old_size = table->table_size;
  table->slots = slots;
  table->table_size = static_cast<int>(new_size);
  table->num_dead_entries = 0;
  for (int i = 0; i < old_size; ++i) {
    if (old[i].entry == nullptr || old[i].entry == tombstone()) continue;
    *hash_probe(table, old[i].hash, old[i].entry->name, old[i].entry->name_length) = old[i];
  }
  free_array(old, static_cast<size_t>(old_size), sizeof(HashSlot));
}

// Returns the entry already filed under the same name, or `entry` once added.
ZipEntry* hash_insert(HashTable* table, ZipEntry* entry, uint32_t hash) {
  HashSlot* slot = hash_probe(table, hash, entry->name, entry->name_length);
  if (slot->entry != nullptr) return slot->entry;
  *slot = {hash, entry};
  ++table->num_entries;
  if ((table->num_entries + table->num_dead_entries) * 8 > table->table_size * 5) {
    hash_resize(table, static_cast<size_t>(table->table_size) * 2);
  }
  return entry;
}

// ---- central directory ----

// Eight name bytes at a time: does any lie outside 0x20..0x7e?
bool printable(const unsigned char* name, size_t length) {
  constexpr uint64_t kOnes = 0x0101010101010101;
  constexpr uint64_t kHigh = 0x8080808080808080;
  uint64_t bad = 0;
  size_t i = 0;
  for (; i + 8 <= length; i += 8) {
    uint64_t w;
    std::memcpy(&w, name + i, 8);
    bad |= ((w - kOnes * 0x20) & ~w) | (w + kOnes * (0x7f - 0x7e)) | w;
  }
  if (i < length && length >= 8) {  // the last eight bytes, some of them seen already
    uint64_t w;
    std::memcpy(&w, name + length - 8, 8);
    bad |= ((w - kOnes * 0x20) & ~w) | (w + kOnes * (0x7f - 0x7e)) | w;
    i = length;
  }
  for (; i < length; ++i) bad |= (name[i] < 0x20 || name[i] > 0x7e) ? kHigh : 0;
  return (bad & kHigh) == 0;
}

bool valid_name(const unsigned char* name, size_t length) {
  if (length > kMaxNameLength) {
    std::printf("minzip: Filename too long (%d chatacters)\n", static_cast<int>(length));
    return false;
  }
  if (printable(name, length)) return true;
  for (size_t i = 0; i < length; ++i) {
    if (name[i] < 0x20 || name[i] > 0x7e) {
      std::printf("minzip: Filename contains invalid character '%03o'\n", name[i]);
      return false;
    }
  }
  return true;
}

int compare_names(const ZipEntry& a, const char* name, uint32_t length) {
  // Names are checked to be printable before they are filed, so no NUL ends one early and
  // memcmp orders them as strncmp does.
  const int c = std::memcmp(a.name, name, a.name_length < length ? a.name_length : length);
  if (c != 0) return c;
  return a.name_length < length ? -1 : a.name_length > length ? 1 : 0;
}

int compare_names(const ZipEntry& a, const ZipEntry& b) { return compare_names(a, b.name, b.name_length); }

// How the names come in the directory, told by one comparison of each name with the one before.
struct NameOrder {
  bool rising = true;   // no name below the one before it
  bool falling = true;  // every name below the one before it
};

void note_order(NameOrder* order, const ZipEntry& previous, const ZipEntry& next) {
  if (!order->rising && !order->falling) return;
  const int c = compare_names(previous, next);
  order->rising = order->rising && c <= 0;
  order->falling = order->falling && c > 0;
}

// A stable merge sort of positions by name, the left run winning ties; returns whichever of the
// two buffers holds the result.
unsigned int* sort_positions(const ZipEntry* entries, unsigned int* from, unsigned int* to,
                             unsigned int count) {
  for (unsigned int i = 0; i < count; ++i) from[i] = i;
  for (unsigned int width = 1; width < count; width *= 2) {
    for (unsigned int low = 0; low < count; low += 2 * width) {
      const unsigned int mid = std::min(low + width, count);
      const unsigned int high = std::min(mid + width, count);
      unsigned int i = low, j = mid, k = low;
      while (i < mid && j < high) {
        to[k++] = compare_names(entries[from[j]], entries[from[i]]) < 0 ? from[j++] : from[i++];
      }
      while (i < mid) to[k++] = from[i++];
      while (j < high) to[k++] = from[j++];
    }
    std::swap(from, to);
  }
  return from;
}

// Puts the records, filed in directory order, in name order: the order that inserting each one
// after any equal names would give, so equal names keep their directory order and the first of
// them is the one found. Names in order need nothing, names in strictly falling order are
// reversed; any other order is merge sorted by position and each record then moved once, along
// the cycles of the permutation. `hashes` runs parallel to the records and moves with them.
bool put_in_name_order(const NameOrder& order, ZipEntry* entries, uint32_t* hashes, unsigned int count) {
  if (order.rising) return true;
  if (order.falling) {
    std::reverse(entries, entries + count);
    std::reverse(hashes, hashes + count);
    return true;
  }
  const std::unique_ptr<unsigned int, decltype(&std::free)> positions(
      static_cast<unsigned int*>(std::malloc(size_t{count} * 2 * sizeof(unsigned int))), &std::free);
  if (positions == nullptr) return false;
  // source[i]: the directory position of the i-th name
  unsigned int* source = sort_positions(entries, positions.get(), positions.get() + count, count);
  for (unsigned int start = 0; start < count; ++start) {
    if (source[start] == start) continue;
    const ZipEntry entry = entries[start];
    const uint32_t hash = hashes[start];
    unsigned int at = start;
    while (source[at] != start) {
      const unsigned int next = source[at];
      entries[at] = entries[next];
      hashes[at] = hashes[next];
      source[at] = at;
      at = next;
    }
    entries[at] = entry;
    hashes[at] = hash;
    source[at] = at;
  }
  return true;
}

// Fills one record from the central entry at `pos`; false (after saying why) on a bad entry.
bool parse_central_entry(const ZipArchive* archive, size_t pos, ZipEntry* entry, uint32_t* hash,
                         size_t* next) {
  const unsigned char* base = archive->addr;
  const size_t length = archive->length;
  const int at = static_cast<int>(pos);
  if (pos + kCentralHeaderLength > length) {
    std::printf("minzip: Ran off the end (at %d)\n", at);
    return false;
  }
  const unsigned char* p = base + pos;
  if (get32(p) != kCentralSignature) {
    std::printf("minzip: Missed a central dir sig (at %d)\n", at);
    return false;
  }
  const uint32_t name_length = get16(p + kCentralNameLength);
  const size_t extra_length = get16(p + kCentralExtraLength);
  const size_t comment_length = get16(p + kCentralCommentLength);
  const uint32_t local_offset = get32(p + kCentralLocalOffset);
  const unsigned char* name = p + kCentralHeaderLength;
  if (pos + kCentralHeaderLength + name_length > length) {
    std::printf("minzip: Filename ran off the end (at %d)\n", at);
    return false;
  }
  if (!valid_name(name, name_length)) {
    std::printf("minzip: Invalid filename (at %d)\n", at);
    return false;
  }

  const char* text = reinterpret_cast<const char*>(name);
  *hash = zip_name_hash(text, name_length);  // while the name is in the cache
  entry->name_length = name_length;
  entry->name = text;
  entry->compressed_size = get32(p + kCentralCompressedSize);
  entry->uncompressed_size = get32(p + kCentralUncompressedSize);
  entry->method = get16(p + kCentralMethod);
  entry->mod_time = get32(p + kCentralModTime);
  entry->crc = get32(p + kCentralCrc);
  entry->made_by = get16(p + kCentralMadeBy);
  entry->external_attributes = get32(p + kCentralExternalAttributes);
  const int host = entry->made_by >> 8;
  if (host != 0 && host != 3) {
    std::printf("minzip: Incompatible \"version made by\": 0x%02x (at %d)\n", host, at);
    return false;
  }

  uintptr_t local_addr = 0;
  if (__builtin_add_overflow(reinterpret_cast<uintptr_t>(base), uintptr_t{local_offset}, &local_addr)) {
    std::puts("minzip: Integer overflow adding in parseZipArchive");
    return false;
  }
  if (size_t{local_offset} + kLocalHeaderLength > length) {
    std::printf("minzip: Bad offset to local header: %d (at %d)\n", static_cast<int>(local_offset), at);
    return false;
  }
  const unsigned char* local = base + local_offset;
  if (get32(local) != kLocalSignature) {
    std::printf("minzip: Missed a local header sig (at %d)\n", at);
    return false;
  }
  const uint64_t data_offset = uint64_t{local_offset} + kLocalHeaderLength +
                               get16(local + kLocalNameLength) + get16(local + kLocalExtraLength);
  if (data_offset > UINT32_MAX || data_offset + entry->compressed_size > length) {
    std::printf("minzip: Data ran off the end (at %d)\n", at);
    return false;
  }
  entry->data_offset = static_cast<uint32_t>(data_offset);
  *next = pos + kCentralHeaderLength + name_length + extra_length + comment_length;
  return true;
}

// Position of the end-of-central-directory record, or 0 when there is none.
size_t find_end_record(const unsigned char* base, size_t length) {
  for (size_t pos = length - kEndLength; pos > 0; --pos) {
    if (get32(base + pos) == kEndSignature) return pos;
  }
  return 0;
}

// Files every record in array order. The table is larger than the processor's caches, so each
// record's home slot is fetched a few records ahead: the misses overlap instead of queueing.
void index_entries(ZipArchive* archive, const uint32_t* hashes) {
  constexpr unsigned int kAhead = 64;
  const unsigned int count = archive->num_entries;
  HashTable* table = archive->hash;
  for (unsigned int i = 0; i < count; ++i) {
    if (i + kAhead < count) {
      const uint32_t mask = static_cast<uint32_t>(table->table_size) - 1;
      __builtin_prefetch(&table->slots[hashes[i + kAhead] & mask], 1);
    }
    ZipEntry* entry = &archive->entries[i];
    if (hash_insert(table, entry, hashes[i]) != entry) {
      std::printf("minzip: WARNING: duplicate entry '%.*s' in Zip\n",
                  static_cast<int>(entry->name_length), entry->name);
    }
  }
}

// The parse reads a file mapping in two passes at once, the directory and the local headers,
// and reads neither stretch again (a name only for a sort or a lookup). Once a pass is a whole
// step beyond what it has read, those pages are handed back: the mapping is private and never
// written, so a page read again comes back from the file as it was, and a large archive does
// not stay resident behind the parse. Each hand-back costs a flush of the address space's
// translations, so it is done a megabyte at a time.
constexpr size_t kReleaseStep = size_t{1} << 20;

struct MappedPass {
  unsigned char* base;  // null when the archive is not a file mapping
  size_t released;      // pages below this offset were handed back
};

void pass_reaches(MappedPass* pass, size_t pos) {
  if (pass->base == nullptr) return;
  const size_t step_start = pos / kReleaseStep * kReleaseStep;
  if (step_start < pass->released + kReleaseStep) return;
  ::madvise(pass->base + pass->released, step_start - pass->released, MADV_DONTNEED);
  pass->released = step_start;
}

int parse_archive(ZipArchive* archive, bool file_mapping) {
  const unsigned char* base = archive->addr;
  const size_t length = archive->length;
  if (length < kEndLength) return EINVAL;
  const uint32_t first = get32(base);
  if (first == kEndSignature) {
    std::puts("minzip: Found Zip archive, but it looks empty");
    return EINVAL;
  }
  if (first != kLocalSignature) return EINVAL;
  const size_t end = find_end_record(base, length);
  if (end == 0) {
    std::puts("minzip: Could not find end-of-central-directory in Zip");
    return EINVAL;
  }
  const unsigned int count = get16(base + end + kEndEntryCount);
  const uint32_t directory = get32(base + end + kEndDirectoryOffset);
  if (count == 0 || directory >= length) {
    std::printf("minzip: Invalid entries=%d offset=%d (len=%zd)\n", static_cast<int>(count),
                static_cast<int>(directory), static_cast<ssize_t>(length));
    return EINVAL;
  }

  archive->entries = static_cast<ZipEntry*>(zeroed_array(count, sizeof(ZipEntry)));
  archive->num_entries = count;  // also what the entry array is released by
  size_t table_size = 1;
  while (table_size < count * 8 / 5 + 1) table_size <<= 1;
  archive->hash = hash_create(table_size);
  if (archive->entries == nullptr || archive->hash == nullptr) return ENOMEM;

  const std::unique_ptr<uint32_t, decltype(&std::free)> hashes(
      static_cast<uint32_t*>(std::malloc(count * sizeof(uint32_t))), &std::free);
  if (hashes == nullptr) return ENOMEM;
  ZipEntry* entries = archive->entries;
  uint32_t* name_hashes = hashes.get();
  NameOrder order;
  auto* mapped = file_mapping ? const_cast<unsigned char*>(base) : nullptr;
  MappedPass directory_pass{mapped, directory / kReleaseStep * kReleaseStep};
  MappedPass header_pass{mapped, 0};
  size_t pos = directory;
  for (unsigned int i = 0; i < count; ++i) {
    pass_reaches(&directory_pass, pos);
    if (!parse_central_entry(archive, pos, &entries[i], &name_hashes[i], &pos)) return EINVAL;
    if (i > 0) note_order(&order, entries[i - 1], entries[i]);
    pass_reaches(&header_pass, entries[i].data_offset);
    // The next local header is far from the directory: start fetching it now.
    if (pos + kCentralHeaderLength <= length) {
      const uint32_t local_offset = get32(base + pos + kCentralLocalOffset);
      if (local_offset < length) __builtin_prefetch(base + local_offset);
    }
  }
  if (!put_in_name_order(order, entries, name_hashes, count)) return ENOMEM;
  index_entries(archive, name_hashes);
  return 0;
}

// ---- extraction ----

// The copy step: takes bytes while the destination has room for them.
struct CopyTarget {
  unsigned char* next;
  size_t remaining;
};

bool copy_out(CopyTarget* target, const unsigned char* data, size_t length) {
  if (length > target->remaining) return false;
  if (length == 0) return true;  // an empty entry may come with no buffer at all
  std::memcpy(target->next, data, length);
  target->next += length;
  target->remaining -= length;
  return true;
}

bool inflate_to(const ZipArchive* archive, const ZipEntry* entry, CopyTarget* target) {
  unsigned char window[kInflateWindow];
  z_stream zs{};
  zs.next_in = const_cast<Bytef*>(archive->addr + entry->data_offset);
  zs.avail_in = entry->compressed_size;
  zs.next_out = window;
  zs.avail_out = sizeof window;
  int zerr = inflateInit2(&zs, -MAX_WBITS);
  if (zerr != Z_OK) {
    if (zerr == Z_VERSION_ERROR) {
      std::printf("minzip: Installed zlib is not compatible with linked version (%s)\n", ZLIB_VERSION);
    } else {
      std::printf("minzip: Call to inflateInit2 failed (zerr=%d)\n", zerr);
    }
    return false;
  }
  bool ok = true;
  do {
    zerr = inflate(&zs, Z_NO_FLUSH);
    if (zerr != Z_OK && zerr != Z_STREAM_END) {
      std::printf("minzip: zlib inflate call failed (zerr=%d)\n", zerr);
      ok = false;
      break;
    }
    if (zs.avail_out == 0 || (zerr == Z_STREAM_END && zs.avail_out != sizeof window)) {
      if (!copy_out(target, window, sizeof window - zs.avail_out)) {
        std::puts("minzip: Process function elected to fail (in inflate)");
        ok = false;
        break;
      }
      zs.next_out = window;
      zs.avail_out = sizeof window;
    }
  } while (zerr == Z_OK);
  if (ok && zs.total_out != entry->uncompressed_size) {
    std::printf("minzip: Size mismatch on inflated file (%ld vs %ld)\n", static_cast<long>(zs.total_out),
                static_cast<long>(entry->uncompressed_size));
    ok = false;
  }
  inflateEnd(&zs);
  return ok;
}

bool extract_to(const ZipArchive* archive, const ZipEntry* entry, CopyTarget* target) {
  switch (entry->method) {
    case kZipStored:
      // Stored sizes were only checked for the compressed length: keep the copy inside the map.
      if (size_t{entry->data_offset} + entry->uncompressed_size > archive->length) return false;
      return copy_out(target, archive->addr + entry->data_offset, entry->uncompressed_size);
    case kZipDeflated:
      return inflate_to(archive, entry, target);
    default:
      std::printf("minzip: Unsupported compression type %d for entry '%.*s'\n", entry->method,
                  static_cast<int>(entry->name_length), entry->name);
      return false;
  }
}

}  // namespace

uint32_t zip_name_hash(const char* name, size_t length) {
  const auto* p = reinterpret_cast<const unsigned char*>(name);
  uint32_t hash = 2;
  size_t i = 0;
  for (; i + 8 <= length; i += 8) hash = hash * kPower31[8] + fold_eight(load_eight(p + i));
  const size_t rest = length - i;
  if (rest > 0 && length >= 8) {
    // The last eight bytes with those already taken cleared: leading zeros add nothing.
    const uint64_t last = load_eight(p + length - 8) & (~uint64_t{0} << (8 * (8 - rest)));
    return hash * kPower31[rest] + fold_eight(last);
  }
  for (; i < length; ++i) hash = hash * 31 + p[i];
  return hash;
}

int zip_open_archive(const MemMapping* map, ZipArchive* archive) {
  *archive = ZipArchive{};
  archive->addr = map->addr;
  archive->length = map->length;
  // Pages of a mapping made by the file mapper can be handed back; a caller's own memory cannot.
  const int err = parse_archive(archive, map->range_count > 0);
  if (err != 0) zip_close_archive(archive);
  return err;
}

void zip_close_archive(ZipArchive* archive) {
  free_array(archive->entries, archive->num_entries, sizeof(ZipEntry));
  hash_free(archive->hash);
  *archive = ZipArchive{};
}

const ZipEntry* zip_find_entry(const ZipArchive* archive, const char* name) {
  if (archive->hash == nullptr) return nullptr;
  const auto length = static_cast<uint32_t>(std::strlen(name));
  return hash_probe(archive->hash, zip_name_hash(name, length), name, length)->entry;
}

bool zip_extract_entry_to_buffer(const ZipArchive* archive, const ZipEntry* entry,
                                 unsigned char* buffer) {
  CopyTarget target{buffer, entry->uncompressed_size};
  if (!extract_to(archive, entry, &target) || target.remaining != 0) {
    std::puts("minzip: Can't extract entry to memory buffer.");
    return false;
  }
  return true;
}
