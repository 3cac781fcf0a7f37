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
#include "commands/identity.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/station_port.h"

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
    port_.open(PortKind::tty);
    is_sp = 1;
    gps_workers_peak = 0;
  }
  void TearDown() override {
    // Leaves the GPS test closed for the next test.
    std::filesystem::remove_all(host_path("/.emu/modem"));
    EXPECT_EQ(gps(("AT+JVGPS=0")), RESULT_OK);
    EXPECT_EQ(gps_workers_running.load(), 0);
    port_.close();
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

  std::string port_output() { return received_ += port_.drain(); }

  StationPort port_;
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

// The poll's answers land on the modem's thread while handlers read other items: every answer
// must be the one its own request asked for.
TEST_F(GpsTest, PollNeverSpoilsAnotherRequestsAnswer) {
  write_file("/.emu/modem/gps/2", "$GPGGA,fix\r\n");
  write_file("/.emu/modem/nv/6853", "PCB0001");
  write_file("/.emu/modem/nv/66024", "TDNV-66024");
  ASSERT_EQ(gps("AT+JVGPS=1"), RESULT_OK);
  ASSERT_EQ(gps("AT+JVGPS=2"), RESULT_OK);
  ASSERT_TRUE(eventually([&] { return polls() >= 1; }));
  const size_t polls_before = polls();
  for (int i = 0; i < 300 || polls() < polls_before + 3; ++i) {
    ASSERT_EQ(call_handler(imei_and_pcb_code_on_handler, "AT+EGMR=0,5").body, "PCB0001") << i;
    ASSERT_EQ(call_handler(nv_66024_handler, "AT+JVTDNV=0").body, "TDNV-66024") << i;
  }
  EXPECT_EQ(gps("AT+JVGPS=0"), RESULT_OK);
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
