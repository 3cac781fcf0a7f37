#include "commands/operator.h"

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <string_view>
#include <strings.h>

#include "commands/command_util.h"
#include "commands/device_info.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/qmi_client.h"
#include "services/ulda_nvram.h"

namespace {

constexpr const char* kReleaseNameList = "/system/etc/release_name_cfg.ini";
constexpr const char* kCustomerProperty = "persist.sys.pemu.product.cust";
constexpr const char* kInternalCard = "/storage/sdcard0";
constexpr const char* kExternalCard = "/storage/sdcard1";

constexpr std::string_view kChinaFlags[] = {"CN-YD", "CN-YD-A", "CN-LT", "CN-DX"};

// The export products whose modem carries a region code.
constexpr const char* kRegionProducts[] = {"QM0304F_EX", "QM0305F_EX", "QM0203F_EX",
                                           "QM0306F_EX", "QM0308F_EX"};

struct RegionCode {
  std::string_view hw_id;
  std::string_view country;
  const char* code;
};

// Codes come from the product owners; a combination not listed gets no code.
constexpr RegionCode kRegionCodes[] = {
    {"B", "MY", "4500000000000000"}, {"B", "IN", "8500000000000000"},
    {"B", "MM", "8500000000000000"}, {"B", "ID", "8500000000000000"},
    {"B", "VN", "8500000000000000"}, {"B", "TH", "8500000000000000"},
    {"B", "PH", "8500000000000000"},
};

constexpr uint32_t kRegionCodeItem = 65633;

using StoredFlag = char[sizeof(ulda_nvram::optr_flag) + 1];

// The flag field fills its whole width when it is as long as the field: no terminator.
void read_stored_flag(const ulda_nvram& record, StoredFlag& flag) {
  std::memcpy(flag, record.optr_flag, sizeof record.optr_flag);
  flag[sizeof record.optr_flag] = '\0';
}

bool is_region_product() {
  for (const char* model : kRegionProducts)
    if (is_product_model(model)) return true;
  return false;
}

// The id after "hw_id:" up to the next blank, comma or line end; empty when there is none.
std::string_view hardware_id(std::string_view text) {
  constexpr std::string_view kMark = "hw_id:";
  const size_t at = text.find(kMark);
  if (at == std::string_view::npos) return {};
  text.remove_prefix(at + kMark.size());
  return text.substr(0, text.find_first_of(" \t\r\n,;"));
}

const char* region_code_for(std::string_view hw_id, std::string_view country) {
  for (const RegionCode& row : kRegionCodes)
    if (row.hw_id == hw_id && row.country == country) return row.code;
  return nullptr;
}

bool dir_has_entry(const char* dir, const char* part, const char* other_part) {
  UniqueDir listing(dev_opendir(dir));
  if (!listing) return false;
  while (const dirent* entry = ::readdir(listing.get())) {
    if (std::strstr(entry->d_name, part) != nullptr &&
        (other_part == nullptr || std::strstr(entry->d_name, other_part) != nullptr))
      return true;
  }
  return false;
}

bool is_china_flag(std::string_view flag) {
  for (std::string_view known : kChinaFlags)
    if (flag == known) return true;
  return false;
}

// Stores the flag in the record and mirrors it in the customer property.
int store_optr_flag(const char* flag) {
  const int status = update_ulda_nvram(__func__, [flag](ulda_nvram& record) {
    set_ulda_string(record.optr_flag, flag);
    ATCI_LOGD("set ulda_nvram.optr_flag=%s", flag);
    return true;
  });
  if (status != RESULT_OK) return RESULT_ERROR;
  property_set(kCustomerProperty, flag);
  return RESULT_OK;
}

int answer_region_failure(char* response) {
  std::snprintf(response, RESPONSE_SIZE, "write nv error!");
  return RESULT_ERROR;
}

// Returns a status and fills the body; nothing is stored when it fails before the record
// was written.
int set_optr_flag(const char* flag, char* response) {
  ATCI_LOGD("optr flag : %s, length = %d", flag, static_cast<int>(std::strlen(flag)));
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  StoredFlag stored;
  read_stored_flag(record, stored);
  const std::string_view text(flag);

  if (std::strcmp(stored, flag) == 0) {
    ATCI_LOGD("optr_flag = flag = %s", flag);
    return answer_quoted(response, "no");
  }
  if (text == "N") {
    if (store_optr_flag(flag) != RESULT_OK) return RESULT_ERROR;
    if (write_region_code(flag) != 0) return answer_region_failure(response);
    return answer_quoted(response, "no");
  }
  if (is_china_flag(text)) {
    const char* answer = "no";
    if (find_release_name(nullptr) == 0) {
      if (!dir_has_entry(kInternalCard, "apps.zip", nullptr)) {
        answer_quoted(response, "no apps package found");
        return RESULT_ERROR;
      }
      answer = "yes";
    }
    if (store_optr_flag(flag) != RESULT_OK) return RESULT_ERROR;
    return answer_quoted(response, answer);
  }
  if (text.size() != 2) return LOGGED_ERROR("optr flag error : %s", flag);
  if (store_optr_flag(flag) != RESULT_OK) return RESULT_ERROR;
  if (write_region_code(flag) != 0) return answer_region_failure(response);
  if (dir_has_entry(kInternalCard, "oem", flag) || dir_has_entry(kExternalCard, "oem", flag)) {
    ATCI_LOGD("need update package");
    return answer_quoted(response, "yes");
  }
  ATCI_LOGD("update nothing");
  return answer_quoted(response, "no");
}

}  // namespace

