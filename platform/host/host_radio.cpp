// The emulated phone's radio hardware. The FM tuner's signal comes
// from /.emu/fm/signal; no ioctl is made on the host, whatever the descriptor is.
#include <unistd.h>

#include <charconv>
#include <cstring>
#include <fcntl.h>

#include "platform/host/host_root.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"

int platform_fm_tuner_signal(int fd, int* signal) {
  if (fd < 0 || signal == nullptr) return -1;
  UniqueFd state(host_resolve("/.emu/fm/signal", O_RDONLY | O_CLOEXEC));
  if (!state.ok()) return -1;
  char text[32] = {};
  const ssize_t n = ::read(state.get(), text, sizeof text - 1);
  if (n <= 0) return -1;
  const char* p = text;
  while (*p == ' ' || *p == '\t') ++p;
  if (*p == '+') ++p;
  int value = 0;
  const auto [end, ec] = std::from_chars(p, text + n, value);
  if (ec != std::errc() || (*end != '\0' && std::strchr(" \t\r\n", *end) == nullptr)) return -1;
  *signal = value;
  return 0;
}
