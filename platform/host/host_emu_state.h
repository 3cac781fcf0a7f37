// Small state files of the emulated phone's simulated services, under /.emu/ in the root.
#pragma once

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "platform/platform.h"
#include "platform/unique_fd.h"

// The first line of a state file without its line end: 1 when read, 0 when the file is
// missing, -1 when it cannot be read.
inline int emu_read_line(const char* path, char* out, size_t size) {
  out[0] = '\0';
  UniqueFile file(dev_fopen(path, "r"));
  if (!file) return errno == ENOENT ? 0 : -1;
  if (std::fgets(out, static_cast<int>(size), file.get()) == nullptr && std::ferror(file.get()))
    return -1;
  out[std::strcspn(out, "\r\n")] = '\0';
  return 1;
}

// An integer state file: `fallback` when missing, 0 when it does not hold an integer.
inline int emu_read_int(const char* path, int fallback) {
  char text[32];
  const int found = emu_read_line(path, text, sizeof text);
  if (found == 0) return fallback;
  char* end = nullptr;
  const long value = std::strtol(text, &end, 0);
  return found > 0 && end != text && *end == '\0' ? static_cast<int>(value) : 0;
}