int find_release_name(const char* name) {
  UniqueFile file(dev_fopen(kReleaseNameList, "r"));
  if (!file) {
    ATCI_LOGE("Failed to open %s", kReleaseNameList);
    return -1;
  }
  char model[PROPERTY_VALUE_MAX];
  property_get("ro.pemu.product.model", model, "");
  // Without a model every line would "contain" it.
  if (model[0] == '\0') return -1;
  char line[128];
  bool listed = false;
  while (!listed && std::fgets(line, sizeof line, file.get()) != nullptr) {
    ATCI_LOGD("buf: %s", line);
    listed = std::strstr(line, model) != nullptr;
  }
  if (!listed) return -1;
  if (name == nullptr) return 0;
  while (std::fgets(line, sizeof line, file.get()) != nullptr) {
    ATCI_LOGD("buf: %s", line);
    cut_at_line_end(line);
    char* equals = std::strchr(line, '=');
    if (equals == nullptr || equals[1] == '\0') return -1;
    *equals = '\0';
    if (std::strcmp(line, "default") == 0) continue;
    if (std::strcmp(line, name) == 0) return 0;
  }
  return -1;
}

int write_region_code(const char* flag) {
  if (!is_region_product()) {
    ATCI_LOGD("return");
    return 0;
  }
  char adc_value[129];
  if (read_file_head("/sys/devs_list/mpps_value", adc_value, 128) < 0) {
    ATCI_LOGE("open error:%s", std::strerror(errno));
    return -1;
  }
  ATCI_LOGD("adc_value =%s", adc_value);
  const char* code = region_code_for(hardware_id(adc_value), flag);
  if (code == nullptr) {
    ATCI_LOGD("do nothing!");
    return 0;
  }
  kro_write_nv_info_req_msg_v01 req{};
  req.nvItem_id = kRegionCodeItem;
  req.buffer_valid = 1;
  std::strncpy(req.buffer, code, sizeof req.buffer - 1);
  kro_status_resp_msg_v01 resp{};
  qmi_kro_wait_record wait{};
  ATCI_LOGD("write nv65633:%s", code);
  const int ret = qmi_kro_write_nv_msg_ex(&req, sizeof req, QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01,
                                          &resp, sizeof resp, &wait);
  if (ret != 0 || wait.transp_err != 0 || resp.result != 0) {
    ATCI_LOGE("ret=%d, msg_id=%d, status=%d", ret, wait.msg_id, wait.transp_err);
    ATCI_LOGE("error=%d, result=%d", resp.error, resp.result);
    return -1;
  }
  return 0;
}

int optr_flag_handler(char* cmdline, int, char* response) {
  if (line_starts_with(cmdline, "AT+JVOPTR=1")) {
    const std::string_view flag = comma_field(cmdline, 1);
    if (flag.empty()) return LOGGED_ERROR("optr flag is NULL");
    char text[CMD_LINE_SIZE];
    copy_field(text, flag);
    return set_optr_flag(text, response);
  }
  if (line_is(cmdline, "AT+JVOPTR=0")) {
    ulda_nvram record;
    if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
    StoredFlag stored;
    read_stored_flag(record, stored);
    ATCI_LOGD("ulda_nvram.optr_flag: %s", stored);
    return answer_quoted(response, stored);
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int check_oem_handler(char* cmdline, int, char*) {
  if (!line_starts_with(cmdline, "AT+JVOEM=0")) return REJECT_COMMAND_LINE(cmdline);
  char oem_version[PROPERTY_VALUE_MAX];
  property_get("ro.oem.version", oem_version, "");
  ATCI_LOGD("===========ro.oem.version: %s", oem_version);
  if (oem_version[0] == '\0') return LOGGED_ERROR("oem version is null");
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  StoredFlag flag;
  read_stored_flag(record, flag);
  char customize[PROPERTY_VALUE_MAX];
  property_get("ro.product.customize.kro", customize, "");
  ATCI_LOGD("ro.product.customize.kro: %s", customize);
  if (customize[0] == '\0' || flag[0] == '\0') return RESULT_ERROR;
  if (strncasecmp(flag, customize, std::strlen(customize)) != 0) {
    ATCI_LOGD("not match");
    return RESULT_ERROR;
  }
  ATCI_LOGD("match");
  return RESULT_OK;
}
