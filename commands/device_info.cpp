#include "commands/device_info.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <strings.h>
#include <unistd.h>

#include "commands/command_util.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"

namespace {

constexpr const char* kMppsValue = "/sys/devs_list/mpps_value";

// A query that answers one value read from one kernel file.
enum class Extract {
  kFirstLine,  // fgets into `limit` bytes, cut at the first CR or LF
  kHead,       // the first `limit` bytes as they are, line end included
};

struct FileQuery {
  const char* variant;
  const char* path;
  size_t limit;
  Extract extract;
};

constexpr size_t kFirstLineSize = 50;
constexpr size_t kMaxQueryRead = 256;

constexpr FileQuery kLcmId{"AT+JVLCMID=0", "/sys/lcm/lcm_id", kFirstLineSize, Extract::kFirstLine};
constexpr FileQuery kPanelModuleId{"AT+JVPID=0", "/sys/touchscreen/firmware_module_id",
                                   kFirstLineSize, Extract::kFirstLine};
constexpr FileQuery kPanelIc{"AT+JVCKIC=0", "/sys/touchscreen/touchpanel_devices", 10,
                             Extract::kHead};
constexpr FileQuery kMpps{"AT+JVMPPS=0", kMppsValue, 200, Extract::kHead};
// Relative paths: they resolve against the working directory, as on the phone.
constexpr FileQuery kFrontCamera{"AT+JVCCMID=0", "sys/ccm/FrontSensorId", kFirstLineSize,
                                 Extract::kFirstLine};
constexpr FileQuery kRearCamera{"AT+JVCCMID=0", "sys/ccm/RearSensorId", kFirstLineSize,
                                Extract::kFirstLine};

// `value` holds kMaxQueryRead + 1 bytes. An empty file counts as unreadable.
bool read_query_value(const FileQuery& query, char* value) {
  static_assert(kFirstLineSize <= kMaxQueryRead && 200 <= kMaxQueryRead);
  if (query.extract == Extract::kHead) return read_file_value(query.path, value, query.limit);
  if (read_first_line(query.path, value, query.limit) <= 0) {
    ATCI_LOGE("cannot read %s", query.path);
    return false;
  }
  cut_at_line_end(value);
  return true;
}

int answer_file_query(const FileQuery& query, const char* cmdline, char* response) {
  if (!line_is(cmdline, query.variant)) return REJECT_COMMAND_LINE(cmdline);
  char value[kMaxQueryRead + 1];
  if (!read_query_value(query, value)) return RESULT_ERROR;
  return answer_quoted(response, value);
}

// readFromFile's contract: callers pass 100 and use only the sign of the result.
constexpr int kSmallFileSize = 100;

bool read_small_file(const char* path, char (&buf)[kSmallFileSize + 1]) {
  std::memset(buf, 0, sizeof buf);
  if (readFromFile(path, buf, kSmallFileSize) < 0) {
    ATCI_LOGE("readFromFile %s fail", path);
    return false;
  }
  return true;
}

// Dual-SIM phones report both slots in "gsm.sim.state" as "slot1,slot2"; others have a
// property per slot. Fields are positional: ",READY" leaves slot 1 empty.
struct SimSlots {
  char states[PROPERTY_VALUE_MAX];
  char states2[PROPERTY_VALUE_MAX];
  std::string_view slot[2];
};

void read_sim_slots(SimSlots& sim, const char* fallback) {
  property_get("gsm.sim.state", sim.states, fallback);
  const std::string_view all(sim.states);
  const size_t comma = all.find(',');
  if (comma != std::string_view::npos) {
    sim.slot[0] = all.substr(0, comma);
    const std::string_view rest = all.substr(comma + 1);
    sim.slot[1] = rest.substr(0, rest.find(','));
    return;
  }
  property_get("gsm.sim.state.2", sim.states2, fallback);
  sim.slot[0] = all;
  sim.slot[1] = sim.states2;
}

}  // namespace

bool sim_state_present(std::string_view state) {
  static constexpr std::string_view kPresentSimStates[] = {
      "PIN_REQUIRED", "PUK_REQUIRED",  "NETWORK_LOCKED", "READY",
      "NOT_READY",    "PERM_DISABLED", "CARD_IO_ERROR",  "PERSO_LOCKED",
  };
  for (std::string_view present : kPresentSimStates)
    if (state == present) return true;
  return false;
}

int is_product_model(const char* model) {
  char value[PROPERTY_VALUE_MAX];
  property_get("ro.pemu.product.model", value, "");
  return std::strcmp(value, model) == 0 ? 1 : 0;
}

int jvmodel_handler(char* cmdline, int, char* response) {
  if (!line_starts_with(cmdline, "AT+JVMODEL=0")) return REJECT_COMMAND_LINE(cmdline);
  char model[PROPERTY_VALUE_MAX];
  property_get("ro.product.model", model, "");
  return answer_quoted(response, model);
}

