#include "commands/lights.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"
#include "tests/unit/worker_port.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kLeds = "/sys/class/leds/";
const std::string kRed = kLeds + "red/brightness";
const std::string kGreen = kLeds + "green/brightness";
const std::string kEngineering = kLeds + "green/engineering";
const std::string kLcd = kLeds + "lcd-backlight/brightness";
const std::string kButton = kLeds + "button-backlight/brightness";
const std::string kFront = "/sys/ext_led/EXT_FLASH_LED";
const std::string kWhite = kLeds + "flash1_torch-light/brightness";
const std::string kWarm = kLeds + "flash0_torch-light/brightness";
const std::string kVibrator = "/sys/class/timed_output/vibrator/enable";
const std::string kModel = "prop:ro.pemu.product.model";
const std::string kReceiver =
    "am broadcast -n com.ulda.engineermode/.KeepScreenOnReceiver -a kro.intent.action.KEEP_CREEN_ON -e status ";
const std::string kKeepOn = "/data/data/com.ulda.engineermode/keepScreenOn";

// Every node a light command may touch, as on a fresh phone.
const Pairs kNodes = {
    {kRed, "5\n"},    {kGreen, "5\n"}, {kLeds + "blue/brightness", "5\n"}, {kEngineering, "5\n"},
    {kLcd, "102\n"},  {kButton, "5\n"}, {kFront, "5\n"}, {kWhite, "5\n"}, {kWarm, "5\n"}, {kVibrator, "5\n"},
};
// The nodes after a command: `changed` ones hold their new value, all others keep theirs.
Pairs nodes(const Pairs& changed = {}) {
  Pairs after = kNodes;
  for (auto& [path, content] : after)
    for (const auto& [node, value] : changed)
      if (node == path) content = value;
  return after;
}
Pairs model(const std::string& code, Pairs pairs = kNodes) {
  if (!code.empty()) pairs.push_back({kModel, code});
  return pairs;
}
// The daemon on the UART, with or without a frame buffer.
Pairs uart(const std::string& code, bool fb) {
  Pairs pairs = model(code, {{"flag:uart", "1"}, {kLcd, "102\n"}});
  if (fb) pairs.push_back({"/dev/graphics/fb0", ""});
  return pairs;
}

