// libFuzzer target: AT+JVFILE=1 fed arbitrary characters cut into arbitrary reads, on either
// transport. Input: the transport (byte 0, low bit), the announced length (bytes 1-2), then the
// characters, cut into reads at every 0xff byte. The port is hung up after the last read, so
// a transfer that wants more fails instead of waiting. The stored file must be exactly what a
// station's decoder makes of what was read: on a tty each read on its own (pairs of it, an odd
// last character dropped, a read of one character skipped); on TCP one stream without CR and
// LF. A transfer that fails leaves the older file.
#include <sys/socket.h>

#include <cstdint>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <string>
#include <string_view>
#include <vector>

#include "commands/file_transfer.h"
#include "core/command.h"
#include "tests/fuzz/fuzz_phone.h"

namespace {

fuzz::Phone* tty;
fuzz::Phone* socket_port;

char decode(char high, char low) { return static_cast<char>(((high - 0x30) << 4) | (low & 0x0f)); }

// What the receiver should store, or false when it must fail (the reads ran out first).
bool expected_content(const std::vector<std::string_view>& reads, bool socket, long remaining,
                      std::string& out) {
  std::string stream;
  for (std::string_view read : reads) {
    if (remaining <= 0) return true;
    if (socket) {
      for (char c : read)
        if (c != '\r' && c != '\n') stream += c;
      const size_t pairs = stream.size() / 2;
      for (size_t i = 0; i < pairs; ++i) out += decode(stream[2 * i], stream[2 * i + 1]);
      stream.erase(0, 2 * pairs);
      remaining -= static_cast<long>(pairs);
    } else if (read.size() > 1) {
      for (size_t i = 0; i + 1 < read.size(); i += 2) out += decode(read[i], read[i + 1]);
      remaining -= static_cast<long>(read.size() / 2);
    }
  }
  return remaining <= 0;
}

std::string file_text(const fuzz::fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  socket_port = new fuzz::Phone(PortKind::socket);
  tty = new fuzz::Phone(PortKind::tty);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 3) return 0;
  const bool socket = data[0] & 1;
  const long length = data[1] | (data[2] & 0x0f) << 8;
  fuzz::Phone& phone = socket ? *socket_port : *tty;
  phone.new_port();
  std::vector<std::string_view> reads;
  std::string_view rest(reinterpret_cast<const char*>(data) + 3, size - 3);
  while (!rest.empty()) {
    const size_t cut = std::min(rest.find('\xff'), rest.size());
    // A tty read is at most a line; the receiver asks for 1100 characters at a time.
    const std::string_view read = rest.substr(0, std::min<size_t>(cut, 1100));
    rest.remove_prefix(std::min(cut + 1, rest.size()));
    if (read.empty()) continue;
    reads.push_back(read);
    ::send(phone.station(), read.data(), read.size(), 0);
  }
  ::shutdown(phone.station(), SHUT_WR);

  const fuzz::fs::path stored = phone.root() / "data/fuzz.bin";
  { std::ofstream(stored) << "older"; }
  char line[CMD_LINE_SIZE] = {};
  std::snprintf(line, sizeof line, "AT+JVFILE=1,FUZZ.BIN,%ld", length);
  char body[RESPONSE_SIZE] = {};
  const int status = jvfile_handler(line, OP_SET, body);

  std::string expected;
  const bool whole = expected_content(reads, socket, length, expected);
  if (status != (whole ? RESULT_OK : RESULT_ERROR)) fuzz::fail("status", line);
  if (file_text(stored) != (whole ? expected : "older")) fuzz::fail("stored content", line);
  phone.check_bounds();
  return 0;
}
