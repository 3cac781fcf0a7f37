// A device root holding a factory record whose every byte differs from its neighbours, so a
// field written at the wrong offset or a byte lost on the way shows in a whole-record compare.
#pragma once

#include <cstring>
#include <functional>
#include <string>

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
