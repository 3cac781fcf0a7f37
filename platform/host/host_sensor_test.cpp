// The sensor test library of the emulated phone: the result of test N comes from
// /.emu/sensor/N (docs/emulator.md); an unconfigured test passes with zero values.
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "core/log.h"
#include "platform/device_services.h"
#include "platform/host/host_emu_state.h"

namespace {

void parse_values(const char* text, sensor_test_result* result) {
  char* end = nullptr;
  for (float& value : result->values) {
    value = std::strtof(text, &end);
    if (end == text) return;
    text = end;
  }
}

void parse_line(std::string_view line, sensor_test_result* result) {
  const size_t eq = line.find('=');
  if (eq == std::string_view::npos) return;
  const std::string_view key = line.substr(0, eq);
  const char* value = line.data() + eq + 1;
  if (key == "success") {
    char* end = nullptr;
    const long success = std::strtol(value, &end, 10);
    result->success = end != value && (*end == '\0' || std::isspace(static_cast<unsigned char>(*end)))
                          ? static_cast<int32_t>(success)
                          : 0;
  } else if (key == "values") {
    parse_values(value, result);
  }
}

}  // namespace

int pemu_sensor_factory_test(int test, sensor_test_result* result, int, int) {
  if (result == nullptr) return -1;
  std::memset(result, 0, sizeof *result);
  result->success = 1;
  char path[48];
  std::snprintf(path, sizeof path, "/.emu/sensor/%d", test);
  UniqueFile file(dev_fopen(path, "r"));
  if (!file) return 0;
  char line[512];
  while (std::fgets(line, sizeof line, file.get()) != nullptr) {
    line[std::strcspn(line, "\r\n")] = '\0';
    parse_line(line, result);
  }
  return 0;
}

void show_sensor_test_result(const sensor_test_result* result) {
  if (result == nullptr) return;
  char text[28 * 16];
  size_t used = 0;
  for (const float value : result->values) {
    const int n = std::snprintf(text + used, sizeof text - used, " %g", static_cast<double>(value));
    if (n < 0 || static_cast<size_t>(n) >= sizeof text - used) break;
    used += static_cast<size_t>(n);
  }
  ATCI_LOGD("sensor test result: success %d, values%s", result->success, text);
}
