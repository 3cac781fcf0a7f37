#include "commands/operator.h"

#include "tests/unit/handler_case.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kMy = "2 65633 0,0 4500000000000000\n";
const std::string kNeighbour = "2 65633 0,0 8500000000000000\n";
const std::pair<std::string, std::string> kList = {"/system/etc/release_name_cfg.ini", "[QM0202]\n[QM0101]\nIN=1\n"};
const std::pair<std::string, std::string> kQm0101 = {"prop:ro.pemu.product.model", "QM0101"};
const std::pair<std::string, std::string> kRegionModel = {"prop:ro.pemu.product.model", "QM0305F_EX"};
const std::pair<std::string, std::string> kHardwareB = {"/sys/devs_list/mpps_value", "cpu--AA hw_id:B\n"};
const Pairs kRegion = {kRegionModel, kHardwareB};

std::string quoted(const std::string& value) { return "\r\n\"" + value + "\"\r\n"; }

RecordTest::Change flag(const std::string& value) {
  return [value](ulda_nvram& r) { set_ulda_string(r.optr_flag, value.c_str()); };
}

// AT+JVOPTR=1,<to> over a record holding `from`. `stored` is the flag stored and mirrored in
// the property after it ("": the record stays as it was); `requests` the simulated modem's log.
HandlerCase optr(const char* name, const std::string& to, const std::string& from, Pairs before, int status,
                 const std::string& body, const std::string& stored, const std::string& requests = kAbsent) {
  return {name, optr_flag_handler, "AT+JVOPTR=1," + to, std::move(before), status, body, {},
          {{"/.emu/modem/requests.log", requests}, {"prop:persist.sys.pemu.product.cust", stored}}, flag(from),
          stored.empty() ? nullptr : flag(stored)};
}

// AT+JVOEM=0 with the operator software's version and customisation, over a stored flag.
HandlerCase oem(const char* name, const char* version, const char* customize, const char* stored, int status) {
  const Pairs before = {{"prop:ro.oem.version", version}, {"prop:ro.product.customize.kro", customize}};
  return {name, check_oem_handler, "AT+JVOEM=0", before, status, "", {}, {}, flag(stored)};
}

const HandlerCase kRows[] = {
    optr("same_flag", "N", "N", {}, OK, quoted("no"), ""),
    optr("n", "N", "IN", {}, OK, quoted("no"), "N"),
    optr("cn_not_listed", "CN-LT", "", {kList, {"prop:ro.pemu.product.model", "QM0305"}}, OK, quoted("no"), "CN-LT"),
    // Without a model every line would hold it.
    optr("cn_no_model", "CN-LT", "", {kList}, OK, quoted("no"), "CN-LT"),
    optr("cn_no_package", "CN-YD", "", {kList, kQm0101}, ERR, quoted("no apps package found"), ""),
    optr("cn_package", "CN-YD-A", "", {kList, kQm0101, {"/storage/sdcard0/x_apps.zip", ""}}, OK, quoted("yes"),
         "CN-YD-A"),
    optr("cn_region_product", "CN-YD", "", kRegion, OK, quoted("no"), "CN-YD"),
    optr("country_package", "IN", "", {{"/storage/sdcard1/oem_IN.zip", ""}}, OK, quoted("yes"), "IN"),
    optr("country_other_package", "IN", "", {{"/storage/sdcard0/oem_MY.zip", ""}}, OK, quoted("no"), "IN"),
    optr("region", "MY", "", kRegion, OK, quoted("no"), "MY", kMy),
    optr("region_longer_hardware_id", "MY", "", {kRegionModel, {"/sys/devs_list/mpps_value", "hw_id:B1\n"}}, OK,
         quoted("no"), "MY"),
    // Once the record is written the flag stays, whatever the modem does.
    optr("region_transport_error", "MY", "", {kRegionModel, kHardwareB, {"/.emu/modem/transport_error", "1"}}, ERR,
         "write nv error!", "MY", kMy),
    optr("region_refused", "VN", "", {kRegionModel, kHardwareB, {"/.emu/modem/response_error", "3"}}, ERR,
         "write nv error!", "VN", kNeighbour),
    optr("region_no_hardware_file", "MY", "", {kRegionModel}, ERR, "write nv error!", "MY"),
    optr("bad_flag", "ABC", "IN", {}, ERR, "", ""),
    optr("no_flag", "", "IN", {}, ERR, "", ""),
    optr("no_record", "N", "IN", {{"/persist/ulda_nvram", kAbsent}}, ERR, "", ""),
    // A flag as wide as its field has no terminator.
    {"read_full_width", optr_flag_handler, "AT+JVOPTR=0", {}, OK, quoted("ABCDEFGHIJKLMNOP"), {}, {},
     flag("ABCDEFGHIJKLMNOP")},

    oem("oem_match", "1.0", "in", "IN", OK),
    // Compared over the customisation's length.
    oem("oem_flag_longer", "1.0", "IN", "INDIA", OK),
    oem("oem_flag_shorter", "1.0", "INDIA", "IN", ERR),
    oem("oem_no_version", "", "IN", "IN", ERR),
    oem("oem_no_customisation", "1.0", "", "IN", ERR),
};

INSTANTIATE_TEST_SUITE_P(Operator, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
