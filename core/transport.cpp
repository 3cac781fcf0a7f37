#include "core/transport.h"

#include <fcntl.h>
#include <sys/select.h>
#include <sys/socket.h>
#include <termios.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>

#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"

SerialDevice serial;
int32_t is_uart_flag = 0;
int32_t is_sp = 0;

namespace {

constexpr size_t kAnswerSize = 2048;
constexpr long kBlockPauseNs = 100'000'000;
constexpr int kReopenTries = 3;

// Held for each write to the port (a tty answer, one socket block, one stream line), so a
// worker's stream line falls between writes, never inside one; the reader takes it to change
// the active port, which the tty write path reads.
std::mutex transport_lock;

// Re-opens since the port last gave data. A hung-up port can open fine and fail again at
// once; such a re-open counts as a failed try, so a lasting hang-up ends the service instead
// of spinning.
int reopens_without_data = 0;

// The reader's port waits log under its name, as they always have.
#define READLINE_LOG(level, fmt, ...) \
  atci_log((level), __LINE__, "readline", fmt __VA_OPT__(, ) __VA_ARGS__)

bool port_is_socket() {
  return std::strcmp(serial.dev_name[0], "socket") == 0 && is_uart_flag != 1;
}

ssize_t write_port_locked(const char* data, size_t length) {
  return port_is_socket() ? ::send(serial.fd[0], data, length, 0)
                          : ::write(serial.fd[serial.active_port], data, length);
}

const char* result_word(int status) {
  switch (status) {
    case RESULT_OK:
      return "OK";
    case RESULT_ERROR:
      return "ERROR";
    case RESULT_BODY_ONLY:
      return "";
    case RESULT_NOT_IMPLEMENTED:
      return "Not Implement";
    default:
      return "UNKNOWN";
  }
}

// The station skips the NUL padding: every block is sent as the full buffer.
void send_block(char* block, const char* text) {
  std::memset(block, 0, kAnswerSize);
  std::snprintf(block, kAnswerSize, "%s\n", text);
  const std::lock_guard lock(transport_lock);
  [[maybe_unused]] const ssize_t n = ::send(serial.fd[0], block, kAnswerSize, 0);
}

void pause_between_blocks() {
  timespec pause{0, kBlockPauseNs};
  while (nanosleep(&pause, &pause) != 0) {
  }
}

// Closes the descriptor that failed and opens its port again; ends the process when three
// tries in a row fail.
void reopen_port(SerialDevice* device, int index) {
  READLINE_LOG(LOG_LVL_ERR, " Error in serail read:%d", errno);
  ::close(device->fd[index]);
  device->fd[index] = -1;
  while (reopens_without_data < kReopenTries) {
    ++reopens_without_data;
    device->fd[index] = open_serial_device(device, device->dev_name[index]);
    if (device->fd[index] >= 0) {
      READLINE_LOG(LOG_LVL_DEBUG, "The FD is reopen successfully");
      return;
    }
  }
  READLINE_LOG(LOG_LVL_ERR, "The process is terminated due to fatal error");
  std::exit(1);
}

// The station hung up or the connection broke: the service is over. On the phone init starts
// the daemon again for the next station.
[[noreturn]] void end_of_connection(ssize_t received) {
  const int error = errno;
  if (received == 0) {
    READLINE_LOG(LOG_LVL_INFO, "The station closed the connection\n");
  } else {
    READLINE_LOG(LOG_LVL_ERR, "Failed to receive command !!!\n");
    READLINE_LOG(LOG_LVL_ERR, "receive error: %d", error);
  }
  std::exit(0);
}

int read_socket_command(SerialDevice* device, char* buffer, int length) {
  const ssize_t received = ::recv(device->fd[0], buffer, length, 0);
  if (received < 0 && errno == EINTR) return READ_AGAIN;
  if (received <= 0) end_of_connection(received);
  const int count = static_cast<int>(received) + 1;
  READLINE_LOG(LOG_LVL_DEBUG, "readCount = %d !!!\n", count);
  return count;
}

int read_tty_command(SerialDevice* device, char* buffer, int length) {
  READLINE_LOG(LOG_LVL_DEBUG, "Wait for select data from USB");
  READLINE_LOG(LOG_LVL_DEBUG, "serial->fd[0]:%d", device->fd[0]);
  if (device->fd[0] < 0 || device->fd[0] >= FD_SETSIZE) {
    // Waiting on a closed port can never end: the service is over.
    READLINE_LOG(LOG_LVL_ERR, "Fail to select in readline. error: %d", EBADF);
    std::exit(1);
  }
  fd_set readable;
  FD_ZERO(&readable);
  FD_SET(device->fd[0], &readable);
  const int ret = ::select(device->fd[0] + 1, &readable, nullptr, nullptr, nullptr);
  READLINE_LOG(LOG_LVL_DEBUG, " ret:%d", ret);
  if (ret < 0) {
    if (errno == EINTR || errno == EAGAIN) return READ_AGAIN;
    READLINE_LOG(LOG_LVL_ERR, "Fail to select in readline. error: %d", errno);
    for (int& fd : device->fd) {
      if (fd >= 0) ::close(fd);
      fd = -1;
    }
    return READ_NONE;
  }
  if (ret == 0) {
    READLINE_LOG(LOG_LVL_DEBUG, "ERROR:No data from USB devices");
    return READ_AGAIN;
  }
  const int index = FD_ISSET(device->fd[0], &readable) ? 0 : 1;
  READLINE_LOG(LOG_LVL_DEBUG, "Read data from USB:%d:%d", index, device->fd[index]);
  {
    const std::lock_guard lock(transport_lock);
    device->active_port = index;
  }
  const int current = device->fd[index];
  READLINE_LOG(LOG_LVL_DEBUG, "Wait for read data from USB :%d", current);
  const int count = static_cast<int>(::read(current, buffer, length));
  READLINE_LOG(LOG_LVL_DEBUG, "the readCount is %d with %s:%d", count, buffer, buffer[0]);
  if (count <= 0) {
    reopen_port(device, index);
    return READ_NONE;
  }
  reopens_without_data = 0;
  return count;
}

}  // namespace

