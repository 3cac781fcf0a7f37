#include "commands/display.h"

#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <string_view>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/file_io.h"
#include "services/ulda_nvram.h"

namespace {

constexpr const char* kLcmTest = "com.ulda.engineermode/.ATLcmTest";
constexpr const char* kLcmAction = "android.factorytest.ATLCM";
constexpr const char* kColourCalibration = "/sys/class/leds/lcd-backlight/lcm_color_cali";
constexpr const char* kCamera = "com.android.camera";

int set_colour_type(const char* cmdline) {
  const std::string_view field = comma_field(cmdline, 1);
  if (!all_digits(field)) return REJECT_COMMAND_LINE(cmdline);
  unsigned long type = 0;
  if (std::from_chars(field.data(), field.data() + field.size(), type).ec != std::errc() ||
      type > 1)
    return LOGGED_ERROR("just surport 0 & 1");
  {
    UniqueFd fd(dev_open(kColourCalibration, O_WRONLY | O_TRUNC));
    if (!fd.ok()) return LOGGED_ERROR("cannot open %s", kColourCalibration);
    if (!write_full(fd.get(), field.data(), field.size()))
      ATCI_LOGE("cannot write %s", kColourCalibration);
  }
  const int status = update_ulda_nvram(__func__, [type](ulda_nvram& record) {
    record.lcm_color_type = static_cast<int32_t>(type);
    return true;
  });
  if (status != RESULT_OK) return RESULT_ERROR;
  property_set("sys.em.lcm_color_type", type == 0 ? "1" : "2");
  return RESULT_OK;
}

// The unit goes to sleep: the answer leaves first, since the port goes quiet after it.
int sleep_now(int fb) {
  write_early_answer("AT+EQSB=0", "OK", true);
  run_sh_commands({"echo \"255\" > /sys/class/leds/lcd-backlight/brightness",
                   "echo \"0\" > /sys/class/leds/lcd-backlight/brightness",
                   "echo 1 > /sys/touchscreen/suspend_cmd"});
  if (platform_fb_blank(fb, PLATFORM_FB_BLANK_POWERDOWN) != 0) ATCI_LOGE("FBIOBLANK failed");
  run_sh_command("echo \"mem\" > /sys/power/autosleep");
  return RESULT_DONE;
}

}  // namespace

int lcmt_handler(char* cmdline, int, char*) {
  if (line_starts_with(cmdline, "AT+LCMT=1")) {
    char extras[100];
    const std::string_view colour = comma_field(cmdline, 1);
    std::snprintf(extras, sizeof extras, "-e lcm_color %.*s", static_cast<int>(colour.size()),
                  colour.data());
    startActivityFromAtcid(kLcmTest, kLcmAction, extras);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+LCMT=0")) {
    startActivityFromAtcid(kLcmTest, kLcmAction, nullptr);
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int jvlcd_handler(char* cmdline, int, char* response) {
  if (line_starts_with(cmdline, "AT+JVLCD=1")) return set_colour_type(cmdline);
  if (line_is(cmdline, "AT+JVLCD=0"))
    return answer_record_int(__func__, response, &ulda_nvram::lcm_color_type);
  return REJECT_COMMAND_LINE(cmdline);
}

int eqsb_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+EQSB=0")) return REJECT_COMMAND_LINE(cmdline);
  if (is_sp == 0) {
    sendBroadcastFromAtcid("com.ulda.engineermode/.ATGoToSleepReceiver",
                           "kro.intent.action.AT_GO_TO_SLEEP", nullptr);
    return RESULT_OK;
  }
  UniqueFd fb(dev_open("/dev/graphics/fb0", O_RDWR));
  if (!fb.ok()) ATCI_LOGE("cannot open /dev/graphics/fb0");
  return sleep_now(fb.get());
}

int eslp_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+ESLP=0")) return REJECT_COMMAND_LINE(cmdline);
  constexpr const char* kMaxFreq = "/sys/devices/system/cpu/cpu0/cpufreq/scaling_max_freq";
  UniqueFd fd(dev_open(kMaxFreq, O_WRONLY | O_CREAT | O_TRUNC, 0666));
  if (!fd.ok()) return LOGGED_ERROR("cannot open %s", kMaxFreq);
  return result_of(write_full(fd.get(), "800000", 6));
}

namespace {

enum class CameraStep { kOpen, kFocus, kCapture, kClose };

struct CameraVariant {
  const char* variant;
  CameraStep step;
  const char* extras;
};

constexpr CameraVariant kCameraVariants[] = {
    {"AT+MMICCM=B,1", CameraStep::kOpen, "-e cameraId back"},
    {"AT+MMICCM=F,1", CameraStep::kOpen, "-e cameraId front"},
    {"AT+MMICCM=B,3", CameraStep::kFocus, nullptr},
    {"AT+MMICCM=F,3", CameraStep::kFocus, nullptr},
    {"AT+MMICCM=B,2", CameraStep::kCapture, nullptr},
    {"AT+MMICCM=F,2", CameraStep::kCapture, nullptr},
    {"AT+MMICCM=B,0", CameraStep::kClose, nullptr},
    {"AT+MMICCM=F,0", CameraStep::kClose, nullptr},
};

}  // namespace

int mmiccm_handler(char* cmdline, int, char*) {
  for (const CameraVariant& v : kCameraVariants) {
    if (!line_is(cmdline, v.variant)) continue;
    switch (v.step) {
      case CameraStep::kOpen:
        startActivityFromAtcid("com.android.camera/.Camera", nullptr, v.extras);
        break;
      case CameraStep::kFocus:
        sendBroadcastFromAtcid(nullptr, "android.intent.action.AF", nullptr);
        sleep_ms(500);  // the lens settles before the next step
        break;
      case CameraStep::kCapture:
        sendBroadcastFromAtcid(nullptr, "android.intent.action.CAPTURE", nullptr);
        break;
      case CameraStep::kClose:
        stopActivityFromAtcid(kCamera, nullptr, nullptr);
        break;
    }
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}

int mmitw_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+MMITW=1")) {
    startActivityFromAtcid("com.ulda.engineermode/.FingerTouchActivity", nullptr, nullptr);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+MMITW=0")) {
    run_sh_command("input keyevent 4");  // Back closes the screen
    return RESULT_OK;
  }
  return REJECT_COMMAND_LINE(cmdline);
}
