#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "commands/gps_fm.h"
#include "core/command.h"
#include "core/serial.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Lines = std::vector<std::string>;

// Waits for a condition with a generous deadline; false when it never held.
template <typename Condition>
bool eventually(Condition condition) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  return true;
}

class GpsTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    saved_serial_ = serial;
    saved_sp_ = is_sp;
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, port_), 0);
    std::memset(&serial, 0, sizeof serial);
    serial.fd[0] = port_[0];
    serial.fd[1] = -1;
    is_sp = 1;
    gps_workers_peak = 0;
  }
  void TearDown() override {
    // Leaves the GPS test closed for the next test.
    std::filesystem::remove_all(host_path("/.emu/modem"));
    EXPECT_EQ(gps(("AT+JVGPS=0")), RESULT_OK);
    EXPECT_EQ(gps_workers_running.load(), 0);
    serial = saved_serial_;
    is_sp = saved_sp_;
    ::close(port_[0]);
    ::close(port_[1]);
    DeviceRootTest::TearDown();
  }

  static int gps(const std::string& line) { return call_handler(gps_handler, line).status; }

  Lines requests() const {
    std::istringstream log(read_file("/.emu/modem/requests.log"));
    Lines lines;
    for (std::string line; std::getline(log, line);) lines.push_back(line);
    return lines;
  }
  size_t polls() const {
    size_t n = 0;
    for (const std::string& r : requests()) n += r == "3 2";
    return n;
  }

  std::string port_output() {
    char buf[1024];
    ssize_t n;
    while ((n = ::recv(port_[1], buf, sizeof buf, MSG_DONTWAIT)) > 0) received_.append(buf, n);
    return received_;
  }

  SerialDevice saved_serial_{};
  int32_t saved_sp_ = 0;
  int port_[2] = {-1, -1};
  std::string received_;
};

TEST_F(GpsTest, OpenOnceStreamAndClose) {
  EXPECT_EQ(gps("AT+JVGPS=2"), RESULT_ERROR);  // not open
  EXPECT_EQ(gps("AT+JVGPS=4"), RESULT_ERROR);
  EXPECT_TRUE(requests().empty());
  is_sp = 0;
  EXPECT_EQ(gps("AT+JVGPS=3"), RESULT_OK);
  EXPECT_EQ(gps("at+jvgps=1"), RESULT_OK);  // already open: no second request
  EXPECT_EQ(requests(), Lines{"3 3"});
  EXPECT_EQ(shell_commands(), Lines(2, "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 2"));

  write_file("/.emu/modem/gps/2", "$GPGGA,fix\r\n");
  EXPECT_EQ(gps("AT+JVGPS=2"), RESULT_OK);
  EXPECT_EQ(gps("AT+JVGPS=2"), RESULT_OK);
  ASSERT_TRUE(eventually([&] { return polls() >= 2; }));
  EXPECT_TRUE(eventually([&] { return port_output().find("$GPGGA,fix\r\n$GPGGA,fix\r\n") == 0; }));
  EXPECT_EQ(gps("AT+JVGPS=0"), RESULT_OK);
  // Reaped by the close, and no poll after it.
  EXPECT_EQ(gps_workers_running.load(), 0);
  EXPECT_EQ(gps_workers_peak.load(), 1);
  EXPECT_EQ(requests().back(), "3 0");
  EXPECT_EQ(gps("AT+JVGPS=2"), RESULT_ERROR);
}

TEST_F(GpsTest, CloseThenOpenAndStreamAtOnceNeverRunsTwoWorkers) {
  for (int cycle = 0; cycle < 20; ++cycle) {
    ASSERT_EQ(gps("AT+JVGPS=1"), RESULT_OK);
    ASSERT_EQ(gps("AT+JVGPS=2"), RESULT_OK);
    if (cycle % 4 == 0) {
      ASSERT_TRUE(eventually([] { return gps_workers_running.load() == 1; }));
    }
    ASSERT_EQ(gps("AT+JVGPS=0"), RESULT_OK);
    ASSERT_EQ(gps_workers_running.load(), 0);
  }
  EXPECT_EQ(gps_workers_peak.load(), 1);
  EXPECT_EQ(requests().back(), "3 0");
}