int jvram_handler(char* cmdline, int, char* response) {
  if (!line_starts_with(cmdline, "AT+JVRAM=0")) return REJECT_COMMAND_LINE(cmdline);
  char line[kFirstLineSize];
  if (read_first_line("/proc/meminfo", line, sizeof line) <= 0)
    return LOGGED_ERROR("cannot read /proc/meminfo");
  std::string_view rest(line);
  constexpr std::string_view kBlanks = " \t\r\n";
  const std::string_view name = next_token(rest, kBlanks);
  const std::string_view size_kb = next_token(rest, kBlanks);
  if (name.find("MemTotal") == std::string_view::npos || size_kb.empty())
    return LOGGED_ERROR("no MemTotal in: %s", line);
  return answer_quoted_int(response, static_cast<int>(parse_long(size_kb) / 1024));
}

int jvfq_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVFQ=0")) return REJECT_COMMAND_LINE(cmdline);
  char sectors[kSmallFileSize + 1];
  if (!read_small_file("sys/class/block/mmcblk0/size", sectors)) return RESULT_ERROR;
  // 512-byte sectors in gigabytes.
  const double gigabytes = static_cast<double>(parse_long(sectors)) * 4.76837158203125e-7;
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%.2f\"\r\n", gigabytes);
  return RESULT_OK;
}

int jvrid_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVRID=1")) return REJECT_COMMAND_LINE(cmdline);
  // 32 hex digits; the line end after them is not read.
  char cid[33];
  if (read_file_head("/sys/block/mmcblk0/device/cid", cid, 32) < 0)
    return LOGGED_ERROR("cannot open the card identity");
  return answer_quoted(response, cid);
}

int jvcpuid_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVCPUID=1")) return REJECT_COMMAND_LINE(cmdline);
  char serial[kMaxQueryRead + 1];
  if (!read_file_value("/proc/sec_serial_num", serial)) return RESULT_ERROR;
  const bool hex_prefix = std::strncmp(serial, "0x", 2) == 0;
  return answer_quoted(response, hex_prefix ? serial + 2 : serial);
}

int jvseboot_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVSEBOOT=1")) return REJECT_COMMAND_LINE(cmdline);
  char state[41];
  if (!read_file_value("/proc/sec_enable", state)) return RESULT_ERROR;
  return result_of(strcasecmp(state, "0x00303030") == 0);
}

int jvbbtype_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVBBTYPE=0")) return REJECT_COMMAND_LINE(cmdline);
  char line[128];
  if (read_first_line(kMppsValue, line, sizeof line) <= 0)
    return LOGGED_ERROR("cannot read %s", kMppsValue);
  const std::string_view text(line);
  if (text.find("cpu") == std::string_view::npos) return RESULT_ERROR;
  // The first test that holds decides, so a loose "AB" beats a strict "cpu--AA". Each strict
  // "cpu--XX" test is implied by the loose "XX" test that follows it, so only these remain.
  struct Variant {
    std::string_view mark;
    const char* chip;
  };
  static constexpr Variant kVariants[] = {
      {"AB", "8974AB"}, {"AC", "8974AC"}, {"AA", "8974AA"},
      {"26", "8926"},   {"28", "8928"},   {"cpu-16", "8916"},
  };
  for (const Variant& variant : kVariants)
    if (text.find(variant.mark) != std::string_view::npos) return answer_quoted(response, variant.chip);
  return LOGGED_ERROR("unknown processor variant: %s", line);
}

int jvmpps_handler(char* cmdline, int, char* response) {
  return answer_file_query(kMpps, cmdline, response);
}

int jvlcmid_handler(char* cmdline, int, char* response) {
  return answer_file_query(kLcmId, cmdline, response);
}

int jvpid_handler(char* cmdline, int, char* response) {
  return answer_file_query(kPanelModuleId, cmdline, response);
}

int jvckic_handler(char* cmdline, int, char* response) {
  return answer_file_query(kPanelIc, cmdline, response);
}

int jvccmid_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, kFrontCamera.variant)) return REJECT_COMMAND_LINE(cmdline);
  char front[kMaxQueryRead + 1];
  char rear[kMaxQueryRead + 1];
  if (!read_query_value(kFrontCamera, front) || !read_query_value(kRearCamera, rear))
    return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"front:%s\r\nback:%s\"\r\n ", front, rear);
  return RESULT_OK;
}

