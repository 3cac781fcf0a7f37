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
#include "tests/unit/device_root.h"
#include "tests/unit/station_port.h"

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
    port_.open(PortKind::tty);
  }

  // Every test stops what it started; a worker still running here is a fault.
  void TearDown() override {
    EXPECT_TRUE(wait_until([] { return running_workers() == 0; })) << "a worker is left running";
    port_.close();
    DeviceRootTest::TearDown();
  }

  std::string next_write(int ms = 20000) { return port_.next_write(ms); }

  StationPort port_;
};
