#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>

#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "tests/unit/device_root.h"

namespace fs = std::filesystem;

using PlatformTest = DeviceRootTest;

TEST_F(PlatformTest, PathsNeverLeaveTheRoot) {
  write_file("/etc/inside", "in");
  fs::create_symlink("/etc/inside", host_path("/abs_link"));
  fs::create_symlink("../../../../../../etc/inside", host_path("/up_link"));
  for (const char* path : {"/abs_link", "/up_link", "/../../etc/inside", "etc/inside"}) {
    UniqueFd fd(dev_open(path, O_RDONLY));
    ASSERT_TRUE(fd.ok()) << path;
    char text[8] = {};
    ASSERT_EQ(::read(fd.get(), text, sizeof text - 1), 2) << path;
    EXPECT_STREQ(text, "in") << path;
  }
  // A link to the machine's /etc/passwd resolves to the root's (absent) one.
  fs::create_symlink("/etc/passwd", host_path("/passwd_link"));
  EXPECT_LT(dev_open("/passwd_link", O_RDONLY), 0);
}

TEST_F(PlatformTest, UnlinkRemovesTheLinkNotItsTarget) {
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
