#include "core/serial.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/socket.h>
#include <termios.h>
#include <unistd.h>

#include "core/log.h"
#include "platform/platform.h"

SerialDevice serial;
std::mutex transport_write_lock;
int32_t is_uart_flag = 0;
int32_t is_sp = 0;

bool is_socket_transport() { return std::strcmp(serial.dev_name[0], "socket") == 0; }

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

int writeDataToSerial(const char* data, int length) {
  ATCI_LOGD("Enter with data:%.*s:%d", length, data, length);
  ssize_t n;
  {
    const std::lock_guard lock(transport_write_lock);
    n = is_socket_transport() && is_uart_flag != 1
            ? ::send(serial.fd[0], data, length, 0)
            : ::write(serial.fd[serial.active_port], data, length);
  }
  if (n < length) {
    ATCI_LOGW("Couldn't write all data to the serial port. Wrote only %d bytes with %d",
              static_cast<int>(n), errno);
  }
  return static_cast<int>(n);
}

int readDataFromSerial(char* buffer, int length) {
  int count;
  if (is_socket_transport() && is_uart_flag != 1) {
    ATCI_LOGD("Wait for read data from socket :%d", serial.fd[0]);
    // Reported one higher than received, as the line reader counts on the socket.
    count = static_cast<int>(::recv(serial.fd[0], buffer, length, 0)) + 1;
  } else {
    ATCI_LOGD("Wait for read data from USB :%d", serial.fd[serial.active_port]);
    count = static_cast<int>(::read(serial.fd[serial.active_port], buffer, length));
  }
  ATCI_LOGD("readCount :%d", count);
  return count;
}
