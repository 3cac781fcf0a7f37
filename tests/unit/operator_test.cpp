#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "commands/operator.h"
#include "core/command.h"
#include "services/ulda_nvram.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Setup = std::vector<std::pair<std::string, std::string>>;

constexpr size_t kFlagOffset = offsetof(ulda_nvram, optr_flag);
constexpr size_t kFlagWidth = sizeof(ulda_nvram::optr_flag);

std::string quoted(const std::string& value) { return "\r\n\"" + value + "\"\r\n"; }

// A record whose every other byte is set, so a stray write shows.
std::string record_with_flag(const std::string& flag) {
  std::string record(ULDA_NVRAM_SIZE, '\xa5');
  std::string field = flag.substr(0, kFlagWidth);
  field.resize(kFlagWidth, '\0');
  return record.replace(kFlagOffset, kFlagWidth, field);
}

const Setup kRegionPhone{{"ro.pemu.product.model", "QM0305F_EX"}};
const Setup kHardwareB{{"/sys/devs_list/mpps_value", "cpu--AA hw_id:B\n"}};
const Setup kListed{{"/system/etc/release_name_cfg.ini", "[QM0101]\nIN=1\n"}};
const Setup kQm0101{{"ro.pemu.product.model", "QM0101"}};

Setup joined(const Setup& a, const Setup& b = {}) {
  Setup all = a;
  all.insert(all.end(), b.begin(), b.end());
  return all;
}

struct OptrCase {
  const char* name;
  std::string line;
  std::string stored;  // flag in the record before; "-" for no record at all
  Setup files;
  Setup properties;
  int status;
  std::string body;
  std::string flag_after;      // "-" when the record must be unchanged
  std::string requests;        // the simulated modem's request log
};
void PrintTo(const OptrCase& c, std::ostream* os) { *os << c.name; }

std::vector<OptrCase> optr_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const std::string kMy = "2 65633 0,0 4500000000000000\n";
  const std::string kNeighbour = "2 65633 0,0 8500000000000000\n";
  return {
      {"same_flag", "AT+JVOPTR=1,N", "N", {}, {}, OK, quoted("no"), "-", ""},
      {"n", "AT+JVOPTR=1,N", "IN", {}, {}, OK, quoted("no"), "N", ""},
      {"n_region_product", "AT+JVOPTR=1,N", "", kHardwareB, kRegionPhone, OK, quoted("no"), "N", ""},
      {"cn_not_listed", "AT+JVOPTR=1,CN-LT", "", {}, kQm0101, OK, quoted("no"), "CN-LT", ""},
      {"cn_listed_no_package", "AT+JVOPTR=1,CN-YD", "", kListed, kQm0101, ERR, quoted("no apps package found"), "-", ""},
      {"cn_listed_package", "AT+JVOPTR=1,CN-YD-A", "", joined(kListed, {{"/storage/sdcard0/x_apps.zip", ""}}), kQm0101, OK, quoted("yes"), "CN-YD-A", ""},
      {"cn_package_elsewhere", "AT+JVOPTR=1,CN-DX", "", joined(kListed, {{"/storage/sdcard1/apps.zip", ""}}), kQm0101, ERR, quoted("no apps package found"), "-", ""},
      {"cn_region_product", "AT+JVOPTR=1,CN-YD", "", kHardwareB, kRegionPhone, OK, quoted("no"), "CN-YD", ""},
      {"country", "AT+JVOPTR=1,IN", "", {}, {}, OK, quoted("no"), "IN", ""},
      {"country_package", "AT+JVOPTR=1,IN", "", {{"/storage/sdcard1/oem_IN.zip", ""}}, {}, OK, quoted("yes"), "IN", ""},
      {"country_other_package", "AT+JVOPTR=1,IN", "", {{"/storage/sdcard0/oem_MY.zip", ""}}, {}, OK, quoted("no"), "IN", ""},
      {"region_my", "AT+JVOPTR=1,MY", "", kHardwareB, kRegionPhone, OK, quoted("no"), "MY", kMy},
      {"region_neighbour", "AT+JVOPTR=1,PH", "", kHardwareB, kRegionPhone, OK, quoted("no"), "PH", kNeighbour},
      {"region_other_hardware", "AT+JVOPTR=1,MY", "", {{"/sys/devs_list/mpps_value", "hw_id:01100\n"}}, kRegionPhone, OK, quoted("no"), "MY", ""},
      {"region_longer_hardware_id", "AT+JVOPTR=1,MY", "", {{"/sys/devs_list/mpps_value", "hw_id:B1\n"}}, kRegionPhone, OK, quoted("no"), "MY", ""},
      // After the record is written the flag stays, whatever the modem does.
      {"region_transport_error", "AT+JVOPTR=1,MY", "", joined(kHardwareB, {{"/.emu/modem/transport_error", "1"}}), kRegionPhone, ERR, "write nv error!", "MY", kMy},
      {"region_refused", "AT+JVOPTR=1,VN", "", joined(kHardwareB, {{"/.emu/modem/response_error", "3"}}), kRegionPhone, ERR, "write nv error!", "VN", kNeighbour},
      {"region_no_hardware_file", "AT+JVOPTR=1,MY", "", {}, kRegionPhone, ERR, "write nv error!", "MY", ""},
      {"bad_flag", "AT+JVOPTR=1,ABC", "IN", {}, {}, ERR, "", "-", ""},
      {"bad_flag_one_letter", "AT+JVOPTR=1,Y", "IN", {}, {}, ERR, "", "-", ""},
      {"no_flag", "AT+JVOPTR=1", "IN", {}, {}, ERR, "", "-", ""},
      {"no_record", "AT+JVOPTR=1,N", "-", {}, {}, ERR, "", "-", ""},
      {"read", "AT+JVOPTR=0", "CN-YD-A", {}, {}, OK, quoted("CN-YD-A"), "-", ""},
      {"read_full_width", "AT+JVOPTR=0", "ABCDEFGHIJKLMNOP", {}, {}, OK, quoted("ABCDEFGHIJKLMNOP"), "-", ""},
      {"read_no_record", "AT+JVOPTR=0", "-", {}, {}, ERR, "", "-", ""},
  };
}

