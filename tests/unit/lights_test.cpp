#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

#include "commands/lights.h"
#include "commands/worker.h"
#include "core/command.h"
#include "core/transport.h"
#include "services/ulda_nvram.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/worker_port.h"

namespace {

using Files = std::vector<std::pair<std::string, std::string>>;

const std::string kLeds = "/sys/class/leds/";
const std::string kLcd = kLeds + "lcd-backlight/brightness";
const std::string kButton = kLeds + "button-backlight/brightness";
const std::string kEngineering = kLeds + "green/engineering";
const std::string kFront = "/sys/ext_led/EXT_FLASH_LED";
const std::string kWhite = kLeds + "flash1_torch-light/brightness";
const std::string kWarm = kLeds + "flash0_torch-light/brightness";
const std::string kVibrator = "/sys/class/timed_output/vibrator/enable";

// Every node a light command may touch, as on a fresh phone.
const Files kNodes = {
    {kLeds + "red/brightness", "5\n"}, {kLeds + "green/brightness", "5\n"},
    {kLeds + "blue/brightness", "5\n"}, {kEngineering, "5\n"}, {kLcd, "102\n"},
    {kButton, "5\n"}, {kFront, "5\n"}, {kWhite, "5\n"}, {kWarm, "5\n"}, {kVibrator, "5\n"},
};

struct LightCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  std::string model;
  int status;
  Files changed;  // nodes whose content changes; all others keep theirs
};
void PrintTo(const LightCase& c, std::ostream* os) { *os << c.name; }

std::vector<LightCase> light_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  return {
      {"button_on", edft_handler, "AT+EDFT=5,1", "", OK, {{kButton, "255"}}},
      {"lcd_full", edft_handler, "AT+EDFT=0,5", "", OK, {{kLcd, "255"}}},
      {"lcd_level", edft_handler, "AT+EDFT=0,5,128", "", OK, {{kLcd, "128"}}},
      {"lcd_level_300", edft_handler, "AT+EDFT=0,5,300", "", ERR, {}},
      {"lcd_level_negative", edft_handler, "AT+EDFT=0,5,-1", "", ERR, {}},
      {"lcd_level_letter", edft_handler, "AT+EDFT=0,5,12A", "", ERR, {}},
      {"lcd_level_huge", edft_handler, "AT+EDFT=0,5,99999999999999999999", "", ERR, {}},
      {"lcd_no_level", edft_handler, "AT+EDFT=0,50", "", ERR, {}},
      {"lcd_off", edft_handler, "AT+EDFT=0,0", "", OK, {{kLcd, "0"}}},
      // Not on the UART, an OLED model drives the backlight like any other.
      {"lcd_off_oled_usb", edft_handler, "AT+EDFT=0,0", "QM0202A", OK, {{kLcd, "0"}}},
      {"edft_other", edft_handler, "AT+EDFT=6,2", "", ERR, {}},

      {"leds_off", mmiled_handler, "AT+MMILED=1,0", "", OK, {{kLeds + "red/brightness", "0"}, {kLeds + "green/brightness", "0"}}},
      {"leds_off_led_model", mmiled_handler, "AT+MMILED=1,0", "QM0305LG4", OK, {{kEngineering, "0"}}},
      {"green", mmiled_handler, "AT+MMILED=1,2", "", OK, {{kLeds + "green/brightness", "100"}}},
      {"green_led_model", mmiled_handler, "AT+MMILED=1,2", "QM0305", OK, {{kEngineering, "255"}}},
      {"blue", mmiled_handler, "AT+MMILED=1,3", "", OK, {{kLeds + "blue/brightness", "100"}}},
      {"led_other", mmiled_handler, "AT+MMILED=1,4", "", ERR, {}},

      {"front_flash_2", jvsg_handler, "AT+JVSG=2", "", OK, {{kFront, "2"}}},
      {"white_on", jvsg_handler, "AT+JVSG=1,1", "", OK, {{kWhite, "40"}}},
      {"warm_on", jvsg_handler, "AT+JVSG=1,2", "", OK, {{kWarm, "40"}}},
      {"front_on", jvsg_handler, "AT+JVSG=1,3", "", OK, {{kFront, "1"}}},
      {"flash_other", jvsg_handler, "AT+JVSG=3", "", ERR, {}},
  };
}

