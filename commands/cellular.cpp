#include "commands/cellular.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <mutex>
#include <string_view>
#include <strings.h>

#include "commands/command_util.h"
#include "commands/device_info.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/qmi_client.h"

namespace {

constexpr const char* kFastSearchNet = "com.android.phone.fastSearchNet.FastSearchNetService";
constexpr const char* kConnWifiReceiver = "com.ulda.engineermode/.ConnWifiReceiver";
constexpr const char* kKeepScreenOn = "kro.intent.action.KEEP_CREEN_ON";

void log_cmdline(const char* caller, const char* cmdline) {
  atci_log(LOG_LVL_DEBUG, __LINE__, caller, "===========cmdline %s\r\n", cmdline);
}

// A broadcast switch of two whole-line variants: "=1" sends `on`, "=0" sends `off`.
struct Switch {
  const char* on_line;
  const char* off_line;
  const char* action;
  const char* on_extras;
  const char* off_extras;
};

int broadcast_switch(const Switch& s, const char* cmdline) {
  const char* extras = line_is(cmdline, s.on_line)    ? s.on_extras
                       : line_is(cmdline, s.off_line) ? s.off_extras
                                                      : nullptr;
  if (extras == nullptr)
    return LOGGED_ERROR("**********this at command invalid:%s***********\r\n", cmdline);
  sendBroadcastFromAtcid(nullptr, s.action, extras);
  return RESULT_OK;
}

using IntRequest = int (*)(qmi::client_type*, qmi::txn_handle*, const kro_int_req_msg_v01*,
                          QmiResult*);

// One 4-byte request. True when it returned 0 and its answer came without a transport error;
// `result` gets what the answer left.
bool int_request(IntRequest request, int32_t value, QmiResult& result) {
  const kro_int_req_msg_v01 req{value};
  const int rc = request(nullptr, nullptr, &req, &result);
  result.text[sizeof result.text - 1] = '\0';
  return rc == 0 && result.flag == 0;
}

// Slot 2 is the second field of "gsm.sim.state" as strtok finds it (",READY" has none), or
// the property of its own.
bool sim2_present() {
  char states[PROPERTY_VALUE_MAX];
  property_get("gsm.sim.state", states, " ");
  if (std::strchr(states, ',') != nullptr) return sim_state_present(comma_field(states, 1));
  property_get("gsm.sim.state.2", states, " ");
  return sim_state_present(states);
}

// Modem NV items behind the MEID and WLAN MAC commands.
struct NvCommand {
  const char* read_line;
  const char* write_prefix;
  uint32_t item;
  uint8_t read_option;
};
constexpr NvCommand kMeid{"AT+JVMEID=0", "AT+JVMEID=1", 1943, 0};
constexpr NvCommand kWlanMac{"AT+JVWMAC=0", "AT+JVWMAC=1", 4678, 1};

int nv_read(const NvCommand& nv, char* response) {
  kro_read_nv_info_req_msg_v01 req{};
  req.nvItem_id = nv.item;
  req.option[0] = req.option[1] = nv.read_option;
  kro_read_nv_info_resp_msg_v01 resp{};
  qmi_kro_wait_record wait{};
  wait.transp_err = -1;
  const int rc = qmi_kro_read_nv_msg_ex(&req, sizeof req, QMI_KRO_READ_NV_INFO_RESP_MSG_V01, &resp,
                                        sizeof resp, &wait);
  if (rc != 0 || wait.msg_id != QMI_KRO_READ_NV_INFO_RESP_MSG_V01 || wait.transp_err != 0)
    return LOGGED_ERROR("ret=%d, msg_id=%d, status=%d", rc, wait.msg_id, wait.transp_err);
  if (resp.buffer_valid != 1) return LOGGED_ERROR("get_nv_rsp.buffer_valid:%d", resp.buffer_valid);
  std::snprintf(response, RESPONSE_SIZE, "%.*s", static_cast<int>(sizeof resp.buffer),
                resp.buffer);
  return RESULT_OK;
}

int nv_write(const NvCommand& nv, const char* cmdline) {
  const std::string_view field = comma_field(cmdline, 1);
  if (field.empty()) return LOGGED_ERROR("========The wlan addr is NULL====");
  char value[CMD_LINE_SIZE];
  copy_field(value, field);
  substring(value);
  kro_write_nv_info_req_msg_v01 req{};
  req.nvItem_id = nv.item;
  req.buffer_valid = 1;
  std::snprintf(req.buffer, sizeof req.buffer, "%.255s", value);
  qmi_response_type_v01 resp{-1, -1};
  qmi_kro_wait_record wait{};
  wait.transp_err = -1;
  const int rc = qmi_kro_write_nv_msg_ex(&req, sizeof req, QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01,
                                         &resp, sizeof resp, &wait);
  // A write the modem refused is no success, whatever the transport says.
  if (rc != 0 || wait.msg_id != QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01 || wait.transp_err != 0 ||
      resp.result != 0) {
    ATCI_LOGE("ret=%d, msg_id=%d, status=%d\n", rc, wait.msg_id, wait.transp_err);
    return LOGGED_ERROR("error=%d, result=%d\n", resp.error, resp.result);
  }
  return RESULT_OK;
}

int nv_command(const NvCommand& nv, const char* caller, const char* cmdline, char* response) {
  log_cmdline(caller, cmdline);
  if (line_is(cmdline, nv.read_line)) return nv_read(nv, response);
  if (line_starts_with(cmdline, nv.write_prefix)) return nv_write(nv, cmdline);
  return REJECT_COMMAND_LINE(cmdline);
}

}  // namespace

