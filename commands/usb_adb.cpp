#include "commands/usb_adb.h"

#include <dirent.h>
#include <fcntl.h>
#include <strings.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <memory>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "commands/worker.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/ulda_nvram.h"

namespace {

constexpr const char* kUsbConfig = "persist.sys.usb.config";
constexpr const char* kDebugUsbFunctions = "diag,serial_smd,serial_tty,rmnet_bam,mass_storage,adb";
constexpr const char* kUsbOnline = "/sys/class/power_supply/usb/online";
constexpr size_t kScratchSize = 2 * 1024 * 1024;

// One look at the cable: the pause before the next look in milliseconds, or 0 once it was
// pulled and the phone told to shut down. A node that cannot be read is looked at again after
// a second, so it never makes the watch spin.
unsigned look_at_usb_cable() {
  const WorkerCycle cycle;
  UniqueFd online(dev_open(kUsbOnline, O_RDONLY));
  if (!online.ok()) {
    ATCI_LOGE("fail to open online");
    return 1000;
  }
  char state[6];
  if (read_head(online.get(), state, 5) < 0) {
    ATCI_LOGE("fail to read online");
    return 1000;
  }
  ATCI_LOGD("usb online =%s", state);
  if (state[0] != '0') return 2000;
  ATCI_LOGD("power off");
  online.reset();
  sendBroadcastFromAtcid(nullptr, "kro.intent.action.AT_SHUT_DOWN", nullptr);
  return 0;
}

void check_usb_state_thread() {
  ATCI_LOGD("%s: Start", __func__);
  while (const unsigned pause = look_at_usb_cable()) sleep_ms(pause);
  ATCI_LOGD("========%s: Exit", __func__);
}

int open_debug_access() {
  int status = update_ulda_nvram("jvadb_handler", [](ulda_nvram& r) {
    r.adb_flag = 1;
    return true;
  });
  if (status != RESULT_OK) return status;
  if (write_file_to_data() != 0) return RESULT_ERROR;
  char platform[PROPERTY_VALUE_MAX];
  property_get("ro.pemu.product.platform", platform, "");
  ATCI_LOGD("ro.pemu.product.platform: %s", platform);
  char config[PROPERTY_VALUE_MAX];
  property_get(kUsbConfig, config, " ");
  if (strcasecmp(config, kDebugUsbFunctions) != 0) property_set(kUsbConfig, kDebugUsbFunctions);
  property_set("persist.sys.kroem", "1");
  return RESULT_OK;
}

}  // namespace

int write_file_to_data() {
  UniqueFd file(dev_open("/data/at_test", O_WRONLY | O_CREAT | O_TRUNC, 0666));
  if (!file.ok()) {
    ATCI_LOGE("=====open the file data/at_test fail");
    return -1;
  }
  // Only the write and the sync matter; the content does not.
  const std::unique_ptr<char[]> block(new char[kScratchSize]());
  [[maybe_unused]] const ssize_t written = ::write(file.get(), block.get(), kScratchSize);
  file.reset();
  platform_sync();
  dev_unlink("/data/at_test");
  return 0;
}

int close_adb(const char* cmdline) {
  ATCI_LOGD("==========entry close_adb()");
  const int status = update_ulda_nvram(__func__, [](ulda_nvram& r) {
    r.adb_flag = 0;
    return true;
  });
  if (status != RESULT_OK) return -1;
  if (write_file_to_data() != 0) {
    ATCI_LOGE("======write_file_to_data fail========");
    return -1;
  }
  ATCI_LOGD("===========check the ulda_nvram.adb_flag");
  if (poll_adb_flag_cleared() != 0) return -1;

  // The receiver listens for this spelling.
  sendBroadcastFromAtcid(nullptr, "android.intent.ACTION_AT_RESERT_NETWORK_MODE", nullptr);
  sleep_ms(1000);
  run_sh_command("rm -r /storage/sdcard0/ram_dump");
  property_set("persist.sys.dloadmode", "0");

  // Switching to charging removes the USB serial function and the port with it: the station
  // hears OK now or never.
  if (is_uart_flag == 0) write_early_answer(cmdline, "OK");

  property_set(kUsbConfig, "charging");
  ATCI_LOGD("close wifi");
  sendBroadcastFromAtcid(nullptr, "android.intent.action.RESTART_ATCID", "--ei em 4");
  run_sh_command("rm /cache/recovery/last_ssid_pwd");
  return 1;
}

