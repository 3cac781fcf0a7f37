#include "core/reader.h"

#include <strings.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <cstring>

#include "core/dispatch.h"
#include "core/log.h"
#include "platform/platform.h"

namespace {

constexpr int kReadSize = 6144;
constexpr int kMaxLine = 200;

bool is_a(char c) { return c == 'A' || c == 'a'; }
bool is_t(char c) { return c == 'T' || c == 't'; }

}  // namespace

char* readline(SerialDevice* device) {
  // One more than the read size: the socket's count runs one past the bytes received.
  static char buffer[kReadSize + 2];
  const char* start = nullptr;  // kept across read cycles of this call

  ATCI_LOGD("Enter");
  for (;;) {
    std::memset(device->line, 0, sizeof device->line);
    std::memset(buffer, 0, sizeof buffer);
    device->line_len = 0;
    device->state = 0;

    const int count = read_command_data(device, buffer, kReadSize);
    if (count == READ_AGAIN) continue;
    if (count == READ_NONE) return nullptr;

    ATCI_LOGD("state %d with %d:%d", device->state, 0,
              std::toupper(static_cast<unsigned char>(buffer[0])));
    if (is_a(buffer[0])) {
      device->state = 1;
      start = buffer;
      ATCI_LOGD("Find 'A' in %s with index:%d", buffer, 0);
    }
    // A 'T' at byte 1 completes the line even after a read whose 'A' came earlier in this
    // call; with no 'A' seen at all there is nothing to copy from.
    if (count >= 1 && is_t(buffer[1]) && start != nullptr) {
      device->state = 3;
      ATCI_LOGD("the readCurr is %d & the total size is %d", 2, count);
      device->line_len = count;
      std::memcpy(device->line, start, count);
      device->line[count - 1] = '\0';
      return device->line;
    }
  }
}

void readerLoop(SerialDevice* device) {
  ATCI_LOGD("Enter");
  for (;;) {
    char* line = readline(device);
    if (line == nullptr) {
      ATCI_LOGD("readline: NULL");
      continue;
    }
    ATCI_LOGD("readline:%s", line);
    for (char* c = line; *c; ++c)
      *c = static_cast<char>(std::toupper(static_cast<unsigned char>(*c)));
    while (*line == ' ') ++line;
    for (size_t len = std::strlen(line); len > 0 && line[len - 1] == ' '; --len)
      line[len - 1] = '\0';
    ATCI_LOGD("Command:%s", line);
    const size_t length = std::strlen(line);
    ATCI_LOGD("strlen(line):%d", static_cast<int>(length));

    if (length >= kMaxLine) {
      write_early_answer("", "ERROR");
      return;
    }
    char copy_line[kMaxLine] = {};
    std::snprintf(copy_line, sizeof copy_line, "%s", line);
    ATCI_LOGD("copy_line:%s", copy_line);

    const int type = process_cmd_line(line);
    ATCI_LOGD("The command type is belonged to :%d", type);
    if (type == 4) {
      ATCI_LOGD("ATCI COMMAND");
      // The station ends the service with this command; the descriptor keeps its number.
      if (strcasecmp(line, "AT+JVSSID=0") == 0) ::close(device->fd[0]);
    } else {
      ATCI_LOGD("RIL_TYPE COMMAND");
      const bool emergency_call = strcasecmp(copy_line, "ATD112;") == 0;
      if (emergency_call)
        platform_system("/system/bin/sh -c \"am broadcast -a kro.intent.action.AT_EMERG_CALL\"");
      write_early_answer(copy_line, emergency_call ? "OK" : "ERROR");
    }
  }
}
