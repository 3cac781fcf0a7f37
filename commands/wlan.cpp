#include "commands/wlan.h"

#include <unistd.h>

#include <atomic>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <strings.h>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"

namespace {

struct Channel {
  const char* frequency;
  int number;
};

constexpr Channel k24GHz[] = {
    {"2412.00", 1},  {"2417.00", 2},  {"2422.00", 3},  {"2427.00", 4},  {"2432.00", 5},
    {"2437.00", 6},  {"2442.00", 7},  {"2447.00", 8},  {"2452.00", 9},  {"2457.00", 10},
    {"2462.00", 11}, {"2467.00", 12}, {"2472.00", 13}, {"2484.00", 14},
};

constexpr Channel k5GHz[] = {
    {"4920.00", 240}, {"4940.00", 244}, {"4960.00", 248}, {"4980.00", 252}, {"5040.00", 208},
    {"5060.00", 212}, {"5080.00", 216}, {"5180.00", 36},  {"5200.00", 40},  {"5220.00", 44},
    {"5240.00", 48},  {"5260.00", 52},  {"5280.00", 56},  {"5300.00", 60},  {"5320.00", 64},
    {"5500.00", 100}, {"5520.00", 104}, {"5540.00", 108}, {"5560.00", 112}, {"5580.00", 116},
    {"5600.00", 120}, {"5620.00", 124}, {"5640.00", 128}, {"5660.00", 132}, {"5680.00", 136},
    {"5700.00", 140}, {"5745.00", 149}, {"5765.00", 153}, {"5785.00", 157}, {"5805.00", 161},
    {"5825.00", 165},
};

constexpr Channel kBonded[] = {
    {"5210.00", 42}, {"5290.00", 58}, {"5530.00", 106}, {"5775.00", 155}, {"5795.00", 159},
};

struct Rate {
  const char* mbps;
  const char* name;
};

constexpr Rate kBRates[] = {
    {"1.00", "11B_LONG_1_MBPS"},
    {"2.00", "11B_LONG_2_MBPS"},
    {"5.50", "11B_LONG_5_5_MBPS"},
    {"11.00", "11B_LONG_11_MBPS"},
};
// 802.11g and 802.11a share their rates.
constexpr Rate kGRates[] = {
    {"6.00", "11A_6_MBPS"},   {"9.00", "11A_9_MBPS"},   {"12.00", "11A_12_MBPS"},
    {"18.00", "11A_18_MBPS"}, {"24.00", "11A_24_MBPS"}, {"36.00", "11A_36_MBPS"},
    {"48.00", "11A_48_MBPS"}, {"54.00", "11A_54_MBPS"},
};
constexpr Rate kNRates[] = {
    {"6.50", "MCS_6_5_MBPS"},   {"13.00", "MCS_13_MBPS"}, {"19.50", "MCS_19_5_MBPS"},
    {"26.00", "MCS_26_MBPS"},   {"39.00", "MCS_39_MBPS"}, {"52.00", "MCS_52_MBPS"},
    {"58.50", "MCS_58_5_MBPS"}, {"65.00", "MCS_65_MBPS"}, {"72.20", "MCS_SG_72_2_MBPS"},
};
constexpr Rate kAcRates[] = {
    {"86.60", "VHT_MCS_SGI_86_6_MBPS"},     {"200.00", "VHT_MCS_CB_SGI_200_MBPS"},
    {"325.00", "VHT_MCS_CB_SGI_325_MBPS"},  {"390.00", "VHT_MCS_CB_SGI_390_MBPS"},
    {"433.30", "VHT_MCS_CB_SGI_433_3_MBPS"},
};

bool matches(const char* key, std::string_view text) {
  return std::strlen(key) == text.size() && strncasecmp(key, text.data(), text.size()) == 0;
}

int find_channel(std::string_view text, bool wide, bool bonded) {
  if (bonded) {
    for (const Channel& c : kBonded)
      if (matches(c.frequency, text)) return c.number;
    return 0;
  }
  for (const Channel& c : k24GHz)
    if (matches(c.frequency, text)) return c.number;
  if (wide)
    for (const Channel& c : k5GHz)
      if (matches(c.frequency, text)) return c.number;
  return 0;
}

template <typename Table>
const char* rate_in(const Table& table, std::string_view text) {
  for (const Rate& r : table)
    if (matches(r.mbps, text)) return r.name;
  return nullptr;
}

// b/g for 2.4 GHz, n/a for the wide lookup, ac when bonded.
const char* find_rate(std::string_view text, bool wide, bool bonded) {
  if (bonded) return rate_in(kAcRates, text);
  const char* name = wide ? rate_in(kNRates, text) : rate_in(kBRates, text);
  return name != nullptr ? name : rate_in(kGRates, text);
}

std::atomic<bool> power_is_off{false};

constexpr size_t kCommandSize = 100;
constexpr const char* kLoadWlan = "insmod /system/lib/modules/wlan.ko con_mode=5 ";
constexpr const char* kTxPowerFile = "/data/wlanTxPower";

// The second ":"-field of the first line a driver tool writes to `file`, at most size - 1
// characters read. False, and logged, when the file cannot be opened or the field is missing;
// the file is removed only once the value was read.
bool read_driver_value(const char* tool, const char* file, size_t size, const char* missing_log,
                       char (&value)[kCommandSize]) {
  char line[kCommandSize];
  if (sh_first_line(tool, file, line, size) < 0) {
    ATCI_LOGE("===the file %s is NULL\r\n", file);
    return false;
  }
  std::string_view rest(line);
  next_token(rest, ":");
  const std::string_view field = next_token(rest, ":");
  if (field.empty()) {
    ATCI_LOGE("%s", missing_log);
    return false;
  }
  copy_field(value, field);
  run_sh_command("rm %s", file);
  return true;
}

// The power the driver reports for the current channel, as its raw integer.
bool read_tx_power(const char* missing_log, char (&value)[kCommandSize]) {
  return read_driver_value("iwpriv wlan0 get_chpower", kTxPowerFile, 50, missing_log, value);
}

// A field as a terminated string for the C conversions.
struct FieldText {
  explicit FieldText(std::string_view field) { copy_field(text, field); }
  char text[CMD_LINE_SIZE];
};

// The channel and rate commands of a transmit or receive variant; false when a lookup or the
// bonding value fails (nothing has run yet).
struct RfSetup {
  char channel_cmd[kCommandSize];
  char rate_cmd[kCommandSize];
};

bool rf_setup(std::string_view channel, std::string_view rate, std::string_view bonding,
              bool wide, RfSetup& setup) {
  const bool bonded = !bonding.empty();
  if (bonded) {
    const int cb = std::atoi(FieldText(bonding).text);
    if (cb < 1 || cb > 10) {
      ATCI_LOGE("channel bonding %d not in [1,10]", cb);
      return false;
    }
    char bonding_cmd[kCommandSize];
    std::snprintf(bonding_cmd, sizeof bonding_cmd, "iwpriv wlan0 set_cb %d", cb);
    ATCI_LOGD("channel_bonding_cmd=%s", bonding_cmd);
  }
  const int number = find_channel(channel, wide, bonded);
  if (number == 0) {
    ATCI_LOGE("unsupported channel");
    return false;
  }
  const char* rate_name = find_rate(rate, wide, bonded);
  if (rate_name == nullptr) {
    ATCI_LOGE("unsupported rate");
    return false;
  }
  std::snprintf(setup.channel_cmd, sizeof setup.channel_cmd, "iwpriv wlan0 set_channel %d", number);
  std::snprintf(setup.rate_cmd, sizeof setup.rate_cmd, "iwpriv wlan0 set_txrate %s", rate_name);
  return true;
}

int wlan_init() {
  if (is_sp == 0) {
    ATCI_LOGD("begin JVWLAN=1 KEEP_CREEN_ON 2");
    sendBroadcastFromAtcid(nullptr, "kro.intent.action.KEEP_CREEN_ON", "-e status 2");
    ATCI_LOGD("end JVWLAN=1 KEEP_CREEN_ON 2");
  }
  run_sh_commands({"rmmod cfg80211", "rmmod wlan", "insmod /system/lib/modules/cfg80211.ko",
                   "echo 5 >  /sys/module/wcnsscore/parameters/wlan_eng_mode", kLoadWlan});
  ::sleep(2);
  if (check_driver_loaded("wlan") == 0) {
    ATCI_LOGE("wlan modules unloaded, try to load again!");
    run_sh_command("%s", kLoadWlan);
    ::usleep(200);
  }
  char mode[50];
  read_first_line("/sys/module/wcnsscore/parameters/wlan_eng_mode", mode, sizeof mode);
  ATCI_LOGD("check wlan_eng_mode:%s", mode);
  return RESULT_OK;
}

// =2 (2.4 GHz, b/g rates) and =3 (wide or bonded, n/a or ac rates).
int wlan_transmit(const char* cmdline, bool wide) {
  CommaFields fields(cmdline);
  const std::string_view channel = fields.next();
  const std::string_view rate = fields.next();
  const std::string_view power = fields.next();
  const std::string_view bonding = wide ? fields.next() : std::string_view();
  if (channel.empty() || rate.empty() || power.empty())
    return LOGGED_ERROR("Parameters incomplete.");
  power_is_off = false;
  int power_value = 0;
  const FieldText power_text(power);
  if (std::strcmp(power_text.text, "OFF") == 0 || std::strcmp(power_text.text, "off") == 0) {
    power_is_off = true;
    ATCI_LOGD("power is OFF");
  }
  RfSetup setup;
  if (!rf_setup(channel, rate, bonding, wide, setup)) return RESULT_ERROR;

  if (!wide && check_driver_loaded("wlan") == 0) {
    ATCI_LOGE("wlan modules unloaded, try to load!");
    run_sh_command("%s", kLoadWlan);
    ::usleep(200);
  }
  run_sh_commands({"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0"});
  if (!power_is_off) power_value = static_cast<int>(std::atof(power_text.text) * 100);
  if (!wide) sleep_ms(200);
  run_sh_commands({"iwpriv wlan0 ftm 1", setup.channel_cmd, "iwpriv wlan0 ena_chain 2",
                   setup.rate_cmd, "iwpriv wlan0 pwr_cntl_mode 2"});
  if (power_is_off) {
    char value[kCommandSize];
    if (!read_tx_power("===the default_power is NULL\r\n", value)) return RESULT_ERROR;
    power_value = std::atoi(value);
  }
  run_sh_command("iwpriv wlan0 set_txpower %d", power_value);
  run_sh_command("iwpriv wlan0 tx 1");
  return RESULT_OK;
}

// =4 (2.4 GHz, b/g rates) and =5 (wide or bonded). The rate is never set on receive.
int wlan_receive(const char* cmdline, bool wide) {
  CommaFields fields(cmdline);
  const std::string_view channel = fields.next();
  const std::string_view rate = fields.next();
  const std::string_view bonding = wide ? fields.next() : std::string_view();
  if (channel.empty() || rate.empty()) return LOGGED_ERROR("Parameters incomplete.");
  RfSetup setup;
  if (!rf_setup(channel, rate, bonding, wide, setup)) return RESULT_ERROR;
  run_sh_command("iwpriv wlan0 ftm 1");
  if (wide) ::sleep(1);
  run_sh_commands({setup.channel_cmd, "iwpriv wlan0 ena_chain 1", "iwpriv wlan0 pwr_cntl_mode 2"});
  ATCI_LOGD("rate_cmd=%s, !!BUT AT NOT SET!!", setup.rate_cmd);
  run_sh_commands({"iwpriv wlan0 clr_rxpktcnt 1", "iwpriv wlan0 rx 1"});
  return RESULT_OK;
}

int wlan_packet_count(char* response) {
  sleep_ms(500);
  char value[kCommandSize];
  if (!read_driver_value("iwpriv wlan0 get_rxpktcnt", "/data/wlanRxPER", 100,
                         "===the pckcnt is NULL\r\n", value))
    return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "\"%ld\"", std::atol(value));
  run_sh_command("iwpriv wlan0 clr_rxpktcnt 1");
  return RESULT_OK;
}

