// A temporary device root for in-process tests: ATCID_ROOT points at a fresh directory, the
// shell is recorded instead of run, and files and properties can be set up and read back.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

class DeviceRootTest : public ::testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  // Paths are device paths: "/proc/meminfo" or "sys/class/..." both land under the root.
  std::filesystem::path host_path(const std::string& device_path) const;
  void write_file(const std::string& device_path, const std::string& content);
  std::string read_file(const std::string& device_path) const;
  bool exists(const std::string& device_path) const;
  void make_dir(const std::string& device_path);
  void set_property(const std::string& name, const std::string& value);
  std::string get_property(const std::string& name) const;

 public:
  // Every command text handed to the shell since SetUp, in order.
  static std::vector<std::string>& shell_commands();
  // What the recorded shell does for a command: its wait status (default 0). Tests may set
  // it to simulate a tool's effect on the root, such as writing its output file.
  static std::function<int(const std::string&)>& shell_action();

 protected:
  std::filesystem::path root_;
};
