#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "commands/bluetooth.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Lines = std::vector<std::string>;

const std::string kNv = "/persist/.bt_nv.bin";
const std::string kScan = "/data/user/0/com.ulda.engineermode/bt_device";
const std::string kAddr = std::string("\x01\x00\x06\x01\x02\x03\x04\x05\x06", 9);

std::string bytes(std::initializer_list<int> values) {
  std::string out;
  for (int v : values) out += static_cast<char>(v);
  return out;
}

struct BtCase {
  const char* name;
  std::string line;
  std::string nv;       // NV file content; "-" for no file
  std::string scan;     // scan file content; "-" for no file
  std::string dut;      // bluetooth.bdt.pemudut after the tool ran
  int status;
  std::string body;
  Lines shell;
};
void PrintTo(const BtCase& c, std::ostream* os) { *os << c.name; }

std::string tool(const std::string& command) { return "/system/bin/sh -c \"" + command + "\""; }

std::vector<BtCase> cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const std::string other_item = bytes({2, 0, 3, 9, 9, 9});
  return {
      {"read", "AT+EMBT=5", kAddr, "-", "", OK, "+EMBT: \"060504030201\"", {}},
      {"read_after_other_items", "AT+EMBT=5", other_item + other_item + other_item + kAddr, "-", "", OK, "+EMBT: \"060504030201\"", {}},
      {"read_fifth_item", "AT+EMBT=5", other_item + other_item + other_item + other_item + kAddr, "-", "", ERR, "", {}},
      {"read_long_value", "AT+EMBT=5", bytes({1, 7, 8, 0xa1, 0xb2, 0xc3, 0xd4, 0xe5, 0xf6, 0x77, 0x88}), "-", "", OK, "+EMBT: \"F6E5D4C3B2A1\"", {}},
      {"read_short_value", "AT+EMBT=5", bytes({1, 0, 5, 1, 2, 3, 4, 5}), "-", "", ERR, "", {}},
      {"read_truncated_value", "AT+EMBT=5", bytes({1, 0, 6, 1, 2, 3}), "-", "", ERR, "", {}},
      {"read_no_item", "AT+EMBT=5", other_item, "-", "", ERR, "", {}},
      {"read_empty_file", "AT+EMBT=5", "", "-", "", ERR, "", {}},
      {"read_no_file", "AT+EMBT=5", "-", "-", "", ERR, "", {}},
      {"write", "AT+EMBT=0,BT,0123456789ab", "-", "-", "", OK, "", {tool("btnvtool -b AB.89.67.45.23.01")}},
      {"write_missing", "AT+EMBT=0,BT", "-", "-", "", ERR, "", {}},
      {"write_short", "AT+EMBT=0,BT,0123456789A", "-", "-", "", ERR, "", {}},
      {"write_station_text", "AT+EMBT=0,BT,\";reboot;\"xxxxxx", "-", "-", "", OK, "", {tool("btnvtool -b 11.B2.8D.B8.BE.2B")}},
      {"dut", "AT+EMBT=1", "-", "-", "true", OK, "", {tool("bdt entrydut")}},
      {"dut_not_entered", "AT+EMBT=1", "-", "-", "false", ERR, "", {tool("bdt entrydut")}},
      {"tx", "AT+EMBT=1,39", "-", "-", "true", OK, "", {tool("bdt txcontinuous 39")}},
      {"tx_10_is_channel_form", "AT+EMBT=10", "-", "-", "true", ERR, "", {}},
      {"tx_channel_not_digits", "AT+EMBT=1,3;x", "-", "-", "true", ERR, "", {}},
      {"tx_channel_too_long", "AT+EMBT=1,1234", "-", "-", "true", ERR, "", {}},
      {"dut_query", "AT+EMBT=4", "-", "-", "xtruex", OK, "", {}},
      {"dut_query_unset", "AT+EMBT=4", "-", "-", "", ERR, "", {}},
      {"exit", "AT+EMBT=2", "-", "-", "", OK, "", {tool("bdt exitdut")}},
      {"scan", "AT+EMBT=6", "-", "-", "", OK, "", {"am broadcast -a android.intent.action.SCAN_BT_DEVICE"}},
      {"scan_stop", "AT+EMBT=8", "-", "-", "", OK, "", {"am broadcast -a android.intent.action.STOP_BT_DEVICE"}},
      {"scan_result", "AT+EMBT=7", "-", "a\nb\n", "", OK, "\r\n\"a\n,\r\nb\n\"\r\n", {}},
      {"scan_result_five", "AT+EMBT=7", "-", "1\n2\n3\n4\n5\n6\n7\n", "", OK, "\r\n\"1\n,\r\n2\n,\r\n3\n,\r\n4\n,\r\n5\n\"\r\n", {}},
      {"scan_result_empty", "AT+EMBT=7", "-", "", "", OK, "\"\r\n", {}},
      {"scan_result_long_lines", "AT+EMBT=7", "-", std::string(2000, 'x'), "", OK,
       "\r\n\"" + std::string(255, 'x') + ",\r\n" + std::string(255, 'x') + ",\r\n" + std::string(255, 'x') + ",\r\n" + std::string(255, 'x') + ",\r\n" + std::string(255, 'x') + "\"\r\n", {}},
      {"scan_result_missing", "AT+EMBT=7", "-", "-", "", ERR, "", {}},
      {"other", "AT+EMBT=3", "-", "-", "", ERR, "", {}},
  };
}

class BluetoothTest : public DeviceRootTest, public ::testing::WithParamInterface<BtCase> {};

TEST_P(BluetoothTest, Answers) {
  const BtCase& c = GetParam();
  if (c.nv != "-") write_file(kNv, c.nv);
  if (c.scan != "-") write_file(kScan, c.scan);
  shell_action() = [this, &c](const std::string&) {
    set_property("bluetooth.bdt.pemudut", c.dut);
    return 0;
  };
  if (c.line == "AT+EMBT=4") set_property("bluetooth.bdt.pemudut", c.dut);
  const HandlerAnswer answer = call_handler(bt_handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  EXPECT_EQ(shell_commands(), c.shell);
}

INSTANTIATE_TEST_SUITE_P(Variants, BluetoothTest, ::testing::ValuesIn(cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class BtNvReadTest : public DeviceRootTest {};

TEST_F(BtNvReadTest, CountsEveryHeaderFillsFourRecords) {
  bt_nv_item items[BT_NV_ITEMS] = {};
  EXPECT_EQ(bt_nv_read(items), -1);
  // Six items, the last one cut short: it still counts.
  std::string file;
  for (int id = 1; id <= 5; ++id) file += bytes({id, 0x40 + id, 2, id, id});
  file += bytes({9, 0, 200, 1});
  write_file(kNv, file);
  EXPECT_EQ(bt_nv_read(items), 6);
  for (int i = 0; i < BT_NV_ITEMS; ++i) {
    EXPECT_EQ(items[i].id, static_cast<uint32_t>(i + 1));
    EXPECT_EQ(items[i].second, static_cast<uint32_t>(0x41 + i));
    EXPECT_EQ(items[i].length, 2);
    EXPECT_EQ(items[i].value[1], i + 1);
    EXPECT_TRUE(items[i].value_read);
  }
}

}  // namespace
