// Debian builds libcutils without its property calls (they need the phone's C library), so
// they get a stand-in of their own, defined through libcutils' real header.
#include <cutils/properties.h>

#include <cstdlib>

int property_get(const char*, char*, const char*) { std::abort(); }
int property_set(const char*, const char*) { std::abort(); }
