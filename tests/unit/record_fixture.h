// A device root whose factory record has every byte unlike its neighbours, so a field written
// at the wrong offset or a byte lost shows in a whole-record compare; PortTest adds the
// transport on a socket pair, the test holding the station's end.
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
    ulda_nvram r;
    auto* bytes = reinterpret_cast<unsigned char*>(&r);
    for (size_t i = 0; i < sizeof r; ++i) bytes[i] = static_cast<unsigned char>(i * 31 + 7);
    if (change) change(r);
    return r;
  }
  static std::string bytes_of(const ulda_nvram& r) {
    return std::string(reinterpret_cast<const char*>(&r), sizeof r);
  }
  void put_record(const ulda_nvram& r) { write_file("/persist/ulda_nvram", bytes_of(r)); }
  std::string record_bytes() const { return read_file("/persist/ulda_nvram"); }
  void break_record_writes() { make_dir("/persist/ulda_nvram.tmp"); }  // reads still work
};

class PortTest : public RecordTest {
 protected:
  void SetUp() override {
    RecordTest::SetUp();
    use_port("/dev/ttyGS0");
  }
  void TearDown() override {
    use_port(nullptr);
    is_uart_flag = 0;
    RecordTest::TearDown();
  }
  // Sequenced packets: one send is one read, as a canonical tty's lines arrive.
  void use_port(const char* device_name) {
    for (int fd : {station_, serial.fd[0]})
      if (fd >= 0) ::close(fd);
    initSerialDevice(&serial);
    station_ = -1;
    if (device_name == nullptr) return;
    int pair[2];
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, pair), 0);
    std::strcpy(serial.dev_name[0], device_name);
    serial.fd[0] = pair[0];
    station_ = pair[1];
  }
  std::string drain() {
    std::string out;
    char buf[8192];
    ::fcntl(station_, F_SETFL, O_NONBLOCK);
    for (ssize_t n; (n = ::read(station_, buf, sizeof buf)) > 0;) out.append(buf, n);
    return out;
  }
  int station_ = -1;
};