const HandlerCase kRows[] = {
    {"button_on", edft_handler, "AT+EDFT=5,1", kNodes, OK, "", {}, nodes({{kButton, "255"}})},
    {"button_off", edft_handler, "AT+EDFT=5,0", kNodes, OK, "", {}, nodes({{kButton, "0"}})},
    {"lcd_level", edft_handler, "AT+EDFT=0,5,128", kNodes, OK, "", {}, nodes({{kLcd, "128"}})},
    {"lcd_level_0", edft_handler, "AT+EDFT=0,5,0", kNodes, OK, "", {}, nodes({{kLcd, "0"}})},
    {"lcd_level_300", edft_handler, "AT+EDFT=0,5,300", kNodes, ERR, "", {}, nodes()},
    {"lcd_level_negative", edft_handler, "AT+EDFT=0,5,-1", kNodes, ERR, "", {}, nodes()},
    {"lcd_level_letter", edft_handler, "AT+EDFT=0,5,12A", kNodes, ERR, "", {}, nodes()},
    {"lcd_no_level", edft_handler, "AT+EDFT=0,50", kNodes, ERR, "", {}, nodes()},
    {"lcd_off", edft_handler, "AT+EDFT=0,0", kNodes, OK, "", {}, nodes({{kLcd, "0"}})},
    // Not on the UART, an OLED model drives the backlight like any other.
    {"lcd_off_oled_usb", edft_handler, "AT+EDFT=0,0", model("QM0202A"), OK, "", {}, nodes({{kLcd, "0"}})},
    {"leds_off", mmiled_handler, "AT+MMILED=1,0", kNodes, OK, "", {}, nodes({{kRed, "0"}, {kGreen, "0"}})},
    {"leds_off_led_model", mmiled_handler, "AT+MMILED=1,0", model("QM0305LG4"), OK, "", {}, nodes({{kEngineering, "0"}})},
    {"red", mmiled_handler, "AT+MMILED=1,1", kNodes, OK, "", {}, nodes({{kRed, "100"}})},
    {"green", mmiled_handler, "AT+MMILED=1,2", kNodes, OK, "", {}, nodes({{kGreen, "100"}})},
    {"green_led_model", mmiled_handler, "AT+MMILED=1,2", model("QM0305"), OK, "", {}, nodes({{kEngineering, "255"}})},
    // The model is compared whole and case-sensitively.
    {"green_model_longer", mmiled_handler, "AT+MMILED=1,2", model("QM0305AB"), OK, "", {}, nodes({{kGreen, "100"}})},
    {"green_model_lower_case", mmiled_handler, "AT+MMILED=1,2", model("qm0305"), OK, "", {}, nodes({{kGreen, "100"}})},
    {"blue", mmiled_handler, "AT+MMILED=1,3", kNodes, OK, "", {}, nodes({{kLeds + "blue/brightness", "100"}})},
    {"front_flash_on", jvsg_handler, "AT+JVSG=1", kNodes, OK, "", {}, nodes({{kFront, "1"}})},
    {"front_flash_off", jvsg_handler, "AT+JVSG=0", kNodes, OK, "", {}, nodes({{kFront, "0"}})},
    {"front_flash_2", jvsg_handler, "AT+JVSG=2", kNodes, OK, "", {}, nodes({{kFront, "2"}})},
    {"white_on", jvsg_handler, "AT+JVSG=1,1", kNodes, OK, "", {}, nodes({{kWhite, "40"}})},
    {"warm_on", jvsg_handler, "AT+JVSG=1,2", kNodes, OK, "", {}, nodes({{kWarm, "40"}})},
    {"warm_off", jvsg_handler, "AT+JVSG=0,2", kNodes, OK, "", {}, nodes({{kWarm, "0"}})},
    // A torch node that is not there is not created.
    {"torch_missing", jvsg_handler, "AT+JVSG=1,1", {}, ERR, "", {}, {{kWhite, kAbsent}}},
    // On the UART, display power goes through the frame buffer, whose descriptor stays open.
    {"uart_oled_on_no_fb", edft_handler, "AT+EDFT=0,5,30", uart("QM0202A", false), ERR, "", {}, {{kLcd, "102\n"}}},
    {"uart_oled_on", edft_handler, "AT+EDFT=0,5,30", uart("QM0202A", true), OK, "", {"/system/bin/sh -c \"chmod 666 /sys/lcm/oled_pixelon\"",
     "/system/bin/sh -c \"echo \"1\" > /sys/lcm/oled_pixelon\"", "/system/bin/sh -c \"chmod 444 /sys/lcm/oled_pixelon\""}, {{kLcd, "30"}}},
    {"uart_oled_off", edft_handler, "AT+EDFT=0,0", uart("QM0202A", true), OK, "", {}, {{kLcd, "102\n"}, {"/.emu/framebuffer.log", "blank 4\n"}}},
    {"uart_plain_on", edft_handler, "AT+EDFT=0,5", uart("", false), OK, "", {}, {{kLcd, "255"}}},
    {"uart_qm0304a_on", edft_handler, "AT+EDFT=0,5", uart("QM0304A", true), OK, "", {}, {{kLcd, "255"}}},
    // The flash calibration result: the body is written also when it fails.
    {"flash_result_0", sgdjz_handler, "AT+SGDJZ=1", {}, ERR, "\n+led_result:\"0\"\r\n", {}, {}, [](ulda_nvram& r) { r.led_result = 0; }},
    {"flash_result_1", sgdjz_handler, "AT+SGDJZ=1", {}, OK, "\n+led_result:\"1\"\r\n", {}, {}, [](ulda_nvram& r) { r.led_result = 1; }},
    {"screen_on_lock", jvsp_handler, "AT+JVSP=0", {}, OK, "", {kReceiver + "1"}, {{"/.emu/wake_lock.log", "acquire 1 atcid\n"}}},
    {"screen_on_unlock", jvsp_handler, "AT+JVSP=1", {}, OK, "", {kReceiver + "0"}, {{"/.emu/wake_lock.log", "release atcid\n"}}},
    {"screen_on_5", jvsp_handler, "AT+JVSP=3", {}, OK, "", {kReceiver + "5"}, {{"/.emu/wake_lock.log", kAbsent}}},
    {"always_on", jvbs_handler, "AT+JVBS=1", {}, OK, "", {"/system/bin/sh -c \"touch " + kKeepOn + "\"", "/system/bin/sh -c \"chmod 0666 " + kKeepOn + "\"", kReceiver + "3"}},
    {"always_off", jvbs_handler, "AT+JVBS=0", {{kKeepOn, ""}}, OK, "", {kReceiver + "4"}, {{kKeepOn, kAbsent}}},
    {"always_off_console", jvbs_handler, "AT+JVBS=0", {{kKeepOn, ""}, {"flag:sp", "1"}}, OK, "", {}, {{kKeepOn, kAbsent}}},
    {"flashlight_off", jvflight_handler, "AT+JVFLIGHT=0", {}, OK, "", {"am broadcast -a android.intent.action.FLASH_CHANGE --es value off"}},
};

INSTANTIATE_TEST_SUITE_P(Lights, HandlerTable, ::testing::ValuesIn(kRows), case_name);

class Lights : public WorkerPortTest {};

TEST_F(Lights, VibratorRunsOnceAndEndsAtZero) {
  write_file(kVibrator, "0\n");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 1);
  EXPECT_TRUE(wait_until([&] { return read_file(kVibrator) == "1000"; }));
  EXPECT_STREQ(vibrateControl(0), "OK");
  EXPECT_EQ(running_workers(), 0);  // joined before it returns
  EXPECT_EQ(read_file(kVibrator), "0");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,0").status, RESULT_OK);
  EXPECT_STREQ(vibrateControl(2), "ERROR");
}

TEST_F(Lights, IndicatorsAlternateAndEndDark) {
  for (const std::string code : {"", "QM0305A"}) {
    const std::string green = code.empty() ? kGreen : kEngineering;
    if (!code.empty()) write_file("/dev/__properties__/ro.pemu.product.model", code);
    write_file(kRed, "0\n");
    write_file(green, "0\n");
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=1").status, RESULT_OK);
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=1").status, RESULT_OK);
    EXPECT_EQ(running_workers(), 1);
    EXPECT_TRUE(wait_until([&] { return read_file(green) == "255"; })) << code;
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=0").status, RESULT_OK);
    EXPECT_EQ(running_workers(), 0);
    EXPECT_EQ(read_file(kRed) + read_file(green), "00");
  }
}

// The node is a pipe held open for reading here, so both writes show, in order.
TEST_F(Lights, BacklightOffGoesFullBrightnessFirst) {
  make_dir("/sys/class/leds/lcd-backlight");
  ASSERT_EQ(::mkfifo(host_path(kLcd).c_str(), 0600), 0);
  const int fd = ::open(host_path(kLcd).c_str(), O_RDWR | O_NONBLOCK);
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,0").status, RESULT_OK);
  char seen[16] = {};
  EXPECT_EQ(::read(fd, seen, sizeof seen - 1), 4);
  EXPECT_STREQ(seen, "2550");
  ::close(fd);
}

}  // namespace
