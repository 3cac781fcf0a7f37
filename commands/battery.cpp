#include "commands/battery.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string_view>

#include "commands/command_util.h"
#include "commands/worker.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/file_io.h"

std::atomic<pthread_t> adc_test_thread{NO_THREAD};
std::atomic<bool> eadc_test_exit{false};

namespace {

constexpr const char* kVoltageNow = "/sys/class/power_supply/battery/voltage_now";
constexpr const char* kTemp = "/sys/class/power_supply/battery/temp";
constexpr const char* kChargeNow = "/sys/class/power_supply/battery/charge_now";
constexpr const char* kCurrentNow = "/sys/class/power_supply/battery/current_now";
constexpr const char* kCapacity = "/sys/class/power_supply/battery/capacity";
constexpr const char* kStatus = "/sys/class/power_supply/battery/status";
constexpr const char* kAcCurrent = "/sys/class/power_supply/cms/current_ac_avg_now";
constexpr const char* kChargeCurrent = "/data/data/com.ulda.engineermode/files/ChargeCurrent";
constexpr const char* kAuthentic = "/sys/class/power_supply/bms/authentic";

// Each integer goes through single precision, then is divided in double precision.
double scaled(int value, double divisor) { return static_cast<float>(value) / divisor; }

// One cycle of the stream: false when a battery file is gone, which ends it.
bool write_adc_line() {
  const WorkerCycle cycle;
  int voltage = 0, temperature = 0, current = 0;
  if (!read_int_file(kVoltageNow, voltage) || !read_int_file(kTemp, temperature)) return false;
  UniqueFd{dev_open(kChargeNow, O_RDONLY)}.reset();  // opened and closed unread
  if (!read_int_file(kCurrentNow, current)) return false;
  char line[50];
  const int n = std::snprintf(line, sizeof line, "+EADC: \"%.2f,%.2f,%.2f,%.2f,%.2f\"\r\n",
                              scaled(voltage, 1000000.0), scaled(temperature, 10.0), 0.584,
                              scaled(current, 1000.0), 4.5);
  write_unsolicited({line, static_cast<size_t>(std::min(n, static_cast<int>(sizeof line) - 1))});
  return true;
}

void adc_stream_body() { run_stream(eadc_test_exit, write_adc_line, 300000); }

// Charger controls: write-only, created in an existing directory, truncated.
struct ChargerWrite {
  const char* variant;
  const char* path;
  const char* text;
  bool needs_write;  // false: the open alone decides
};

constexpr ChargerWrite kChargerWrites[] = {
    {"AT+JVCHARG=0", "sys/bus/platform/devices/pm8921-charger/charge", "0", false},
    {"AT+JVCHARG=1", "sys/bus/platform/devices/pm8921-charger/charge", "1", false},
    {"AT+RMCHARGEP=0", "/sys/class/power_supply/cms/present", "0", true},
    {"AT+JVQXGWBH=1,1", "/sys/devices/platform/battery/Charging_TemputerSet", "1", true},
    {"AT+JVQXGWBH=1,0", "/sys/devices/platform/battery/Charging_TemputerSet", "0", true},
    {"AT+JVDISRECHARGE=0", "/sys/kernel/debug/cms/debug", "chg-cutoff", true},
    {"AT+JVDISRECHARGE=1", "/sys/kernel/debug/cms/debug", "chg-open", true},
};

int charger_write(const char* cmdline) {
  for (const ChargerWrite& w : kChargerWrites) {
    if (!line_is(cmdline, w.variant)) continue;
    UniqueFd fd(dev_open(w.path, O_WRONLY | O_CREAT | O_TRUNC, 0666));
    if (!fd.ok()) return LOGGED_ERROR("cannot open %s", w.path);
    const bool written = write_full(fd.get(), w.text, std::strlen(w.text));
    if (!written) ATCI_LOGE("cannot write %s", w.path);
    return result_of(written || !w.needs_write);
  }
  return REJECT_COMMAND_LINE(cmdline);
}

}  // namespace

int eadc_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+EADC=1")) {
    eadc_test_exit = false;
    if (adc_test_thread.load() != NO_THREAD) return RESULT_OK;
    pthread_t thread;
    if (start_worker(&thread, adc_stream_body, true) != 0) return RESULT_ERROR;
    adc_test_thread = thread;
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+EADC=0")) {
    eadc_test_exit = true;
    adc_test_thread = NO_THREAD;
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+EADC=2")) {
    int current = 0;
    if (!read_int_file(kAcCurrent, current)) return RESULT_ERROR;
    std::snprintf(response, RESPONSE_SIZE, "\"%.2f\"", current / 1000.0);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+EADC=3")) {
    char text[32] = {};
    const ssize_t n = read_file_head(kChargeCurrent, text, 20);
    if (n <= 1) return LOGGED_ERROR("no charge current in %s", kChargeCurrent);
    return answer_quoted(response, text);
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int jvdlj_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVDLJ=1")) return REJECT_COMMAND_LINE(cmdline);
  int voltage = 0, capacity = 0;
  if (!read_int_file(kVoltageNow, voltage) || !read_int_file(kCapacity, capacity))
    return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "\"%.2f,%d%s\"\r\n", voltage / 1000000.0, capacity, "%");
  return RESULT_OK;
}

int jvcharge_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVCHARGE=0")) return REJECT_COMMAND_LINE(cmdline);
  char text[41];
  if (read_file_head(kStatus, text, 40) < 0) return LOGGED_ERROR("cannot read %s", kStatus);
  const std::string_view status(text);
  return result_of(status.find("Full") != std::string_view::npos ||
                   status.find("Charging") != std::string_view::npos);
}

int jvcharg_handler(char* cmdline, int, char*) { return charger_write(cmdline); }
int rmchargep_handler(char* cmdline, int, char*) { return charger_write(cmdline); }
int jvqxgwbh_handler(char* cmdline, int, char*) { return charger_write(cmdline); }
int jvdisrecharge_handler(char* cmdline, int, char*) { return charger_write(cmdline); }

int jvdljcs_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVDLJCS=2")) return REJECT_COMMAND_LINE(cmdline);
  char byte[2];
  return result_of(read_file_head(kAuthentic, byte, 1) == 1 && byte[0] == '1');
}
