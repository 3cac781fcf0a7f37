#include "platform/android/vendor/pemufactory.h"

#include <cstdlib>

namespace vendor {

const char* sendMessage(const char*) { std::abort(); }
int isSetupwizardDisabled(void) { std::abort(); }
int checkCameraDeviceConnect(void) { std::abort(); }

}  // namespace vendor
