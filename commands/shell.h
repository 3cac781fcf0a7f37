// The phone's shell as the command families reach it: /system/bin/sh -c "TEXT" through the
// platform's system(), and tool output captured in a scratch file.
#pragma once

#include <cstddef>
#include <initializer_list>

// Runs a command text exactly as given through the platform shell; returns the wait status.
int run_shell(const char* command);

// The longest shell command text, its NUL included.
inline constexpr size_t SH_COMMAND_SIZE = 512;

// Writes /system/bin/sh -c "TEXT" for a printf-style TEXT into `command`; false, and logged,
// when it would not fit.
bool sh_command_text(char (&command)[SH_COMMAND_SIZE], const char* format, ...)
    __attribute__((format(printf, 2, 3)));

// Runs /system/bin/sh -c "TEXT" for a printf-style TEXT and returns system()'s raw result; -1,
// and logged, when the command would not fit.
int run_sh_command(const char* format, ...) __attribute__((format(printf, 1, 2)));

// Runs each text in turn as run_sh_command("%s", text) does; the results are not wanted.
void run_sh_commands(std::initializer_list<const char*> texts);

// The shell ran the command and it exited with status 0.
bool shell_succeeded(int status);
// The raw rule for run_sh_command: failed only on -1 or 127. The wait status is not decoded,
// so a tool the shell could not find (32512) is no failure.
inline bool sh_command_failed(int result) { return result == -1 || result == 127; }

// Runs "TOOL > SCRATCH" as run_sh_command does, then reads the scratch's first line as
// read_first_line does (-1 when it cannot be opened). The scratch stays: callers differ in
// whether and when it goes.
int sh_first_line(const char* tool, const char* scratch, char* line, size_t size);
