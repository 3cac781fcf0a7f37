#include "commands/factory_flags.h"

#include <strings.h>

#include <charconv>
#include <cstdint>
#include <cstdio>
#include <string_view>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "commands/usb_adb.h"
#include "commands/worker.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "services/factory_support.h"
#include "services/qmi_client.h"
#include "services/ulda_nvram.h"

std::atomic<bool> root_integrity_check_running{false};

namespace {

// Decimal digits only, within int32.
bool parse_digits(std::string_view text, int32_t& value) {
  return all_digits(text) &&
         std::from_chars(text.data(), text.data() + text.size(), value).ec == std::errc{};
}

// A 32-bit mask in decimal; bit 31 included.
bool parse_mask(std::string_view text, uint32_t& mask) {
  if (text.empty()) return false;
  const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), mask);
  return ec == std::errc{} && end == text.data() + text.size();
}

// "=1,<digits>" stores the number in the field.
int store_digits(const char* caller, const char* cmdline, int32_t ulda_nvram::*field) {
  const std::string_view param = comma_field(cmdline, 1);
  int32_t value = 0;
  if (!parse_digits(param, value))
    return LOGGED_ERROR("====this at wall paper id invalid:%.*s", static_cast<int>(param.size()),
                        param.data());
  return update_ulda_nvram(caller, [&](ulda_nvram& r) {
    r.*field = value;
    ATCI_LOGD("=======set ulda_nvram field: %d", value);
    return true;
  });
}

bool boot_completed() {
  char bootanim[PROPERTY_VALUE_MAX];
  char completed[PROPERTY_VALUE_MAX];
  property_get("init.svc.bootanim", bootanim, "");
  property_get("sys.boot_completed", completed, "");
  ATCI_LOGD("bootanim=%s,boot_completed=%s", bootanim, completed);
  return strcasecmp(bootanim, "stopped") == 0 && strcasecmp(completed, "1") == 0;
}

void root_integrity_check_thread() {
  {
    const WorkerCycle cycle;
    ATCI_LOGD("%s: Start", __func__);
    dev_unlink("/data/rooIntegityCheck.txt");
    int ret = run_sh_command("richk > data/rooIntegityCheck.txt");
    ATCI_LOGD("ret%d", ret);
    ret = run_sh_command("chmod 666 /data/rooIntegityCheck.txt");
    ATCI_LOGD("ret%d", ret);
  }
  root_integrity_check_running.store(false, std::memory_order_release);
}

// Sets the log switch and checks that it took.
int set_kro_log(const char* value) {
  property_set("persist.sys.is_kro_log", value);
  char read_back[PROPERTY_VALUE_MAX];
  property_get("persist.sys.is_kro_log", read_back, "");
  return result_of(strcasecmp(read_back, value) == 0);
}

constexpr const char* kLogCaptures[] = {
    "cat /proc/kmsg > /data/log.txt&",
    "logcat -v time > /data/adb.txt&",
};

// Kernel debug output of the audio codec and power management; the log captures follow.
constexpr const char* kDebugLogCommands[] = {
    "echo file wcd9320.c +p > /d/dynamic_debug/control",
    "echo file wcd9xxx-common.c +p > /d/dynamic_debug/control",
    "echo file wcd9xxx-mbhc.c +p > /d/dynamic_debug/control",
    "echo file wcd9xxx-core.c +p > /d/dynamic_debug/control",
    "echo file soc-dapm.c +p > /d/dynamic_debug/control",
    "echo 0x21 > /sys/module/pm_8x60/parameters/debug_mask ",
    "echo 1 > /sys/kernel/debug/clk/debug_suspend",
    "echo 1 > /sys/module/msm_show_resume_irq/parameters/debug_mask",
};

}  // namespace

int jvcn_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVCN=0")) return RESULT_ERROR;
  if (!boot_completed()) return RESULT_ERROR;
  return update_ulda_nvram(__func__, [](ulda_nvram& r) {
    r.is_jvsn_ok = 1;
    ATCI_LOGD("=====set iulda_nvram.is_jvsn_ok: %d", r.is_jvsn_ok);
    return true;
  });
}

int jvmmiui_handler(char* cmdline, int, char* response) {
  if (line_starts_with(cmdline, "AT+JVMMIUI=1"))
    return store_digits(__func__, cmdline, &ulda_nvram::wallpaper_id);
  if (line_is(cmdline, "AT+JVMMIUI=0"))
    return answer_record_int(__func__, response, &ulda_nvram::wallpaper_id);
  return REJECT_COMMAND_LINE(cmdline);
}

int jvroot_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVROOT=2"))
    return answer_record_int(__func__, response, &ulda_nvram::is_root);
  if (!line_is(cmdline, "AT+JVROOT=0")) return REJECT_COMMAND_LINE(cmdline);
  const int status = update_ulda_nvram(__func__, [](ulda_nvram& r) {
    property_set("persist.sys.is_root", "0");
    r.is_root = 0;
    return true;
  });
  if (status != RESULT_OK) return status;
  return result_of(write_file_to_data() == 0);
}

int jv3g_handler(char* cmdline, int, char* response) {
  if (line_starts_with(cmdline, "AT+JV3G=1"))
    return store_digits(__func__, cmdline, &ulda_nvram::nomal_3g);
  if (!line_is(cmdline, "AT+JV3G=0")) return REJECT_COMMAND_LINE(cmdline);
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  char value[PROPERTY_VALUE_MAX];
  property_get("sys.pemu.3g.nomal", value, "");
  ATCI_LOGD("============getprop:%s,ulda_nvram.nomal_3g:%d", value, record.nomal_3g);
  // An unset property reads as 0, as atoi reads it.
  if (parse_long(value) != record.nomal_3g)
    return LOGGED_ERROR("========getprop != ulda_nvram.nomal_3g");
  return answer_quoted_int(response, record.nomal_3g);
}

