#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "commands/cellular.h"
#include "core/command.h"
#include "core/transport.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Pairs = std::vector<std::pair<std::string, std::string>>;
using Lines = std::vector<std::string>;
const std::string kAbsent = "<absent>";

struct CellularCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Pairs files;        // device path -> content
  Pairs properties;   // name -> value
  int uart;
  int status;
  std::string body;
  Lines shell;        // every command text handed to the shell
  std::string requests;  // the modem's request log
  Pairs after;        // device path or "prop:<name>" -> expected content (kAbsent: not there)
};
void PrintTo(const CellularCase& c, std::ostream* os) { *os << c.name; }

const std::string kTelephony = "/data/data/com.android.providers.telephony/databases/telephony.db";
const std::string kTagId = "/data/data/com.android.nfc/files/TagId";

std::string repeat(const std::string& piece, int times) {
  std::string out;
  while (times-- > 0) out += piece;
  return out;
}

std::vector<CellularCase> cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  return {
      {"offl_on_em2", plan_mode_test_handler, "AT+OFFL=1", {}, {{"persist.sys.kroem", "2"}}, 0, OK, "",
       {"am broadcast -a android.intent.action.RESTART_ATCID --ei em 1",
        "am broadcast -a android.intent.action.AT_AIRPLANE_MODE --ez state true"}, "", {}},
      {"offl_on_uart", plan_mode_test_handler, "AT+OFFL=1", {}, {{"persist.sys.kroem", "2"}}, 1, OK, "", {}, "", {}},
      {"offl_off", plan_mode_test_handler, "at+offl=0", {}, {}, 0, OK, "",
       {"am broadcast -a android.intent.action.AT_AIRPLANE_MODE --ez state false"}, "", {}},
      {"offl_other", plan_mode_test_handler, "AT+OFFL=2", {}, {}, 0, ERR, "", {}, "", {}},
      {"sb3g_on", status_bar_3g_handler, "AT+JVSB3G=1", {}, {}, 0, OK, "",
       {"am broadcast -a android.intent.action.AT_3G_STATUS --ez state true"}, "", {}},
      {"sbdt_off", status_bar_data_handler, "AT+JVSBDT=0", {}, {}, 0, OK, "",
       {"am broadcast -a android.intent.action.AT_DATA_ENABLE --ez state false"}, "", {}},
      {"sbdt_other", status_bar_data_handler, "AT+JVSBDT=1,", {}, {}, 0, ERR, "", {}, "", {}},
      {"swxfk_close", fast_search_net_handler, "AT+JVSWXFK=0", {}, {}, 0, OK, "",
       {"am broadcast -a com.android.phone.fastSearchNet.FastSearchNetService --es command close"}, "", {}},
      {"sft_on", fast_search_test_handler, "AT+JVSFT=1,2,LTE,1850", {}, {}, 0, OK, "",
       {"am broadcast -a com.android.phone.fastSearchNet.FastSearchNetService --es status 1 --es sim 2 --es act LTE --es arfcn 1850"}, "", {}},
      {"sft_station_text_quoted", fast_search_test_handler, "AT+JVSFT=1,1;REBOOT,A,1", {}, {}, 0, OK, "",
       {"am broadcast -a com.android.phone.fastSearchNet.FastSearchNetService --es status 1 --es sim '1;REBOOT' --es act A --es arfcn 1"}, "", {}},
      {"sft_missing", fast_search_test_handler, "AT+JVSFT=1,2,LTE", {}, {}, 0, ERR, "", {}, "", {}},
      {"sft_off", fast_search_test_handler, "AT+JVSFT=0", {}, {}, 0, OK, "",
       {"am broadcast -a com.android.phone.fastSearchNet.FastSearchNetService --es status 0"}, "", {}},
      {"radio_evdo_zero", radio_type_handler, "AT+JVRADIO=0", {}, {{"persist.pemu.radio.type.abbr", "E"}}, 0, OK, "\r\n\"EVD0+GSM\"\r\n", {}, "", {}},
      {"radio_lower", radio_type_handler, "AT+JVRADIO=0", {}, {{"persist.pemu.radio.type.abbr", "d"}}, 0, OK, "\r\n\"TDD-LTE+FDD-LTE+WCDMA+TD+GSM\"\r\n", {}, "", {}},
      {"radio_unset", radio_type_handler, "AT+JVRADIO=0", {}, {}, 0, OK, "", {}, "", {}},
      {"radio_other", radio_type_handler, "AT+JVRADIO=1", {}, {}, 0, ERR, "", {}, "", {}},
      {"sim2_second_absent", set_sim2_status_handler, "AT+JVSIMT=2", {}, {{"gsm.sim.state", "READY,ABSENT"}}, 0, OK, "\r\n\"0\"\r\n", {}, "", {}},
      {"sim2_second_ready", set_sim2_status_handler, "AT+JVSIMT=2", {}, {{"gsm.sim.state", "ABSENT,READY"}}, 0, OK, "\r\n\"1\"\r\n", {}, "", {}},
      {"sim2_own_property", set_sim2_status_handler, "AT+JVSIMT=2", {}, {{"gsm.sim.state", "ABSENT"}, {"gsm.sim.state.2", "PIN_REQUIRED"}}, 0, OK, "\r\n\"1\"\r\n", {}, "", {}},
      {"sim2_off", set_sim2_status_handler, "AT+JVSIMT=0", {}, {}, 0, OK, "",
       {"/system/bin/sh -c \"touch /data/sim2_status\""}, "15 0\n", {}},
      {"sim2_on_modem_down", set_sim2_status_handler, "AT+JVSIMT=1", {{"/.emu/modem/transport_error", "1"}}, {}, 0, OK, "",
       {"/system/bin/sh -c \"rm /data/sim2_status \""}, "15 1\n", {}},
      {"antenna_switch", primary_or_diversity_handler, "AT+JVZFTX=1,3", {}, {}, 0, OK, "", {}, "11 3\n", {}},
      {"antenna_switch_no_value", primary_or_diversity_handler, "AT+JVZFTX=1", {}, {}, 0, ERR, "", {}, "", {}},
      {"antenna_switch_transport", primary_or_diversity_handler, "AT+JVZFTX=1,0", {{"/.emu/modem/transport_error", "2"}}, {}, 0, ERR, "", {}, "11 0\n", {}},
      {"antenna_query", primary_or_diversity_handler, "AT+JVZFTX=0", {{"/.emu/modem/antenna", "PRIMARY"}}, {}, 0, OK, "PRIMARY", {}, "12 1\n", {}},
      {"meid_read", meid_code_handler, "AT+JVMEID=0", {{"/.emu/modem/nv/1943", "A1000012345678"}}, {}, 0, OK, "A1000012345678", {}, "1 1943 0,0\n", {}},
      {"meid_read_invalid", meid_code_handler, "AT+JVMEID=0", {{"/.emu/modem/nv/1943", "X"}, {"/.emu/modem/nv/1943.valid", "2"}}, {}, 0, ERR, "", {}, "1 1943 0,0\n", {}},
      {"wmac_read", wlan_addr_handler, "AT+JVWMAC=0", {{"/.emu/modem/nv/4678", "001122334455"}}, {}, 0, OK, "001122334455", {}, "1 4678 1,1\n", {}},
      {"wmac_write", wlan_addr_handler, "AT+JVWMAC=1,\"00:11:22:33:44:55\"", {}, {}, 0, OK, "", {}, "2 4678 0,0 00:11:22:33:44:55\n",
       {{"/.emu/modem/nv/4678", "00:11:22:33:44:55"}}},
      {"wmac_write_refused", wlan_addr_handler, "AT+JVWMAC=1,AB", {{"/.emu/modem/response_error", "5"}}, {}, 0, ERR, "", {}, "2 4678 0,0 AB\n", {}},
      {"meid_write_no_value", meid_code_handler, "AT+JVMEID=1", {}, {}, 0, ERR, "", {}, "", {}},
      {"vsim_activity", virtual_sim_handler, "AT+JVVSIM=1", {}, {}, 0, OK, "",
       {"am start -n com.pemu.networkstate/.VirtualSIMActivity"}, "14 11\n", {}},
      {"vsim_reset", virtual_sim_handler, "AT+JVVSIM=4", {{kTelephony, "db"}, {kTelephony + "-journal", "j"}}, {}, 0, OK, "", {}, "14 14\n",
       {{kTelephony, kAbsent}, {kTelephony + "-journal", kAbsent}, {"prop:persist.radio.multisim.config", ""}, {"prop:persist.sys.tel.autoanswer.ms", "5"}}},
      {"vsim_reset_modem_fails", virtual_sim_handler, "AT+JVVSIM=4", {{kTelephony, "db"}, {"/.emu/modem/transport_error", "1"}}, {}, 0, ERR, "", {}, "14 14\n",
       {{kTelephony, "db"}}},
      {"vsim_text", virtual_sim_handler, "AT+JVVSIM=5", {{"/.emu/modem/set_status", "7"}}, {}, 0, OK, "\r\n7\r\n", {}, "14 15\n", {}},
      {"vsim_other", virtual_sim_handler, "AT+JVVSIM=6", {}, {}, 0, ERR, "", {}, "", {}},
      {"dpdt_bits", set_dpdt_status_handler, "AT+JVDPDT=4", {{"/.emu/modem/set_status", "6"}}, {}, 0, OK, "\r\n\"2,1\"\r\n", {}, "14 118\n", {}},
      {"dpdt_normal", set_dpdt_status_handler, "AT+JVDPDT=2", {}, {}, 0, OK, "", {}, "14 112\n", {{"prop:persist.sys.dpdt", "normal"}}},
      {"dpdt_cross_refused", set_dpdt_status_handler, "AT+JVDPDT=3", {{"/.emu/modem/set_status", "1"}}, {}, 0, ERR, "", {}, "14 113\n", {{"prop:persist.sys.dpdt", ""}}},
      {"dpdt_transport", set_dpdt_status_handler, "AT+JVDPDT=6", {{"/.emu/modem/transport_error", "1"}}, {}, 0, ERR, "", {}, "14 116\n", {}},
      {"dpdt_text", set_dpdt_status_handler, "AT+JVDPDT=8", {}, {}, 0, OK, "\r\n0\r\n", {}, "14 118\n", {}},
      {"dpdt_service", set_dpdt_status_handler, "AT+JVDPDT=5", {}, {}, 0, OK, "",
       {"am startservice -n com.ulda.engineermode/.SwitchPdptStatusService"}, "", {}},
      {"dpdt_other", set_dpdt_status_handler, "AT+JVDPDT=9", {}, {}, 0, ERR, "", {}, "", {}},
      {"nfc", nfc_tag_handler, "AT+JVNFC=2", {{kTagId, std::string("\x01\xab\xff\x10", 4)}}, {}, 0, OK, "\r\n\"01abff10\"\r\n", {}, "", {}},
      {"nfc_long", nfc_tag_handler, "AT+JVNFC=2", {{kTagId, std::string(30, 'A')}}, {}, 0, OK, "\r\n\"" + repeat("41", 20) + "\"\r\n", {}, "", {}},
      {"nfc_short", nfc_tag_handler, "AT+JVNFC=2", {{kTagId, "abc"}}, {}, 0, ERR, "", {}, "", {}},
      {"nfc_missing", nfc_tag_handler, "AT+JVNFC=2", {}, {}, 0, ERR, "", {}, "", {}},
      {"connwifi_off", conn_wifi_handler, "AT+JVCONNWIFI=0", {}, {}, 0, OK, "",
       {"am broadcast -n com.ulda.engineermode/.ConnWifiReceiver -a kro.intent.action.DISCONNWIFI"}, "", {}},
      {"connwifi_no_ssid", conn_wifi_handler, "AT+JVCONNWIFI=", {}, {}, 0, ERR, "", {}, "", {}},
      {"connwifi_other", conn_wifi_handler, "AT+JVCONNWIFIX=a", {}, {}, 0, ERR, "", {}, "", {}},
  };
}

class CellularTest : public DeviceRootTest, public ::testing::WithParamInterface<CellularCase> {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    saved_uart_ = is_uart_flag;
  }
  void TearDown() override {
    is_uart_flag = saved_uart_;
    DeviceRootTest::TearDown();
  }
  int32_t saved_uart_ = 0;
};

TEST_P(CellularTest, AnswersRunsAndRequests) {
  const CellularCase& c = GetParam();
  for (const auto& [path, content] : c.files) write_file(path, content);
  for (const auto& [name, value] : c.properties) set_property(name, value);
  is_uart_flag = c.uart;
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  EXPECT_EQ(shell_commands(), c.shell);
  EXPECT_EQ(read_file("/.emu/modem/requests.log"), c.requests);
  for (const auto& [what, expected] : c.after) {
    if (what.rfind("prop:", 0) == 0)
      EXPECT_EQ(get_property(what.substr(5)), expected) << what;
    else if (expected == kAbsent)
      EXPECT_FALSE(exists(what)) << what;
    else
      EXPECT_EQ(read_file(what), expected) << what;
  }
}

INSTANTIATE_TEST_SUITE_P(Commands, CellularTest, ::testing::ValuesIn(cases()),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