int plan_mode_test_handler(char* cmdline, int, char*) {
  log_cmdline(__func__, cmdline);
  if (line_is(cmdline, "AT+OFFL=1")) {
    char mode[PROPERTY_VALUE_MAX];
    property_get("persist.sys.kroem", mode, " ");
    if (std::strcmp(mode, "2") == 0) {
      if (is_uart_flag == 0)
        sendBroadcastFromAtcid(nullptr, "android.intent.action.RESTART_ATCID", "--ei em 1");
      ATCI_LOGI("send broadcast android.intent.action.RESTART_ATCID\r\n");
    }
    if (is_uart_flag == 0)
      sendBroadcastFromAtcid(nullptr, "android.intent.action.AT_AIRPLANE_MODE", "--ez state true");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+OFFL=0")) {
    if (is_uart_flag == 0)
      sendBroadcastFromAtcid(nullptr, "android.intent.action.AT_AIRPLANE_MODE", "--ez state false");
    return RESULT_OK;
  }
  return LOGGED_ERROR("====this at command invalid:%s====\r\n", cmdline);
}

int status_bar_3g_handler(char* cmdline, int, char*) {
  log_cmdline(__func__, cmdline);
  static constexpr Switch k3g{"AT+JVSB3G=1", "AT+JVSB3G=0", "android.intent.action.AT_3G_STATUS",
                              "--ez state true", "--ez state false"};
  return broadcast_switch(k3g, cmdline);
}

int status_bar_data_handler(char* cmdline, int, char*) {
  log_cmdline(__func__, cmdline);
  static constexpr Switch kData{"AT+JVSBDT=1", "AT+JVSBDT=0",
                                "android.intent.action.AT_DATA_ENABLE", "--ez state true",
                                "--ez state false"};
  return broadcast_switch(kData, cmdline);
}

int fast_search_net_handler(char* cmdline, int, char*) {
  log_cmdline(__func__, cmdline);
  if (line_is(cmdline, "AT+JVSWXFK=1"))
    ATCI_LOGI("===send fastSearchNet float open begin==== \r\n");
  static constexpr Switch kFloat{"AT+JVSWXFK=1", "AT+JVSWXFK=0", kFastSearchNet,
                                 "--es command open", "--es command close"};
  return broadcast_switch(kFloat, cmdline);
}

int fast_search_test_handler(char* cmdline, int, char*) {
  log_cmdline(__func__, cmdline);
  if (line_starts_with(cmdline, "AT+JVSFT=1")) {
    CommaFields fields(cmdline);
    const std::string_view sim = fields.next();
    const std::string_view act = fields.next();
    const std::string_view channel = fields.next();
    if (sim.empty() || act.empty() || channel.empty())
      return LOGGED_ERROR("===========sim OR act OR channel is NULL\r\n");
    char extras[256];
    std::snprintf(extras, sizeof extras, "--es status 1 --es sim %.*s --es act %.*s --es arfcn %.*s",
                  static_cast<int>(sim.size()), sim.data(), static_cast<int>(act.size()),
                  act.data(), static_cast<int>(channel.size()), channel.data());
    sendBroadcastFromAtcid(nullptr, kFastSearchNet, extras);
    return RESULT_OK;
  }
  if (line_starts_with(cmdline, "AT+JVSFT=0")) {
    sendBroadcastFromAtcid(nullptr, kFastSearchNet, "--es status 0");
    return RESULT_OK;
  }
  return LOGGED_ERROR("**********this at command invalid:%s***********\r\n", cmdline);
}

