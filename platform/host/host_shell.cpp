// The shell of the emulated phone. Every command text is recorded in /.emu/shell.log and run
// by the root's own /system/bin/sh in a child with its own user, PID, network, IPC and UTS
// namespaces, chrooted into the root: it can see and signal nothing of the real machine.
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sched.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/host/host_hooks.h"
#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

ShellHook g_shell_hook = nullptr;
constexpr int kCouldNotExecute = 127;

void record_command(const char* command) {
  if (host_make_dirs("/.emu") != 0) return;
  std::string line;
  for (const char* c = command; *c; ++c) {
    if (*c == '\n')
      line += "\\n";
    else
      line += *c;
  }
  line += '\n';
  UniqueFd fd(host_resolve("/.emu/shell.log", O_WRONLY | O_CREAT | O_APPEND, 0644));
  if (fd.ok()) [[maybe_unused]] const ssize_t n = ::write(fd.get(), line.data(), line.size());
}

bool write_file(const char* path, const char* text) {
  UniqueFd fd(::open(path, O_WRONLY | O_CLOEXEC));
  const ssize_t len = static_cast<ssize_t>(std::strlen(text));
  return fd.ok() && ::write(fd.get(), text, len) == len;
}

// Runs in the forked child; never returns.
[[noreturn]] void run_isolated(const char* command) {
  const uid_t uid = ::geteuid();
  const gid_t gid = ::getegid();
  if (::unshare(CLONE_NEWUSER | CLONE_NEWPID | CLONE_NEWNET | CLONE_NEWIPC | CLONE_NEWUTS) != 0)
    _exit(kCouldNotExecute);
  char map[64];
  std::snprintf(map, sizeof map, "0 %u 1", static_cast<unsigned>(uid));
  if (!write_file("/proc/self/uid_map", map) || !write_file("/proc/self/setgroups", "deny"))
    _exit(kCouldNotExecute);
  std::snprintf(map, sizeof map, "0 %u 1", static_cast<unsigned>(gid));
  if (!write_file("/proc/self/gid_map", map)) _exit(kCouldNotExecute);

  // The first child in the new PID namespace is its init: when the shell ends, whatever it
  // left running in the background ends with it.
  const pid_t shell = ::fork();
  if (shell < 0) _exit(kCouldNotExecute);
  if (shell == 0) {
    if (::fchdir(host_root_fd()) != 0 || ::chroot(".") != 0 || ::chdir("/") != 0)
      _exit(kCouldNotExecute);
    char* const argv[] = {const_cast<char*>("sh"), const_cast<char*>("-c"),
                          const_cast<char*>(command), nullptr};
    char* const envp[] = {const_cast<char*>("PATH=/system/bin:/system/xbin:/sbin:/bin"),
                          const_cast<char*>("HOME=/data"), nullptr};
    ::execve("/system/bin/sh", argv, envp);
    _exit(kCouldNotExecute);
  }
  int status = 0;
  while (::waitpid(shell, &status, 0) < 0 && errno == EINTR) {
  }
  if (WIFSIGNALED(status)) {
    ::signal(WTERMSIG(status), SIG_DFL);
    ::raise(WTERMSIG(status));
  }
  _exit(WIFEXITED(status) ? WEXITSTATUS(status) : kCouldNotExecute);
}

}  // namespace

void host_set_shell_hook(ShellHook hook) { g_shell_hook = hook; }

int platform_system(const char* command) {
  if (command == nullptr) return 1;
  if (g_shell_hook != nullptr) return g_shell_hook(command);
  record_command(command);
  platform_log_flush();  // the command's own output comes after the lines that led to it
  const pid_t pid = ::fork();
  if (pid < 0) return -1;
  if (pid == 0) run_isolated(command);
  int status = 0;
  while (::waitpid(pid, &status, 0) < 0) {
    if (errno != EINTR) return -1;
  }
  return status;
}
