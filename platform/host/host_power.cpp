// Power requests of the emulated phone: recorded, then the process ends as the phone would
// go away. reboot(2) is never called by a host build.
#include <arpa/inet.h>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

#include "platform/host/host_hooks.h"
#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

PowerHook g_power_hook = nullptr;

[[noreturn]] void go_away(const char* what) {
  if (g_power_hook != nullptr) {
    g_power_hook(what);
    std::abort();  // a hook that returns breaks its contract
  }
  if (host_make_dirs("/.emu") == 0) {
    UniqueFd fd(host_resolve("/.emu/power.log", O_WRONLY | O_CREAT | O_APPEND, 0644));
    if (fd.ok()) {
      char line[32];
      const int n = std::snprintf(line, sizeof line, "%s\n", what);
      [[maybe_unused]] const ssize_t w = ::write(fd.get(), line, n);
      ::fsync(fd.get());
    }
  }
  std::fflush(nullptr);
  _exit(0);
}

}  // namespace

void host_set_power_hook(PowerHook hook) { g_power_hook = hook; }

// sync(2) would flush every file system of the machine; the phone's data lives in the root.
void platform_sync() { ::syncfs(host_root_fd()); }

void platform_restart() { go_away("restart"); }
void platform_power_off() { go_away("power-off"); }

int platform_tcp_port() {
  const char* text = std::getenv("ATCID_PORT");
  if (text == nullptr || *text == '\0') return 6888;
  char* end = nullptr;
  const long port = std::strtol(text, &end, 10);
  return *end == '\0' && port > 0 && port < 65536 ? static_cast<int>(port) : 6888;
}

// The emulated phone is not open to the network unless asked: loopback by default.
int platform_tcp_listen_address(uint32_t* address) {
  const char* text = std::getenv("ATCID_LISTEN");
  if (text == nullptr || *text == '\0') {
    *address = htonl(INADDR_LOOPBACK);
    return 0;
  }
  in_addr addr{};
  if (::inet_pton(AF_INET, text, &addr) != 1) {
    std::fprintf(stderr, "atcid: ATCID_LISTEN '%s' is not an IPv4 address\n", text);
    return -1;
  }
  *address = addr.s_addr;
  return 0;
}
