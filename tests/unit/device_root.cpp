#include "tests/unit/device_root.h"

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <unistd.h>

#include "platform/host/host_hooks.h"
#include "platform/platform.h"

namespace fs = std::filesystem;

std::vector<std::string>& DeviceRootTest::shell_commands() {
  static std::vector<std::string> commands;
  return commands;
}

std::function<int(const std::string&)>& DeviceRootTest::shell_action() {
  static std::function<int(const std::string&)> action;
  return action;
}

namespace {
int record_shell(const char* command) {
  DeviceRootTest::shell_commands().emplace_back(command);
  const auto& action = DeviceRootTest::shell_action();
  return action ? action(command) : 0;
}
}  // namespace

void DeviceRootTest::SetUp() {
  char pattern[] = "/tmp/atcid-unit-XXXXXX";
  ASSERT_NE(::mkdtemp(pattern), nullptr);
  root_ = pattern;
  ::setenv("ATCID_ROOT", pattern, 1);
  ASSERT_EQ(platform_init(), 0);
  shell_commands().clear();
  shell_action() = nullptr;
  host_set_shell_hook(record_shell);
  // A handler that powers the phone off or restarts it would end the test binary with status
  // 0, which reads as a pass: the hook returns, and the platform aborts instead.
  host_set_power_hook([](const char* what) {
    std::fprintf(stderr, "unexpected power request in a unit test: %s\n", what);
  });
}

void DeviceRootTest::TearDown() {
  host_set_shell_hook(nullptr);
  host_set_power_hook(nullptr);
  shell_action() = nullptr;
  ::chdir("/");
  std::error_code ignored;
  fs::remove_all(root_, ignored);
}

fs::path DeviceRootTest::host_path(const std::string& device_path) const {
  return root_ / fs::path(device_path).relative_path();
}

void DeviceRootTest::write_file(const std::string& device_path, const std::string& content) {
  const fs::path path = host_path(device_path);
  fs::create_directories(path.parent_path());
  std::ofstream(path, std::ios::binary | std::ios::trunc) << content;
}

std::string DeviceRootTest::read_file(const std::string& device_path) const {
  std::ifstream in(host_path(device_path), std::ios::binary);
  std::ostringstream text;
  text << in.rdbuf();
  return text.str();
}

bool DeviceRootTest::exists(const std::string& device_path) const {
  std::error_code ignored;
  return fs::exists(fs::symlink_status(host_path(device_path), ignored));
}

void DeviceRootTest::make_dir(const std::string& device_path) {
  fs::create_directories(host_path(device_path));
}

void DeviceRootTest::set_property(const std::string& name, const std::string& value) {
  ASSERT_EQ(property_set(name.c_str(), value.c_str()), 0) << name;
}

std::string DeviceRootTest::get_property(const std::string& name) const {
  char value[PROPERTY_VALUE_MAX];
  property_get(name.c_str(), value, "");
  return value;
}
