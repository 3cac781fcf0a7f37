// The legacy wake lock protocol against a directory that plays /sys/power.
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include "platform/android/android_wake_lock.h"

namespace fs = std::filesystem;

namespace {

std::string contents(const fs::path& p) {
  std::ifstream in(p);
  std::stringstream s;
  s << in.rdbuf();
  return s.str();
}

}  // namespace

TEST(PhoneWakeLock, NameGoesToLockThenUnlockFile) {
  char pattern[] = "/tmp/atcid-power-XXXXXX";
  ASSERT_NE(::mkdtemp(pattern), nullptr);
  const fs::path dir = pattern;
  std::ofstream(dir / "wake_lock").close();
  std::ofstream(dir / "wake_unlock").close();

  EXPECT_EQ(wake_lock_acquire_in(pattern, 2, "atcid"), -EINVAL);  // only partial locks
  EXPECT_EQ(wake_lock_acquire_in(pattern, PARTIAL_WAKE_LOCK, ""), -EINVAL);
  EXPECT_EQ(contents(dir / "wake_lock"), "");

  EXPECT_EQ(wake_lock_acquire_in(pattern, PARTIAL_WAKE_LOCK, "atcid"), 5);
  EXPECT_EQ(contents(dir / "wake_lock"), "atcid");
  EXPECT_EQ(contents(dir / "wake_unlock"), "");
  EXPECT_EQ(wake_lock_release_in(pattern, "atcid"), 5);
  EXPECT_EQ(contents(dir / "wake_unlock"), "atcid");

  fs::remove_all(dir);
  EXPECT_EQ(wake_lock_acquire_in(pattern, PARTIAL_WAKE_LOCK, "atcid"), -ENOENT);
}
