// Shapes that recur across command families: matching a line against a variant, its comma
// fields, the logged failure, the quoted answers, and the small reads of kernel and scratch
// files. The shell has its own header, commands/shell.h.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <sys/types.h>

#include "core/command.h"
#include "core/log.h"

// Whole-line, case-insensitive: "AT+JVSIM=1" matches "at+jvsim=1" but not "AT+JVSIM=1 ".
bool line_is(const char* line, const char* variant);
// Only the variant's length is compared, so trailing text is accepted.
bool line_starts_with(const char* line, const char* variant);

// A failure logged at the caller's line and function, then answered ERROR:
// `return LOGGED_ERROR("cannot open %s", path);`. A line of the family that matches none of
// its variants is such a failure, in the family's own words or REJECT_COMMAND_LINE's plain ones.
#define LOGGED_ERROR(format, ...) (ATCI_LOGE(format __VA_OPT__(, ) __VA_ARGS__), RESULT_ERROR)
#define REJECT_COMMAND_LINE(cmdline) LOGGED_ERROR("this at command invalid: %s", (cmdline))

inline int result_of(bool pass) { return pass ? RESULT_OK : RESULT_ERROR; }

// The query body "\r\n\"value\"\r\n". Both return RESULT_OK.
int answer_quoted(char* response, const char* value);
int answer_quoted_int(char* response, int value);

struct ulda_nvram;
// The query answering one field of the factory record, quoted; `caller` names the read in
// the log. RESULT_ERROR when the record cannot be read.
int answer_record_int(const char* caller, char* response, int32_t ulda_nvram::*field);

// Room for a body that grows line by line: the framed answer (echo, body, result word) must
// stay within the response size.
inline constexpr size_t BODY_LIMIT = RESPONSE_SIZE - CMD_LINE_SIZE - 64;
// Appends `piece` only when all of it fits below BODY_LIMIT; false when it was dropped.
bool body_append(char* response, std::string_view piece);

// The small-file read: up to `limit` bytes of `fd` into `buf` (which holds limit + 1), ended
// with a NUL; it reads again after a short read until the limit or the end of the file.
// Returns the byte count, or -1 when the first read fails (a descriptor of -1 included).
ssize_t read_head(int fd, char* buf, size_t limit);

// read_head of a device file; -1 also when it cannot be opened.
ssize_t read_file_head(const char* path, char* buf, size_t limit);

// read_file_head for a value that must be there: the whole buffer but its last byte is the
// limit. False, and logged, when the file cannot be opened, read, or is empty.
bool read_file_value(const char* path, char* buf, size_t limit);
template <size_t N>
bool read_file_value(const char* path, char (&buf)[N]) {
  return read_file_value(path, buf, N - 1);
}

// The first line of a device file as fgets reads it into `size` bytes: at most size - 1
// characters, its line end included when it fits. Returns its length; 0, with `line` empty,
// when the file is empty or its read fails; -1 when it cannot be opened.
int read_first_line(const char* path, char* line, size_t size);

// The integer at the head of a device file as "%d" reads it: blanks, a sign, digits. False,
// and logged, when the file cannot be opened or holds none, or one beyond int.
bool read_int_file(const char* path, int& value);

// Ends the text at its first CR or LF.
void cut_at_line_end(char* text);

// strtok over a view: skips leading delimiters, returns the next token and moves `rest` past it.
// At the end the token is empty but never a null view, so it prints as "" with "%.*s".
std::string_view next_token(std::string_view& rest, std::string_view delimiters);

// The comma-separated parameters of a line, split as strtok splits them: the first field (the
// command itself) is dropped and empty fields are skipped; an empty view once they run out.
struct CommaFields {
  explicit CommaFields(std::string_view line) : rest(line) { next_token(rest, ","); }
  std::string_view next() { return next_token(rest, ","); }
  std::string_view rest;
};

// Parameter `n` of the line, counted as CommaFields hands them out from 1; empty when missing.
std::string_view comma_field(std::string_view line, int n);

// A field as a terminated copy, cut to the buffer.
template <size_t N>
void copy_field(char (&out)[N], std::string_view field) {
  const size_t length = field.size() < N - 1 ? field.size() : N - 1;
  field.copy(out, length);
  out[length] = '\0';
}

// Decimal digits only, and at least one.
bool all_digits(std::string_view text);

// atol over a view: leading blanks and a sign, then digits up to the first other character;
// 0 when there are none.
long parse_long(std::string_view text);

// A pause of whole milliseconds.
void sleep_ms(unsigned ms);
