// Debian's libcutils headers expect the C library's property limits, which only the phone's C
// library has; these are Android's values.
#pragma once

#define PROP_NAME_MAX 32
#define PROP_VALUE_MAX 92
