// The port a station talks through: a tty (USB gadget serial or UART) or one accepted TCP
// connection. This module is the only code that tells the two apart; everything written to the
// port (framed answers, early answers, stream lines) goes through it under one lock.
#pragma once

#include <cstdint>
#include <string_view>

inline constexpr int SERIAL_LINE_SIZE = 6145;

struct SerialDevice {
  char dev_name[2][64];  // device name 0 is "socket" on the socket transport
  int32_t fd[2];         // -1 when closed; descriptor 0 is the one in use in every mode
  int32_t flags[2];      // set to 1 at init, read by nothing
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
// One write of the port, as is: no framing.
int writeDataToSerial(const char* data, int length);
// One raw read for a handler that receives data after its line; on the socket the count is one
// past the bytes received (0 on an error, 1 when the peer closed).
int readDataFromSerial(char* buffer, int length);

enum class PortKind { tty, socket };
// Makes an open descriptor the port in use (descriptor 0): start-up after its accept, and tests,
// which hold the other end of a socket pair.
void attach_port(PortKind kind, int fd);

// The dispatcher's answer: echo, body and the status's result word, framed for the port.
void writeDataToserialByResponseType(const char* echo, const char* body, int status);

// An answer written whole before the handler acts (the phone is about to go away) or by the
// reader itself: the line, CR LF, a blank CR LF when asked, the result word and CR LF, in one
// write. The same bytes on every port.
int write_early_answer(std::string_view line, std::string_view word, bool blank_line = false);

// A line of a stream worker or of the modem's GPS answer, unframed, between answers.
int write_unsolicited(std::string_view text);

// One raw read of data that follows a command line.
struct PortRead {
  int count;    // as readDataFromSerial reports it (and logs it)
  int bytes;    // data bytes in the buffer; below 1 when the port failed or the peer left
  bool stream;  // the port does not keep the sender's line boundaries (TCP)
};
PortRead read_port_data(char* buffer, int length);

// The line reader's wait for one read: the count it scans (on the socket one past the bytes
// received), READ_AGAIN for a new read cycle, or READ_NONE when the read failed and the port
// was closed or opened again. Ends the process when the station hung up (status 0) or the port
// cannot be used again (status 1).
inline constexpr int READ_AGAIN = -1;
inline constexpr int READ_NONE = -2;
int read_command_data(SerialDevice* device, char* buffer, int length);