// The fixed channel 1 and the rate of a protocol for the power commands; null for others.
const char* protocol_rate(std::string_view protocol) {
  struct ProtocolRate {
    const char* protocol;
    const char* rate_cmd;
  };
  static constexpr ProtocolRate kRates[] = {
      {"B", "iwpriv wlan0 set_txrate 11B_LONG_11_MBPS"},
      {"G", "iwpriv wlan0 set_txrate 11A_18_MBPS"},
      {"N", "iwpriv wlan0 set_txrate MCS_6_5_MBPS"},
  };
  for (const ProtocolRate& p : kRates)
    if (matches(p.protocol, protocol)) return p.rate_cmd;
  return nullptr;
}

int wlan_set_power(const char* cmdline) {
  CommaFields fields(cmdline);
  const std::string_view protocol = fields.next();
  const std::string_view power = fields.next();
  if (protocol.empty()) return LOGGED_ERROR("protocol null.");
  const char* rate_cmd = protocol_rate(protocol);
  if (rate_cmd == nullptr) return LOGGED_ERROR("protocl wrong.");
  if (power.empty())
    return LOGGED_ERROR("Parameters incomplete %c.",
                        std::tolower(static_cast<unsigned char>(protocol[0])));
  const double value = std::atof(FieldText(power).text);
  if (!(value >= 5 && value <= 20)) {
    ATCI_LOGE("power=%d,not in [5,20]", static_cast<int>(value));
    if (matches("N", protocol)) ATCI_LOGE("AT+JVWLAN=SP,N,power");
    return RESULT_ERROR;
  }
  run_sh_commands({"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1",
                   "iwpriv wlan0 set_channel 1", "iwpriv wlan0 ena_chain 2", rate_cmd,
                   "iwpriv wlan0 pwr_cntl_mode 2"});
  run_sh_command("iwpriv wlan0 set_chpower %d", static_cast<int>(value * 100));
  return RESULT_OK;
}

