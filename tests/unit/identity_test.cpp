#include <gtest/gtest.h>
#include <sys/wait.h>

#include <string>
#include <utility>
#include <vector>

#include "commands/identity.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Files = std::vector<std::pair<std::string, std::string>>;

constexpr int kUnknown = -1;  // framed as "UNKNOWN"

struct ModemCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Files files;
  int status;
  std::string body;
  std::string requests;  // the simulated modem's request log afterwards
  std::string barcode;   // "persist.sys.barcode" afterwards
};
void PrintTo(const ModemCase& c, std::ostream* os) { *os << c.name; }

std::vector<ModemCase> modem_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const auto egmr = imei_and_pcb_code_on_handler;
  const Files barcode{{"/.emu/modem/nv/6853", "PCB0001"}};
  return {
      {"read_barcode", egmr, "AT+EGMR=0,5", barcode, OK, "PCB0001", "1 6853 0,0\n", ""},
      {"read_imei", egmr, "AT+EGMR=0,7", {{"/.emu/modem/nv/550", "3579"}}, OK, "3579", "1 550 0,0\n", ""},
      {"read_imei_options", egmr, "AT+EGMR=0,10", {}, OK, "", "1 550 1,1\n", ""},
      {"read_trailing_text", egmr, "AT+EGMR=0,5X", barcode, ERR, "", "", ""},
      {"read_transport_error", egmr, "AT+EGMR=0,5", {{"/.emu/modem/nv/6853", "PCB"}, {"/.emu/modem/transport_error", "1"}}, ERR, "", "1 6853 0,0\n", ""},
      {"read_send_error", egmr, "AT+EGMR=0,5", {{"/.emu/modem/send_error", "-1"}}, ERR, "", "", ""},
      // "=1,7" is told apart first, then "=1,10"; all else that passed is the barcode.
      {"write_barcode", egmr, "AT+EGMR=1,5,\"PCB9\"", {}, OK, "", "2 6853 0,0 PCB9\n", "PCB9"},
      {"write_imei", egmr, "AT+EGMR=1,7,123456789012345", {}, OK, "", "2 550 0,0 123456789012345\n", ""},
      {"write_imei_options", egmr, "AT+EGMR=1,10,3579", {}, OK, "", "2 550 1,1 3579\n", ""},
      {"write_imei_prefix", egmr, "AT+EGMR=1,70,3579", {}, OK, "", "2 550 0,0 3579\n", ""},
      {"write_no_value", egmr, "AT+EGMR=1,5", {}, ERR, "", "", ""},
      {"write_empty_value", egmr, "AT+EGMR=1,5,\"\"", {}, ERR, "", "", ""},
      {"write_other_item", egmr, "AT+EGMR=1,6,X", {}, ERR, "", "", ""},
      {"write_transport_error", egmr, "AT+EGMR=1,5,B", {{"/.emu/modem/transport_error", "1"}}, ERR, "", "2 6853 0,0 B\n", ""},

      {"tdnv_read", nv_66024_handler, "AT+JVTDNV=0", {{"/.emu/modem/nv/66024", "1"}}, OK, "1", "1 66024 0,0\n", ""},
      {"tdnv_write", nv_66024_handler, "AT+JVTDNV=1,\"7\"", {}, OK, "", "2 66024 0,0 7\n", ""},
      {"tdnv_no_value", nv_66024_handler, "AT+JVTDNV=1", {}, ERR, "", "", ""},
      {"sys_read", change_sig_system_handler, "AT+JVSYS=0", {{"/.emu/modem/nv/72542", "W"}}, OK, "W", "1 72542 0,0\n", ""},
      {"sys_write", change_sig_system_handler, "AT+JVSYS=1,TDS", {}, OK, "", "2 72542 0,0 TDS\n", ""},
      {"sys_no_value", change_sig_system_handler, "AT+JVSYS=1,", {}, ERR, "", "", ""},
  };
}

class ModemItemTest : public DeviceRootTest, public ::testing::WithParamInterface<ModemCase> {};

TEST_P(ModemItemTest, AnswersAndRequests) {
  const ModemCase& c = GetParam();
  for (const auto& [path, content] : c.files) write_file(path, content);
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  EXPECT_EQ(read_file("/.emu/modem/requests.log"), c.requests);
  EXPECT_EQ(get_property("persist.sys.barcode"), c.barcode);
}

