#include "commands/file_transfer.h"

#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string_view>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"

namespace {

// "/data/" and 23 characters fill the path buffer stations have always been held to.
constexpr size_t kPathSize = 30;
constexpr size_t kNameMax = kPathSize - sizeof "/data/";
constexpr int kChunkChars = 1100;
constexpr size_t kChunkBytes = kChunkChars / 2;

// The name goes into a shell command: only characters the shell takes literally.
bool name_char_allowed(char c) {
  return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
         std::string_view("._-+@%=:").find(c) != std::string_view::npos;
}

// The lower-cased name as "/data/<name>". A link or anything but a regular file is refused, so
// neither the transfer nor the check ever opens one.
bool transfer_path(std::string_view name, char (&path)[kPathSize]) {
  if (name.empty() || name.size() > kNameMax || name == "." || name == "..") return false;
  char lower[kNameMax + 1] = {};
  for (size_t i = 0; i < name.size(); ++i) {
    const char c = name[i];
    lower[i] = c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    if (!name_char_allowed(lower[i])) return false;
  }
  std::snprintf(path, sizeof path, "/data/%s", lower);
  struct stat st;
  if (dev_lstat(path, &st) == 0) return S_ISREG(st.st_mode);
  return errno == ENOENT;
}

// atoi's reading (blanks, a sign, digits up to the first other character; none is 0), but a
// value beyond int is refused rather than wrapped.
bool parse_length(std::string_view text, long long& length) {
  text.remove_prefix(std::min(text.find_first_not_of(" \t\r\n\f\v"), text.size()));
  if (!text.empty() && text.front() == '+') text.remove_prefix(1);
  length = 0;
  const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), length);
  if (ec == std::errc::result_out_of_range) return false;
  return length >= INT_MIN && length <= INT_MAX;
}

uint8_t decode_pair(char high, char low) {
  return static_cast<uint8_t>(((high - 0x30) << 4) | (low & 0x0F));
}

// A tty read is one line: its pairs are decoded on their own and an odd last character (the
// line end) is dropped.
size_t decode_line(const char* chunk, int count, uint8_t* bytes) {
  const size_t pairs = static_cast<size_t>(count) / 2;
  for (size_t i = 0; i < pairs; ++i) bytes[i] = decode_pair(chunk[2 * i], chunk[2 * i + 1]);
  return pairs;
}

// TCP splits anywhere: the characters form one stream, a pair may straddle two reads, and
// line ends are not content.
struct StreamDecoder {
  int pending = -1;  // the first character of a pair still waiting for its second

  size_t decode(const char* chunk, int count, uint8_t* bytes) {
    size_t n = 0;
    for (int i = 0; i < count; ++i) {
      const char c = chunk[i];
      if (c == '\r' || c == '\n') continue;
      if (pending < 0) {
        pending = static_cast<unsigned char>(c);
      } else {
        bytes[n++] = decode_pair(static_cast<char>(pending), c);
        pending = -1;
      }
    }
    return n;
  }
};

// Decoded bytes wait here and go to the file in large writes: one write a line would cost the
// receive more than its decoding.
class FileWriter {
 public:
  explicit FileWriter(int fd) : fd_(fd) {}
  // Room for one chunk's bytes at the end of what is waiting.
  uint8_t* room() {
    if (sizeof pending_ - used_ < kChunkBytes && !flush()) return nullptr;
    return pending_ + used_;
  }
  void add(size_t n) { used_ += n; }
  // False, and logged, when a write was short.
  bool flush() {
    if (used_ > 0 && ::write(fd_, pending_, used_) != static_cast<ssize_t>(used_)) {
      ATCI_LOGE("write file error:%s ", std::strerror(errno));
      return false;
    }
    used_ = 0;
    return true;
  }

 private:
  int fd_;
  size_t used_ = 0;
  uint8_t pending_[64 * 1024];
};

