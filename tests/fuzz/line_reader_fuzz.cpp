// libFuzzer target: the line reader fed arbitrary reads on either transport. The first byte
// picks the transport; the rest is cut into reads at every 0xff byte. A line the reader hands
// on comes after a read that began with "A", ends inside the read that carried it, and every
// read is taken: none is left behind and the reader never waits for more than arrived.
#include <poll.h>
#include <sys/socket.h>

#include <cstdint>
#include <cstring>
#include <string_view>

#include "core/reader.h"
#include "tests/fuzz/fuzz_phone.h"

namespace {

fuzz::Phone* tty;
fuzz::Phone* socket_port;

constexpr char kLast[] = "AT\x02LAST";

bool pending(int fd) {
  pollfd p{fd, POLLIN, 0};
  return ::poll(&p, 1, 0) == 1;
}

bool is_a(char c) { return c == 'A' || c == 'a'; }

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  // Both phones share the one transport record: each input attaches its own before it reads.
  socket_port = new fuzz::Phone(PortKind::socket);
  tty = new fuzz::Phone(PortKind::tty);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const bool socket = data[0] & 1;
  fuzz::Phone& phone = socket ? *socket_port : *tty;
  phone.attach();
  std::string_view rest(reinterpret_cast<const char*>(data) + 1, size - 1);
  bool any_a = false;
  auto send = [&](std::string_view read) {
    if (::send(phone.station(), read.data(), read.size(), 0) != static_cast<ssize_t>(read.size()))
      fuzz::fail("send");
  };
  while (!rest.empty()) {
    const size_t cut = std::min(rest.find('\xff'), rest.size());
    const std::string_view read = rest.substr(0, std::min<size_t>(cut, 6144));
    rest.remove_prefix(std::min(cut + 1, rest.size()));
    // An empty read would be a hang-up, which ends the daemon by design.
    if (read.empty()) continue;
    any_a = any_a || is_a(read[0]);
    send(read);
  }
  // The reader waits for a line without end: a last one ends the input.
  send(socket ? kLast : std::string(kLast) + "\n");
  for (;;) {
    const char* line = readline(&serial);
    if (line == nullptr) fuzz::fail("no line from a read");
    if (line == std::string_view(kLast)) break;
    if (std::strlen(line) >= static_cast<size_t>(serial.line_len) + (socket ? 0 : 1) ||
        serial.line_len > 6145)
      fuzz::fail("line past its read", line);
    if (serial.state != 3 || !any_a) fuzz::fail("not a line", line);
  }
  if (pending(serial.fd[0])) fuzz::fail("a read left behind");
  return 0;
}
