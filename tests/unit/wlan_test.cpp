#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "commands/wlan.h"
#include "core/command.h"
#include "core/transport.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Lines = std::vector<std::string>;

struct WlanCase {
  const char* name;
  std::string line;
  std::string modules;      // /proc/modules
  std::string driver_out;   // what the driver's get_* command leaves in its output file
  int status;
  std::string body;
  Lines commands;           // tool commands, as run inside sh -c "..."
};
void PrintTo(const WlanCase& c, std::ostream* os) { *os << c.name; }

const std::string kLoaded = "wlan 1 0 - Live 0x0000000000000000\n";

Lines tx(const std::string& channel, const std::string& rate, const std::string& power) {
  return {"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1",
          "iwpriv wlan0 set_channel " + channel, "iwpriv wlan0 ena_chain 2",
          "iwpriv wlan0 set_txrate " + rate, "iwpriv wlan0 pwr_cntl_mode 2",
          "iwpriv wlan0 set_txpower " + power, "iwpriv wlan0 tx 1"};
}

Lines rx(const std::string& channel) {
  return {"iwpriv wlan0 ftm 1", "iwpriv wlan0 set_channel " + channel, "iwpriv wlan0 ena_chain 1",
          "iwpriv wlan0 pwr_cntl_mode 2", "iwpriv wlan0 clr_rxpktcnt 1", "iwpriv wlan0 rx 1"};
}

Lines sp(const std::string& rate, const std::string& power) {
  return {"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1",
          "iwpriv wlan0 set_channel 1", "iwpriv wlan0 ena_chain 2",
          "iwpriv wlan0 set_txrate " + rate, "iwpriv wlan0 pwr_cntl_mode 2",
          "iwpriv wlan0 set_chpower " + power};
}

Lines with_default_power(Lines commands) {
  commands.insert(commands.end() - 2, {"iwpriv wlan0 get_chpower > /data/wlanTxPower",
                                       "rm /data/wlanTxPower"});
  return commands;
}

