#include "commands/lights.h"

#include <atomic>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <pthread.h>
#include <string_view>
#include <unistd.h>

#include "commands/command_util.h"
#include "commands/device_info.h"
#include "commands/shell.h"
#include "commands/worker.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/file_io.h"
#include "services/ulda_nvram.h"

namespace {

constexpr const char* kVibratorEnable = "/sys/class/timed_output/vibrator/enable";
constexpr const char* kRedLed = "/sys/class/leds/red/brightness";
constexpr const char* kGreenLed = "/sys/class/leds/green/brightness";
constexpr const char* kGreenEngineering = "sys/class/leds/green/engineering";
constexpr const char* kButtonBacklight = "/sys/class/leds/button-backlight/brightness";
constexpr const char* kLcdBacklight = "/sys/class/leds/lcd-backlight/brightness";
constexpr const char* kFrameBuffer = "/dev/graphics/fb0";
constexpr const char* kKeepScreenOnFile = "/data/data/com.ulda.engineermode/keepScreenOn";
constexpr const char* kKeepScreenOnReceiver = "com.ulda.engineermode/.KeepScreenOnReceiver";
constexpr const char* kKeepScreenOnAction = "kro.intent.action.KEEP_CREEN_ON";
constexpr const char* kWakeLockName = "atcid";

constexpr const char* kLedModels[] = {"QM0305A", "QM0305", "QM0305F_EX", "QM0305LG4"};
constexpr const char* kOledModels[] = {"QM0202A", "QM0203V", "QM0203F_EX", "QM0307A"};

template <size_t N>
bool is_any_model(const char* const (&models)[N]) {
  for (const char* model : models)
    if (is_product_model(model)) return true;
  return false;
}

// The LED model group drives green through its engineering node.
const char* green_led() { return is_any_model(kLedModels) ? kGreenEngineering : kGreenLed; }

const char* ok_or_error(bool ok) { return ok ? "OK" : "ERROR"; }
int status_of(const char* control_result) {
  return std::strcmp(control_result, "ERROR") == 0 ? RESULT_ERROR : RESULT_OK;
}

// A joinable worker: "off" sets the flag and joins, so the final writes precede the answer.
struct JoinedWorker {
  std::atomic<bool> stop{true};
  pthread_t handle{};
  void (*body)();
};

void vibrator_body();
void indicate_lights_body();
JoinedWorker g_vibrator{.body = vibrator_body};
JoinedWorker g_indicate_lights{.body = indicate_lights_body};

void vibrator_body() {
  for (;;) {
    {
      const WorkerCycle cycle;
      write_int(kVibratorEnable, 1000);  // one 1000 ms pulse
    }
    if (g_vibrator.stop) break;
    ::sleep(1);
  }
  const WorkerCycle cycle;
  write_int(kVibratorEnable, 0);
}

void indicate_lights_body() {
  for (uint32_t counter = 0;; ++counter) {
    {
      const WorkerCycle cycle;
      const char* green = green_led();
      write_int(kRedLed, 0);
      write_int(green, 0);
      write_int(counter % 2 == 0 ? kRedLed : green, 255);
    }
    if (g_indicate_lights.stop) break;
    sleep_ms(500);
  }
  const WorkerCycle cycle;
  write_int(kRedLed, 0);
  write_int(green_led(), 0);
}

const char* control_worker(JoinedWorker& worker, int on) {
  if (on == 1) {
    if (!worker.stop) return "OK";
    worker.stop = false;
    if (start_worker(&worker.handle, worker.body, false) != 0) {
      worker.stop = true;
      return "ERROR";
    }
    return "OK";
  }
  if (on == 0) {
    if (worker.stop) return "OK";
    worker.stop = true;
    return ok_or_error(pthread_join(worker.handle, nullptr) == 0);
  }
  return "ERROR";
}

// Write-only without create: a node holds exactly the last value.
int set_flashlight(const char* path, int state, const char* on_text) {
  UniqueFd fd(dev_open(path, O_WRONLY | O_TRUNC));
  if (!fd.ok()) {
    ATCI_LOGE("cannot open %s", path);
    return 0;
  }
  if (state == 1 || state == 0) {
    const char* text = state == 1 ? on_text : "0";
    if (!write_full(fd.get(), text, std::strlen(text))) ATCI_LOGE("cannot write %s", path);
  }
  return 1;
}

// The level of "AT+EDFT=0,5,<level>": decimal digits worth at most 255, else -1.
int backlight_level(const char* cmdline) {
  if (line_is(cmdline, "AT+EDFT=0,5")) return 255;
  const std::string_view field = comma_field(cmdline, 2);
  unsigned value = 0;
  const auto [end, error] = std::from_chars(field.data(), field.data() + field.size(), value);
  if (field.empty() || error != std::errc() || end != field.data() + field.size() || value > 255)
    return -1;
  return static_cast<int>(value);
}

// Held open while the display is on: the open keeps the panel powered.
UniqueFd g_display_fd;

int display_on() {
  const bool oled = is_any_model(kOledModels);
  if (!oled && !is_product_model("QM0304A")) return RESULT_OK;
  UniqueFd fd(dev_open(kFrameBuffer, O_RDWR));
  if (!fd.ok()) return LOGGED_ERROR("cannot open %s", kFrameBuffer);
  g_display_fd = std::move(fd);
  if (oled) {
    run_sh_commands({"chmod 666 /sys/lcm/oled_pixelon", "echo \"1\" > /sys/lcm/oled_pixelon",
                     "chmod 444 /sys/lcm/oled_pixelon"});
  }
  return RESULT_OK;
}

int display_off() {
  UniqueFd fd(dev_open(kFrameBuffer, O_RDWR));
  if (!fd.ok()) return LOGGED_ERROR("cannot open %s", kFrameBuffer);
  if (platform_fb_blank(fd.get(), PLATFORM_FB_BLANK_POWERDOWN) != 0) ATCI_LOGE("FBIOBLANK failed");
  return RESULT_OK;
}

void keep_screen_on_broadcast(const char* extras) {
  sendBroadcastFromAtcid(kKeepScreenOnReceiver, kKeepScreenOnAction, extras);
}

}  // namespace

