#include "commands/display.h"

#include "tests/unit/handler_case.h"

namespace {

const std::string kCali = "/sys/class/leds/lcd-backlight/lcm_color_cali";
const std::string kFreq = "/sys/devices/system/cpu/cpu0/cpufreq/scaling_max_freq";
const std::string kLcm = "am start -n com.ulda.engineermode/.ATLcmTest -a android.factorytest.ATLCM";
constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;

void colour_type(ulda_nvram& r) { r.lcm_color_type = 1; }

const HandlerCase kRows[] = {
    {"lcm_colour", lcmt_handler, "AT+LCMT=1,2", {}, OK, "", {kLcm + " -e lcm_color 2"}},
    {"lcm_no_colour", lcmt_handler, "AT+LCMT=1", {}, OK, "", {kLcm + " -e lcm_color"}},
    {"lcm_plain", lcmt_handler, "AT+LCMT=0", {}, OK, "", {kLcm}},
    {"lcm_other", lcmt_handler, "AT+LCMT=2", {}, ERR, ""},
    {"camera_back", mmiccm_handler, "AT+MMICCM=B,1", {}, OK, "",
     {"am start -n com.android.camera/.Camera -e cameraId back"}},
    {"camera_focus", mmiccm_handler, "AT+MMICCM=F,3", {}, OK, "",
     {"am broadcast -a android.intent.action.AF"}},
    {"camera_capture", mmiccm_handler, "AT+MMICCM=B,2", {}, OK, "",
     {"am broadcast -a android.intent.action.CAPTURE"}},
    {"camera_close", mmiccm_handler, "AT+MMICCM=B,0", {}, OK, "", {"am force-stop com.android.camera"}},
    {"camera_other", mmiccm_handler, "AT+MMICCM=X,1", {}, ERR, ""},
    {"touch_open", mmitw_handler, "AT+MMITW=1", {}, OK, "",
     {"am start -n com.ulda.engineermode/.FingerTouchActivity"}},
    {"touch_back", mmitw_handler, "AT+MMITW=0", {}, OK, "", {"/system/bin/sh -c \"input keyevent 4\""}},
    {"sleep_broadcast", eqsb_handler, "AT+EQSB=0", {}, OK, "",
     {"am broadcast -n com.ulda.engineermode/.ATGoToSleepReceiver -a "
      "kro.intent.action.AT_GO_TO_SLEEP"}},
    {"sleep_other", eqsb_handler, "AT+EQSB=1", {}, ERR, ""},
    // Console mode: the answer leaves first, since the port goes quiet after it.
    {"sleep_console", eqsb_handler, "AT+EQSB=0", {{"flag:sp", "1"}, {"/dev/graphics/fb0", ""}},
     RESULT_DONE, "",
     {"/system/bin/sh -c \"echo \"255\" > /sys/class/leds/lcd-backlight/brightness\"",
      "/system/bin/sh -c \"echo \"0\" > /sys/class/leds/lcd-backlight/brightness\"",
      "/system/bin/sh -c \"echo 1 > /sys/touchscreen/suspend_cmd\"",
      "/system/bin/sh -c \"echo \"mem\" > /sys/power/autosleep\""},
     {{"port", "AT+EQSB=0\r\n\r\nOK\r\n"}, {"/.emu/framebuffer.log", "blank 4\n"}}},

    {"colour_set", jvlcd_handler, "AT+JVLCD=1,1", {{kCali, "0\n"}}, OK, "", {},
     {{kCali, "1"}, {"prop:sys.em.lcm_color_type", "2"}}, nullptr, colour_type},
    {"colour_clear", jvlcd_handler, "AT+JVLCD=1,0", {{kCali, "1\n"}}, OK, "", {},
     {{kCali, "0"}, {"prop:sys.em.lcm_color_type", "1"}}, colour_type,
     [](ulda_nvram& r) { r.lcm_color_type = 0; }},
    {"colour_query", jvlcd_handler, "AT+JVLCD=0", {}, OK, "\r\n\"1\"\r\n", {}, {}, colour_type},
    {"colour_out_of_range", jvlcd_handler, "AT+JVLCD=1,2", {{kCali, "0\n"}}, ERR, "", {}, {{kCali, "0\n"}}},
    {"colour_not_digits", jvlcd_handler, "AT+JVLCD=1,-1", {{kCali, "0\n"}}, ERR, "", {}, {{kCali, "0\n"}}},
    {"colour_huge", jvlcd_handler, "AT+JVLCD=1,99999999999999999999", {{kCali, "0\n"}}, ERR, "", {},
     {{kCali, "0\n"}}},
    {"colour_missing", jvlcd_handler, "AT+JVLCD=1,", {{kCali, "0\n"}}, ERR, "", {}, {{kCali, "0\n"}}},
    // The node is written before the record; a record failure leaves it changed.
    {"colour_record_fails", jvlcd_handler, "AT+JVLCD=1,1",
     {{kCali, "0\n"}, {"/persist/ulda_nvram.tmp/x", ""}}, ERR, "", {},
     {{kCali, "1"}, {"prop:sys.em.lcm_color_type", ""}}},

    {"clock_cap", eslp_handler, "AT+ESLP=0", {{kFreq, "2265600\n"}}, OK, "", {}, {{kFreq, "800000"}}},
    {"clock_cap_no_directory", eslp_handler, "AT+ESLP=0", {}, ERR, ""},
    {"clock_other", eslp_handler, "AT+ESLP=1", {{kFreq, "2265600\n"}}, ERR, "", {},
     {{kFreq, "2265600\n"}}},
};

INSTANTIATE_TEST_SUITE_P(Display, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
