#include "commands/identity.h"

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/qmi_client.h"

namespace {

constexpr uint32_t kBarcodeItem = 6853;
constexpr uint32_t kImeiItem = 550;

// A request that could not be sent or whose answer carried a transport error.
bool modem_request_failed(int ret, const QmiResult& result) {
  if (ret == 0 && result.flag == 0) return false;
  ATCI_LOGE("======send qmi msg fail\n");
  return true;
}

// The body is the item's text as the modem answered it; an item the modem does not hold
// answers an empty body.
int read_nv_item(uint32_t item, uint8_t option, char* response) {
  kro_read_nv_info_req_msg_v01 req{};
  req.nvItem_id = item;
  req.option[0] = req.option[1] = option;
  qmi::client_type clnt{};
  qmi::txn_handle txn{};
  QmiResult result;
  if (modem_request_failed(qmi_kro_read_nv_msg(&clnt, &txn, &req, &result), result))
    return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "%.*s", static_cast<int>(sizeof result.text),
                result.text);
  return RESULT_OK;
}

// `request_name` names the request in the log as each command always has.
int write_nv_item(uint32_t item, uint8_t option, const char* value, const char* request_name) {
  kro_write_nv_info_req_msg_v01 req{};
  req.nvItem_id = item;
  req.buffer_valid = 1;
  std::memcpy(req.buffer, value, strnlen(value, sizeof req.buffer));
  req.option[0] = req.option[1] = option;
  ATCI_LOGD("======before set buffer\n");
  ATCI_LOGD("=======%s.nvItem_id:%d,%s.buffer:%.*s\n", request_name, static_cast<int>(item),
            request_name, static_cast<int>(sizeof req.buffer), req.buffer);
  qmi::client_type clnt{};
  qmi::txn_handle txn{};
  QmiResult result;
  if (modem_request_failed(qmi_kro_write_nv_msg(&clnt, &txn, &req, &result), result))
    return RESULT_ERROR;
  ATCI_LOGD("=======111stop\n");
  return RESULT_OK;
}

// Parameter `index` normalised by substring into `out`. False when the field is missing or
// nothing is left of it.
bool normalised_field(const char* cmdline, int index, const char* value_name,
                      char (&out)[CMD_LINE_SIZE]) {
  copy_field(out, comma_field(cmdline, index));
  ATCI_LOGD("===========Before %s:%s\r\n", value_name, out);
  substring(out);
  ATCI_LOGD("===========After %s:%s\r\n", value_name, out);
  return out[0] != '\0';
}

struct NvRead {
  const char* line;
  uint32_t item;
  uint8_t option;
};

constexpr NvRead kIdentityReads[] = {
    {"AT+EGMR=0,5", kBarcodeItem, 0},
    {"AT+EGMR=0,7", kImeiItem, 0},
    {"AT+EGMR=0,10", kImeiItem, 1},
};

// The modem items with one read and one write variant each; the write's value is the
// second field.
struct NvItemCommand {
  const char* read_line;
  const char* write_prefix;
  uint32_t item;
  const char* missing_log;
  const char* value_name;    // in the log
  const char* request_name;  // in the log
};

constexpr NvItemCommand kTdNvItem{"AT+JVTDNV=0", "AT+JVTDNV=1", 66024,
                                  "========nv_value is NULL\n", "nv_value", "data_req_for_put_nv"};
constexpr NvItemCommand kSignalSystemItem{"AT+JVSYS=0", "AT+JVSYS=1", 72542,
                                          "========The wlan addr is NULL====\r\n", "value",
                                          "data_req"};

int nv_item_command(const NvItemCommand& command, char* cmdline, char* response) {
  ATCI_LOGD("%s start\n", cmdline);
  if (line_is(cmdline, command.read_line)) return read_nv_item(command.item, 0, response);
  if (!line_starts_with(cmdline, command.write_prefix)) return REJECT_COMMAND_LINE(cmdline);
  char value[CMD_LINE_SIZE];
  if (!normalised_field(cmdline, 1, command.value_name, value))
    return LOGGED_ERROR("%s", command.missing_log);
  return write_nv_item(command.item, 0, value, command.request_name);
}

// ---- Device-key tool ----

constexpr const char* kKeyScratch = "/data/RSAtemp";

enum class KeyStep {
  kBackground,  // started, not waited for
  kSavedCheck,  // its output must say "true"
  kReadText,    // its output is the answer
};

struct KeyCommand {
  const char* variant;
  const char* shell;
  KeyStep step;
  const char* fail_log;
};

constexpr KeyCommand kKeyCommands[] = {
    {"AT+PEMUKP=1,genkey", "/data/pemukp --genkey&", KeyStep::kBackground, "==genkey fail \r\n"},
    {"AT+PEMUKP=1,keysaved", "/data/pemukp --keysaved> /data/RSAtemp", KeyStep::kSavedCheck,
     "==keysaved fail \r\n"},
    {"AT+PEMUKP=1,getkey", "/data/pemukp --getkey > /data/RSAtemp", KeyStep::kReadText,
     "==getkey fail \r\n"},
    {"AT+PEMUKP=1,genuniqueid", "/data/pemukp --genuniqueid&", KeyStep::kBackground,
     "==genkey fail \r\n"},
    {"AT+PEMUKP=1,getuniqueid", "/data/pemukp --getuniqueid > /data/RSAtemp", KeyStep::kReadText,
     "==getkey fail \r\n"},
};

