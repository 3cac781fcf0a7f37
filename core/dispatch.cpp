#include "core/dispatch.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string_view>
#include <sys/socket.h>
#include <time.h>

#include "core/command.h"
#include "core/log.h"
#include "core/serial.h"

namespace {

constexpr size_t kAnswerSize = 2048;
constexpr long kBlockPauseNs = 100'000'000;

const char* result_word(int status) {
  switch (status) {
    case RESULT_OK: return "OK";
    case RESULT_ERROR: return "ERROR";
    case RESULT_BODY_ONLY: return "";
    case RESULT_NOT_IMPLEMENTED: return "Not Implement";
    default: return "UNKNOWN";
  }
}

// The station skips the NUL padding: every block is sent as the full buffer.
void send_block(char* block, const char* text) {
  std::memset(block, 0, kAnswerSize);
  std::snprintf(block, kAnswerSize, "%s\n", text);
  const std::lock_guard lock(transport_write_lock);
  [[maybe_unused]] const ssize_t n = ::send(serial.fd[0], block, kAnswerSize, 0);
}

void pause_between_blocks() {
  timespec pause{0, kBlockPauseNs};
  while (nanosleep(&pause, &pause) != 0) {
  }
}

const CommandEntry* find_command(const char* name) {
  for (const CommandEntry& row : command_table) {
    if (std::strcmp(row.name, name) == 0) return &row;
  }
  return nullptr;
}

}  // namespace

int classify_command_form(const char* line) {
  const std::string_view text(line);
  if (text.size() < 2) return OP_INVALID;
  if (text.size() == 2 || std::isalpha(static_cast<unsigned char>(text[2]))) return OP_BASIC;
  if (text.find("=?") != std::string_view::npos) return OP_TEST;
  if (text.find('?') != std::string_view::npos) return OP_READ;
  if (text.find('=') != std::string_view::npos) return OP_SET;
  return OP_ACTION;
}

void writeDataToserialByResponseType(const char* echo, const char* body, int status) {
  char result[kAnswerSize] = {};
  std::snprintf(result, sizeof result, "%s%s\r\n", is_socket_transport() ? "" : "\r\n",
                result_word(status));
  char answer[kAnswerSize] = {};
  if (!is_socket_transport()) {
    // Stations have always received the framed answer cut to the buffer.
    if (std::snprintf(answer, sizeof answer, "%s\n%s\n%s", echo, body, result) >=
        static_cast<int>(sizeof answer))
      ATCI_LOGW("answer cut to %d bytes", static_cast<int>(sizeof answer) - 1);
    ATCI_LOGD("========last_rsp:%s", answer);
    writeDataToSerial(answer, static_cast<int>(std::strlen(answer)));
    return;
  }
  send_block(answer, echo);
  pause_between_blocks();
  send_block(answer, body);
  pause_between_blocks();
  send_block(answer, result);
  ATCI_LOGD("========last_rsp:%s", answer);
}

int pemu_command_hdlr(char* line) {
  const std::string_view text(line);
  const auto name = std::unique_ptr<char[]>(new char[text.size() + 1]);
  const size_t name_len = std::min(text.find_first_of("=?"), text.size());
  std::memcpy(name.get(), line, name_len);
  name[name_len] = '\0';
  ATCI_LOGD("======The command is %s\n", line);

  // One byte past the handler's body stays NUL, so a full body still ends.
  char body[RESPONSE_SIZE + 1] = {};
  char echo[kAnswerSize] = {};
  char copy[CMD_LINE_SIZE] = {};
  std::snprintf(copy, sizeof copy, "%s", line);
  std::snprintf(echo, sizeof echo, "%s\r\n", line);

  const CommandEntry* row = find_command(name.get());
  if (row == nullptr) {
    ATCI_LOGD("======111The command is %s\n", line);
    return 0;
  }
  const int form = classify_command_form(line);
  ATCI_LOGD("The command op is %d; Support op is %d", form, row->op);
  if ((form & row->op) == 0) {
    writeDataToserialByResponseType(echo, "", RESULT_NOT_IMPLEMENTED);
    return 1;
  }
  ATCI_LOGD("The command is %s\n", line);
  const int status = row->handler(copy, form, body);
  if (status != RESULT_DONE) writeDataToserialByResponseType(echo, body, status);
  return 1;
}

int process_cmd_line(char* line) {
  ATCI_LOGD("Enter");
  ATCI_LOGD("handle in custom_command_hdlr");
  return pemu_command_hdlr(line) ? 4 : 1;
}
