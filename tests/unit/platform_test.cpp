#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <sys/stat.h>
#include <thread>

#include "platform/host/host_hooks.h"
#include "platform/host/host_root.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "tests/unit/device_root.h"
#include "tests/unit/qemu_skips.h"

namespace fs = std::filesystem;

using PlatformTest = DeviceRootTest;

// The confinement cases hold for the kernel's resolver and for the walk used without it.
class ResolverTest : public DeviceRootTest, public ::testing::WithParamInterface<bool> {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    if (!GetParam() && host_walk_resolver_in_use() && under_qemu_user())
      GTEST_SKIP() << kQemuHasNoOpenat2;
    host_use_walk_resolver(GetParam());
  }
  void TearDown() override {
    host_choose_resolver();
    DeviceRootTest::TearDown();
  }
  std::string read_through(const char* path, int flags = O_RDONLY) {
    UniqueFd fd(dev_open(path, flags, 0644));
    if (!fd.ok()) return "errno " + std::to_string(errno);
    char text[16] = {};
    return ::read(fd.get(), text, sizeof text - 1) >= 0 ? text : "unreadable";
  }
};

INSTANTIATE_TEST_SUITE_P(KernelAndWalk, ResolverTest, ::testing::Bool());

TEST_P(ResolverTest, PathsNeverLeaveTheRoot) {
  write_file("/etc/inside", "in");
  make_dir("/data/sub");
  fs::create_symlink("/etc/inside", host_path("/abs_link"));
  fs::create_symlink("../../../../../../etc/inside", host_path("/up_link"));
  fs::create_symlink("../../etc", host_path("/data/sub/rel_dir"));
  fs::create_symlink("/data/sub/rel_dir/../../../..", host_path("/data/top"));
  fs::create_symlink("loop_b", host_path("/data/loop_a"));
  fs::create_symlink("loop_a", host_path("/data/loop_b"));
  fs::create_symlink("/data/created", host_path("/data/dangling"));
  // A link to the machine's /etc/passwd resolves to the root's (absent) one.
  fs::create_symlink("/etc/passwd", host_path("/passwd_link"));
  const struct {
    const char* path;
    int flags;
    std::string expected;
  } cases[] = {
      {"/abs_link", O_RDONLY, "in"},
      {"/up_link", O_RDONLY, "in"},
      {"/../../etc/inside", O_RDONLY, "in"},
      {"etc/inside", O_RDONLY, "in"},
      {"/data/sub/rel_dir/inside", O_RDONLY, "in"},
      {"/data/top/etc/./inside", O_RDONLY, "in"},
      {"/passwd_link", O_RDONLY, "errno " + std::to_string(ENOENT)},
      {"/data/loop_a", O_RDONLY, "errno " + std::to_string(ELOOP)},
      {"/etc/inside/x", O_RDONLY, "errno " + std::to_string(ENOTDIR)},
      {"/abs_link", O_RDONLY | O_NOFOLLOW, "errno " + std::to_string(ELOOP)},
      {"/data/dangling", O_RDWR | O_CREAT, ""},
  };
  for (const auto& c : cases) EXPECT_EQ(read_through(c.path, c.flags), c.expected) << c.path;
  EXPECT_TRUE(fs::is_regular_file(host_path("/data/created")));
}

TEST_P(ResolverTest, UnlinkRemovesTheLinkNotItsTarget) {
  write_file("/data/keep", "x");
  fs::create_symlink("/data/keep", host_path("/data/link"));
  ASSERT_EQ(dev_unlink("/data/link"), 0);
  EXPECT_TRUE(exists("/data/keep"));
  EXPECT_FALSE(exists("/data/link"));
  EXPECT_NE(dev_rmdir("/.."), 0);
  EXPECT_NE(dev_unlink("/"), 0);
}

TEST_F(PlatformTest, PropertiesFollowAndroidRules) {
  char value[PROPERTY_VALUE_MAX];
  EXPECT_EQ(property_get("persist.sys.none", value, "dflt"), 4);
  EXPECT_STREQ(value, "dflt");
  EXPECT_EQ(property_set("persist.sys.x", "hello"), 0);
  EXPECT_EQ(property_get("persist.sys.x", value, "dflt"), 5);
  EXPECT_STREQ(value, "hello");
  EXPECT_EQ(read_file("/dev/__properties__/persist.sys.x"), "hello");

  const std::string longest(91, 'v');
  EXPECT_EQ(property_set("persist.sys.long", longest.c_str()), 0);
  EXPECT_EQ(property_set("persist.sys.long", (longest + "v").c_str()), -1);
  EXPECT_EQ(get_property("persist.sys.long"), longest);

  EXPECT_EQ(property_set("ro.build.x", "1"), 0);
  EXPECT_EQ(property_set("ro.build.x", "2"), -1);
  EXPECT_EQ(get_property("ro.build.x"), "1");

  for (const char* bad : {"../escape", "a/b", ".hidden", ""})
    EXPECT_EQ(property_set(bad, "1"), -1) << bad;
  EXPECT_FALSE(exists("/dev/escape"));
}

