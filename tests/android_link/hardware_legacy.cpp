#include "platform/android/vendor/hardware_legacy_power.h"

#include <cstdlib>

namespace vendor {

int acquire_wake_lock(int, const char*) { std::abort(); }
int release_wake_lock(const char*) { std::abort(); }

}  // namespace vendor