int radio_type_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  if (!line_is(cmdline, "AT+JVRADIO=0"))
    return LOGGED_ERROR("=======this at command invalid:%s*\r\n", cmdline);
  struct RadioType {
    const char* abbr;
    const char* bands;
  };
  static constexpr RadioType kTypes[] = {
      {"T", "TD+GSM"},
      {"W", "WCDMA+GSM"},
      {"E", "EVD0+GSM"},
      {"A", "TDD-LTE+FDD-LTE+WCDMA+TD+GSM"},
      {"D", "TDD-LTE+FDD-LTE+WCDMA+TD+GSM"},
      {"L", "TDD-LTE+TD+GSM"},
      {"M", "TDD-LTE+TD+WCDMA+GSM"},
      {"F", "FDD-LTE+WCDMA+GSM"},
      {"H", "FDD-LTE+TDD-LTE+WCDMA+GSM"},
      {"V", "FDD-LTE+EVDO+GSM"},
      {"U", "FDD-LTE+WCDMA+EVDO+GSM"},
  };
  char abbr[PROPERTY_VALUE_MAX];
  property_get("persist.pemu.radio.type.abbr", abbr, "");
  for (const RadioType& type : kTypes)
    if (strcasecmp(abbr, type.abbr) == 0) return answer_quoted(response, type.bands);
  return RESULT_OK;
}

int set_sim2_status_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  struct Sim2Switch {
    const char* line;
    const char* command;
    const char* failure;
    int32_t value;
  };
  static constexpr Sim2Switch kSwitches[] = {
      {"AT+JVSIMT=0", "touch /data/sim2_status",
       "Touch /data/sim2_status fail!\r\n", 0},
      {"AT+JVSIMT=1", "rm /data/sim2_status ",
       "rm /data/sim2_status fail!\r\n", 1},
  };
  for (const Sim2Switch& s : kSwitches) {
    if (!line_is(cmdline, s.line)) continue;
    if (run_sh_command("%s", s.command) < 0) return LOGGED_ERROR("%s", s.failure);
    QmiResult ignored;
    int_request(qmi_switch_sim2_status, s.value, ignored);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVSIMT=2")) return answer_quoted_int(response, sim2_present() ? 1 : 0);
  return REJECT_COMMAND_LINE(cmdline);
}

int primary_or_diversity_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  QmiResult answer;
  if (line_starts_with(cmdline, "AT+JVZFTX=1")) {
    const std::string_view n = comma_field(cmdline, 1);
    if (n.empty()) return RESULT_ERROR;
    return result_of(int_request(mutuallySwitchForPrimaryAndDiversity,
                                 static_cast<int32_t>(parse_long(n)), answer));
  }
  if (line_is(cmdline, "AT+JVZFTX=0")) {
    if (!int_request(getPrimaryAndDiversitymsg, 1, answer)) return RESULT_ERROR;
    std::snprintf(response, RESPONSE_SIZE, "%s", answer.text);
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int meid_code_handler(char* cmdline, int, char* response) {
  return nv_command(kMeid, __func__, cmdline, response);
}

int wlan_addr_handler(char* cmdline, int, char* response) {
  return nv_command(kWlanMac, __func__, cmdline, response);
}

int virtual_sim_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  struct VirtualSim {
    const char* line;
    const char* activity;
    int32_t code;
  };
  static constexpr VirtualSim kVariants[] = {
      {"AT+JVVSIM=1", "com.pemu.networkstate/.VirtualSIMActivity", 11},
      {"AT+JVVSIM=2", "com.pemu.networkstate/.VirtualSIM8960Activity", 12},
      {"AT+JVVSIM=3", nullptr, 13},
      {"AT+JVVSIM=4", nullptr, 14},
      {"AT+JVVSIM=5", nullptr, 15},
  };
  const VirtualSim* v = nullptr;
  for (const VirtualSim& candidate : kVariants)
    if (line_is(cmdline, candidate.line)) v = &candidate;
  if (v == nullptr) return RESULT_ERROR;

  if (v->activity != nullptr) startActivityFromAtcid(v->activity, nullptr, nullptr);
  if (v->code == 14) {
    property_set("persist.radio.multisim.config", "");
    property_set("persist.sys.tel.autoanswer.ms", "5");
  }
  QmiResult answer;
  if (!int_request(qmi_set_status, v->code, answer))
    return LOGGED_ERROR("======send qmi msg fail\n");
  if (v->code == 14) {
    dev_unlink("/data/data/com.android.providers.telephony/databases/telephony.db");
    dev_unlink("/data/data/com.android.providers.telephony/databases/telephony.db-journal");
  }
  if (v->code == 15) std::snprintf(response, RESPONSE_SIZE, "\r\n%s\r\n", answer.text);
  return RESULT_OK;
}