// Values read are kept between reads; every way of changing a property file from outside
// must still show at the next read.
TEST_F(PlatformTest, PropertyChangesMadeOutsideShowAtOnce) {
  make_dir("/dev/__properties__");
  make_dir("/data");
  const fs::path dir = host_path("/dev/__properties__");
  const struct {
    const char* what;
    std::function<void()> change;
    const char* expected;
  } cases[] = {
      {"written in place", [&] { write_file("/dev/__properties__/p.x", "2"); }, "2"},
      {"renamed over", [&] {
         write_file("/dev/__properties__/.tmp", "3");
         fs::rename(dir / ".tmp", dir / "p.x");
       }, "3"},
      {"removed", [&] { fs::remove(dir / "p.x"); }, "dflt"},
      {"created", [&] { write_file("/dev/__properties__/p.x", "4"); }, "4"},
      {"a link's target changed", [&] {
         fs::remove(dir / "p.x");
         write_file("/data/target", "5");
         fs::create_symlink("/data/target", dir / "p.x");
         get_property("p.x");
         write_file("/data/target", "6");
       }, "6"},
      {"a hard link's other name written", [&] {
         fs::remove(dir / "p.x");
         write_file("/data/other", "7");
         fs::create_hard_link(host_path("/data/other"), dir / "p.x");
         get_property("p.x");
         std::ofstream(host_path("/data/other"), std::ios::trunc) << "8";
       }, "8"},
  };
  write_file("/dev/__properties__/p.x", "1");
  char value[PROPERTY_VALUE_MAX];
  property_get("p.x", value, "dflt");
  ASSERT_STREQ(value, "1");
  for (const auto& c : cases) {
    property_get("p.x", value, "dflt");  // kept, if it can be
    c.change();
    property_get("p.x", value, "dflt");
    EXPECT_STREQ(value, c.expected) << c.what;
  }
}

TEST_F(PlatformTest, ShellHookRecordsInsteadOfRunning) {
  EXPECT_EQ(platform_system("echo hi > /data/x"), 0);
  ASSERT_EQ(shell_commands().size(), 1u);
  EXPECT_EQ(shell_commands()[0], "echo hi > /data/x");
  EXPECT_FALSE(exists("/data/x"));
}

// The real shell: a static mksh as the root's /system/bin/sh, run in the namespaces.
TEST_F(PlatformTest, ShellCallsRunInTheRootSideBySide) {
  if (under_qemu_user()) GTEST_SKIP() << kQemuRefusesUserNamespaces;
  host_set_shell_hook(nullptr);
  EXPECT_EQ(platform_system("exit 0"), 127 << 8);  // no /system/bin/sh in this root yet
  const fs::path mksh = "/bin/mksh-static";
  if (!fs::exists(mksh)) GTEST_SKIP() << "no static mksh (package mksh)";
  make_dir("/system/bin");
  fs::copy_file(mksh, host_path("/system/bin/sh"));
  make_dir("/data");
  ASSERT_EQ(::mkfifo(host_path("/data/fifo").c_str(), 0600), 0);

  // The first call waits for what the second writes: calls must not wait for one another.
  int first = -1;
  std::thread reader([&] {
    first = platform_system(
        "exec 3<> /data/fifo; echo > /data/started; read line <&3; echo \"$line\" > /data/got; "
        "exit 3");
  });
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  while (!exists("/data/started") && std::chrono::steady_clock::now() < deadline)
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  std::thread watchdog([&] {  // a serialising shell would leave the reader waiting for good
    while (!exists("/data/got") && std::chrono::steady_clock::now() < deadline)
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
    UniqueFd fifo(::open(host_path("/data/fifo").c_str(), O_WRONLY | O_NONBLOCK));
    if (fifo.ok()) [[maybe_unused]] const ssize_t n = ::write(fifo.get(), "late\n", 5);
  });
  EXPECT_EQ(platform_system("echo go 1<> /data/fifo"), 0);
  reader.join();
  watchdog.join();
  EXPECT_EQ(first, 3 << 8);
  EXPECT_EQ(read_file("/data/got"), "go\n");
  // Files the shell makes land in the root, not on the machine.
  EXPECT_EQ(platform_system("echo inside > /etc-probe"), 0);
  EXPECT_EQ(read_file("/etc-probe"), "inside\n");
  EXPECT_FALSE(fs::exists("/etc-probe"));
}