int jvadb_handler(char* cmdline, int, char* response) {
  char line[100];
  std::snprintf(line, sizeof line, "%s", cmdline);

  if (line_is(line, "AT+JVADB=1")) return open_debug_access();
  if (line_is(line, "AT+JVADB=2")) {
    ulda_nvram record;
    // A failed read answers OK with an empty body; stations rely on it.
    if (read_ulda_nvram(__func__, record) == RESULT_OK)
      std::snprintf(response, RESPONSE_SIZE, "\n\"%d\"\r\n", record.adb_flag);
    return RESULT_OK;
  }
  if (line_is(line, "AT+JVADB=0,0")) {
    const bool closed = close_adb(line) == 1;
    ATCI_LOGD("=====only close adb");
    return result_of(closed);
  }
  if (line_is(line, "AT+JVADB=0,1")) {
    if (close_adb(line) != 1) return LOGGED_ERROR("===== close adb fail");
    ATCI_LOGD("===== close adb success");
    sendBroadcastFromAtcid(nullptr, "kro.intent.action.AT_SHUT_DOWN", nullptr);
    return RESULT_OK;
  }
  if (line_is(line, "AT+JVADB=0,2")) {
    if (close_adb(line) != 1) return RESULT_ERROR;
    platform_sync();
    sleep_ms(100);
    ATCI_LOGD("=====reboot after close adb");
    platform_restart();
  }
  if (line_is(line, "AT+JVADB=0,3")) {
    if (close_adb(line) != 1) return RESULT_ERROR;
    return result_of(start_worker(nullptr, check_usb_state_thread, true) == 0);
  }
  return REJECT_COMMAND_LINE(line);
}

int jvdiag_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVDIAG=0")) return REJECT_COMMAND_LINE(cmdline);
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  return result_of(record.adb_flag == 1);
}

int jvcom_handler(char* cmdline, int, char*) {
  struct Mode {
    const char* variant;
    const char* functions;
  };
  static constexpr Mode kModes[] = {
      {"AT+JVCOM=1,DIAG", "diag,adb"},
      {"AT+JVCOM=1,ADB", "adb"},
      {"AT+JVCOM=1,NMEA", "serial_smd,serial_tty"},
  };
  for (const Mode& m : kModes) {
    if (line_is(cmdline, m.variant)) {
      property_set(kUsbConfig, m.functions);
      return RESULT_OK;
    }
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int omenu_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+OMENU=0,1")) {
    sendBroadcastFromAtcid(nullptr, "kro.intent.action.CHANGE_USBMASS", "-e status 0");
    return RESULT_OK;
  }
  if (!line_is(cmdline, "AT+OMENU=1,1")) return REJECT_COMMAND_LINE(cmdline);
  // Mass storage of an empty card would show the station nothing to check.
  bool has_entry = false;
  if (UniqueDir dir(dev_opendir("/storage/sdcard0")); dir) {
    while (const dirent* entry = ::readdir(dir.get())) {
      if (std::strcmp(entry->d_name, ".") != 0 && std::strcmp(entry->d_name, "..") != 0) {
        has_entry = true;
        break;
      }
    }
  }
  if (!has_entry) return RESULT_ERROR;
  sendBroadcastFromAtcid(nullptr, "kro.intent.action.CHANGE_USBMASS", "-e status 1");
  return RESULT_OK;
}