int wlan_get_power(const char* cmdline, char* response) {
  CommaFields fields(cmdline);
  const std::string_view protocol = fields.next();
  if (protocol.empty()) return LOGGED_ERROR("Parameters incomplete.");
  const char* rate_cmd = protocol_rate(protocol);
  if (rate_cmd == nullptr) return LOGGED_ERROR("temp solution,20120311 just support BGN protocol");
  run_sh_commands({"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1",
                   "iwpriv wlan0 set_channel 1", rate_cmd});
  char value[kCommandSize];
  if (!read_tx_power("===the default_power is NULL\r\n", value)) return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%f\"\r\n", std::atof(value) / 100);
  return RESULT_OK;
}

int wlan_set_config(const char* cmdline) {
  killprocess("ptt_socket_app", 1);
  run_sh_command("ptt_socket_app");
  CommaFields fields(cmdline);
  const std::string_view value = fields.next();
  if (value.empty()) return LOGGED_ERROR("Parameters configItem1 incomplete.");
  run_sh_command("iwpriv wlan0 set_configitem %d", std::atoi(FieldText(value).text));
  return RESULT_OK;
}

int wlan_get_config(char* response) {
  run_sh_command("iwpriv wlan0 ftm 1");
  char value[kCommandSize];
  if (!read_driver_value("iwpriv wlan0 get_configitem", kTxPowerFile, 50,
                         "===the configItem1 is NULL\r\n", value))
    return RESULT_ERROR;
  return answer_quoted_int(response, std::atoi(value));
}

}  // namespace