int set_dpdt_status_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  enum class Answer { kConfirm, kNormal, kCross, kBits, kText };
  struct Dpdt {
    const char* line;
    int32_t code;
    Answer answer;
  };
  static constexpr Dpdt kVariants[] = {
      {"AT+JVDPDT=0", 110, Answer::kConfirm}, {"AT+JVDPDT=1", 111, Answer::kConfirm},
      {"AT+JVDPDT=2", 112, Answer::kNormal},  {"AT+JVDPDT=3", 113, Answer::kCross},
      {"AT+JVDPDT=4", 118, Answer::kBits},    {"AT+JVDPDT=6", 116, Answer::kConfirm},
      {"AT+JVDPDT=7", 117, Answer::kConfirm}, {"AT+JVDPDT=8", 118, Answer::kText},
  };
  if (line_is(cmdline, "AT+JVDPDT=5")) {
    startServiceFromAtcid("com.ulda.engineermode/.SwitchPdptStatusService", nullptr, nullptr);
    return RESULT_OK;
  }
  for (const Dpdt& v : kVariants) {
    if (!line_is(cmdline, v.line)) continue;
    QmiResult answer;
    const char* const text = answer.text;
    const bool answered = int_request(qmi_set_status, v.code, answer);
    ATCI_LOGD("return_buffer: %s\r\n", text);
    if (!answered) return RESULT_ERROR;
    switch (v.answer) {
      case Answer::kBits: {
        const long bits = parse_long(text);
        std::snprintf(response, RESPONSE_SIZE, "\r\n\"%ld,%ld\"\r\n", bits & 3, (bits >> 2) & 3);
        return RESULT_OK;
      }
      case Answer::kText:
        std::snprintf(response, RESPONSE_SIZE, "\r\n%s\r\n", text);
        return RESULT_OK;
      default:
        break;
    }
    if (std::strcmp(text, "0") != 0) return RESULT_ERROR;
    if (v.answer == Answer::kNormal) property_set("persist.sys.dpdt", "normal");
    if (v.answer == Answer::kCross) property_set("persist.sys.dpdt", "cross");
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int nfc_tag_handler(char* cmdline, int, char* response) {
  log_cmdline(__func__, cmdline);
  if (!line_is(cmdline, "AT+JVNFC=2")) return RESULT_ERROR;
  constexpr const char* kTagId = "/data/data/com.android.nfc/files/TagId";
  UniqueFd fd(dev_open(kTagId, O_RDONLY | O_CLOEXEC));
  if (!fd.ok()) return LOGGED_ERROR("==open %s fail\r\n", kTagId);
  char tag[21];
  const ssize_t n = read_head(fd.get(), tag, sizeof tag - 1);
  ATCI_LOGD("==read %s:%d\r\n", kTagId, static_cast<int>(n));
  if (n <= 3) return RESULT_ERROR;
  char hex[2 * sizeof tag + 1] = {};
  for (ssize_t i = 0; i < n; ++i)
    std::snprintf(hex + 2 * i, 3, "%02x", static_cast<unsigned char>(tag[i]));
  return answer_quoted(response, hex);
}

int conn_wifi_handler(char* cmdline, int, char*) {
  atci_log(LOG_LVL_DEBUG, __LINE__, __func__, "======cmdline %s======\r\n", cmdline);
  if (line_is(cmdline, "AT+JVCONNWIFI=0")) {
    sendBroadcastFromAtcid(kConnWifiReceiver, "kro.intent.action.DISCONNWIFI", nullptr);
    return RESULT_OK;
  }
  constexpr std::string_view kName = "AT+JVCONNWIFI";
  const std::string_view line(cmdline);
  if (!line_starts_with(cmdline, "AT+JVCONNWIFI") ||
      (line.size() > kName.size() && line[kName.size()] != '='))
    return LOGGED_ERROR("==command invalid:%s", cmdline);
  std::string_view rest = line.substr(std::min(line.find('='), line.size()));
  if (!rest.empty()) rest.remove_prefix(1);
  const std::string_view ssid_field = next_token(rest, ",");
  const std::string_view pwd_field = next_token(rest, ",");
  if (ssid_field.empty()) return LOGGED_ERROR("==command invalid:%s", cmdline);
  char ssid[CMD_LINE_SIZE];
  char pwd[CMD_LINE_SIZE];
  copy_field(ssid, ssid_field);
  copy_field(pwd, pwd_field.empty() ? std::string_view("(null)") : pwd_field);
  substring(ssid);
  if (!pwd_field.empty()) substring(pwd);
  char extras[2 * CMD_LINE_SIZE + 32];
  std::snprintf(extras, sizeof extras, "-e ssid %s -e pwd %s", ssid, pwd);
  sendBroadcastFromAtcid(kConnWifiReceiver, "kro.intent.action.CONNWIFI", extras);
  sendBroadcastFromAtcid(nullptr, kKeepScreenOn, "-e status 3");
  ::sleep(50);
  sendBroadcastFromAtcid(nullptr, kKeepScreenOn, "-e status 4");
  platform_sync();
  sleep_ms(150);
  platform_restart();
}
