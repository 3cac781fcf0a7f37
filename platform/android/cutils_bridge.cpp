#include "platform/android/cutils_bridge.h"

#include <cutils/properties.h>

// The daemon sizes its buffers by the boundary's constants, which must be Android's.
static_assert(PROPERTY_KEY_MAX == 32 && PROPERTY_VALUE_MAX == 92);

int cutils_property_get(const char* key, char* value, const char* default_value) {
  return property_get(key, value, default_value);
}

int cutils_property_set(const char* key, const char* value) { return property_set(key, value); }
