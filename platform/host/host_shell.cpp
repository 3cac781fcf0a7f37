// The shell of the emulated phone. Every command text is recorded in /.emu/shell.log and run
// by the root's own /system/bin/sh inside namespaces of its own: user, PID, network, IPC and
// UTS, chrooted into the root, so it can see and signal nothing of the real machine.
//
// The namespaces are held by one small init per daemon, started on first use: it is PID 1 of
// its PID namespace, adopts and reaps whatever a command leaves in the background, and ends
// when the daemon's end of its request socket closes (the daemon ended, however it ended),
// taking every process of the namespace with it. Each call sends the command text and a
// reply socket; a runner in the namespace starts the shell, waits for it and sends back its
// wait status, so calls from several threads never wait for one another.
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <mutex>
#include <sched.h>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/host/host_hooks.h"
#include "platform/host/host_root.h"
#include "platform/platform.h"

namespace {

ShellHook g_shell_hook = nullptr;
constexpr int kCouldNotExecute = 127;
constexpr int kCouldNotExecuteStatus = kCouldNotExecute << 8;
// Command texts longer than this are refused by the holder (a factory command is far shorter).
constexpr size_t kMaxCommand = 64 * 1024;

// Descriptor numbers inside the holder, fixed before everything else is closed.
constexpr int kHolderRequests = 3;
constexpr int kHolderRoot = 4;

std::mutex g_holder_lock;
UniqueFd g_requests;   // the daemon's end of the holder's request socket
pid_t g_holder = -1;   // the child that entered the namespaces (the holder init's parent)
std::string g_holder_root;  // the root it is chrooted into

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

// In the namespaces: starts the shell on `command`, waits for it and answers its wait status.
[[noreturn]] void run_command(const char* command, int reply) {
  ::signal(SIGCHLD, SIG_DFL);  // the holder ignores it to reap; this runner waits itself
  int status = -1;
  const pid_t shell = ::fork();
  if (shell == 0) {
    ::close(reply);
    char* const argv[] = {const_cast<char*>("sh"), const_cast<char*>("-c"),
                          const_cast<char*>(command), nullptr};
    char* const envp[] = {const_cast<char*>("PATH=/system/bin:/system/xbin:/sbin:/bin"),
                          const_cast<char*>("HOME=/data"), nullptr};
    ::execve("/system/bin/sh", argv, envp);
    _exit(kCouldNotExecute);
  }
  if (shell > 0) {
    while (::waitpid(shell, &status, 0) < 0 && errno == EINTR) {
    }
  }
  [[maybe_unused]] const ssize_t n = ::send(reply, &status, sizeof status, MSG_NOSIGNAL);
  _exit(0);
}

// PID 1 of the namespace: one runner per request; orphans are reaped by ignoring SIGCHLD.
[[noreturn]] void holder_init() {
  // Commands start as from a fresh init: default signals (the daemon ignores SIGPIPE), none
  // blocked.
  ::signal(SIGPIPE, SIG_DFL);
  sigset_t none;
  sigemptyset(&none);
  ::sigprocmask(SIG_SETMASK, &none, nullptr);
  ::signal(SIGCHLD, SIG_IGN);
  static char command[kMaxCommand + 1];
  if (::send(kHolderRequests, "r", 1, MSG_NOSIGNAL) != 1) _exit(kCouldNotExecute);
  for (;;) {
    alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))];
    iovec iov{command, kMaxCommand};
    msghdr msg{};
    msg.msg_iov = &iov;
    msg.msg_iovlen = 1;
    msg.msg_control = control;
    msg.msg_controllen = sizeof control;
    const ssize_t n = ::recvmsg(kHolderRequests, &msg, MSG_CMSG_CLOEXEC);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) _exit(0);  // the daemon is gone: so is everything in the namespace
    int reply = -1;
    const cmsghdr* c = CMSG_FIRSTHDR(&msg);
    if (c != nullptr && c->cmsg_level == SOL_SOCKET && c->cmsg_type == SCM_RIGHTS)
      std::memcpy(&reply, CMSG_DATA(c), sizeof reply);
    if (reply < 0) continue;
    if ((msg.msg_flags & (MSG_TRUNC | MSG_CTRUNC)) == 0) {
      command[n] = '\0';
      if (::fork() == 0) run_command(command, reply);
    }
    ::close(reply);  // a refused or failed request reads as end of stream
  }
}

