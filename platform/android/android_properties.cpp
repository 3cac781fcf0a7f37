// System properties on the phone: libcutils.
#include "platform/android/cutils_bridge.h"
#include "platform/platform.h"

int property_get(const char* key, char* value, const char* default_value) {
  return cutils_property_get(key, value, default_value);
}

int property_set(const char* key, const char* value) { return cutils_property_set(key, value); }
