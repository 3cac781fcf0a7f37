// The partial wake lock on the phone: libhardware_legacy.
#include "platform/android/vendor/hardware_legacy_power.h"
#include "platform/platform.h"

static_assert(PARTIAL_WAKE_LOCK == vendor::PARTIAL_WAKE_LOCK);

// Releases of the library answer success with 0 or with the bytes written to /sys/power.
int acquire_wake_lock(int lock, const char* id) {
  return vendor::acquire_wake_lock(lock, id) < 0 ? -1 : 0;
}

int release_wake_lock(const char* id) { return vendor::release_wake_lock(id) < 0 ? -1 : 0; }
