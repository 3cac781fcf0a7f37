#include "commands/command_util.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/wait.h>
#include <strings.h>
#include <unistd.h>

#include "platform/platform.h"
#include "platform/unique_fd.h"

bool line_is(const char* line, const char* variant) { return strcasecmp(line, variant) == 0; }

bool line_starts_with(const char* line, const char* variant) {
  return strncasecmp(line, variant, std::strlen(variant)) == 0;
}

int answer_quoted(char* response, const char* value) {
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%s\"\r\n", value);
  return RESULT_OK;
}

int answer_quoted_int(char* response, int value) {
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%d\"\r\n", value);
  return RESULT_OK;
}

bool body_append(char* response, std::string_view piece) {
  const size_t used = std::strlen(response);
  if (used + piece.size() > BODY_LIMIT) return false;
  std::memcpy(response + used, piece.data(), piece.size());
  response[used + piece.size()] = '\0';
  return true;
}

ssize_t read_file_head(const char* path, char* buf, size_t limit) {
  buf[0] = '\0';
  UniqueFd fd(dev_open(path, O_RDONLY));
  if (!fd.ok()) return -1;
  size_t count = 0;
  while (count < limit) {
    const ssize_t n = ::read(fd.get(), buf + count, limit - count);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0 && count == 0) return -1;
    if (n < 1) break;
    count += static_cast<size_t>(n);
  }
  buf[count] = '\0';
  return static_cast<ssize_t>(count);
}

bool read_file_value(const char* path, char* buf, size_t limit) {
  if (read_file_head(path, buf, limit) > 0) return true;
  ATCI_LOGE("cannot read %s", path);
  return false;
}

int read_first_line(const char* path, char* line, size_t size) {
  line[0] = '\0';
  UniqueFile file(dev_fopen(path, "r"));
  if (!file) return -1;
  return std::fgets(line, static_cast<int>(size), file.get()) != nullptr ? 0 : -1;
}

void cut_at_line_end(char* text) { text[std::strcspn(text, "\r\n")] = '\0'; }

std::string_view next_token(std::string_view& rest, std::string_view delimiters) {
  const size_t begin = rest.find_first_not_of(delimiters);
  if (begin == std::string_view::npos) {
    rest = {};
    return {};
  }
  rest.remove_prefix(begin);
  const size_t end = std::min(rest.find_first_of(delimiters), rest.size());
  const std::string_view token = rest.substr(0, end);
  rest.remove_prefix(end);
  return token;
}

long parse_long(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r\n";
  text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
  if (!text.empty() && text.front() == '+') text.remove_prefix(1);
  long value = 0;
  std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

int run_shell(const char* command) {
  ATCI_LOGD("%s", command);
  return platform_system(command);
}

bool shell_succeeded(int status) {
  return status != -1 && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

int run_sh_command(const char* text) {
  char command[512];
  const int n = std::snprintf(command, sizeof command, "/system/bin/sh -c \"%s\"", text);
  if (n < 0 || static_cast<size_t>(n) >= sizeof command) {
    ATCI_LOGE("command too long: %s", text);
    return -1;
  }
  return run_shell(command);
}
