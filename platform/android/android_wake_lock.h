// The legacy wake lock interface: a lock is held while its name is written to
// <power>/wake_lock and released by writing the name to <power>/wake_unlock. Only partial
// locks (keep the CPU running) exist. The power directory is /sys/power on the phone.
#pragma once

#include "platform/platform.h"

inline constexpr char kSysPower[] = "/sys/power";

// The count written, or the negative errno; -EINVAL for any lock but PARTIAL_WAKE_LOCK.
int wake_lock_acquire_in(const char* power_dir, int lock, const char* id);
int wake_lock_release_in(const char* power_dir, const char* id);