TEST_F(GpsTest, ModemFailures) {
  write_file("/.emu/modem/send_error", "1");
  EXPECT_EQ(gps("AT+JVGPS=1"), RESULT_ERROR);
  EXPECT_EQ(gps("AT+JVGPS=2"), RESULT_ERROR);  // still closed
  std::filesystem::remove(host_path("/.emu/modem/send_error"));
  ASSERT_EQ(gps("AT+JVGPS=1"), RESULT_OK);
  ASSERT_EQ(gps("AT+JVGPS=2"), RESULT_OK);
  ASSERT_TRUE(eventually([&] { return polls() >= 1; }));
  // A failed poll ends the worker; a failed close leaves the test open.
  write_file("/.emu/modem/send_error", "1");
  EXPECT_TRUE(eventually([] { return gps_workers_running.load() == 0; }));
  EXPECT_EQ(gps("AT+JVGPS=0"), RESULT_ERROR);
  std::filesystem::remove(host_path("/.emu/modem/send_error"));
  EXPECT_EQ(gps("AT+JVGPS=1"), RESULT_OK);
  EXPECT_EQ(requests().back(), "3 2");  // "has open": nothing sent
}

class FmTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    write_file("/dev/radio0", "");
    write_file("sys/devices/virtual/misc/msm_snd/device", "");
  }
  void TearDown() override {
    call_handler(fm_test_handler, "AT+JVFM=0");
    DeviceRootTest::TearDown();
  }
  static HandlerAnswer fm(const std::string& line) { return call_handler(fm_test_handler, line); }
  static size_t open_descriptors() {
    size_t n = 0;
    for ([[maybe_unused]] const auto& e : std::filesystem::directory_iterator("/proc/self/fd")) ++n;
    return n;
  }
};

const std::string kRouteOn = "/system/bin/sh -c \"echo 26 0 1 > /sys/devices/virtual/misc/msm_snd/device\"";
const std::string kRouteOff = "/system/bin/sh -c \"echo 6 1 1 > /sys/devices/virtual/misc/msm_snd/device\"";

TEST_F(FmTest, TunerLifecycle) {
  const size_t descriptors = open_descriptors();
  EXPECT_EQ(fm("AT+JVFM=2").status, RESULT_ERROR);  // not open
  EXPECT_EQ(fm("AT+JVFM=1").status, RESULT_OK);
  EXPECT_EQ(fm("AT+JVFM=1").status, RESULT_OK);  // already open: nothing done
  EXPECT_EQ(shell_commands(), Lines{kRouteOn});
  EXPECT_EQ(open_descriptors(), descriptors + 1);

  write_file("/.emu/fm/signal", "42\n");
  EXPECT_EQ(fm("AT+JVFM=2").body, "\r\n\"42\"\r\n");
  write_file("/.emu/fm/signal", "x");
  EXPECT_EQ(fm("AT+JVFM=2").body, "\r\n\"0\"\r\n");
  std::filesystem::remove(host_path("/.emu/fm/signal"));
  const HandlerAnswer unread = fm("AT+JVFM=2");
  EXPECT_EQ(unread.status, RESULT_OK);
  EXPECT_EQ(unread.body, "\r\n\"0\"\r\n");

  EXPECT_EQ(fm("AT+JVFM=0").status, RESULT_OK);
  EXPECT_EQ(shell_commands(), (Lines{kRouteOn, kRouteOff}));
  EXPECT_EQ(open_descriptors(), descriptors);
  EXPECT_EQ(fm("AT+JVFM=2").status, RESULT_ERROR);
  EXPECT_EQ(fm("AT+JVFM=4").status, RESULT_ERROR);
}

TEST_F(FmTest, MissingDevices) {
  std::filesystem::remove(host_path("/dev/radio0"));
  write_file("/.emu/fm/signal", "42");
  EXPECT_EQ(fm("AT+JVFM=1").status, RESULT_OK);  // the tuner's open is not checked
  EXPECT_EQ(fm("AT+JVFM=2").status, RESULT_ERROR);
  std::filesystem::remove(host_path("sys/devices/virtual/misc/msm_snd/device"));
  EXPECT_EQ(fm("AT+JVFM=1").status, RESULT_ERROR);
  EXPECT_EQ(fm("AT+JVFM=0").status, RESULT_ERROR);
  EXPECT_EQ(shell_commands(), Lines{kRouteOn});
}

TEST_F(FmTest, HeadsetStatus) {
  const struct {
    const char* content;  // nullptr: no file
    int status;
  } cases[] = {{"1", RESULT_OK}, {"3\n", RESULT_OK}, {"2", RESULT_ERROR}, {"0", RESULT_ERROR},
               {"", RESULT_ERROR}, {nullptr, RESULT_ERROR}};
  for (const auto& c : cases) {
    std::filesystem::remove(host_path("/sys/kernel/debug/mbhc_status"));
    if (c.content) write_file("/sys/kernel/debug/mbhc_status", c.content);
    EXPECT_EQ(fm("AT+JVFM=3").status, c.status) << (c.content ? c.content : "(none)");
  }
}

}  // namespace
