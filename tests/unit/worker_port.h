// A device root with the transport on one end of a socket pair, for commands whose worker
// threads write to the port. Each write arrives as one packet, so a line cut in two shows.
#pragma once

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <string>
#include <thread>

#include "commands/worker.h"
#include "core/serial.h"
#include "tests/unit/device_root.h"

// Polls `done` until it holds or a generous deadline passes.
template <typename Predicate>
bool wait_until(Predicate done) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  while (!done()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  return true;
}

class WorkerPortTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    int pair[2];
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, pair), 0);
    initSerialDevice(&serial);
    std::strcpy(serial.dev_name[0], "/dev/ttyGS0");
    serial.fd[0] = pair[0];
    station_ = pair[1];
  }

  // Every test stops what it started; a worker still running here is a fault.
  void TearDown() override {
    EXPECT_TRUE(wait_until([] { return running_workers() == 0; })) << "a worker is left running";
    is_uart_flag = 0;
    is_sp = 0;
    ::close(station_);
    ::close(serial.fd[0]);
    initSerialDevice(&serial);
    DeviceRootTest::TearDown();
  }

  // The next write the port received, or "" when none came within `ms`.
  std::string next_write(int ms = 20000) {
    pollfd p{station_, POLLIN, 0};
    if (::poll(&p, 1, ms) != 1) return "";
    char buf[4096];
    const ssize_t n = ::recv(station_, buf, sizeof buf, 0);
    return n > 0 ? std::string(buf, static_cast<size_t>(n)) : "";
  }

  int station_ = -1;
};
