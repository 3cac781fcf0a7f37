#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "platform/host/host_root.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "tests/unit/device_root.h"

namespace fs = std::filesystem;

using PlatformTest = DeviceRootTest;

// The confinement cases hold for the kernel's resolver and for the walk used without it.
class ResolverTest : public DeviceRootTest, public ::testing::WithParamInterface<bool> {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
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

TEST_F(PlatformTest, ShellHookRecordsInsteadOfRunning) {
  EXPECT_EQ(platform_system("echo hi > /data/x"), 0);
  ASSERT_EQ(shell_commands().size(), 1u);
  EXPECT_EQ(shell_commands()[0], "echo hi > /data/x");
  EXPECT_FALSE(exists("/data/x"));
}
