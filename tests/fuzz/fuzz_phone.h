// An emulated phone inside a fuzz target: a fresh root made from the template beside a
// directory that nothing may touch, the shell recorded instead of run, a power request turned
// into an exception that ends the input, and the port on a socket pair.
#pragma once

#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <utility>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>

#include "core/transport.h"
#include "platform/host/host_hooks.h"
#include "platform/platform.h"

namespace fuzz {

namespace fs = std::filesystem;

// Thrown by the power hook: the phone went away, as it does after an early answer.
struct PowerRequest {};

[[noreturn]] inline void fail(const char* what, std::string_view detail = {}) {
  std::fprintf(stderr, "fuzz check failed: %s %.*s\n", what, static_cast<int>(detail.size()),
               detail.data());
  std::abort();
}

class Phone {
 public:
  // `kind` is the transport the port plays.
  explicit Phone(PortKind kind) : kind_(kind) {
    char pattern[] = "/tmp/atcid-fuzz-XXXXXX";
    if (::mkdtemp(pattern) == nullptr) fail("mkdtemp");
    base_ = pattern;
    root_ = base_ / "root";
    outside_ = base_ / "outside";
    fs::copy(fs::path(ATCID_SOURCE_DIR) / "emulator/root", root_,
             fs::copy_options::recursive | fs::copy_options::copy_symlinks);
    for (const char* dir : {"data", "cache/recovery", "persist", "tmp", ".emu"})
      fs::create_directories(root_ / dir);
    fs::create_directories(outside_);
    write(outside_ / "precious", "untouched");
    // Ways out of the root that resolution must not take.
    fs::create_symlink("../../outside", root_ / "data/escape");
    fs::create_symlink(outside_, root_ / "data/absolute");
    fs::create_symlink(outside_ / "precious", root_ / "sdcard/precious");
    // A pulled cable ends the cable watch at its first look.
    write(root_ / "sys/class/power_supply/usb/online", "0\n");
    host_set_shell_hook([](const char*) { return 0; });
    host_set_power_hook([](const char*) { throw PowerRequest{}; });
    new_port();
  }

  // A fresh socket pair as the port in use (the previous one closed), the station's end
  // drained by a thread when `drained`, so no writer ever blocks on a full port.
  void new_port(bool drained = false) {
    if (station_ >= 0) {
      ::close(station_);
      ::close(daemon_);
    }
    int pair[2];
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, pair) != 0) fail("socketpair");
    daemon_ = pair[0];
    station_ = pair[1];
    attach();
    if (drained) std::thread([this, fd = station_] { drain(fd); }).detach();
  }

  // Makes this phone's root and port the ones in use.
  void attach() {
    ::setenv("ATCID_ROOT", root_.c_str(), 1);
    if (platform_init() != 0) fail("platform_init");
    initSerialDevice(&serial);
    std::strcpy(serial.dev_name[0], "/dev/ttyGS0");
    std::strcpy(serial.dev_name[1], "/dev/ttyHSL0");
    attach_port(kind_, daemon_);
  }

  const fs::path& root() const { return root_; }
  int station() const { return station_; }

  // Everything the port was given since the last call: a mark written after it arrives last.
  std::string take_output() {
    static constexpr std::string_view kMark = "\x01end of input\x01";
    write_unsolicited(kMark);
    for (;;) {
      {
        const std::lock_guard lock(output_lock_);
        if (const size_t at = output_.find(kMark); at != std::string::npos) {
          std::string out = output_.substr(0, at);
          output_.erase(0, at + kMark.size());
          return out;
        }
      }
      std::this_thread::sleep_for(std::chrono::microseconds(100));
    }
  }

  // Nothing outside the root changed, and the factory record kept its size.
  void check_bounds() const {
    std::string listing;
    for (const auto& e : fs::recursive_directory_iterator(outside_))
      listing += e.path().string() + "\n";
    if (listing != (outside_ / "precious").string() + "\n") fail("outside the root:", listing);
    std::string text;
    std::getline(std::ifstream(outside_ / "precious"), text);
    if (text != "untouched") fail("outside the root: precious changed");
    std::error_code error;
    const auto size = fs::file_size(root_ / "persist/ulda_nvram", error);
    if (error || size != 536) fail("factory record size", std::to_string(error ? 0 : size));
  }

 private:
  static void write(const fs::path& path, std::string_view text) {
    if (!(std::ofstream(path, std::ios::binary) << text)) fail("cannot write", path.string());
  }

  void drain(int fd) {
    char buf[8192];
    for (;;) {
      const ssize_t n = ::recv(fd, buf, sizeof buf, 0);
      if (n <= 0) return;
      const std::lock_guard lock(output_lock_);
      output_.append(buf, static_cast<size_t>(n));
    }
  }

  PortKind kind_;
  fs::path base_, root_, outside_;
  int daemon_ = -1;
  int station_ = -1;
  std::mutex output_lock_;
  std::string output_;
};

}  // namespace fuzz
