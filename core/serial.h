// The transport record and its four operations: a tty (USB gadget serial or UART) or one
// accepted TCP connection, told apart by device name 0 being "socket".
#pragma once

#include <cstdint>
#include <mutex>

inline constexpr int SERIAL_LINE_SIZE = 6145;

struct SerialDevice {
  char dev_name[2][64];
  int32_t fd[2];     // -1 when closed; descriptor 0 is the one in use in every mode
  int32_t flags[2];  // set to 1 at init, read by nothing
  char line[SERIAL_LINE_SIZE];
  int32_t line_len;
  int32_t state;        // reader state: 0 idle, 1 'A' seen, 3 line complete
  int32_t active_port;  // which descriptor the last read came from
};

extern SerialDevice serial;
extern int32_t is_uart_flag;  // the kernel command line selected the UART
extern int32_t is_sp;         // console mode "sendAT" or "sendSP"

void initSerialDevice(SerialDevice* device);
int open_serial_device(SerialDevice* device, const char* path);
int writeDataToSerial(const char* data, int length);
int readDataFromSerial(char* buffer, int length);

// Held for each write to the port (a tty answer, one socket block, one stream line), so a
// worker's stream line falls between writes, never inside one.
extern std::mutex transport_write_lock;

// True when the transport is the socket server's connection.
bool is_socket_transport();
