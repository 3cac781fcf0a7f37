#include "commands/amplifier.h"

#include <climits>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "commands/command_util.h"
#include "commands/device_info.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"

namespace {

// The shell texts of one amplifier family's calibration.
struct AmplifierFamily {
  const char* calibrate;    // starts the calibration
  const char* save_status;  // keeps the amplifier's status in the result file
  const char* read_log;     // what the result read logs
  const char* read_result;  // keeps the calibration register in the result file
  const char* finish;       // ends the calibration
};

constexpr AmplifierFamily kTfa9890{
    R"(echo "3" > /d/tfa9890/calibrate)",
    "cat /d/tfa9890/current_status > /data/AmplifierCal",
    "cat /d/tfa9890/current_status",
    "cat /d/tfa9890/codec_reg | grep reg{80}> /data/AmplifierCal",
    R"(echo "2" > /d/tfa9890/calibrate)",
};
constexpr AmplifierFamily kTfa98xx{
    R"(echo "3" > /d/tfa98xx/calibrate)",
    "cat /d/tfa98xx/current_status > /data/AmplifierCal",
    "cat /d/tfa98xx/current_status",
    "cat /d/tfa98xx/codec_reg | grep reg{0080}> /data/AmplifierCal",
    R"(echo "8" > /d/tfa98xx/calibrate)",
};

constexpr const char* kResultFile = "/data/AmplifierCal";
constexpr size_t kResultRead = 100;

// The calibration steps log untagged, without the call-site prefix.
#define AMP_LOG(fmt, ...) atci_log_untagged(LOG_LVL_DEBUG, fmt __VA_OPT__(, ) __VA_ARGS__)

const AmplifierFamily& family_of_model() {
  return is_product_model("QM0304A") || is_product_model("QM0304F_EX") ? kTfa98xx : kTfa9890;
}

int start_calibration(const AmplifierFamily& family) {
  AMP_LOG("%s", family.calibrate);
  int result = run_sh_command("%s", family.calibrate);
  if (sh_command_failed(result)) {
    AMP_LOG("==%s fail!", family.calibrate);
    return result;
  }
  result = run_sh_command("%s", family.save_status);
  if (sh_command_failed(result)) {
    atci_log_untagged(LOG_LVL_ERR, "==current_status");
    return result;
  }
  return 0;
}

// 1 calibrated, 0 not, -1 when the register cannot be read.
int read_calibration(const AmplifierFamily& family) {
  AMP_LOG("%s", family.read_log);
  if (sh_command_failed(run_sh_command("%s", family.read_result))) {
    AMP_LOG("===========sent command fial =====\r\n");
    return -1;
  }
  UniqueFd fd(dev_open(kResultFile, O_RDONLY));
  // Only descriptor 0 counts as an open failure; -1 fails at the read.
  if (fd.get() == 0) {
    AMP_LOG("/data/AmplifierCal open error\r\n");
    return -1;
  }
  char text[kResultRead + 1];
  if (read_head(fd.get(), text, kResultRead) == -1) {
    AMP_LOG("/data/AmplifierCal read error\r\n");
    return -1;
  }
  AMP_LOG("==AmplifierCal:%s\r\n", text);
  const char* colon = std::strchr(text, ':');
  if (colon == nullptr) return -1;
  const int value = static_cast<int>(parse_long(colon + 1));
  AMP_LOG("==ret:%d\r\n", value);
  return (value >> 1) & 1;
}

int finish_calibration(const AmplifierFamily& family) {
  AMP_LOG("%s", family.finish);
  const int result = run_sh_command("%s", family.finish);
  if (sh_command_failed(result)) {
    AMP_LOG("==%s fail!", family.finish);
    return result;
  }
  return 0;
}

// ---- AT+JVAUDIO

constexpr char kDebugDir[] = "/d";
constexpr size_t kChildPathSize = sizeof kDebugDir + 1 + NAME_MAX;  // "/d/NAME"
constexpr size_t kStatusRead = 128;
constexpr std::string_view kClosing = "\"\r\n";

// The first failure opens the quoted list; a token that would leave no room for the closing
// quote is dropped.
void add_failure(char* response, std::string_view token, bool* first_failure) {
  const std::string_view lead = *first_failure ? "\r\n\"ERROR: " : ", ";
  if (std::strlen(response) + lead.size() + token.size() + kClosing.size() > BODY_LIMIT) return;
  body_append(response, lead);
  body_append(response, token);
  *first_failure = false;
}

// Checks the "i2c" status file of one device directory. False when it cannot be opened.
bool check_device(const char* dir_path, char* response, bool* first_failure) {
  UniqueDir dir(dev_opendir(dir_path));
  if (!dir) return true;
  while (const dirent* entry = ::readdir(dir.get())) {
    if (std::strcmp(entry->d_name, "i2c") != 0) continue;
    char path[kChildPathSize + 4];
    std::snprintf(path, sizeof path, "%s/i2c", dir_path);
    ATCI_LOGD("i2c device : %s\r\n", path);
    UniqueFd fd(dev_open(path, O_RDONLY));
    if (fd.get() < 1) {
      ATCI_LOGE("failed to open %s\r\n", path);
      return false;
    }
    char status[kStatusRead + 1];
    if (read_head(fd.get(), status, kStatusRead) < 0) continue;
    if (std::strstr(status, "ERROR") == nullptr) continue;
    std::string_view rest(status);
    const std::string_view token = next_token(rest, " ");  // the status up to its first space
    if (!token.empty()) add_failure(response, token, first_failure);
  }
  return true;
}

}  // namespace

int smart_speaker_Amplifier_calibrate_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("===========cmdline %s\r\n", cmdline);
  if (line_is(cmdline, "AT+ZNGF=0")) return result_of(start_calibration(family_of_model()) == 0);
  if (line_is(cmdline, "AT+ZNGF=2")) {
    const int calibrated = read_calibration(family_of_model());
    if (calibrated < 0) return RESULT_ERROR;
    std::snprintf(response, RESPONSE_SIZE, "\r\n%d\r\n", calibrated);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+ZNGF=3")) return result_of(finish_calibration(family_of_model()) == 0);
  return LOGGED_ERROR("===========sent command fial =====\r\n");
}

int i2c_device_test_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("===========cmdline %s\r\n", cmdline);
  if (!line_starts_with(cmdline, "AT+JVAUDIO=1")) return RESULT_ERROR;
  bool first_failure = true;
  // "/d" is the phone's debugfs link: a device path, resolved in the device's root.
  UniqueDir debug(dev_opendir(kDebugDir));
  while (debug) {
    const dirent* entry = ::readdir(debug.get());
    if (entry == nullptr) break;
    if (std::strcmp(entry->d_name, ".") == 0 || std::strcmp(entry->d_name, "..") == 0) continue;
    char child[kChildPathSize];
    std::snprintf(child, sizeof child, "%s/%s", kDebugDir, entry->d_name);
    struct stat st {};
    const bool is_dir = dev_stat(child, &st) == 0 && S_ISDIR(st.st_mode);
    ATCI_LOGD("childPath = %s\r\n", child);
    if (!is_dir) continue;
    if (!check_device(child, response, &first_failure)) {
      response[0] = '\0';
      return RESULT_ERROR;
    }
  }
  if (first_failure) {
    std::snprintf(response, RESPONSE_SIZE, "\r\n\"OK\"\r\n");
  } else {
    body_append(response, kClosing);
  }
  return RESULT_OK;
}
