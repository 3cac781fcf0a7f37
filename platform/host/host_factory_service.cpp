// The factory service, camera and setup-wizard state of the emulated phone (docs/emulator.md).
#include <cctype>
#include <cstdio>
#include <cstring>
#include <string_view>

#include "platform/device_services.h"
#include "platform/host/host_emu_state.h"

namespace {

// A request names a state file: one word of letters, digits, '_' and '-'.
bool is_request_word(std::string_view request) {
  if (request.empty() || request.size() > 64) return false;
  for (const char c : request) {
    if (!(std::isalnum(static_cast<unsigned char>(c)) || c == '_' || c == '-')) return false;
  }
  return true;
}

}  // namespace

int factory_service_request(const char* request, char* answer, size_t size) {
  if (answer == nullptr || size == 0) return -1;
  answer[0] = '\0';
  if (request == nullptr || !is_request_word(request)) return -1;
  char path[96];
  std::snprintf(path, sizeof path, "/.emu/factory/%s", request);
  const int found = emu_read_line(path, answer, size);
  // With nothing configured the service reports success, as a good board does.
  if (found == 0) std::snprintf(answer, size, "0");
  return found < 0 ? -1 : 0;
}

int setupwizard_state() { return emu_read_int("/.emu/setupwizard", 0); }

int camera_connected_mask() { return emu_read_int("/.emu/camera", 3); }
