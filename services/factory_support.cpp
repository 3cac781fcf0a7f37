// The factory support adapter: framework requests go to the `am` tool through the platform
// shell; file helpers and MD5 work on device paths; the rest asks the platform's services.
#include "services/factory_support.h"

#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <string_view>

#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/file_io.h"
#include "services/md5.h"

namespace {

constexpr std::string_view kBlanks = " \t\r\n";

bool is_plain_word(std::string_view word) {
  for (const char c : word) {
    const bool plain = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                       std::string_view("._/:=,@%+-").find(c) != std::string_view::npos;
    if (!plain) return false;
  }
  return !word.empty();
}

// The words come from the station (an SSID, a password): anything the shell could read as
// more than one word or as syntax is single-quoted.
void append_word(std::string& command, std::string_view word) {
  command += ' ';
  if (is_plain_word(word)) {
    command += word;
    return;
  }
  command += '\'';
  for (const char c : word) {
    if (c == '\'')
      command += "'\\''";
    else
      command += c;
  }
  command += '\'';
}

void append_option(std::string& command, const char* option, const char* value) {
  if (value == nullptr || *value == '\0') return;
  command += ' ';
  command += option;
  append_word(command, value);
}

// The extras fragment is split at blanks, as the shell would split it unquoted.
void append_fragment(std::string& command, const char* fragment) {
  std::string_view rest(fragment ? fragment : "");
  while (!rest.empty()) {
    const size_t start = rest.find_first_not_of(kBlanks);
    if (start == std::string_view::npos) break;
    rest.remove_prefix(start);
    const size_t end = rest.find_first_of(kBlanks);
    append_word(command, rest.substr(0, end));
    rest.remove_prefix(end == std::string_view::npos ? rest.size() : end);
  }
}

int run(const std::string& command) {
  ATCI_LOGD("run: %s", command.c_str());
  return platform_system(command.c_str()) == 0 ? 0 : -1;
}

// am <subcommand> [-n component] [-a action] [extras...]
int am_request(const char* subcommand, const char* component, const char* action,
               const char* extras) {
  std::string command = "am ";
  command += subcommand;
  append_option(command, "-n", component);
  append_option(command, "-a", action);
  append_fragment(command, extras);
  return run(command);
}

}  // namespace

int sendBroadcastFromAtcid(const char* component, const char* action, const char* extras) {
  return am_request("broadcast", component, action, extras);
}

int startActivityFromAtcid(const char* component, const char* action, const char* extras) {
  return am_request("start", component, action, extras);
}

int startServiceFromAtcid(const char* component, const char* action, const char* extras) {
  return am_request("startservice", component, action, extras);
}

// force-stop takes a package only: no intent, so action and extras do not apply.
int stopActivityFromAtcid(const char* package, const char*, const char*) {
  if (package == nullptr || *package == '\0') return -1;
  std::string command = "am force-stop";
  append_word(command, package);
  return run(command);
}

// A non-zero flag asks for SIGKILL, so the process is gone before the caller starts it again.
// The shell's killall reaches only the phone's own processes (on a host build: the emulated
// phone's PID namespace).
int killprocess(const char* name, int flag) {
  if (name == nullptr || *name == '\0') return -1;
  std::string command = flag != 0 ? "killall -9" : "killall";
  append_word(command, name);
  return run(command);
}

const char* sendMessage(const char* request) {
  static char answer[256];
  if (request == nullptr || factory_service_request(request, answer, sizeof answer) != 0)
    answer[0] = '\0';
  return answer;
}

int readFromFile(const char* path, char* buffer, int size) {
  if (path == nullptr || buffer == nullptr || size <= 0) return -1;
  buffer[0] = '\0';
  UniqueFd fd(dev_open(path, O_RDONLY));
  if (!fd.ok()) return -1;
  const ssize_t n = read_full(fd.get(), buffer, static_cast<size_t>(size) - 1);
  if (n < 0) return -1;
  buffer[n] = '\0';
  return static_cast<int>(n);
}

// No O_CREAT: a missing node is a failure, as it is in sysfs.
int write_int(const char* path, int value) {
  if (path == nullptr) return -1;
  UniqueFd fd(dev_open(path, O_WRONLY | O_TRUNC));
  if (!fd.ok()) return -1;
  char text[16];
  const int len = std::snprintf(text, sizeof text, "%d", value);
  return write_full(fd.get(), text, static_cast<size_t>(len)) ? 0 : -1;
}

void substring(char* token) {
  if (token == nullptr) return;
  constexpr std::string_view kAround = " \t\r\n\"";
  std::string_view text(token);
  const size_t start = text.find_first_not_of(kAround);
  if (start == std::string_view::npos) {
    token[0] = '\0';
    return;
  }
  const size_t end = text.find_last_not_of(kAround) + 1;
  std::memmove(token, token + start, end - start);
  token[end - start] = '\0';
}

int isSetupwizardDisabled() { return setupwizard_state(); }

int checkCameraDeviceConnect(int) { return camera_connected_mask(); }

int MD5_Update_File(MD5_CTX* context, const char* path) {
  if (context == nullptr || path == nullptr) return -1;
  UniqueFd fd(dev_open(path, O_RDONLY));
  if (!fd.ok()) return -1;
  char chunk[16384];
  for (;;) {
    const ssize_t n = read_full(fd.get(), chunk, sizeof chunk);
    if (n < 0) return -1;
    md5_update(context, chunk, static_cast<size_t>(n));
    if (static_cast<size_t>(n) < sizeof chunk) return 0;
  }
}
