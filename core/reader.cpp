#include "core/reader.h"

#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <strings.h>
#include <sys/select.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/dispatch.h"
#include "core/log.h"
#include "platform/platform.h"

namespace {

constexpr int kReadSize = 6144;
constexpr int kMaxLine = 200;
constexpr int kReopenTries = 3;

bool is_a(char c) { return c == 'A' || c == 'a'; }
bool is_t(char c) { return c == 'T' || c == 't'; }

// Re-opens since the port last gave data. A hung-up port can open fine and fail again at
// once; such a re-open counts as a failed try, so a lasting hang-up ends the service instead
// of spinning.
int reopens_without_data = 0;

// Closes the descriptor that failed and opens its port again; ends the process when three
// tries in a row fail.
void reopen_port(SerialDevice* device, int index) {
  ATCI_LOGE(" Error in serail read:%d", errno);
  ::close(device->fd[index]);
  device->fd[index] = -1;
  while (reopens_without_data < kReopenTries) {
    ++reopens_without_data;
    device->fd[index] = open_serial_device(device, device->dev_name[index]);
    if (device->fd[index] >= 0) {
      ATCI_LOGD("The FD is reopen successfully");
      return;
    }
  }
  ATCI_LOGE("The process is terminated due to fatal error");
  std::exit(1);
}

// The station hung up or the connection broke: the service is over. On the phone init starts
// the daemon again for the next station.
[[noreturn]] void end_of_connection(ssize_t received) {
  const int error = errno;
  if (received == 0) {
    ATCI_LOGI("The station closed the connection\n");
  } else {
    ATCI_LOGE("Failed to receive command !!!\n");
    ATCI_LOGE("receive error: %d", error);
  }
  std::exit(0);
}

}  // namespace

char* readline(SerialDevice* device) {
  // One more than the read size: the socket's count runs one past the bytes received.
  static char buffer[kReadSize + 2];
  const char* start = nullptr;  // kept across read cycles of this call
  int index = 0;
  int current = -1;

  ATCI_LOGD("Enter");
  for (;;) {
    std::memset(device->line, 0, sizeof device->line);
    std::memset(buffer, 0, sizeof buffer);
    device->line_len = 0;
    device->state = 0;

    int count;
    if (is_socket_transport()) {
      const ssize_t received = ::recv(device->fd[0], buffer, kReadSize, 0);
      if (received < 0 && errno == EINTR) continue;
      if (received <= 0) end_of_connection(received);
      count = static_cast<int>(received) + 1;
      ATCI_LOGD("readCount = %d !!!\n", count);
    } else {
      ATCI_LOGD("Wait for select data from USB");
      ATCI_LOGD("serial->fd[0]:%d", device->fd[0]);
      if (device->fd[0] < 0 || device->fd[0] >= FD_SETSIZE) {
        // Waiting on a closed port can never end: the service is over.
        ATCI_LOGE("Fail to select in readline. error: %d", EBADF);
        std::exit(1);
      }
      fd_set readable;
      FD_ZERO(&readable);
      FD_SET(device->fd[0], &readable);
      const int ret = ::select(device->fd[0] + 1, &readable, nullptr, nullptr, nullptr);
      ATCI_LOGD(" ret:%d", ret);
      if (ret < 0) {
        if (errno == EINTR || errno == EAGAIN) continue;
        ATCI_LOGE("Fail to select in readline. error: %d", errno);
        for (int& fd : device->fd) {
          if (fd >= 0) ::close(fd);
          fd = -1;
        }
        return nullptr;
      }
      if (ret == 0) {
        ATCI_LOGD("ERROR:No data from USB devices");
        continue;
      }
      index = FD_ISSET(device->fd[0], &readable) ? 0 : 1;
      ATCI_LOGD("Read data from USB:%d:%d", index, device->fd[index]);
      {
        // Stream workers read it when they write a line.
        const std::lock_guard lock(transport_write_lock);
        device->active_port = index;
      }
      current = device->fd[index];

      ATCI_LOGD("Wait for read data from USB :%d", current);
      count = static_cast<int>(::read(current, buffer, kReadSize));
      ATCI_LOGD("the readCount is %d with %s:%d", count, buffer, buffer[0]);
      if (count <= 0) {
        reopen_port(device, index);
        return nullptr;
      }
      reopens_without_data = 0;
    }

    ATCI_LOGD("state %d with %d:%d", device->state, 0, std::toupper(static_cast<unsigned char>(buffer[0])));
    if (count >= 0 && is_a(buffer[0])) {
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
  char answer[1024] = {};
  ATCI_LOGD("Enter");
  for (;;) {
    char* line = readline(device);
    if (line == nullptr) {
      ATCI_LOGD("readline: NULL");
      continue;
    }
    ATCI_LOGD("readline:%s", line);
    for (char* c = line; *c; ++c) *c = static_cast<char>(std::toupper(static_cast<unsigned char>(*c)));
    while (*line == ' ') ++line;
    for (size_t len = std::strlen(line); len > 0 && line[len - 1] == ' '; --len) line[len - 1] = '\0';
    ATCI_LOGD("Command:%s", line);
    const size_t length = std::strlen(line);
    ATCI_LOGD("strlen(line):%d", static_cast<int>(length));

    if (length >= kMaxLine) {
      static constexpr char kError[] = "\r\nERROR\r\n";
      writeDataToSerial(kError, sizeof kError - 1);
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
      std::memset(answer, 0, sizeof answer);
      if (strcasecmp(copy_line, "ATD112;") == 0) {
        platform_system("/system/bin/sh -c \"am broadcast -a kro.intent.action.AT_EMERG_CALL\"");
        std::snprintf(answer, sizeof answer, "%s\r\nOK\r\n", copy_line);
      } else {
        std::snprintf(answer, sizeof answer, "%s\r\nERROR\r\n", copy_line);
      }
      writeDataToSerial(answer, static_cast<int>(std::strlen(answer)));
    }
  }
}
