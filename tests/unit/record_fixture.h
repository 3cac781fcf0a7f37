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

#include "services/ulda_nvram.h"
#include "tests/unit/device_root.h"
#include "tests/unit/station_port.h"

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
    port_.open(PortKind::tty);
  }
  void TearDown() override {
    port_.close();
    RecordTest::TearDown();
  }
  std::string drain() { return port_.drain(); }
  StationPort port_;
};
