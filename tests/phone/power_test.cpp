// The phone's restart and power-off sequence, against fake system calls.
#include <gtest/gtest.h>
#include <linux/reboot.h>

#include <cerrno>
#include <string>
#include <vector>

#include "platform/android/android_power.h"

namespace {

std::vector<std::string> g_calls;
int g_property_result = 0;

void fake_sync() { g_calls.push_back("sync"); }
int fake_reboot(int command) {
  g_calls.push_back("reboot " + std::to_string(static_cast<unsigned>(command)));
  errno = EPERM;
  return -1;
}
int fake_property_set(const char* key, const char* value) {
  g_calls.push_back(std::string("setprop ") + key + " " + value);
  return g_property_result;
}
void fake_sleep(unsigned ms) { g_calls.push_back("sleep " + std::to_string(ms)); }

constexpr PhonePowerOps kFakes{fake_sync, fake_reboot, fake_property_set, fake_sleep};

std::string reboot_call(unsigned command) { return "reboot " + std::to_string(command); }

}  // namespace

TEST(PhonePower, SyncThenRebootThenInitWhenTheKernelRefuses) {
  struct Row {
    PowerRequest request;
    int property_result;
    std::vector<std::string> calls;
  };
  const Row rows[] = {
      {PowerRequest::restart,
       0,
       {"sync", reboot_call(LINUX_REBOOT_CMD_RESTART), "setprop sys.powerctl reboot",
        "sleep 10000"}},
      {PowerRequest::power_off,
       0,
       {"sync", reboot_call(LINUX_REBOOT_CMD_POWER_OFF), "setprop sys.powerctl shutdown",
        "sleep 10000"}},
      // init refused too: no wait for nothing
      {PowerRequest::restart,
       -1,
       {"sync", reboot_call(LINUX_REBOOT_CMD_RESTART), "setprop sys.powerctl reboot"}},
  };
  for (const Row& row : rows) {
    g_calls.clear();
    g_property_result = row.property_result;
    phone_power_request(kFakes, row.request);
    EXPECT_EQ(g_calls, row.calls);
  }
}
