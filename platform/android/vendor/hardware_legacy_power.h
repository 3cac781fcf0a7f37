// Android's legacy power interface (libhardware_legacy): named wake locks.
#pragma once

namespace vendor {

inline constexpr int PARTIAL_WAKE_LOCK = 1;  // keeps the CPU running, lets the screen go off

extern "C" {

// 0 or a count of bytes written on success (releases differ), negative on failure.
int acquire_wake_lock(int lock, const char* id);
int release_wake_lock(const char* id);

}  // extern "C"
}  // namespace vendor
