#include "commands/power_reset.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string_view>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "commands/storage.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "minzip/app_version.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/ulda_nvram.h"

namespace {

constexpr const char* kRecoveryDir = "/cache/recovery";
constexpr const char* kRecoveryCommand = "/cache/recovery/command";
constexpr const char* kKeepList = "/sdcard/.clear_sdcard.cfg";
constexpr const char* kMissingKeepList = "\r\n\"SDcard missing .clear_sdcard.cfg file!\"\r\n";
constexpr const char* kUpdateReceiver = "com.ulda.engineermode/.UpdateSWReceiver";
constexpr const char* kUpdateAction = "android.flashOP.UpdateSW";
constexpr size_t kRecoveryTextMax = 255;

// The phone is about to go away: the station hears OK now or never. The update commands
// answer with a blank line before the word, the power commands without.
void early_answer_line(const char* cmdline) { write_early_answer(cmdline, "OK", true); }

void ensure_recovery_dir() {
  if (dev_access(kRecoveryDir, F_OK) != 0) run_sh_command("mkdir /cache/recovery");
}

// Recovery reads the command file at its next start.
void reboot_recovery() { run_sh_command("reboot recovery"); }

// Writes all of `data` over the start of the command file; the tail of a longer earlier
// command stays.
bool overwrite_recovery_command(const void* data, size_t size) {
  ensure_recovery_dir();
  UniqueFd file(dev_open(kRecoveryCommand, O_RDWR | O_CREAT, 0666));
  if (!file.ok()) {
    ATCI_LOGE("Failed to open /cache/recovery/command ");
    return false;
  }
  const ssize_t ret = ::write(file.get(), data, size);
  ATCI_LOGD("======ret = %d", static_cast<int>(ret));
  if (ret != static_cast<ssize_t>(size)) {
    ATCI_LOGE("write error: ret=%d", static_cast<int>(ret));
    return false;
  }
  return true;
}

int master_clear() {
  ensure_recovery_dir();
  {
    UniqueFd file(dev_open(kRecoveryCommand, O_WRONLY | O_CREAT | O_TRUNC, 0666));
    if (!file.ok()) return LOGGED_ERROR("fail to open /cache/recovery/command");
    // Recovery reads the terminating NUL too.
    static constexpr char kWipe[] = "--wipe_data";
    static_assert(sizeof kWipe == 12);
    if (::write(file.get(), kWipe, sizeof kWipe) != static_cast<ssize_t>(sizeof kWipe))
      return LOGGED_ERROR("fail to write /cache/recovery/command");
  }
  const int status = update_ulda_nvram("master_clear", [](ulda_nvram& r) {
    ATCI_LOGD("=======set ulda_nvram.master_clear_flag: %d,%d", r.adb_flag, 13);
    r.master_clear_flag = 13;
    r.master_clear_armed = 1;
    return true;
  });
  if (status != RESULT_OK) return status;
  write_early_answer("AT+JVRT=1", "OK");
  sleep_ms(3000);
  reboot_recovery();
  return RESULT_OK;
}

int install_operator_package(const char* cmdline, char* response) {
  const std::string_view name = comma_field(cmdline, 1);
  if (name.empty()) return RESULT_ERROR;
  char path[CMD_LINE_SIZE + 32];
  std::snprintf(path, sizeof path, "/storage/sdcard0/oem_%.*s.zip", static_cast<int>(name.size()),
                name.data());
  ATCI_LOGD("path = %s", path);
  if (dev_access(path, F_OK) != 0) {
    std::snprintf(response, RESPONSE_SIZE, "\r\n\"Package %s not found!\"\r\n", path);
    return RESULT_ERROR;
  }
  // A 199-character line leaves the command well under the writer's 255 characters.
  char command[kRecoveryTextMax + 64];
  std::snprintf(command, sizeof command, "--update_package=%s/mode=update_local", path);
  ATCI_LOGD("recovery_cmd = %s", command);
  // Stations have always read OK here, with nothing installed.
  if (write_recovery_command(command) != 0) return RESULT_OK;
  early_answer_line(cmdline);
  sleep_ms(2000);
  reboot_recovery();
  ATCI_LOGD("update oem");
  return RESULT_OK;
}

struct CardPackages {
  bool operator_package = false;
  bool apps = false;
};

CardPackages find_card_packages(const char* operator_name) {
  CardPackages found;
  UniqueDir dir(dev_opendir("/storage/sdcard0"));
  if (!dir) return found;
  while (const dirent* entry = ::readdir(dir.get())) {
    const std::string_view name(entry->d_name);
    // An empty operator would match every name with "oem" in it.
    if (*operator_name != '\0' && name.find("oem") != std::string_view::npos &&
        name.find(operator_name) != std::string_view::npos) {
      ATCI_LOGD("Upgrade package : %s", entry->d_name);
      found.operator_package = true;
    }
    if (name.find("apps.zip") != std::string_view::npos) found.apps = true;
  }
  return found;
}

bool app_version_matches(char* response) {
  if (isAppVersionMatched() == 0) return true;
  std::snprintf(response, RESPONSE_SIZE,
                "\r\nAPP version is not consistent with the software version!\r\n");
  return false;
}

int broadcast_update(const char* mode, const char* operator_name) {
  char extras[64];
  std::snprintf(extras, sizeof extras, "-e mode %s -e optr %s", mode, operator_name);
  sendBroadcastFromAtcid(kUpdateReceiver, kUpdateAction, extras);
  return RESULT_OK;
}

int update_apps_only(const char* cmdline, char* response) {
  if (!app_version_matches(response)) return RESULT_ERROR;
  ATCI_LOGD("update apps only");
  static constexpr char kUpdateApp[] = "--update_app";
  if (!overwrite_recovery_command(kUpdateApp, sizeof kUpdateApp - 1))
    return LOGGED_ERROR("======write the file fail");
  if (set_restore_flag() != 1 || clear_sdcard("update_app") != 1) return RESULT_ERROR;
  early_answer_line(cmdline);
  sleep_ms(3000);
  reboot_recovery();
  return RESULT_OK;
}

int update_from_card(const char* cmdline, bool with_restore, char* response) {
  ulda_nvram record;
  if (read_ulda_nvram("update_package_handler", record) != RESULT_OK) return RESULT_ERROR;
  char operator_name[sizeof record.optr_flag + 1] = {};
  std::memcpy(operator_name, record.optr_flag, sizeof record.optr_flag);
  ATCI_LOGD("get ulda_nvram.optr_flag=%s", operator_name);

  const CardPackages found = find_card_packages(operator_name);
  if (!found.operator_package && !found.apps) {
    std::snprintf(response, RESPONSE_SIZE, "\r\n\"Need oem or apps package!\"\r\n");
    return RESULT_ERROR;
  }
  if (dev_access(kKeepList, F_OK) != 0) {
    std::snprintf(response, RESPONSE_SIZE, "%s", kMissingKeepList);
    return RESULT_ERROR;
  }
  if (found.operator_package && found.apps) {
    if (!app_version_matches(response) || set_restore_flag() != 1) return RESULT_ERROR;
    ATCI_LOGD("update oem and apps");
    return broadcast_update("update_with_app", operator_name);
  }
  if (found.apps) return update_apps_only(cmdline, response);
  ATCI_LOGD("update oem only");
  if (!with_restore) {
    ATCI_LOGD("update oem without restore");
    return broadcast_update("update_local", operator_name);
  }
  if (set_restore_flag() != 1) return RESULT_ERROR;
  ATCI_LOGD("update oem with restore");
  return broadcast_update("update_with_clean", operator_name);
}

}  // namespace