// The model is a read-only property: set it the way the phone's init would.
class ModelTest : public WorkerPortTest {
 protected:
  void set_model(const std::string& model) { write_file("/dev/__properties__/ro.pemu.product.model", model); }
};

class LightCommand : public ModelTest, public ::testing::WithParamInterface<LightCase> {};

TEST_P(LightCommand, WritesExactlyItsNodes) {
  const LightCase& c = GetParam();
  for (const auto& [path, content] : kNodes) write_file(path, content);
  if (!c.model.empty()) set_model(c.model);
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, "");
  for (const auto& [path, content] : kNodes) {
    std::string expected = content;
    for (const auto& [changed, value] : c.changed)
      if (changed == path) expected = value;
    EXPECT_EQ(read_file(path), expected) << path;
  }
  EXPECT_TRUE(shell_commands().empty());
}

INSTANTIATE_TEST_SUITE_P(Cases, LightCommand, ::testing::ValuesIn(light_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class Lights : public ModelTest {};

TEST_F(Lights, MissingNodesFail) {
  const std::pair<CommandHandler, const char*> lines[] = {
      {jvsg_handler, "AT+JVSG=1,1"}, {jvsg_handler, "AT+JVSG=0"},     {edft_handler, "AT+EDFT=5,1"},
      {edft_handler, "AT+EDFT=0,5"}, {mmiled_handler, "AT+MMILED=1,1"},
  };
  for (const auto& [handler, line] : lines)
    EXPECT_EQ(call_handler(handler, line).status, RESULT_ERROR) << line;
  EXPECT_FALSE(exists(kWhite));  // never created
}

TEST_F(Lights, VibratorRunsOnceAndEndsAtZero) {
  write_file(kVibrator, "0\n");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,1").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 1);
  EXPECT_TRUE(wait_until([&] { return read_file(kVibrator) == "1000"; }));
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,0").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 0);  // joined before the answer
  EXPECT_EQ(read_file(kVibrator), "0");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=6,0").status, RESULT_OK);
  EXPECT_EQ(vibrateControl(2), std::string("ERROR"));
}

TEST_F(Lights, IndicatorsAlternateAndEndDark) {
  for (const std::string model : {"", "QM0305A"}) {
    const std::string green = model.empty() ? kLeds + "green/brightness" : kEngineering;
    if (!model.empty()) set_model(model);
    write_file(kLeds + "red/brightness", "0\n");
    write_file(green, "0\n");
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=1").status, RESULT_OK);
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=1").status, RESULT_OK);
    EXPECT_EQ(running_workers(), 1);
    EXPECT_TRUE(wait_until([&] { return read_file(green) == "255"; })) << model;
    EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=0").status, RESULT_OK);
    EXPECT_EQ(running_workers(), 0);
    EXPECT_EQ(read_file(kLeds + "red/brightness"), "0");
    EXPECT_EQ(read_file(green), "0");
  }
  EXPECT_EQ(call_handler(jvlight_handler, "AT+JVLIGHT=2").status, RESULT_ERROR);
}

TEST_F(Lights, DisplayOnTheUartKeepsTheFrameBufferAndBlanksIt) {
  is_uart_flag = 1;
  write_file(kLcd, "102\n");
  set_model("QM0202A");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,5,30").status, RESULT_ERROR);  // no fb0
  EXPECT_EQ(read_file(kLcd), "102\n");
  write_file("/dev/graphics/fb0", "");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,5,30").status, RESULT_OK);
  EXPECT_EQ(read_file(kLcd), "30");
  ASSERT_EQ(shell_commands().size(), 3u);
  EXPECT_EQ(shell_commands()[1], "/system/bin/sh -c \"echo \"1\" > /sys/lcm/oled_pixelon\"");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,0").status, RESULT_OK);
  EXPECT_EQ(read_file(kLcd), "30");  // blanked instead
  EXPECT_EQ(read_file("/.emu/framebuffer.log"), "blank 4\n");
  set_model("QM0304A");
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,5").status, RESULT_OK);
  EXPECT_EQ(shell_commands().size(), 3u);
  EXPECT_EQ(read_file(kLcd), "255");
}

// The node is a pipe here, so both writes show, in order.
TEST_F(Lights, BacklightOffGoesFullBrightnessFirst) {
  make_dir("/sys/class/leds/lcd-backlight");
  const std::string fifo = host_path(kLcd).string();
  ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
  std::atomic<bool> done{false}, finished{false};
  std::string seen;
  std::thread reader([&] {
    while (!done) {
      const int fd = ::open(fifo.c_str(), O_RDONLY);
      if (fd < 0) break;
      char buf[16];
      for (ssize_t n; (n = ::read(fd, buf, sizeof buf)) > 0;) seen.append(buf, n);
      ::close(fd);
    }
    finished = true;
  });
  EXPECT_EQ(call_handler(edft_handler, "AT+EDFT=0,0").status, RESULT_OK);
  done = true;
  while (!finished) {  // releases a reader waiting for a writer that will not come
    const int fd = ::open(fifo.c_str(), O_WRONLY | O_NONBLOCK);
    if (fd >= 0) ::close(fd);
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  reader.join();
  EXPECT_EQ(seen, "2550");
}

TEST_F(Lights, FlashCalibrationResult) {
  make_dir("/persist");
  EXPECT_EQ(call_handler(sgdjz_handler, "AT+SGDJZ=1").status, RESULT_ERROR);  // no record
  ulda_nvram record{};
  record.led_result = 0;
  ASSERT_EQ(put_ULDA_NV_item(&record), 0);
  EXPECT_EQ(call_handler(sgdjz_handler, "AT+SGDJZ=1").body, "\n+led_result:\"0\"\r\n");
  EXPECT_EQ(call_handler(sgdjz_handler, "AT+SGDJZ=1").status, RESULT_ERROR);
  record.led_result = 3;
  ASSERT_EQ(put_ULDA_NV_item(&record), 0);
  const HandlerAnswer answer = call_handler(sgdjz_handler, "AT+SGDJZ=1");
  EXPECT_EQ(answer.status, RESULT_OK);
  EXPECT_EQ(answer.body, "\n+led_result:\"3\"\r\n");
}

TEST_F(Lights, KeepScreenOnRequests) {
  const std::string receiver = "am broadcast -n com.ulda.engineermode/.KeepScreenOnReceiver -a kro.intent.action.KEEP_CREEN_ON -e status ";
  make_dir("/data/data/com.ulda.engineermode");
  struct Step {
    CommandHandler handler;
    std::string line;
    std::vector<std::string> shell;
  };
  const std::string touch = "/system/bin/sh -c \"touch /data/data/com.ulda.engineermode/keepScreenOn\"";
  const std::string chmod = "/system/bin/sh -c \"chmod 0666 /data/data/com.ulda.engineermode/keepScreenOn\"";
  const Step steps[] = {
      {jvsp_handler, "AT+JVSP=0", {receiver + "1"}},
      {jvsp_handler, "AT+JVSP=1", {receiver + "0"}},
      {jvsp_handler, "AT+JVSP=3", {receiver + "5"}},
      {jvbs_handler, "AT+JVBS=1", {touch, chmod, receiver + "3"}},
      {jvbs_handler, "AT+JVBS=0", {receiver + "4"}},
      {jvflight_handler, "AT+JVFLIGHT=2", {"am broadcast -a android.intent.action.FLASH_CHANGE --es value auto"}},
      {jvsp_handler, "AT+JVSP=2", {}},
      {jvbs_handler, "AT+JVBS=2", {}},
      {jvflight_handler, "AT+JVFLIGHT=3", {}},
  };
  for (const Step& step : steps) {
    shell_commands().clear();
    EXPECT_EQ(call_handler(step.handler, step.line).status, step.shell.empty() ? RESULT_ERROR : RESULT_OK) << step.line;
    EXPECT_EQ(shell_commands(), step.shell) << step.line;
  }
  EXPECT_EQ(read_file("/.emu/wake_lock.log"), "acquire 1 atcid\nrelease atcid\n");
  // Kernel-console mode: files only, no broadcast.
  is_sp = 1;
  write_file("/data/data/com.ulda.engineermode/keepScreenOn", "");
  shell_commands().clear();
  EXPECT_EQ(call_handler(jvbs_handler, "AT+JVBS=0").status, RESULT_OK);
  EXPECT_TRUE(shell_commands().empty());
  EXPECT_FALSE(exists("/data/data/com.ulda.engineermode/keepScreenOn"));
}

}  // namespace
