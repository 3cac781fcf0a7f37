// Tests that cannot run under qemu-user, each with the emulator's own reason. The cross build's
// ctest sets ATCID_QEMU_USER (tools/cross-test).
#pragma once

#include <cstdlib>

inline bool under_qemu_user() {
  const char* v = std::getenv("ATCID_QEMU_USER");
  return v != nullptr && *v != '\0';
}

inline constexpr char kQemuHasNoOpenat2[] =
    "qemu-user has no openat2 (ENOSYS): only the walk resolver can run under it";
inline constexpr char kQemuRefusesUserNamespaces[] =
    "qemu-user keeps a thread of its own in every process and the kernel refuses "
    "unshare(CLONE_NEWUSER) to a multithreaded process (EINVAL): the emulated phone's isolated "
    "shell cannot start under it";
// Not a skip of a whole test: the modem client tests leave out their thread count.
inline constexpr char kQemuListsJoinedThreads[] =
    "qemu-user's host threads stay listed in /proc/self/task for a while after the guest joined "
    "them";