int check_driver_loaded(const char* module) {
  constexpr const char* kModules = "/proc/modules";
  UniqueFile f(dev_fopen(kModules, "r"));
  if (!f) {
    ATCI_LOGE("Could not open %s: %s", kModules, std::strerror(errno));
    return 0;
  }
  const size_t n = std::strlen(module);
  char line[126];
  while (std::fgets(line, sizeof line, f.get()) != nullptr)
    if (std::strncmp(line, module, n) == 0) return 1;
  return 0;
}

int wifi_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVWLAN=1")) return wlan_init();
  if (line_starts_with(cmdline, "AT+JVWLAN=2")) return wlan_transmit(cmdline, false);
  if (line_starts_with(cmdline, "AT+JVWLAN=3")) return wlan_transmit(cmdline, true);
  if (line_starts_with(cmdline, "AT+JVWLAN=4")) return wlan_receive(cmdline, false);
  if (line_starts_with(cmdline, "AT+JVWLAN=5")) return wlan_receive(cmdline, true);
  if (line_starts_with(cmdline, "AT+JVWLAN=6")) return wlan_packet_count(response);
  if (line_is(cmdline, "AT+JVWLAN=7")) {
    run_sh_command("iwpriv wlan0 tx 0");
    ATCI_LOGD("wifi_stop_tx called");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVWLAN=8")) {
    run_sh_commands({"iwpriv wlan0 rx 0", "iwpriv wlan0 ftm 0"});
    ATCI_LOGD("wifi_stop_rx called");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVWLAN=9")) {
    run_sh_commands({"iwpriv wlan0 tx 0", "iwpriv wlan0 rx 0", "iwpriv wlan0 ftm 0",
                     "rmmod cfg80211", "rmmod wlan",
                     "echo 0 > /sys/module/wcnsscore/parameters/wlan_eng_mode"});
    ATCI_LOGD("wifi_deinit called");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVWLAN=10")) {
    run_sh_command("iwpriv wlan0 clr_rxpktcnt 1");
    return RESULT_OK;
  }
  if (line_starts_with(cmdline, "AT+JVWLAN=SP")) return wlan_set_power(cmdline);
  if (line_starts_with(cmdline, "AT+JVWLAN=GP")) return wlan_get_power(cmdline, response);
  if (line_starts_with(cmdline, "AT+JVWLAN=SC")) return wlan_set_config(cmdline);
  if (line_starts_with(cmdline, "AT+JVWLAN=GC")) return wlan_get_config(response);
  return LOGGED_ERROR("=====this at command invalid=====");
}
