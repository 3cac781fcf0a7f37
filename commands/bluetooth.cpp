#include "commands/bluetooth.h"

#include <cstdio>
#include <cstring>
#include <string_view>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"

namespace {

constexpr size_t kMaxValueRead = 260;
constexpr uint32_t kAddressItem = 1;
constexpr size_t kAddressBytes = 6;
constexpr const char* kScanFile = "/data/user/0/com.ulda.engineermode/bt_device";

// "bdt" leaves DUT mode in this property; it is read once, right after the tool returned.
int dut_check() {
  char state[PROPERTY_VALUE_MAX];
  property_get("bluetooth.bdt.pemudut", state, "");
  if (std::strstr(state, "true") == nullptr)
    return LOGGED_ERROR("===is not enter BT ftm Test mode \r\n");
  return RESULT_OK;
}

// Two characters per byte, first pair into byte 0; any character gives its low 4 bits after
// the hex shift, so lower case works as upper case does.
uint8_t nibble(char c) {
  int v = static_cast<unsigned char>(c);
  if (v >= 'A') v -= 7;
  return static_cast<uint8_t>((v - '0') & 0x0f);
}

int write_address(const char* cmdline) {
  CommaFields fields(cmdline);
  fields.next();  // "BT"
  const std::string_view address = fields.next();
  if (address.empty()) return LOGGED_ERROR("========bt_addr is NULL\n");
  if (address.size() < 2 * kAddressBytes)
    return LOGGED_ERROR("========bt_addr too short: %.*s\n", static_cast<int>(address.size()),
                        address.data());
  uint8_t b[kAddressBytes];
  for (size_t i = 0; i < kAddressBytes; ++i)
    b[i] = static_cast<uint8_t>(nibble(address[2 * i]) << 4 | nibble(address[2 * i + 1]));
  // The tool takes the bytes in reverse order.
  run_sh_command("btnvtool -b %02X.%02X.%02X.%02X.%02X.%02X", b[5], b[4], b[3], b[2], b[1], b[0]);
  return RESULT_OK;
}

int read_address(char* response) {
  bt_nv_item items[BT_NV_ITEMS] = {};
  const int count = bt_nv_read(items);
  if (count < 0) return LOGGED_ERROR("BT-NV-CMD: Read from NV persist failed\n");
  ATCI_LOGD("BT-NV-CMD: numitems = %d\n", count);
  const int searched = count < BT_NV_ITEMS ? count : BT_NV_ITEMS;
  for (int i = 0; i < searched; ++i) {
    const bt_nv_item& item = items[i];
    if (item.id != kAddressItem) continue;
    ATCI_LOGD("BT-NV-CMD: Found NV item at '%d'\n", i);
    if (!item.value_read || item.length < kAddressBytes)
      return LOGGED_ERROR("BT-NV-CMD: address item holds %d bytes\n", item.length);
    const uint8_t* v = item.value;
    ATCI_LOGD("BT-NV-CMD: NV_READ_F: BD Addr: %02x %02x %02x %02x %02x %02x\n", v[0], v[1], v[2],
              v[3], v[4], v[5]);
    std::snprintf(response, RESPONSE_SIZE, "+EMBT: \"%02X%02X%02X%02X%02X%02X\"", v[5], v[4],
                  v[3], v[2], v[1], v[0]);
    return RESULT_OK;
  }
  return LOGGED_ERROR("BT-NV-CMD: no address item among the first %d\n", searched);
}

int read_scan(char* response) {
  UniqueFile file(dev_fopen(kScanFile, "r"));
  if (!file) return LOGGED_ERROR("fail to open %s\r\n", kScanFile);
  char line[256];
  for (int n = 0; n < 5 && std::fgets(line, sizeof line, file.get()) != nullptr; ++n) {
    body_append(response, n == 0 ? "\r\n\"" : ",\r\n");
    body_append(response, line);
  }
  body_append(response, "\"\r\n");
  return RESULT_OK;
}

bool is_channel(std::string_view channel) { return channel.size() <= 3 && all_digits(channel); }

}  // namespace

int bt_nv_read(bt_nv_item (&items)[BT_NV_ITEMS]) {
  constexpr const char* kPath = "/persist/.bt_nv.bin";
  ATCI_LOGD("BT-NV-READ: Opening file '%s' for reading\n", kPath);
  UniqueFile file(dev_fopen(kPath, "rb"));
  if (!file) {
    ATCI_LOGE("BT-NV-READ: Open of firmware file failed\n");
    return -1;
  }
  int count = 0;
  unsigned char header[3];
  while (std::fread(header, 1, sizeof header, file.get()) == sizeof header) {
    bt_nv_item scratch{};
    bt_nv_item& item = count < BT_NV_ITEMS ? items[count] : scratch;
    item = bt_nv_item{header[0], header[1], header[2], {}, false};
    ++count;
    ATCI_LOGD("BT-NV-READ: Header = %02x %02x %02x\n", header[0], header[1], header[2]);
    unsigned char value[kMaxValueRead];
    const size_t got = std::fread(value, 1, item.length, file.get());
    if (got != item.length) {
      ATCI_LOGE("BT-NV-READ: fread failed !!! \n");
      continue;
    }
    std::memcpy(item.value, value, got < sizeof item.value ? got : sizeof item.value);
    item.value_read = true;
    char text[sizeof value * 4 + 1] = {};
    for (size_t i = 0; i < got; ++i) std::snprintf(text + 4 * i, 5, "%02x  ", value[i]);
    ATCI_LOGD("BT-NV-READ: NV item %02x value:%s\n", header[0], text);
  }
  ATCI_LOGD("BT-NV-READ: Total number of item Read = %d\n", count);
  return count;
}

int bt_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("===========cmdline %s\r\n", cmdline);
  if (line_is(cmdline, "AT+EMBT=5")) return read_address(response);
  if (line_is(cmdline, "AT+EMBT=4")) return dut_check();
  if (line_starts_with(cmdline, "AT+EMBT=0,BT")) return write_address(cmdline);
  if (line_is(cmdline, "AT+EMBT=1")) {
    run_sh_command("bdt entrydut");
    return dut_check();
  }
  if (line_starts_with(cmdline, "AT+EMBT=1")) {
    CommaFields fields(cmdline);
    const std::string_view channel = fields.next();
    if (channel.empty()) return LOGGED_ERROR("========bt_channel is NULL\n");
    if (!is_channel(channel)) return LOGGED_ERROR("========bt_channel is not a channel\n");
    run_sh_command("bdt txcontinuous %.*s", static_cast<int>(channel.size()), channel.data());
    return dut_check();
  }
  if (line_is(cmdline, "AT+EMBT=2")) {
    run_sh_command("bdt exitdut");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+EMBT=6")) {
    sendBroadcastFromAtcid(nullptr, "android.intent.action.SCAN_BT_DEVICE", nullptr);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+EMBT=7")) return read_scan(response);
  if (line_is(cmdline, "AT+EMBT=8")) {
    sendBroadcastFromAtcid(nullptr, "android.intent.action.STOP_BT_DEVICE", nullptr);
    return RESULT_OK;
  }
  return RESULT_ERROR;
}