std::vector<WlanCase> cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const std::string load = "insmod /system/lib/modules/wlan.ko con_mode=5 ";
  Lines tx_off_unloaded = with_default_power(tx("1", "11B_LONG_1_MBPS", "1500"));
  tx_off_unloaded.insert(tx_off_unloaded.begin(), load);
  return {
      {"tx_b", "AT+JVWLAN=2,2412.00,11.00,15.5", kLoaded, "", OK, "", tx("1", "11B_LONG_11_MBPS", "1550")},
      {"tx_power_off_loads_driver", "AT+JVWLAN=2,2412.00,1.00,off", "", "wlan0     get_chpower:1500\n", OK, "", tx_off_unloaded},
      {"tx_power_off_no_value", "AT+JVWLAN=2,2412.00,1.00,OFF", kLoaded, "wlan0 get_chpower\n", ERR, "",
       {"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1", "iwpriv wlan0 set_channel 1",
        "iwpriv wlan0 ena_chain 2", "iwpriv wlan0 set_txrate 11B_LONG_1_MBPS",
        "iwpriv wlan0 pwr_cntl_mode 2", "iwpriv wlan0 get_chpower > /data/wlanTxPower"}},
      {"tx_power_Off_is_a_number", "AT+JVWLAN=2,2412.00,1.00,Off", kLoaded, "", OK, "", tx("1", "11B_LONG_1_MBPS", "0")},
      {"tx_frequency_needs_decimals", "AT+JVWLAN=2,2412,11.00,15", kLoaded, "", ERR, "", {}},
      {"tx_n_rate_refused_on_2", "AT+JVWLAN=2,2437.00,6.50,15", kLoaded, "", ERR, "", {}},
      {"tx_5ghz_refused_on_2", "AT+JVWLAN=2,5180.00,6.00,15", kLoaded, "", ERR, "", {}},
      {"tx_missing_power", "AT+JVWLAN=2,2412.00,11.00", kLoaded, "", ERR, "", {}},
      {"tx_20_is_2", "AT+JVWLAN=20", kLoaded, "", ERR, "", {}},
      {"tx_n", "AT+JVWLAN=3,2437.00,6.50,15", "", "", OK, "", tx("6", "MCS_6_5_MBPS", "1500")},
      {"tx_a_5ghz", "AT+JVWLAN=3,5825.00,54.00,20", "", "", OK, "", tx("165", "11A_54_MBPS", "2000")},
      {"tx_5ghz_column_order", "AT+JVWLAN=3,4920.00,72.20,5", "", "", OK, "", tx("240", "MCS_SG_72_2_MBPS", "500")},
      {"tx_bonded", "AT+JVWLAN=3,5210.00,200.00,15,2", "", "", OK, "", tx("42", "VHT_MCS_CB_SGI_200_MBPS", "1500")},
      {"tx_bonded_out_of_range", "AT+JVWLAN=3,5210.00,200.00,15,11", "", "", ERR, "", {}},
      {"tx_bonded_needs_bonded_channel", "AT+JVWLAN=3,5180.00,200.00,15,2", "", "", ERR, "", {}},
      {"tx_bonded_needs_ac_rate", "AT+JVWLAN=3,5210.00,6.50,15,2", "", "", ERR, "", {}},
      {"rx_b", "AT+JVWLAN=4,2484.00,5.50", "", "", OK, "", rx("14")},
      {"rx_missing_rate", "AT+JVWLAN=4,2484.00", "", "", ERR, "", {}},
      {"rx_wide", "AT+JVWLAN=5,5180.00,6.50", "", "", OK, "", rx("36")},
      {"rx_bonded", "AT+JVWLAN=5,5795.00,433.30,10", "", "", OK, "", rx("159")},
      {"count", "AT+JVWLAN=6", "", "wlan0     get_rxpktcnt:1234\n", OK, "\"1234\"",
       {"iwpriv wlan0 get_rxpktcnt > /data/wlanRxPER", "rm /data/wlanRxPER", "iwpriv wlan0 clr_rxpktcnt 1"}},
      {"count_no_file", "AT+JVWLAN=6", "", "", ERR, "", {"iwpriv wlan0 get_rxpktcnt > /data/wlanRxPER"}},
      {"stop_tx", "AT+JVWLAN=7", "", "", OK, "", {"iwpriv wlan0 tx 0"}},
      {"stop_rx", "AT+JVWLAN=8", "", "", OK, "", {"iwpriv wlan0 rx 0", "iwpriv wlan0 ftm 0"}},
      {"deinit", "AT+JVWLAN=9", "", "", OK, "",
       {"iwpriv wlan0 tx 0", "iwpriv wlan0 rx 0", "iwpriv wlan0 ftm 0", "rmmod cfg80211", "rmmod wlan",
        "echo 0 > /sys/module/wcnsscore/parameters/wlan_eng_mode"}},
      {"clear_count", "AT+JVWLAN=10", "", "", OK, "", {"iwpriv wlan0 clr_rxpktcnt 1"}},
      {"init_with_parameter", "AT+JVWLAN=1,x", "", "", ERR, "", {}},
      {"set_power_b", "AT+JVWLAN=SP,B,20", "", "", OK, "", sp("11B_LONG_11_MBPS", "2000")},
      {"set_power_n_lower", "AT+JVWLAN=SP,n,5", "", "", OK, "", sp("MCS_6_5_MBPS", "500")},
      {"set_power_above", "AT+JVWLAN=SP,B,20.5", "", "", ERR, "", {}},
      {"set_power_below", "AT+JVWLAN=SP,G,4.9", "", "", ERR, "", {}},
      {"set_power_protocol", "AT+JVWLAN=SP,AC,10", "", "", ERR, "", {}},
      {"set_power_missing", "AT+JVWLAN=SP,G", "", "", ERR, "", {}},
      {"get_power", "AT+JVWLAN=GP,G", "", "wlan0     get_chpower:1550\n", OK, "\r\n\"15.500000\"\r\n",
       {"iwpriv wlan0 tx 0", "iwpriv wlan0 ftm 0", "iwpriv wlan0 ftm 1", "iwpriv wlan0 set_channel 1",
        "iwpriv wlan0 set_txrate 11A_18_MBPS", "iwpriv wlan0 get_chpower > /data/wlanTxPower",
        "rm /data/wlanTxPower"}},
      {"get_power_protocol", "AT+JVWLAN=GP,A", "", "", ERR, "", {}},
      {"set_config", "AT+JVWLAN=SC,3", "", "", OK, "", {"ptt_socket_app", "iwpriv wlan0 set_configitem 3"}},
      {"set_config_missing", "AT+JVWLAN=SC", "", "", ERR, "", {"ptt_socket_app"}},
      {"get_config", "AT+JVWLAN=GC", "", "wlan0     get_configitem:7\n", OK, "\r\n\"7\"\r\n",
       {"iwpriv wlan0 ftm 1", "iwpriv wlan0 get_configitem > /data/wlanTxPower", "rm /data/wlanTxPower"}},
      {"other", "AT+JVWLAN=11", "", "", ERR, "", {}},
  };
}

