// State of the emulated phone's root, shared by the host platform files.
#pragma once

#include <string>

#include "platform/unique_fd.h"

// A descriptor of $ATCID_ROOT and its path; both set by platform_init().
int host_root_fd();
const std::string& host_root_path();

// Opens a device path with openat2(RESOLVE_IN_ROOT): absolute links and ".." never leave the root.
int host_resolve(const char* path, int flags, mode_t mode = 0);

// Makes a directory under the root, with its parents, as the emulator's own state needs it.
int host_make_dirs(const char* path);
