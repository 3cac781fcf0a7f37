// Shapes the radio command families share: comma-separated parameters after the command, and
// tool commands run the way the phone's shell is reached.
#pragma once

#include <cstdio>
#include <string_view>

#include "commands/command_util.h"
#include "core/command.h"

// The comma-separated fields after the command itself, as strtok hands them out (empty
// fields are skipped; an empty view once they run out).
struct CommaFields {
  explicit CommaFields(const char* line) : rest(line) { next_token(rest, ","); }
  std::string_view next() { return next_token(rest, ","); }
  std::string_view rest;
};

// Runs a tool command as /system/bin/sh -c "command"; returns the wait status.
inline int run_tool(const char* command) {
  char line[CMD_LINE_SIZE + 32];
  std::snprintf(line, sizeof line, "/system/bin/sh -c \"%s\"", command);
  return run_shell(line);
}
