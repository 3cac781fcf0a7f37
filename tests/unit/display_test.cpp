#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "commands/display.h"
#include "core/command.h"
#include "core/transport.h"
#include "services/ulda_nvram.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/worker_port.h"

namespace {

const std::string kCali = "/sys/class/leds/lcd-backlight/lcm_color_cali";
const std::string kRecord = "/persist/ulda_nvram";

struct DisplayCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  int status;
  std::vector<std::string> shell;
};
void PrintTo(const DisplayCase& c, std::ostream* os) { *os << c.name; }

std::vector<DisplayCase> request_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const std::string lcm = "am start -n com.ulda.engineermode/.ATLcmTest -a android.factorytest.ATLCM";
  return {
      {"lcm_colour", lcmt_handler, "AT+LCMT=1,2", OK, {lcm + " -e lcm_color 2"}},
      {"lcm_no_colour", lcmt_handler, "AT+LCMT=1", OK, {lcm + " -e lcm_color"}},
      {"lcm_plain", lcmt_handler, "AT+LCMT=0", OK, {lcm}},
      {"lcm_other", lcmt_handler, "AT+LCMT=2", ERR, {}},
      {"camera_back", mmiccm_handler, "at+mmiccm=b,1", OK, {"am start -n com.android.camera/.Camera -e cameraId back"}},
      {"camera_focus", mmiccm_handler, "AT+MMICCM=F,3", OK, {"am broadcast -a android.intent.action.AF"}},
      {"camera_capture", mmiccm_handler, "AT+MMICCM=B,2", OK, {"am broadcast -a android.intent.action.CAPTURE"}},
      {"camera_close", mmiccm_handler, "AT+MMICCM=B,0", OK, {"am force-stop com.android.camera"}},
      {"camera_other", mmiccm_handler, "AT+MMICCM=X,1", ERR, {}},
      {"touch_open", mmitw_handler, "AT+MMITW=1", OK, {"am start -n com.ulda.engineermode/.FingerTouchActivity"}},
      {"touch_back", mmitw_handler, "AT+MMITW=0", OK, {"/system/bin/sh -c \"input keyevent 4\""}},
      {"sleep_broadcast", eqsb_handler, "AT+EQSB=0", OK, {"am broadcast -n com.ulda.engineermode/.ATGoToSleepReceiver -a kro.intent.action.AT_GO_TO_SLEEP"}},
      {"sleep_other", eqsb_handler, "AT+EQSB=1", ERR, {}},
  };
}

class DisplayRequest : public WorkerPortTest, public ::testing::WithParamInterface<DisplayCase> {};

TEST_P(DisplayRequest, RunsExactly) {
  const DisplayCase& c = GetParam();
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, "");
  EXPECT_EQ(shell_commands(), c.shell);
}

INSTANTIATE_TEST_SUITE_P(Cases, DisplayRequest, ::testing::ValuesIn(request_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class Display : public WorkerPortTest {};

TEST_F(Display, ColourTypeGoesToNodeRecordAndProperty) {
  write_file(kCali, "0\n");
  write_file(kRecord, std::string(ULDA_NVRAM_SIZE, '\x5a'));
  std::string expected(ULDA_NVRAM_SIZE, '\x5a');
  for (const char* bad : {"AT+JVLCD=1,2", "AT+JVLCD=1,1A", "AT+JVLCD=1", "AT+JVLCD=1,", "AT+JVLCD=1,-1",
                          "AT+JVLCD=1,99999999999999999999", "AT+JVLCD=2,1"}) {
    EXPECT_EQ(call_handler(jvlcd_handler, bad).status, RESULT_ERROR) << bad;
    EXPECT_EQ(read_file(kCali), "0\n") << bad;
    EXPECT_EQ(read_file(kRecord), expected) << bad;
  }
  EXPECT_EQ(call_handler(jvlcd_handler, "AT+JVLCD=1,1").status, RESULT_OK);
  EXPECT_EQ(read_file(kCali), "1");
  const int32_t one = 1;
  std::memcpy(expected.data() + 260, &one, 4);
  EXPECT_EQ(read_file(kRecord), expected);
  EXPECT_EQ(get_property("sys.em.lcm_color_type"), "2");
  EXPECT_EQ(call_handler(jvlcd_handler, "AT+JVLCD=0").body, "\r\n\"1\"\r\n");
  EXPECT_EQ(call_handler(jvlcd_handler, "AT+JVLCD=1,0").status, RESULT_OK);
  EXPECT_EQ(read_file(kCali), "0");
  EXPECT_EQ(get_property("sys.em.lcm_color_type"), "1");
  // The node is written before the record; a record failure leaves it changed.
  make_dir("/persist/ulda_nvram.tmp");
  EXPECT_EQ(call_handler(jvlcd_handler, "AT+JVLCD=1,1").status, RESULT_ERROR);
  EXPECT_EQ(read_file(kCali), "1");
  EXPECT_EQ(get_property("sys.em.lcm_color_type"), "1");
}

TEST_F(Display, SleepInConsoleModeAnswersFirstAndAddsNothing) {
  is_sp = 1;
  write_file("/dev/graphics/fb0", "");
  const HandlerAnswer answer = call_handler(eqsb_handler, "AT+EQSB=0");
  EXPECT_EQ(answer.status, RESULT_DONE);
  EXPECT_EQ(next_write(), "AT+EQSB=0\r\n\r\nOK\r\n");
  EXPECT_EQ(next_write(0), "");
  const std::vector<std::string> expected = {
      "/system/bin/sh -c \"echo \"255\" > /sys/class/leds/lcd-backlight/brightness\"",
      "/system/bin/sh -c \"echo \"0\" > /sys/class/leds/lcd-backlight/brightness\"",
      "/system/bin/sh -c \"echo 1 > /sys/touchscreen/suspend_cmd\"",
      "/system/bin/sh -c \"echo \"mem\" > /sys/power/autosleep\"",
  };
  EXPECT_EQ(shell_commands(), expected);
  EXPECT_EQ(read_file("/.emu/framebuffer.log"), "blank 4\n");
}

TEST_F(Display, ClockCap) {
  const std::string freq = "/sys/devices/system/cpu/cpu0/cpufreq/scaling_max_freq";
  EXPECT_EQ(call_handler(eslp_handler, "AT+ESLP=0").status, RESULT_ERROR);  // no directory
  make_dir("/sys/devices/system/cpu/cpu0/cpufreq");
  EXPECT_EQ(call_handler(eslp_handler, "AT+ESLP=0").status, RESULT_OK);
  EXPECT_EQ(read_file(freq), "800000");
  write_file(freq, "2265600\n");
  EXPECT_EQ(call_handler(eslp_handler, "AT+ESLP=1").status, RESULT_ERROR);
  EXPECT_EQ(read_file(freq), "2265600\n");
}

}  // namespace
