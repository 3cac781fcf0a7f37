// A device root holding a factory record whose every byte differs from its neighbours, so a
// field written at the wrong offset or a byte lost on the way shows in a whole-record compare.
#pragma once

#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstring>
#include <functional>
#include <string>

#include "core/serial.h"
#include "services/ulda_nvram.h"
#include "tests/unit/device_root.h"

class RecordTest : public DeviceRootTest {
 public:
  using Change = std::function<void(ulda_nvram&)>;

 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    make_dir("/data");
    put_record(patterned());
  }

  static ulda_nvram patterned(const Change& change = nullptr) {
    ulda_nvram record;
    auto* bytes = reinterpret_cast<unsigned char*>(&record);
    for (size_t i = 0; i < sizeof record; ++i) bytes[i] = static_cast<unsigned char>(i * 31 + 7);
    if (change) change(record);
    return record;
  }
  void put_record(const ulda_nvram& record) {
    write_file("/persist/ulda_nvram", std::string(reinterpret_cast<const char*>(&record),
                                                  sizeof record));
  }
  std::string record_bytes() const { return read_file("/persist/ulda_nvram"); }
  static std::string bytes_of(const ulda_nvram& record) {
    return std::string(reinterpret_cast<const char*>(&record), sizeof record);
  }
  // Reads keep working; every write of the record fails.
  void break_record_writes() { make_dir("/persist/ulda_nvram.tmp"); }
};

// The record root with the transport on one end of a socket pair, as a tty (one write, one
// read) or as the socket server's connection; the test holds the station's end.
class PortTest : public RecordTest {
 protected:
  void SetUp() override {
    RecordTest::SetUp();
    use_port("/dev/ttyGS0");
  }
  void TearDown() override {
    for (int fd : {station_, serial.fd[0]})
      if (fd >= 0) ::close(fd);
    initSerialDevice(&serial);
    is_uart_flag = 0;
    RecordTest::TearDown();
  }
  void use_port(const char* device_name, int type = SOCK_SEQPACKET) {
    for (int fd : {station_, serial.fd[0]})
      if (fd >= 0) ::close(fd);
    int pair[2];
    ASSERT_EQ(::socketpair(AF_UNIX, type, 0, pair), 0);
    initSerialDevice(&serial);
    std::strcpy(serial.dev_name[0], device_name);
    serial.fd[0] = pair[0];
    station_ = pair[1];
  }
  // Everything the station has been sent so far.
  std::string drain() {
    std::string out;
    char buf[8192];
    ::fcntl(station_, F_SETFL, O_NONBLOCK);
    for (ssize_t n; (n = ::read(station_, buf, sizeof buf)) > 0;) out.append(buf, n);
    return out;
  }

  int station_ = -1;
};