void initSerialDevice(SerialDevice* device) {
  ATCI_LOGD("Enter");
  std::memset(device, 0, sizeof *device);
  device->fd[0] = device->fd[1] = -1;
  device->flags[0] = device->flags[1] = 1;
}

int open_serial_device(SerialDevice*, const char* path) {
  ATCI_LOGD("Enter");
  ATCI_LOGD("Opened serial port:%s", path);
  int fd;
  do {
    fd = dev_open(path, O_RDWR | O_NOCTTY | O_NONBLOCK);
  } while (fd < 0 && errno == EINTR);
  if (fd < 0) {
    ATCI_LOGE("Fail to open serial device(%s) with error code:%d", path, errno);
    return -1;
  }
  ATCI_LOGD("======is_echo:%d\n", 0);
  ATCI_LOGD("serial->fd is %d ", fd);
  ATCI_LOGD("is_uart_flag: %d ", is_uart_flag);

  const int fl = fcntl(fd, F_GETFL);
  if (fl >= 0) fcntl(fd, F_SETFL, fl & ~O_NONBLOCK);

  termios tio{};
  tcgetattr(fd, &tio);
  if (is_uart_flag == 1) {
    cfsetispeed(&tio, B115200);
    cfsetospeed(&tio, B115200);
  }
  tio.c_oflag &= ~(OPOST | OLCUC | OCRNL | ONOCR | ONLRET);
  tio.c_lflag = ICANON;
  tcflush(fd, TCIFLUSH);
  tcsetattr(fd, TCSANOW, &tio);
  return fd;
}

void attach_port(PortKind kind, int fd) {
  const std::lock_guard lock(transport_lock);
  if (kind == PortKind::socket) std::strcpy(serial.dev_name[0], "socket");
  serial.fd[0] = fd;
  serial.active_port = 0;
}

int writeDataToSerial(const char* data, int length) {
  ATCI_LOGD("Enter with data:%.*s:%d", length, data, length);
  ssize_t n;
  {
    const std::lock_guard lock(transport_lock);
    n = write_port_locked(data, static_cast<size_t>(length));
  }
  if (n < length) {
    ATCI_LOGW("Couldn't write all data to the serial port. Wrote only %d bytes with %d",
              static_cast<int>(n), errno);
  }
  return static_cast<int>(n);
}

int readDataFromSerial(char* buffer, int length) { return read_port_data(buffer, length).count; }

PortRead read_port_data(char* buffer, int length) {
  PortRead r{};
  r.stream = port_is_socket();
  if (r.stream) {
    ATCI_LOGD("Wait for read data from socket :%d", serial.fd[0]);
    r.bytes = static_cast<int>(::recv(serial.fd[0], buffer, length, 0));
    // Reported one higher than received, as the line reader counts on the socket.
    r.count = r.bytes + 1;
  } else {
    ATCI_LOGD("Wait for read data from USB :%d", serial.fd[serial.active_port]);
    r.bytes = r.count = static_cast<int>(::read(serial.fd[serial.active_port], buffer, length));
  }
  ATCI_LOGD("readCount :%d", r.count);
  return r;
}

void writeDataToserialByResponseType(const char* echo, const char* body, int status) {
  const bool socket = port_is_socket();
  char result[kAnswerSize] = {};
  std::snprintf(result, sizeof result, "%s%s\r\n", socket ? "" : "\r\n", result_word(status));
  char answer[kAnswerSize] = {};
  if (!socket) {
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

int write_early_answer(std::string_view line, std::string_view word, bool blank_line) {
  char text[CMD_LINE_SIZE + 32];
  const int n =
      std::snprintf(text, sizeof text, "%.*s\r\n%s%.*s\r\n",
                    static_cast<int>(std::min(line.size(), size_t{CMD_LINE_SIZE})), line.data(),
                    blank_line ? "\r\n" : "", static_cast<int>(word.size()), word.data());
  return writeDataToSerial(text, std::min(n, static_cast<int>(sizeof text) - 1));
}

int write_unsolicited(std::string_view text) {
  return writeDataToSerial(text.data(), static_cast<int>(text.size()));
}

int read_command_data(SerialDevice* device, char* buffer, int length) {
  return port_is_socket() ? read_socket_command(device, buffer, length)
                          : read_tty_command(device, buffer, length);
}