int jvfeature_handler(char* cmdline, int, char* response) {
  const bool set = line_starts_with(cmdline, "AT+JVFEATURE=1");
  if (!set && !line_starts_with(cmdline, "AT+JVFEATURE=0")) return REJECT_COMMAND_LINE(cmdline);
  uint32_t mask = 0;
  if (!parse_mask(comma_field(cmdline, 1), mask)) return RESULT_ERROR;
  if (set) {
    return update_ulda_nvram(__func__, [mask](ulda_nvram& r) {
      r.special_feature = static_cast<int32_t>(static_cast<uint32_t>(r.special_feature) | mask);
      ATCI_LOGD("===set ulda_nvram.specal_feature: %d", r.special_feature);
      return true;
    });
  }
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  ATCI_LOGD("==ulda_nvram.special_feature:%d", record.special_feature);
  return answer_quoted_int(
      response, static_cast<int32_t>(mask & static_cast<uint32_t>(record.special_feature)));
}

int jvtestmmi_handler(char* cmdline, int, char*) {
  const std::string_view order = comma_field(cmdline, 1);
  if (order.empty()) return RESULT_ERROR;
  ATCI_LOGD(" order=%.*s", static_cast<int>(order.size()), order.data());
  char text[sizeof ulda_nvram{}.test_order + 1];
  copy_field(text, order);
  bool written_back = false;
  const int status = update_ulda_nvram(__func__, [&](ulda_nvram& r) {
    set_ulda_string(r.test_order, text);
    ATCI_LOGD(" ulda_nvram.test_order=%.100s", r.test_order);
    written_back = true;
    return true;
  });
  // A failed write leaves the station without any answer, as it always has.
  if (status != RESULT_OK && written_back) return RESULT_DONE;
  return status;
}

int jvkj_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVKJ=1")) return RESULT_ERROR;
  bool idle = false;
  if (!root_integrity_check_running.compare_exchange_strong(idle, true)) return RESULT_OK;
  if (start_worker(nullptr, root_integrity_check_thread, true) == 0) return RESULT_OK;
  root_integrity_check_running.store(false);
  return RESULT_ERROR;
}

int jvdl_handler(char* cmdline, int, char*) {
  ATCI_LOGD("%s", cmdline);
  return result_of(line_is(cmdline, "AT+JVDL=1"));
}

int jvnc_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVNC=1")) return REJECT_COMMAND_LINE(cmdline);
  ATCI_LOGD("%s start", __func__);
  ATCI_LOGD("%s end with OK", __func__);
  return RESULT_OK;
}

int jvlog_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVLOG=1")) return REJECT_COMMAND_LINE(cmdline);
  for (const char* capture : kLogCaptures) run_shell(capture);
  return RESULT_OK;
}

int jvefs_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVEFS=1")) return RESULT_ERROR;
  const kro_int_req_msg_v01 request{0};
  QmiResult result;
  if (qmi_efs_golden_copy(nullptr, nullptr, &request, &result) != 0) return RESULT_ERROR;
  ATCI_LOGD("return_buffer: %s", result.text);
  return result_of(std::string_view(result.text) == "0");
}

int jvrdnv_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVRDNV=0")) return REJECT_COMMAND_LINE(cmdline);
  ulda_nvram record;
  if (get_ULDA_NV_item(&record) != 0)
    return LOGGED_ERROR("===system_init_flag_on_handler read nvram fail");
  return answer_quoted_int(response, record.is_jvsn_ok);
}

int jvqlog_handler(char* cmdline, int, char* response) {
  struct Switch {
    const char* variant;
    const char* value;
  };
  static constexpr Switch kSwitches[] = {
      {"AT+JVQLOG=0", "0"}, {"AT+JVQLOG=1,1", "1"}, {"AT+JVQLOG=1,2", "2"}};
  for (const Switch& s : kSwitches)
    if (line_is(cmdline, s.variant)) return set_kro_log(s.value);
  if (!line_is(cmdline, "AT+JVQLOG=1,3")) return REJECT_COMMAND_LINE(cmdline);
  char value[PROPERTY_VALUE_MAX];
  property_get("persist.sys.is_kro_log", value, " ");
  ATCI_LOGD("======getprop:%s", value);
  std::snprintf(response, RESPONSE_SIZE, "\"%s\"\r\n", value);
  return RESULT_OK;
}

int jvlogat_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVLOGAT=1")) return REJECT_COMMAND_LINE(cmdline);
  for (const char* command : kDebugLogCommands) run_sh_command("%s", command);
  for (const char* capture : kLogCaptures) run_sh_command("%s", capture);
  property_set("com.pemu.atlog", "1");
  return RESULT_OK;
}

int jvsyjm_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVSYJM=1")) return RESULT_ERROR;
  char version[PROPERTY_VALUE_MAX];
  property_get("ro.pemu.rom.version", version, "");
  ATCI_LOGD("getprop ro.pemu.rom.version : %s", version);
  if (strcasecmp(version, "rom_1.0") == 0 || strcasecmp(version, "rom_1.5") == 0)
    return RESULT_ERROR;
  const int val = isSetupwizardDisabled();
  ATCI_LOGD("val = %d", val);
  return result_of(val != 2);
}

int jvg3g_handler(char*, int, char*) { return RESULT_ERROR; }

int jvqhzs_handler(char* cmdline, int, char*) {
  ATCI_LOGD("%s start", __func__);
  ATCI_LOGD("%s", cmdline);
  return RESULT_ERROR;
}
