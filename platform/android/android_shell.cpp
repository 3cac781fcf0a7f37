// The shell on the phone: system(3) and its wait status.
#include <cstdlib>

#include "platform/platform.h"

int platform_system(const char* command) { return std::system(command); }
