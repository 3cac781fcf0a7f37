// The wake lock calls against a fake libhardware_legacy: the daemon's lock reaches the library
// as it was asked for, and every success the library's releases give reads as 0.
#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include "platform/android/vendor/hardware_legacy_power.h"
#include "platform/platform.h"

namespace {
std::string g_call;
int g_result = 0;
}  // namespace

namespace vendor {
int acquire_wake_lock(int lock, const char* id) {
  g_call = "acquire " + std::to_string(lock) + " " + id;
  return g_result;
}
int release_wake_lock(const char* id) {
  g_call = std::string("release ") + id;
  return g_result;
}
}  // namespace vendor

TEST(PhoneWakeLock, ReachesTheLibraryAndAnswersZeroOrMinusOne) {
  struct Row {
    int library_result;
    int expected;
  };
  for (const Row row : {Row{0, 0}, Row{5, 0}, Row{-1, -1}, Row{-EPERM, -1}}) {
    g_result = row.library_result;
    EXPECT_EQ(acquire_wake_lock(PARTIAL_WAKE_LOCK, "atcid"), row.expected);
    EXPECT_EQ(g_call, "acquire 1 atcid");
    EXPECT_EQ(release_wake_lock("atcid"), row.expected);
    EXPECT_EQ(g_call, "release atcid");
  }
}
