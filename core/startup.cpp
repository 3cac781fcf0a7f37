#include "core/startup.h"

#include <arpa/inet.h>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <netinet/in.h>
#include <strings.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/log.h"
#include "core/reader.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"

namespace {

constexpr int kCmdlineSize = 1024;
constexpr int kListenBacklog = 20;

// The value after the first '=' of a token, cutting the token there; null without '='.
char* cut_value(char* token) {
  char* eq = std::strchr(token, '=');
  if (eq == nullptr) return nullptr;
  *eq = '\0';
  return eq + 1;
}

void read_kernel_cmdline(char* text) {
  text[0] = '\0';
  UniqueFd fd(dev_open("/proc/cmdline", O_RDONLY));
  if (!fd.ok()) return;
  ssize_t n = ::read(fd.get(), text, kCmdlineSize);
  if (n < 0) n = 0;
  if (n > 0 && text[n - 1] == '\n') --n;
  text[n] = '\0';
}

[[noreturn]] void fail_socket(const char* what) {
  ATCI_LOGE("%s", what);
  std::exit(1);
}

// The port of device name `index` becomes descriptor 0 in both tty modes.
bool open_port(int index) {
  serial.fd[0] = open_serial_device(&serial, serial.dev_name[index]);
  if (serial.fd[0] != -1) return true;
  ATCI_LOGE("Could not open serial device :%s and start atci service", serial.dev_name[index]);
  return false;
}

int serve_usb() {
  if (!open_port(0)) return 1;
  ATCI_LOGI("Entry atcid-damon from usb port!");
  readerLoop(&serial);
  return 0;
}

int serve_uart() {
  if (!open_port(1)) return 1;
  ATCI_LOGI("openLog start\r\n");
  platform_system("cat /proc/kmsg > /data/log.txt&");
  platform_system("logcat -v time > /data/adb.txt&");
  property_set("persist.sys.is_kro_log", "2");
  ATCI_LOGI("Entry atcid-damon from uart!");
  readerLoop(&serial);
  return 0;
}

int serve_socket() {
  attach_port(PortKind::socket, -1);
  // One station connection per run: when it ends, so does the daemon, and init starts it again.
  const int listener = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (listener < 0) fail_socket("Failed to create socket!!!\n");
  const int on = 1;
  ::setsockopt(listener, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  sockaddr_in addr{};
  addr.sin_family = AF_INET;
  addr.sin_port = htons(static_cast<uint16_t>(platform_tcp_port()));
  if (platform_tcp_listen_address(&addr.sin_addr.s_addr) != 0 ||
      ::bind(listener, reinterpret_cast<sockaddr*>(&addr), sizeof addr) != 0)
    fail_socket("Bind socket error!!!\n");
  if (::listen(listener, kListenBacklog) != 0) fail_socket("Listen socket error!!!\n");
  ATCI_LOGI("start accept\n");
  attach_port(PortKind::socket, ::accept4(listener, nullptr, nullptr, SOCK_CLOEXEC));
  // Never accepted on again: a station that calls meanwhile is refused at once, rather than
  // left waiting in the queue of a daemon that will not answer it.
  ::close(listener);
  ATCI_LOGI("accept finish\n");
  if (serial.fd[0] < 0) ATCI_LOGE("Server accept failed!!!\n");
  readerLoop(&serial);
  return 0;
}

}  // namespace

KernelCmdlineFlags scan_kernel_cmdline(char* text) {
  KernelCmdlineFlags flags{false, false};
  bool console = false;
  bool uart = false;
  char* token = text;
  // An empty token (two adjacent spaces) ends the scan early.
  while (*token != '\0') {
    char* space = std::strchr(token, ' ');
    if (space != nullptr) *space = '\0';
    if (*token == '\0') break;
    ATCI_LOGD("/proc/cmdline :%s", token);
    if (std::strstr(token, "console") != nullptr) {
      const char* value = cut_value(token);
      if (value != nullptr) {
        if (std::strcmp(value, "sendAT") == 0 || std::strcmp(value, "sendSP") == 0) {
          console = true;
          flags.sp = true;
        } else if (std::strcmp(value, "debugAT") == 0 || std::strcmp(value, "sendNormal") == 0) {
          console = true;
        }
      }
    }
    if (std::strstr(token, "androidboot.uart") != nullptr) {
      const char* value = cut_value(token);
      if (value != nullptr && std::strcmp(value, "uart2") == 0) uart = true;
    }
    if (console && uart) {
      flags.uart = true;
      break;
    }
    if (space == nullptr) break;
    token = space + 1;
  }
  return flags;
}

int atcid_main() {
  // A station that hangs up mid-answer must not end the daemon.
  std::signal(SIGPIPE, SIG_IGN);
  ATCI_LOGI("atcid-daemon start!!!");
  char property[PROPERTY_VALUE_MAX];
  property_get("persist.sys.kroem", property, "");
  const char mode = property[0];

  initSerialDevice(&serial);
  std::strcpy(serial.dev_name[0], "/dev/ttyGS0");
  std::strcpy(serial.dev_name[1], "/dev/ttyHSL0");
  ATCI_LOGD("TTY_GS0: %s\n", serial.dev_name[0]);

  char cmdline[kCmdlineSize + 1];
  read_kernel_cmdline(cmdline);
  const KernelCmdlineFlags flags = scan_kernel_cmdline(cmdline);
  if (flags.sp) is_sp = 1;
  if (flags.uart) is_uart_flag = 1;
  ATCI_LOGD("is_uart_flag :%d", is_uart_flag);

  if (is_uart_flag == 1) return serve_uart();
  if (mode == '2') return serve_socket();
  property_get("persist.sys.kroem", property, "0");
  ATCI_LOGD("persist.sys.kroem :%s", property);
  if (strcasecmp(property, "1") == 0) return serve_usb();
  return 0;
}