const char* vibrateControl(int on) { return control_worker(g_vibrator, on); }
const char* indicateLightsControl(int on) { return control_worker(g_indicate_lights, on); }

const char* buttonlightControl(int on) {
  if (on != 0 && on != 1) return "ERROR";
  return ok_or_error(write_int(kButtonBacklight, on == 1 ? 255 : 0) == 0);
}

const char* lcdBacklightControl(int on, int level) {
  if (on == 1) return ok_or_error(write_int(kLcdBacklight, level) == 0);
  if (on != 0) return "ERROR";
  write_int(kLcdBacklight, 255);  // full brightness first, then off: both writes are wanted
  return ok_or_error(write_int(kLcdBacklight, 0) == 0);
}

int Flashlight_setBackWhiteFlashlightState(int state) {
  return set_flashlight("sys/class/leds/flash1_torch-light/brightness", state, "40");
}
int Flashlight_setBackWarmFlashlightState(int state) {
  return set_flashlight("sys/class/leds/flash0_torch-light/brightness", state, "40");
}
int Flashlight_setFrontFlashlightState(int state) {
  return set_flashlight("sys/ext_led/EXT_FLASH_LED", state, "1");
}

int edft_handler(char* cmdline, int, char* response) {
  (void)response;
  if (line_is(cmdline, "AT+EDFT=6,1")) return status_of(vibrateControl(1));
  if (line_is(cmdline, "AT+EDFT=6,0")) return status_of(vibrateControl(0));
  if (line_is(cmdline, "AT+EDFT=5,1")) return status_of(buttonlightControl(1));
  if (line_is(cmdline, "AT+EDFT=5,0")) return status_of(buttonlightControl(0));
  if (line_starts_with(cmdline, "AT+EDFT=0,5")) {
    const int level = backlight_level(cmdline);
    if (level < 0) return REJECT_COMMAND_LINE(cmdline);
    if (is_uart_flag == 1 && display_on() != RESULT_OK) return RESULT_ERROR;
    return status_of(lcdBacklightControl(1, level));
  }
  if (line_is(cmdline, "AT+EDFT=0,0")) {
    if (is_uart_flag == 1 && is_any_model(kOledModels)) return display_off();
    return status_of(lcdBacklightControl(0, 0));
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int jvlight_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVLIGHT=1")) return status_of(indicateLightsControl(1));
  if (line_is(cmdline, "AT+JVLIGHT=0")) return status_of(indicateLightsControl(0));
  return REJECT_COMMAND_LINE(cmdline);
}

int mmiled_handler(char* cmdline, int, char*) {
  const bool led_models = is_any_model(kLedModels);
  if (line_is(cmdline, "AT+MMILED=1,0")) {
    if (led_models) {
      write_int(kGreenEngineering, 0);
      return RESULT_OK;
    }
    if (write_int("sys/class/leds/red/brightness", 0) != 0) return RESULT_ERROR;
    return result_of(write_int("sys/class/leds/green/brightness", 0) == 0);
  }
  if (line_is(cmdline, "AT+MMILED=1,1"))
    return result_of(write_int("sys/class/leds/red/brightness", 100) == 0);
  if (line_is(cmdline, "AT+MMILED=1,2")) {
    if (led_models) return result_of(write_int(kGreenEngineering, 255) == 0);
    return result_of(write_int("sys/class/leds/green/brightness", 100) == 0);
  }
  if (line_is(cmdline, "AT+MMILED=1,3"))
    return result_of(write_int("sys/class/leds/blue/brightness", 100) == 0);
  return REJECT_COMMAND_LINE(cmdline);
}

namespace {

struct FlashVariant {
  const char* variant;
  int (*setter)(int state);  // null: the value goes to the front flash node
  int state;
};

constexpr FlashVariant kFlashVariants[] = {
    {"AT+JVSG=1", nullptr, 1},
    {"AT+JVSG=0", nullptr, 0},
    {"AT+JVSG=2", nullptr, 2},
    {"AT+JVSG=1,1", Flashlight_setBackWhiteFlashlightState, 1},
    {"AT+JVSG=0,1", Flashlight_setBackWhiteFlashlightState, 0},
    {"AT+JVSG=1,2", Flashlight_setBackWarmFlashlightState, 1},
    {"AT+JVSG=0,2", Flashlight_setBackWarmFlashlightState, 0},
    {"AT+JVSG=1,3", Flashlight_setFrontFlashlightState, 1},
    {"AT+JVSG=0,3", Flashlight_setFrontFlashlightState, 0},
};

}  // namespace

int jvsg_handler(char* cmdline, int, char*) {
  for (const FlashVariant& v : kFlashVariants) {
    if (!line_is(cmdline, v.variant)) continue;
    if (v.setter == nullptr)
      return result_of(write_int("/sys/ext_led/EXT_FLASH_LED", v.state) == 0);
    return result_of(v.setter(v.state) != 0);
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int jvflight_handler(char* cmdline, int, char*) {
  constexpr const char* kModes[][2] = {
      {"AT+JVFLIGHT=0", "--es value off"},
      {"AT+JVFLIGHT=1", "--es value on"},
      {"AT+JVFLIGHT=2", "--es value auto"},
  };
  for (const auto& [variant, extras] : kModes) {
    if (!line_is(cmdline, variant)) continue;
    sendBroadcastFromAtcid(nullptr, "android.intent.action.FLASH_CHANGE", extras);
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int sgdjz_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+SGDJZ=1")) return REJECT_COMMAND_LINE(cmdline);
  ulda_nvram record;
  if (read_ulda_nvram(__func__, record) != RESULT_OK) return RESULT_ERROR;
  std::snprintf(response, RESPONSE_SIZE, "\n+led_result:\"%d\"\r\n", record.led_result);
  return result_of(record.led_result >= 1);
}

int jvsp_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVSP=0")) {
    acquire_wake_lock(PARTIAL_WAKE_LOCK, kWakeLockName);
    keep_screen_on_broadcast("-e status 1");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVSP=1")) {
    release_wake_lock(kWakeLockName);
    keep_screen_on_broadcast("-e status 0");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVSP=3")) {
    keep_screen_on_broadcast("-e status 5");
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int jvbs_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVBS=1")) {
    run_sh_commands({"touch /data/data/com.ulda.engineermode/keepScreenOn",
                     "chmod 0666 /data/data/com.ulda.engineermode/keepScreenOn"});
    if (is_sp == 0) keep_screen_on_broadcast("-e status 3");
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVBS=0")) {
    dev_unlink(kKeepScreenOnFile);
    if (is_sp == 0) keep_screen_on_broadcast("-e status 4");
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}
