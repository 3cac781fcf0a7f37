// Restart and power-off on the phone: reboot(2) after sync(). This file is never built into
// anything that runs on a development machine.
#include "platform/android/android_power.h"

#include <netinet/in.h>
#include <sys/reboot.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>

#include "platform/platform.h"

namespace {

void sync_all() { ::sync(); }
int reboot_kernel(int command) { return ::reboot(command); }
void sleep_ms(unsigned ms) {
  timespec t{static_cast<time_t>(ms / 1000), static_cast<long>(ms % 1000) * 1000000L};
  while (::nanosleep(&t, &t) != 0 && errno == EINTR) {
  }
}

constexpr PhonePowerOps kPhoneOps{sync_all, reboot_kernel, property_set, sleep_ms};

}  // namespace

void platform_sync() { ::sync(); }

// Still here: the station sees the link drop and init starts the daemon again.
void platform_restart() {
  phone_power_request(kPhoneOps, PowerRequest::restart);
  _exit(1);
}

void platform_power_off() {
  phone_power_request(kPhoneOps, PowerRequest::power_off);
  _exit(1);
}

int platform_tcp_port() { return 6888; }

int platform_tcp_listen_address(uint32_t* address) {
  *address = htonl(INADDR_ANY);
  return 0;
}