int jvtwst_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVTWST=0")) return REJECT_COMMAND_LINE(cmdline);
  char build[PROPERTY_VALUE_MAX];
  char model[PROPERTY_VALUE_MAX];
  property_get("ro.build.version.kro", build, " ");
  property_get("ro.product.model.kro", model, "QT0102");
  if (std::strcmp(build, " ") == 0 || std::strcmp(model, " ") == 0)
    return LOGGED_ERROR("build version or model not set");
  char firmware[11];
  if (!read_file_value("/sys/touchscreen/firmware_version", firmware)) return RESULT_ERROR;
  firmware[std::strcspn(firmware, "\n")] = '\0';
  // A cut answer would lose its closing quote: refuse it rather than send it.
  constexpr size_t kAnswerLimit = 100;
  const int length = std::snprintf(response, kAnswerLimit, "\"%s_%s\"\n", build, firmware);
  if (length < 0 || static_cast<size_t>(length) >= kAnswerLimit) {
    response[0] = '\0';
    return RESULT_ERROR;
  }
  return RESULT_OK;
}

int jvdcid_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVDCID=1")) return REJECT_COMMAND_LINE(cmdline);
  char text[257];
  if (!read_file_value("/sys/class/power_supply/cms/power_avg", text)) return RESULT_ERROR;
  // Zero is the identity of an approved battery.
  const auto value = static_cast<uint32_t>(std::strtoull(text, nullptr, 16));
  return result_of(value == 0);
}

int jvusb_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVUSB=0")) return REJECT_COMMAND_LINE(cmdline);
  char text[6];
  if (!read_file_value("sys/class/power_supply/usb/power_now", text)) return RESULT_ERROR;
  const long protocol = parse_long(text);
  return answer_quoted_int(response, protocol == 3 ? 2 : protocol == 5 ? 3 : 0);
}

int jvsim_handler(char* cmdline, int, char*) {
  int slot;
  if (line_is(cmdline, "AT+JVSIM=1"))
    slot = 0;
  else if (line_is(cmdline, "AT+JVSIM=2"))
    slot = 1;
  else
    return REJECT_COMMAND_LINE(cmdline);
  SimSlots sim;
  read_sim_slots(sim, " ");
  return result_of(sim_state_present(sim.slot[slot]));
}

int jvcard_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVCARD=1")) return RESULT_OK;  // not an error for this command
  SimSlots sim;
  read_sim_slots(sim, "ABSENT");
  auto inserted = [&](int slot) {
    return sim_state_present(sim.slot[slot]) &&
           sim.slot[slot].find("ABSENT") == std::string_view::npos;
  };
  const bool memory_card = dev_access("/storage/sdcard1", W_OK) == 0;
  std::snprintf(response, RESPONSE_SIZE, "+cards:\"%s\",\"%s\",\"%s\"", inserted(0) ? "SIM1" : "",
                inserted(1) ? "SIM2" : "", memory_card ? "TF" : "");
  return RESULT_OK;
}

int jvts_handler(char* cmdline, int, char* response) {
  const char* path;
  if (line_is(cmdline, "AT+JVTS=1"))
    path = "/sys/devs_list/card_slot_inserted_check";
  else if (line_is(cmdline, "AT+JVTS=0"))
    path = "/sys/devs_list/card_slot_removed_check";
  else
    return REJECT_COMMAND_LINE(cmdline);
  UniqueFile file(dev_fopen(path, "r"));
  if (!file) return LOGGED_ERROR("cannot open %s", path);
  char line[128];
  char piece[sizeof line + 4];
  while (std::fgets(line, sizeof line, file.get()) != nullptr) {
    const int length = std::snprintf(piece, sizeof piece, "\r\n%s\r\n", line);
    if (!body_append(response, std::string_view(piece, static_cast<size_t>(length)))) break;
  }
  return RESULT_BODY_ONLY;
}

int jvhall_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVHALL=1")) return REJECT_COMMAND_LINE(cmdline);
  char state[kSmallFileSize + 1];
  if (!read_small_file("/sys/class/switch/hall/state", state)) return RESULT_ERROR;
  // 1: no magnet in front of the sensor.
  return result_of(parse_long(state) != 1);
}

int jvzwsb_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVZWSB=0")) {
    const char* answer = sendMessage("check_board");
    return result_of(answer != nullptr && std::strcmp(answer, "0") == 0);
  }
  if (line_is(cmdline, "AT+JVZWSB=1")) {
    // The station reads the image quality elsewhere; this answer is fixed.
    sendBroadcastFromAtcid(nullptr, "android.intent.action.FP_IMAGE_QUALITY", nullptr);
    return RESULT_ERROR;
  }
  if (line_is(cmdline, "AT+JVZWSB=2")) return answer_quoted(response, "fpc");
  return REJECT_COMMAND_LINE(cmdline);
}

int jvccm_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVCCM=1")) return REJECT_COMMAND_LINE(cmdline);
  constexpr int kBothCameras = 3;
  return result_of((checkCameraDeviceConnect(0) & kBothCameras) == kBothCameras);
}

int jvzsj_iicrc_handler(char*, int, char*) { return RESULT_NOT_IMPLEMENTED; }
