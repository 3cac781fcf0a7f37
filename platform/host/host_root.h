// State of the emulated phone's root, shared by the host platform files.
#pragma once

#include <string>

#include "platform/unique_fd.h"

// A descriptor of $ATCID_ROOT and its path; both set by platform_init().
int host_root_fd();
const std::string& host_root_path();

// Opens a device path inside the root: absolute links and ".." never leave it. The kernel's
// openat2(RESOLVE_IN_ROOT) where it has one, else the same walk in user space.
int host_resolve(const char* path, int flags, mode_t mode = 0);

// Picks the resolver once, at start-up: the walk only when openat2 is missing or refused.
void host_choose_resolver();
// For tests: run the confinement cases against both resolvers on any machine.
void host_use_walk_resolver(bool walk);
bool host_walk_resolver_in_use();

// Makes a directory under the root, with its parents, as the emulator's own state needs it.
int host_make_dirs(const char* path);
