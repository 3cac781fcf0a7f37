// libcutils' property calls under names of their own: its header declares property_get and
// the size macros for C, which the platform boundary declares for C++.
#pragma once

int cutils_property_get(const char* key, char* value, const char* default_value);
int cutils_property_set(const char* key, const char* value);
