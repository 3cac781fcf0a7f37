#include "commands/command_util.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <strings.h>
#include <unistd.h>

#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/ulda_nvram.h"

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

int answer_record_int(const char* caller, char* response, int32_t ulda_nvram::*field) {
  ulda_nvram record;
  if (read_ulda_nvram(caller, record) != RESULT_OK) return RESULT_ERROR;
  return answer_quoted_int(response, record.*field);
}

bool body_append(char* response, std::string_view piece) {
  const size_t used = std::strlen(response);
  if (used + piece.size() > BODY_LIMIT) return false;
  std::memcpy(response + used, piece.data(), piece.size());
  response[used + piece.size()] = '\0';
  return true;
}

ssize_t read_head(int fd, char* buf, size_t limit) {
  buf[0] = '\0';
  size_t count = 0;
  while (count < limit) {
    const ssize_t n = ::read(fd, buf + count, limit - count);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0 && count == 0) return -1;
    if (n < 1) break;
    count += static_cast<size_t>(n);
  }
  buf[count] = '\0';
  return static_cast<ssize_t>(count);
}

ssize_t read_file_head(const char* path, char* buf, size_t limit) {
  buf[0] = '\0';
  UniqueFd fd(dev_open(path, O_RDONLY));
  return fd.ok() ? read_head(fd.get(), buf, limit) : -1;
}

bool read_file_value(const char* path, char* buf, size_t limit) {
  if (read_file_head(path, buf, limit) > 0) return true;
  ATCI_LOGE("cannot read %s", path);
  return false;
}

int read_first_line(const char* path, char* line, size_t size) {
  line[0] = '\0';
  UniqueFd fd(dev_open(path, O_RDONLY));
  if (!fd.ok()) return -1;
  const ssize_t count = read_head(fd.get(), line, size - 1);
  if (count <= 0) {
    line[0] = '\0';
    return 0;
  }
  // Counted in bytes, not up to a NUL: a line that begins with one is still a line.
  const auto* end = static_cast<const char*>(std::memchr(line, '\n', static_cast<size_t>(count)));
  const auto length = static_cast<size_t>(end != nullptr ? end + 1 - line : count);
  line[length] = '\0';
  return static_cast<int>(length);
}

bool read_int_file(const char* path, int& value) {
  char text[32];
  if (read_file_head(path, text, sizeof text - 1) < 0) {
    ATCI_LOGE("cannot open %s", path);
    return false;
  }
  std::string_view rest(text);
  rest.remove_prefix(std::min(rest.find_first_not_of(" \t\r\n\v\f"), rest.size()));
  if (!rest.empty() && rest.front() == '+') rest.remove_prefix(1);
  const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), value);
  if (error != std::errc() || end == rest.data()) {
    ATCI_LOGE("no integer in %s", path);
    return false;
  }
  return true;
}

void cut_at_line_end(char* text) { text[std::strcspn(text, "\r\n")] = '\0'; }

std::string_view next_token(std::string_view& rest, std::string_view delimiters) {
  const size_t begin = rest.find_first_not_of(delimiters);
  if (begin == std::string_view::npos) {
    rest.remove_prefix(rest.size());
    return rest;
  }
  rest.remove_prefix(begin);
  const size_t end = std::min(rest.find_first_of(delimiters), rest.size());
  const std::string_view token = rest.substr(0, end);
  rest.remove_prefix(end);
  return token;
}

std::string_view comma_field(std::string_view line, int n) {
  CommaFields fields(line);
  std::string_view field = fields.next();
  for (int i = 1; i < n; ++i) field = fields.next();
  return field;
}

bool all_digits(std::string_view text) {
  return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
}

void sleep_ms(unsigned ms) { ::usleep(ms * 1000); }

long parse_long(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r\n";
  text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
  if (!text.empty() && text.front() == '+') text.remove_prefix(1);
  long value = 0;
  std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}