// The shell could not run the command at all: no shell, or no such program.
bool shell_could_not_run(int status) {
  return status == -1 || (WIFEXITED(status) && WEXITSTATUS(status) == 127);
}

// Reads the tool's output once and deletes it; -1 when it cannot be read (it is then left).
ssize_t read_key_scratch(char* buf, size_t limit) {
  UniqueFd fd(dev_open(kKeyScratch, O_RDONLY));
  if (fd.get() == 0) {
    ATCI_LOGE("==open fail \r\n");
    return -1;
  }
  const ssize_t n = read_head(fd.get(), buf, limit);  // a failed open fails here
  if (n < 0) {
    ATCI_LOGE("==read fail \r\n");
    return -1;
  }
  fd.reset();
  dev_unlink(kKeyScratch);
  return n;
}

int run_key_command(const KeyCommand& command, char* response) {
  if (shell_could_not_run(run_sh_command("%s", command.shell))) {
    ATCI_LOGE("%s", command.fail_log);
    // The background variants answer UNKNOWN, as stations expect.
    return command.step == KeyStep::kReadText ? RESULT_ERROR : -1;
  }
  switch (command.step) {
    case KeyStep::kBackground:
      return RESULT_OK;
    case KeyStep::kSavedCheck: {
      char saved[21];
      if (read_key_scratch(saved, 20) < 0) return RESULT_ERROR;
      ATCI_LOGD("==RSAtemp:%s\r\n", saved);
      return result_of(std::strstr(saved, "true") != nullptr);
    }
    case KeyStep::kReadText: {
      char text[601];
      if (read_key_scratch(text, 600) < 0) return RESULT_ERROR;
      ATCI_LOGD("==RSAtemp:%s\r\n", text);
      std::snprintf(response, RESPONSE_SIZE, "\"%s\"", text);
      return RESULT_OK;
    }
  }
  return RESULT_ERROR;
}

// ---- Properties by name ----

constexpr size_t kPropertyValueSize = 100;

void lower_ascii(char* text) {
  for (; *text != '\0'; ++text)
    if (*text >= 'A' && *text <= 'Z') *text = static_cast<char>(*text - 'A' + 'a');
}

int set_named_property(const char* cmdline, char* response) {
  const char* first = std::strchr(cmdline, ',');
  if (first == nullptr) return RESULT_ERROR;
  ATCI_LOGD("vaule : %s\r\n", first);
  const char* second = std::strchr(first + 1, ',');
  if (second == nullptr) return RESULT_ERROR;
  ATCI_LOGD("vaule : %s\r\n", second);
  const char* value = second + 1;
  // The value buffer holds 99 characters; a longer value is refused, not cut.
  if (std::strlen(value) >= kPropertyValueSize) return RESULT_ERROR;
  char name[CMD_LINE_SIZE];
  const size_t name_length = static_cast<size_t>(second - first - 1);
  if (name_length == 0) return RESULT_ERROR;
  std::memcpy(name, first + 1, name_length);
  name[name_length] = '\0';
  lower_ascii(name);
  property_set(name, value);
  property_get(name, response, "NULL");
  ATCI_LOGD("%s : %s\r\n", name, response);
  return result_of(std::strcmp(response, value) == 0);
}

}  // namespace

int imei_and_pcb_code_on_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("============cmdline %s\r\n", cmdline);
  for (const NvRead& read : kIdentityReads)
    if (line_is(cmdline, read.line)) return read_nv_item(read.item, read.option, response);
  // "=1,10" must not be taken for "=1,1...": the IMEI variants are told apart first.
  const bool imei = line_starts_with(cmdline, "AT+EGMR=1,7");
  const bool imei_with_options = !imei && line_starts_with(cmdline, "AT+EGMR=1,10");
  const bool barcode = !imei && !imei_with_options && line_starts_with(cmdline, "AT+EGMR=1,5");
  if (!imei && !imei_with_options && !barcode) return REJECT_COMMAND_LINE(cmdline);
  char value[CMD_LINE_SIZE];
  if (!normalised_field(cmdline, 2, "barcode", value))
    return LOGGED_ERROR("========Barcode is NULL\n");
  const uint32_t item = barcode ? kBarcodeItem : kImeiItem;
  if (write_nv_item(item, imei_with_options ? 1 : 0, value, "data_req_for_put_nv") != RESULT_OK)
    return RESULT_ERROR;
  if (barcode) property_set("persist.sys.barcode", value);
  return RESULT_OK;
}

int nv_66024_handler(char* cmdline, int, char* response) {
  return nv_item_command(kTdNvItem, cmdline, response);
}

int change_sig_system_handler(char* cmdline, int, char* response) {
  return nv_item_command(kSignalSystemItem, cmdline, response);
}

int RSA_key_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("=cmdline %s\r\n", cmdline);
  for (const KeyCommand& command : kKeyCommands)
    if (line_is(cmdline, command.variant)) return run_key_command(command, response);
  return RESULT_ERROR;
}

int property_set_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("cmdline %s\r\n", cmdline);
  if (line_starts_with(cmdline, "AT+JVPROP=1")) return set_named_property(cmdline, response);
  if (line_starts_with(cmdline, "AT+JVPROP=0")) {
    const std::string_view field = comma_field(cmdline, 1);
    if (field.empty()) return RESULT_ERROR;
    char name[CMD_LINE_SIZE];
    copy_field(name, field);
    lower_ascii(name);
    property_get(name, response, "NULL");
    return RESULT_OK;
  }
  return LOGGED_ERROR("invalid command\r\n");
}