class OptrTest : public DeviceRootTest, public ::testing::WithParamInterface<OptrCase> {};

TEST_P(OptrTest, SetsFlagAndRegionCode) {
  const OptrCase& c = GetParam();
  make_dir("/persist");
  const std::string before = c.stored == "-" ? "" : record_with_flag(c.stored);
  if (c.stored != "-") write_file("/persist/ulda_nvram", before);
  for (const auto& [path, content] : c.files) write_file(path, content);
  for (const auto& [name, value] : c.properties) set_property(name, value);

  const HandlerAnswer answer = call_handler(optr_flag_handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  const bool changed = c.flag_after != "-";
  EXPECT_EQ(read_file("/persist/ulda_nvram"), changed ? record_with_flag(c.flag_after) : before);
  EXPECT_EQ(get_property("persist.sys.pemu.product.cust"), changed ? c.flag_after : "");
  EXPECT_EQ(read_file("/.emu/modem/requests.log"), c.requests);
}

INSTANTIATE_TEST_SUITE_P(Operator, OptrTest, ::testing::ValuesIn(optr_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class OemTest : public DeviceRootTest {};

TEST_F(OemTest, MatchesFlagWithCustomisation) {
  struct Case {
    const char* oem_version;
    const char* customize;
    std::string stored;
    std::string line;
    int status;
  };
  const Case cases[] = {
      {"1.0", "in", "IN", "AT+JVOEM=0", RESULT_OK},
      {"1.0", "IN", "INDIA", "AT+JVOEM=0", RESULT_OK},  // over the property's length
      {"1.0", "INDIA", "IN", "AT+JVOEM=0", RESULT_ERROR},
      {"1.0", "MY", "IN", "AT+JVOEM=0,1", RESULT_ERROR},
      {"", "IN", "IN", "AT+JVOEM=0", RESULT_ERROR},
      {"1.0", "", "IN", "AT+JVOEM=0", RESULT_ERROR},
      {"1.0", "IN", "", "AT+JVOEM=0", RESULT_ERROR},
      {"1.0", "IN", "-", "AT+JVOEM=0", RESULT_ERROR},
      {"1.0", "IN", "IN", "AT+JVOEM=1", RESULT_ERROR},
  };
  make_dir("/persist");
  for (const Case& c : cases) {
    // "ro." properties cannot change once set: each case writes the files directly.
    write_file("/dev/__properties__/ro.oem.version", c.oem_version);
    write_file("/dev/__properties__/ro.product.customize.kro", c.customize);
    if (c.stored == "-")
      std::filesystem::remove(host_path("/persist/ulda_nvram"));
    else
      write_file("/persist/ulda_nvram", record_with_flag(c.stored));
    EXPECT_EQ(call_handler(check_oem_handler, c.line).status, c.status)
        << c.customize << " / " << c.stored << " / " << c.oem_version;
  }
}

class ReleaseNameTest : public DeviceRootTest {};

TEST_F(ReleaseNameTest, FindsModelThenName) {
  set_property("ro.pemu.product.model", "QM0305");
  struct Case {
    const char* list;  // nullptr: no list
    const char* name;
    int result;
  };
  const Case cases[] = {
      {"[QM0101]\nIN=1\n[QM0305]\ndefault=x\nMY=y\n", nullptr, 0},
      {"[QM0101]\nIN=1\n[QM0305]\ndefault=x\nMY=y\n", "MY", 0},
      {"[QM0101]\nIN=1\n[QM0305]\ndefault=x\nMY=y\n", "IN", -1},  // listed before the model
      {"[QM0305]\nMY=y\n", "default", -1},
      {"[QM0305]\nID=\nMY=y\n", "MY", -1},  // a key without a value ends the search
      {"[QM0101]\n", nullptr, -1},
      {nullptr, nullptr, -1},
  };
  for (const Case& c : cases) {
    if (c.list != nullptr)
      write_file("/system/etc/release_name_cfg.ini", c.list);
    else
      std::filesystem::remove(host_path("/system/etc/release_name_cfg.ini"));
    EXPECT_EQ(find_release_name(c.name), c.result) << (c.list ? c.list : "none") << c.name;
  }
}

}  // namespace
