// The phone maker's factory support library (libpemufactory): the parts the platform layer
// reaches; the framework requests and file helpers are the daemon's own adapter.
#pragma once

namespace vendor {
extern "C" {

// Sends a one-word request to the factory service; the answer text is the library's.
const char* sendMessage(const char* request);
// The setup wizard's state; the daemon fails its check on 2.
int isSetupwizardDisabled(void);
// Bit set of connected cameras: bit 0 back, bit 1 front.
int checkCameraDeviceConnect(void);

}  // extern "C"
}  // namespace vendor
