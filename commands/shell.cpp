#include "commands/shell.h"

#include <cstdarg>
#include <cstdio>
#include <sys/wait.h>

#include "commands/command_util.h"
#include "core/log.h"
#include "platform/platform.h"

namespace {

// The inner text first: a command that does not fit is refused, and its log names the text.
bool vformat_sh_command(char (&command)[SH_COMMAND_SIZE], const char* format, va_list args) {
  char text[SH_COMMAND_SIZE] = {};
  const int n = std::vsnprintf(text, sizeof text, format, args);
  const int m = n >= 0 && static_cast<size_t>(n) < sizeof text
                    ? std::snprintf(command, sizeof command, "/system/bin/sh -c \"%s\"", text)
                    : -1;
  if (m >= 0 && static_cast<size_t>(m) < sizeof command) return true;
  std::snprintf(command, sizeof command, "%s", text);
  return false;
}

}  // namespace

int run_shell(const char* command) {
  ATCI_LOGD("%s", command);
  return platform_system(command);
}

bool sh_command_text(char (&command)[SH_COMMAND_SIZE], const char* format, ...) {
  va_list args;
  va_start(args, format);
  const bool fits = vformat_sh_command(command, format, args);
  va_end(args);
  if (!fits) ATCI_LOGE("command too long: %s", command);
  return fits;
}

int run_sh_command(const char* format, ...) {
  char command[SH_COMMAND_SIZE];
  va_list args;
  va_start(args, format);
  const bool fits = vformat_sh_command(command, format, args);
  va_end(args);
  if (!fits) {
    ATCI_LOGE("command too long: %s", command);
    return -1;
  }
  return run_shell(command);
}

void run_sh_commands(std::initializer_list<const char*> texts) {
  for (const char* text : texts) run_sh_command("%s", text);
}

bool shell_succeeded(int status) {
  return status != -1 && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

int sh_first_line(const char* tool, const char* scratch, char* line, size_t size) {
  run_sh_command("%s > %s", tool, scratch);
  return read_first_line(scratch, line, size);
}
