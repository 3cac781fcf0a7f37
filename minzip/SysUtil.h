// Read-only memory mapping of whole files, for the zip reader.
#pragma once

#include <cstddef>

struct MappedRange {
  void* addr;
  size_t length;
};

struct MemMapping {
  unsigned char* addr;
  size_t length;
  MappedRange* ranges;
  unsigned int range_count;
};

// Maps a device path (resolved through the platform layer). 0 on success.
int sys_map_file(const char* path, MemMapping* map);
// Maps from the descriptor's current position to its end; the caller keeps the descriptor.
// `name` only labels the messages. A negative `fd` is taken as a failed open of `name`, with
// the reason in errno, so callers that open by other means report alike.
int sys_map_fd(int fd, const char* name, MemMapping* map);
void sys_release_map(MemMapping* map);