// Reads the content into `fd` until `remaining` bytes arrived (more are kept, as stations
// have always seen). False when the port fails or a write is short.
bool receive_content(int fd, long long remaining) {
  StreamDecoder decoder;
  FileWriter file(fd);
  char chunk[kChunkChars + 1];
  while (remaining > 0) {
    const PortRead read = read_port_data(chunk, kChunkChars);
    ATCI_LOGD("receive_len=%d", read.count);
    const int count = read.bytes;
    if (count < 1) {
      ATCI_LOGE("write file error:%s ", std::strerror(errno));
      return false;
    }
    if (!read.stream && count == 1) {
      ATCI_LOGD("readDataFromSerial: %0x, %s", chunk[0], "drop");
      continue;
    }
    uint8_t* bytes = file.room();
    if (bytes == nullptr) return false;
    const size_t n =
        read.stream ? decoder.decode(chunk, count, bytes) : decode_line(chunk, count, bytes);
    file.add(n);
    remaining -= static_cast<long long>(n);
    ATCI_LOGD("total_len=%lld", remaining);
  }
  return file.flush();
}

// The stored file changes only once the whole content is written and synced; a transfer cut
// short leaves the earlier file, and no partial one.
int receive_file(const char* path, long long length) {
  ATCI_LOGD("write file %s", path);
  dev_unlink(FILE_TRANSFER_PARTIAL);
  UniqueFd file(dev_open(FILE_TRANSFER_PARTIAL, O_RDWR | O_CREAT | O_TRUNC | O_NOFOLLOW, 0666));
  if (!file.ok()) return LOGGED_ERROR("create file error:%s ", std::strerror(errno));
  if (!receive_content(file.get(), length) || ::fdatasync(file.get()) != 0 ||
      dev_rename(FILE_TRANSFER_PARTIAL, path) != 0) {
    dev_unlink(FILE_TRANSFER_PARTIAL);
    return RESULT_ERROR;
  }
  if (UniqueFd dir(dev_open("/data", O_RDONLY | O_DIRECTORY)); dir.ok()) ::fsync(dir.get());
  run_sh_command("chmod 777 %s", path);
  return RESULT_OK;
}

int verify_file(const char* path, std::string_view expected, char* response) {
  MD5_CTX context;
  MD5_Init(&context);
  if (MD5_Update_File(&context, path) != 0) {
    std::snprintf(response, RESPONSE_SIZE, "can not open file:%s", path);
    return RESULT_ERROR;
  }
  unsigned char digest[16];
  MD5_Final(digest, &context);
  char hex[33];
  for (size_t i = 0; i < sizeof digest; ++i) std::snprintf(hex + 2 * i, 3, "%02x", digest[i]);
  std::snprintf(response, RESPONSE_SIZE, "\"%s\"", hex);
  if (expected.size() >= 32 && strncasecmp(hex, expected.data(), 32) == 0) return RESULT_OK;
  return LOGGED_ERROR("==verify error");
}

}  // namespace

int jvfile_handler(char* cmdline, int, char* response) {
  const bool receive = line_starts_with(cmdline, "AT+JVFILE=1");
  if (!receive && !line_starts_with(cmdline, "AT+JVFILE=2"))
    return LOGGED_ERROR("==command invalid:%s", cmdline);
  CommaFields fields(cmdline);
  const std::string_view name = fields.next();
  const std::string_view second = fields.next();
  if (name.empty() || second.empty()) return RESULT_ERROR;
  ATCI_LOGD("file_name=%.*s, %s=%.*s", static_cast<int>(name.size()), name.data(),
            receive ? "buff_len" : "md5", static_cast<int>(second.size()), second.data());
  char path[kPathSize];
  if (!transfer_path(name, path))
    return LOGGED_ERROR("refused file name: %.*s", static_cast<int>(name.size()), name.data());
  if (!receive) return verify_file(path, second, response);
  long long length = 0;
  if (!parse_length(second, length)) return RESULT_ERROR;
  return receive_file(path, length);
}
