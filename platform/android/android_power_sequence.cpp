#include <linux/reboot.h>

#include <cerrno>
#include <cstring>

#include "core/log.h"
#include "platform/android/android_power.h"

void phone_power_request(const PhonePowerOps& ops, PowerRequest request) {
  const bool restart = request == PowerRequest::restart;
  ops.sync();
  ops.reboot(restart ? LINUX_REBOOT_CMD_RESTART : LINUX_REBOOT_CMD_POWER_OFF);
  ATCI_LOGE("reboot(2) refused: %s; asking init", std::strerror(errno));
  if (ops.property_set("sys.powerctl", restart ? "reboot" : "shutdown") == 0)
    ops.sleep_ms(kInitShutdownGraceMs);
}
