#include "core/dispatch.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string_view>

#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"

namespace {

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

int pemu_command_hdlr(char* line) {
  const std::string_view text(line);
  const auto name = std::unique_ptr<char[]>(new char[text.size() + 1]);
  const size_t name_len = std::min(text.find_first_of("=?"), text.size());
  std::memcpy(name.get(), line, name_len);
  name[name_len] = '\0';
  ATCI_LOGD("======The command is %s\n", line);

  // One byte past the handler's body stays NUL, so a full body still ends.
  char body[RESPONSE_SIZE + 1] = {};
  char echo[2048] = {};
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