int write_recovery_command(const char* text) {
  const size_t length = strnlen(text, kRecoveryTextMax);
  return overwrite_recovery_command(text, length) ? 0 : -1;
}

int set_restore_flag() {
  const int status = update_ulda_nvram(__func__, [](ulda_nvram& r) {
    r.master_clear_armed = 0;
    r.master_clear_flag = 256;
    return true;
  });
  if (status != RESULT_OK) return 0;
  property_set("persist.sys.is_kro_log", "0");
  ATCI_LOGD("stop krolog");
  return 1;
}

int jvgj_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVGJ=0")) return RESULT_ERROR;
  platform_sync();
  write_early_answer("AT+JVGJ=0", "OK");
  ATCI_LOGD("sync emmc flash complete! shutdown now.");
  sleep_ms(100);
  platform_power_off();
}

int jvreboot_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVREBOOT=1")) return REJECT_COMMAND_LINE(cmdline);
  platform_sync();
  ATCI_LOGD("sync emmc flash complete! shutdown now.");
  write_early_answer("AT+JVREBOOT=1", "OK");
  sleep_ms(150);
  platform_restart();
}

int jvrt_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVRT=1")) return master_clear();
  if (!line_is(cmdline, "AT+JVRT=0")) return REJECT_COMMAND_LINE(cmdline);
  return answer_record_int(__func__, response, &ulda_nvram::master_clear_flag);
}

int jvrtall_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVRTALL=1")) return REJECT_COMMAND_LINE(cmdline);
  if (dev_access(kKeepList, F_OK) != 0) {
    std::snprintf(response, RESPONSE_SIZE, "%s", kMissingKeepList);
    return RESULT_ERROR;
  }
  sendBroadcastFromAtcid(nullptr, "kro.intent.action.AT_RESTORE", nullptr);
  return RESULT_OK;
}

int jvupdate_handler(char* cmdline, int, char* response) {
  if (line_starts_with(cmdline, "AT+JVUPDATE=3"))
    return install_operator_package(cmdline, response);
  if (line_starts_with(cmdline, "AT+JVUPDATE=1")) return update_from_card(cmdline, false, response);
  if (line_starts_with(cmdline, "AT+JVUPDATE=2")) return update_from_card(cmdline, true, response);
  return REJECT_COMMAND_LINE(cmdline);
}
