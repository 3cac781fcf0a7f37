// Shapes that recur across command families: matching a line against a variant, the quoted
// answers, and the small reads of kernel and scratch files.
#pragma once

#include <cstddef>
#include <string_view>
#include <sys/types.h>

#include "core/command.h"
#include "core/log.h"

// Whole-line, case-insensitive: "AT+JVSIM=1" matches "at+jvsim=1" but not "AT+JVSIM=1 ".
bool line_is(const char* line, const char* variant);
// Only the variant's length is compared, so trailing text is accepted.
bool line_starts_with(const char* line, const char* variant);

// A line of the family that matches none of its variants: logged at the caller, then failed.
#define REJECT_COMMAND_LINE(cmdline) \
  (ATCI_LOGE("this at command invalid: %s", (cmdline)), RESULT_ERROR)

inline int result_of(bool pass) { return pass ? RESULT_OK : RESULT_ERROR; }

// The query body "\r\n\"value\"\r\n". Both return RESULT_OK.
int answer_quoted(char* response, const char* value);
int answer_quoted_int(char* response, int value);

// Room for a body that grows line by line: the framed answer (echo, body, result word) must
// stay within the response size.
inline constexpr size_t BODY_LIMIT = RESPONSE_SIZE - CMD_LINE_SIZE - 64;
// Appends `piece` only when all of it fits below BODY_LIMIT; false when it was dropped.
bool body_append(char* response, std::string_view piece);

// Reads up to `limit` bytes of a device file into `buf` (which holds limit + 1) and ends them
// with a NUL; reads again after a short read until the limit or the end of the file.
// Returns the byte count, or -1 when the file cannot be opened or its first read fails.
ssize_t read_file_head(const char* path, char* buf, size_t limit);

// read_file_head for a value that must be there: the whole buffer but its last byte is the
// limit. False, and logged, when the file cannot be opened, read, or is empty.
bool read_file_value(const char* path, char* buf, size_t limit);
template <size_t N>
bool read_file_value(const char* path, char (&buf)[N]) {
  return read_file_value(path, buf, N - 1);
}

// The first line of a device file as fgets reads it into `size` bytes: at most size - 1
// characters, its line end included when it fits. 0, or -1 when the file cannot be opened or
// is empty.
int read_first_line(const char* path, char* line, size_t size);

// Ends the text at its first CR or LF.
void cut_at_line_end(char* text);

// Runs a command text exactly as given through the platform shell; returns the wait status.
int run_shell(const char* command);
// The shell ran the command and it exited with status 0.
bool shell_succeeded(int status);
// Runs `text` as /system/bin/sh -c "TEXT" and returns system()'s raw result; -1 when the
// command would not fit.
int run_sh_command(const char* text);
// The raw rule for run_sh_command: failed only on -1 or 127. The wait status is not decoded,
// so a tool the shell could not find (32512) is no failure.
inline bool sh_command_failed(int result) { return result == -1 || result == 127; }

// strtok over a view: skips leading delimiters, returns the next token (empty at the end) and
// moves `rest` past it.
std::string_view next_token(std::string_view& rest, std::string_view delimiters);

// atol over a view: leading blanks and a sign, then digits up to the first other character;
// 0 when there are none.
long parse_long(std::string_view text);
