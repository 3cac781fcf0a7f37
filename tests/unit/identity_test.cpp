#include "commands/identity.h"

#include "tests/unit/handler_case.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
constexpr int kUnknown = -1;  // framed as "UNKNOWN"
constexpr CommandHandler kEgmr = imei_and_pcb_code_on_handler;
constexpr CommandHandler kProp = property_set_handler;
const std::string kTransportError = "/.emu/modem/transport_error";
const std::string kScratch = "/data/RSAtemp";
const std::string kGenkey = "/system/bin/sh -c \"/data/pemukp --genkey&\"";
const std::string kKeysaved = "/system/bin/sh -c \"/data/pemukp --keysaved> /data/RSAtemp\"";
const std::string kGetkey = "/system/bin/sh -c \"/data/pemukp --getkey > /data/RSAtemp\"";
const std::string kTest = "prop:persist.sys.test";

// A modem item command, with the simulated modem's request log and the barcode property after it.
HandlerCase modem(const char* name, CommandHandler handler, const char* line, Pairs before, int status,
                  const char* body, const std::string& requests, const char* barcode = "") {
  return {name, handler, line, std::move(before), status, body, {},
          {{"/.emu/modem/requests.log", requests}, {"prop:persist.sys.barcode", barcode}}};
}

// The key tool through a shell that returns `shell_status`; `output` is what the tool left in
// the scratch file (kAbsent: nothing), which is read once and deleted.
HandlerCase key(const char* name, const char* variant, const std::string& command, int shell_status,
                const std::string& output, int status, const std::string& body) {
  HandlerCase c{name, RSA_key_handler, std::string("AT+PEMUKP=1,") + variant, {}, status, body, {command},
                {{kScratch, kAbsent}}};
  c.shell_status = shell_status;
  if (output != kAbsent) c.shell_writes = {{kScratch, output}};
  return c;
}

const HandlerCase kRows[] = {
    modem("read_barcode", kEgmr, "AT+EGMR=0,5", {{"/.emu/modem/nv/6853", "PCB1"}}, OK, "PCB1", "1 6853 0,0\n"),
    modem("read_imei_options", kEgmr, "AT+EGMR=0,10", {}, OK, "", "1 550 1,1\n"),
    modem("read_near_miss", kEgmr, "AT+EGMR=0,5X", {}, ERR, "", kAbsent),
    modem("read_transport_error", kEgmr, "AT+EGMR=0,5", {{"/.emu/modem/nv/6853", "PCB"}, {kTransportError, "1"}},
          ERR, "", "1 6853 0,0\n"),
    modem("read_send_error", kEgmr, "AT+EGMR=0,5", {{"/.emu/modem/send_error", "-1"}}, ERR, "", kAbsent),
    // "=1,7" is told apart first, then "=1,10"; all else that passed is the barcode.
    modem("write_barcode", kEgmr, "AT+EGMR=1,5,\"PCB9\"", {}, OK, "", "2 6853 0,0 PCB9\n", "PCB9"),
    modem("write_imei", kEgmr, "AT+EGMR=1,7,123456789012345", {}, OK, "", "2 550 0,0 123456789012345\n"),
    modem("write_imei_options", kEgmr, "AT+EGMR=1,10,3579", {}, OK, "", "2 550 1,1 3579\n"),
    modem("write_imei_prefix", kEgmr, "AT+EGMR=1,70,3579", {}, OK, "", "2 550 0,0 3579\n"),
    modem("write_no_value", kEgmr, "AT+EGMR=1,5", {}, ERR, "", kAbsent),
    modem("write_other_item", kEgmr, "AT+EGMR=1,6,X", {}, ERR, "", kAbsent),
    modem("write_transport_error", kEgmr, "AT+EGMR=1,5,B", {{kTransportError, "1"}}, ERR, "", "2 6853 0,0 B\n"),
    modem("tdnv_read", nv_66024_handler, "AT+JVTDNV=0", {{"/.emu/modem/nv/66024", "1"}}, OK, "1", "1 66024 0,0\n"),
    modem("tdnv_write", nv_66024_handler, "AT+JVTDNV=1,\"7\"", {}, OK, "", "2 66024 0,0 7\n"),
    modem("sys_write", change_sig_system_handler, "AT+JVSYS=1,TDS", {}, OK, "", "2 72542 0,0 TDS\n"),
    modem("sys_no_value", change_sig_system_handler, "AT+JVSYS=1,", {}, ERR, "", kAbsent),

    // Only a shell that could not run the tool fails; the background variants answer UNKNOWN.
    key("genkey", "GENKEY", kGenkey, 1 << 8, kAbsent, OK, ""),
    key("genkey_no_tool", "GENKEY", kGenkey, 127 << 8, kAbsent, kUnknown, ""),
    key("genkey_no_shell", "GENKEY", kGenkey, -1, kAbsent, kUnknown, ""),
    key("genuniqueid", "GENUNIQUEID", "/system/bin/sh -c \"/data/pemukp --genuniqueid&\"", 0, kAbsent, OK, ""),
    key("keysaved", "KEYSAVED", kKeysaved, 0, "true\n", OK, ""),
    key("keysaved_false", "KEYSAVED", kKeysaved, 0, "false\n", ERR, ""),
    key("keysaved_no_output", "KEYSAVED", kKeysaved, 0, kAbsent, ERR, ""),
    key("getkey", "GETKEY", kGetkey, 0, "MIIBIjAN", OK, "\"MIIBIjAN\""),
    key("getkey_cut", "GETKEY", kGetkey, 0, std::string(700, 'k'), OK, "\"" + std::string(600, 'k') + "\""),
    key("getkey_no_shell", "GETKEY", kGetkey, -1, kAbsent, ERR, ""),
    key("getuniqueid", "GETUNIQUEID", "/system/bin/sh -c \"/data/pemukp --getuniqueid > /data/RSAtemp\"", 0, "ID42",
        OK, "\"ID42\""),
    {"key_near_miss", RSA_key_handler, "AT+PEMUKP=1,GENKEY2", {}, ERR, ""},

    // Only the name is lowered; everything after the second comma is the value.
    {"property_set", kProp, "AT+JVPROP=1,PERSIST.SYS.TEST,AB,C", {}, OK, "AB,C", {}, {{kTest, "AB,C"}}},
    {"property_read", kProp, "AT+JVPROP=0,PERSIST.SYS.TEST", {{kTest, "AB,C"}}, OK, "AB,C"},
    {"property_unset", kProp, "AT+JVPROP=0,RO.NOT.SET", {}, OK, "NULL"},
    {"property_no_name", kProp, "AT+JVPROP=0", {}, ERR, ""},
    {"property_one_comma", kProp, "AT+JVPROP=1,PERSIST.SYS.TEST", {}, ERR, "", {}, {{kTest, ""}}},
    // The value buffer holds 99 characters: a longer value is refused, not cut.
    {"property_too_long", kProp, "AT+JVPROP=1,PERSIST.SYS.TEST," + std::string(100, 'V'), {{kTest, "AB,C"}}, ERR, "",
     {}, {{kTest, "AB,C"}}},
    // A value the property store does not take: the read-back differs.
    {"property_not_taken", kProp, "AT+JVPROP=1,PERSIST.SYS.TEST," + std::string(99, 'V'), {{kTest, "AB,C"}}, ERR,
     "AB,C", {}, {{kTest, "AB,C"}}},
    {"property_other", kProp, "AT+JVPROP=2,PERSIST.SYS.TEST", {}, ERR, ""},
};

INSTANTIATE_TEST_SUITE_P(Identity, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