INSTANTIATE_TEST_SUITE_P(Identity, ModemItemTest, ::testing::ValuesIn(modem_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

// The device-key tool: what it printed into the scratch file, or how the shell failed.
struct KeyCase {
  const char* name;
  std::string line;
  int shell_status;
  const char* output;  // nullptr: the tool wrote nothing
  int status;
  std::string body;
  std::string command;  // empty: no shell call
  bool scratch_left;
};
void PrintTo(const KeyCase& c, std::ostream* os) { *os << c.name; }

std::vector<KeyCase> key_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const int kNotFound = 127 << 8;
  const std::string genkey = "/system/bin/sh -c \"/data/pemukp --genkey&\"";
  const std::string keysaved = "/system/bin/sh -c \"/data/pemukp --keysaved> /data/RSAtemp\"";
  const std::string getkey = "/system/bin/sh -c \"/data/pemukp --getkey > /data/RSAtemp\"";
  const std::string getid = "/system/bin/sh -c \"/data/pemukp --getuniqueid > /data/RSAtemp\"";
  static const std::string long_key(700, 'k');
  return {
      {"genkey", "AT+PEMUKP=1,GENKEY", 0, nullptr, OK, "", genkey, false},
      {"genkey_tool_failed", "AT+PEMUKP=1,GENKEY", 1 << 8, nullptr, OK, "", genkey, false},
      {"genkey_no_tool", "AT+PEMUKP=1,GENKEY", kNotFound, nullptr, kUnknown, "", genkey, false},
      {"genkey_no_shell", "AT+PEMUKP=1,GENKEY", -1, nullptr, kUnknown, "", genkey, false},
      {"genuniqueid", "AT+PEMUKP=1,GENUNIQUEID", 0, nullptr, OK, "",
       "/system/bin/sh -c \"/data/pemukp --genuniqueid&\"", false},
      {"keysaved", "AT+PEMUKP=1,KEYSAVED", 0, "true\n", OK, "", keysaved, false},
      {"keysaved_false", "AT+PEMUKP=1,KEYSAVED", 0, "false\n", ERR, "", keysaved, false},
      {"keysaved_no_output", "AT+PEMUKP=1,KEYSAVED", 0, nullptr, ERR, "", keysaved, false},
      {"keysaved_no_tool", "AT+PEMUKP=1,KEYSAVED", kNotFound, "true", kUnknown, "", keysaved, true},
      {"getkey", "AT+PEMUKP=1,GETKEY", 0, "MIIBIjAN", OK, "\"MIIBIjAN\"", getkey, false},
      {"getkey_cut", "AT+PEMUKP=1,GETKEY", 0, long_key.c_str(), OK,
       std::string(1, '"').append(600, 'k').append(1, '"'), getkey, false},
      {"getkey_no_shell", "AT+PEMUKP=1,GETKEY", -1, nullptr, ERR, "", getkey, false},
      {"getuniqueid", "at+pemukp=1,getuniqueid", 0, "ID42", OK, "\"ID42\"", getid, false},
      {"other", "AT+PEMUKP=1,GENKEY2", 0, nullptr, ERR, "", "", false},
  };
}

class KeyToolTest : public DeviceRootTest, public ::testing::WithParamInterface<KeyCase> {};

TEST_P(KeyToolTest, RunsToolAndReadsItsOutput) {
  const KeyCase& c = GetParam();
  make_dir("/data");
  const std::string output = c.output != nullptr ? c.output : "";
  const bool writes = c.output != nullptr;
  shell_action() = [this, &c, output, writes](const std::string&) {
    if (writes) write_file("/data/RSAtemp", output);
    return c.shell_status;
  };
  const HandlerAnswer answer = call_handler(RSA_key_handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  const std::vector<std::string> expected =
      c.command.empty() ? std::vector<std::string>{} : std::vector<std::string>{c.command};
  EXPECT_EQ(shell_commands(), expected);
  EXPECT_EQ(exists("/data/RSAtemp"), c.scratch_left);
}

INSTANTIATE_TEST_SUITE_P(Identity, KeyToolTest, ::testing::ValuesIn(key_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class PropertyTest : public DeviceRootTest {};

TEST_F(PropertyTest, SetsAndReadsByName) {
  set_property("ro.fixed", "A");
  struct Step {
    std::string line;
    int status;
    std::string body;
  };
  const std::string long_value(100, 'V');
  const Step steps[] = {
      // Only the name is lowered; everything after the second comma is the value.
      {"AT+JVPROP=1,PERSIST.SYS.TEST,AB,C", RESULT_OK, "AB,C"},
      {"AT+JVPROP=0,PERSIST.SYS.TEST", RESULT_OK, "AB,C"},
      {"AT+JVPROP=0,RO.NOT.SET", RESULT_OK, "NULL"},
      {"AT+JVPROP=1,PERSIST.SYS.TEST", RESULT_ERROR, ""},
      {"AT+JVPROP=1,,X", RESULT_ERROR, ""},
      {"AT+JVPROP=1,PERSIST.SYS.TEST," + long_value, RESULT_ERROR, ""},
      {"AT+JVPROP=1,PERSIST.SYS.TEST," + long_value.substr(1), RESULT_ERROR, "AB,C"},
      {"AT+JVPROP=1,RO.FIXED,B", RESULT_ERROR, "A"},
      {"AT+JVPROP=0", RESULT_ERROR, ""},
      {"AT+JVPROP=2,PERSIST.SYS.TEST", RESULT_ERROR, ""},
  };
  for (const Step& step : steps) {
    const HandlerAnswer answer = call_handler(property_set_handler, step.line);
    EXPECT_EQ(answer.status, step.status) << step.line;
    EXPECT_EQ(answer.body, step.body) << step.line;
  }
  EXPECT_EQ(get_property("persist.sys.test"), "AB,C");
  EXPECT_EQ(get_property("ro.fixed"), "A");
}

}  // namespace