class WlanTest : public DeviceRootTest, public ::testing::WithParamInterface<WlanCase> {};

TEST_P(WlanTest, RunsTheDriverSequence) {
  const WlanCase& c = GetParam();
  write_file("/proc/modules", c.modules);
  // The driver's get_* commands leave their output where the redirection points.
  shell_action() = [this, &c](const std::string& command) {
    const size_t to = command.find(" > /data/");
    if (to != std::string::npos && command.find("get_") != std::string::npos && !c.driver_out.empty())
      write_file(command.substr(to + 3, command.size() - to - 4), c.driver_out);
    return 0;
  };
  const HandlerAnswer answer = call_handler(wifi_handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  Lines expected;
  for (const std::string& command : c.commands)
    expected.push_back("/system/bin/sh -c \"" + command + "\"");
  if (c.line.rfind("AT+JVWLAN=SC", 0) == 0) expected.insert(expected.begin(), "killall -9 ptt_socket_app");
  EXPECT_EQ(shell_commands(), expected);
}

INSTANTIATE_TEST_SUITE_P(Variants, WlanTest, ::testing::ValuesIn(cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class WlanInitTest : public DeviceRootTest {};

// The driver did not come up: loaded a second time after the settling wait.
TEST_F(WlanInitTest, InitLoadsInEngineeringModeAndRetries) {
  write_file("/proc/modules", "cfg80211 1 0 - Live 0x0\n");
  const int32_t saved_sp = is_sp;
  is_sp = 0;
  const HandlerAnswer answer = call_handler(wifi_handler, "at+jvwlan=1");
  is_sp = saved_sp;
  EXPECT_EQ(answer.status, RESULT_OK);
  const Lines expected = {
      "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 2",
      "/system/bin/sh -c \"rmmod cfg80211\"",
      "/system/bin/sh -c \"rmmod wlan\"",
      "/system/bin/sh -c \"insmod /system/lib/modules/cfg80211.ko\"",
      "/system/bin/sh -c \"echo 5 >  /sys/module/wcnsscore/parameters/wlan_eng_mode\"",
      "/system/bin/sh -c \"insmod /system/lib/modules/wlan.ko con_mode=5 \"",
      "/system/bin/sh -c \"insmod /system/lib/modules/wlan.ko con_mode=5 \"",
  };
  EXPECT_EQ(shell_commands(), expected);
}

TEST_F(WlanInitTest, DriverLoadedIsAPrefixOfAModulesLine) {
  EXPECT_EQ(check_driver_loaded("wlan"), 0);  // no /proc/modules
  write_file("/proc/modules", "cfg80211 1 0 - Live 0x0\nwlan 2 0 - Live 0x0\n");
  EXPECT_EQ(check_driver_loaded("wlan"), 1);
  EXPECT_EQ(check_driver_loaded("wcnss"), 0);
  write_file("/proc/modules", "wlanx 2 0 - Live 0x0\n");  // a prefix, as the driver compares
  EXPECT_EQ(check_driver_loaded("wlan"), 1);
}

}  // namespace
