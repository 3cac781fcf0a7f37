// The station's end of the port: the daemon's transport is attached to one end of a socket
// pair of sequenced packets, so one write of the daemon is one read here (a line cut in two
// shows) and one send from here is one read of the daemon, as a canonical tty's lines arrive.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <string>
#include <string_view>

#include "core/transport.h"

class StationPort {
 public:
  StationPort() = default;
  StationPort(const StationPort&) = delete;
  StationPort& operator=(const StationPort&) = delete;
  ~StationPort() { close(); }

  void open(PortKind kind) {
    close();
    int pair[2];
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, pair), 0);
    initSerialDevice(&serial);
    attach_port(kind, pair[0]);
    daemon_ = pair[0];
    station_ = pair[1];
  }
  void close() {
    if (station_ < 0) return;
    ::close(station_);
    ::close(daemon_);
    station_ = daemon_ = -1;
    initSerialDevice(&serial);
    is_uart_flag = 0;
    is_sp = 0;
  }

  // The next write the port received, or "" when none came within `ms`.
  std::string next_write(int ms = 20000) const {
    pollfd p{station_, POLLIN, 0};
    if (::poll(&p, 1, ms) != 1) return "";
    char buf[8192];
    const ssize_t n = ::recv(station_, buf, sizeof buf, 0);
    return n > 0 ? std::string(buf, static_cast<size_t>(n)) : "";
  }
  // Everything written so far.
  std::string drain() const {
    std::string out;
    char buf[8192];
    for (ssize_t n; (n = ::recv(station_, buf, sizeof buf, MSG_DONTWAIT)) > 0;) out.append(buf, n);
    return out;
  }
  void send(std::string_view data) const {
    ASSERT_EQ(::send(station_, data.data(), data.size(), 0), static_cast<ssize_t>(data.size()));
  }
  void hang_up() const { ::shutdown(station_, SHUT_WR); }

 private:
  int station_ = -1;
  int daemon_ = -1;
};