// The forked child that enters the namespaces and the root; never returns.
[[noreturn]] void enter_namespaces(int requests) {
  // Nothing of the daemon (its port, its station connection) stays open in here, and the
  // request socket is closed for every program the shell runs: only the holder may keep it.
  const int high_requests = ::fcntl(requests, F_DUPFD_CLOEXEC, 16);
  const int high_root = ::fcntl(host_root_fd(), F_DUPFD_CLOEXEC, 16);
  if (high_requests < 0 || high_root < 0 || ::dup3(high_requests, kHolderRequests, O_CLOEXEC) < 0 ||
      ::dup3(high_root, kHolderRoot, O_CLOEXEC) < 0)
    _exit(kCouldNotExecute);
  ::close_range(kHolderRoot + 1, ~0U, 0);
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
  if (::fchdir(kHolderRoot) != 0 || ::chroot(".") != 0 || ::chdir("/") != 0)
    _exit(kCouldNotExecute);
  ::close(kHolderRoot);
  const pid_t init = ::fork();  // the first child in the new PID namespace is its init
  if (init == 0) holder_init();
  ::close(kHolderRequests);
  int status = 0;
  while (init > 0 && ::waitpid(init, &status, 0) < 0 && errno == EINTR) {
  }
  _exit(0);
}

// Called with g_holder_lock held. Forgets a holder that has gone, or that serves another root
// (in-process tests change roots), and starts one if none runs.
bool ensure_holder(bool restart) {
  if ((restart || g_holder_root != host_root_path()) && g_requests.ok()) {
    g_requests.reset();
    if (g_holder > 0) ::waitpid(g_holder, nullptr, 0);
    g_holder = -1;
  }
  if (g_requests.ok()) return true;
  int pair[2];
  if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, pair) != 0) return false;
  const pid_t pid = ::fork();
  if (pid == 0) enter_namespaces(pair[1]);
  ::close(pair[1]);
  UniqueFd requests(pair[0]);
  if (pid < 0) return false;
  // The holder says it is ready once it runs inside; an end of stream means it never got there.
  char ready = 0;
  ssize_t n;
  while ((n = ::read(requests.get(), &ready, 1)) < 0 && errno == EINTR) {
  }
  if (n != 1) {
    requests.reset();
    ::waitpid(pid, nullptr, 0);
    return false;
  }
  g_requests = std::move(requests);
  g_holder = pid;
  g_holder_root = host_root_path();
  return true;
}

// Hands `command` to the holder; the wait status, or -1 when the holder could not run it.
int run_in_holder(const char* command) {
  int pair[2];
  if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, pair) != 0) return -1;
  UniqueFd mine(pair[0]);
  UniqueFd theirs(pair[1]);
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
  iovec iov{const_cast<char*>(command), std::strlen(command)};
  msghdr msg{};
  msg.msg_iov = &iov;
  msg.msg_iovlen = 1;
  msg.msg_control = control;
  msg.msg_controllen = sizeof control;
  cmsghdr* c = CMSG_FIRSTHDR(&msg);
  c->cmsg_level = SOL_SOCKET;
  c->cmsg_type = SCM_RIGHTS;
  c->cmsg_len = CMSG_LEN(sizeof(int));
  const int fd = theirs.get();
  std::memcpy(CMSG_DATA(c), &fd, sizeof fd);

  bool sent = false;
  for (int attempt = 0; attempt < 2 && !sent; ++attempt) {
    const std::lock_guard lock(g_holder_lock);
    if (!ensure_holder(attempt > 0)) return kCouldNotExecuteStatus;
    if (::sendmsg(g_requests.get(), &msg, MSG_NOSIGNAL) >= 0)
      sent = true;
    else if (errno != EPIPE && errno != ECONNRESET)
      return -1;  // the holder is fine; this request is not (too long a text)
  }
  // A holder that cannot even enter the namespaces leaves the shell unable to execute.
  if (!sent) return kCouldNotExecuteStatus;
  theirs.reset();
  int status = 0;
  ssize_t n;
  while ((n = ::read(mine.get(), &status, sizeof status)) < 0 && errno == EINTR) {
  }
  return n == sizeof status ? status : -1;
}

off_t power_log_size() {
  UniqueFd fd(host_resolve("/.emu/power.log", O_RDONLY));
  struct stat st{};
  return fd.ok() && ::fstat(fd.get(), &st) == 0 ? st.st_size : 0;
}

}  // namespace

void host_set_shell_hook(ShellHook hook) { g_shell_hook = hook; }

int platform_system(const char* command) {
  if (command == nullptr) return 1;
  if (g_shell_hook != nullptr) return g_shell_hook(command);
  record_command(command);
  const off_t power_before = power_log_size();
  const int status = run_in_holder(command);
  // The phone's reboot tool ran: the phone is going away, and the daemon with it.
  if (power_log_size() > power_before) {
    std::fflush(nullptr);
    _exit(0);
  }
  return status;
}
