#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "commands/amplifier.h"
#include "commands/command_util.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Lines = std::vector<std::string>;
constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kNoFile = "<none>";

std::string sh(const std::string& text) { return "/system/bin/sh -c \"" + text + "\""; }

const std::string kCal9890 = sh(R"(echo "3" > /d/tfa9890/calibrate)");
const std::string kStatus9890 = sh("cat /d/tfa9890/current_status > /data/AmplifierCal");
const std::string kGrep9890 = sh("cat /d/tfa9890/codec_reg | grep reg{80}> /data/AmplifierCal");
const std::string kFinish9890 = sh(R"(echo "2" > /d/tfa9890/calibrate)");
const std::string kCal98xx = sh(R"(echo "3" > /d/tfa98xx/calibrate)");
const std::string kStatus98xx = sh("cat /d/tfa98xx/current_status > /data/AmplifierCal");
const std::string kGrep98xx = sh("cat /d/tfa98xx/codec_reg | grep reg{0080}> /data/AmplifierCal");
const std::string kFinish98xx = sh(R"(echo "8" > /d/tfa98xx/calibrate)");

using AmplifierTest = DeviceRootTest;

TEST_F(AmplifierTest, Calibration) {
  struct Case {
    std::string model;
    std::string line;
    int fail_call;    // index of the shell call answering fail_status, -1 none
    int fail_status;
    std::string cal;  // what the grep leaves in /data/AmplifierCal
    int status;
    std::string body;
    Lines shell;
  };
  const std::vector<Case> cases = {
      {"", "AT+ZNGF=0", -1, 0, kNoFile, OK, "", {kCal9890, kStatus9890}},
      {"QM0304A", "AT+ZNGF=0", -1, 0, kNoFile, OK, "", {kCal98xx, kStatus98xx}},
      {"", "AT+ZNGF=0", 0, 127, kNoFile, ERR, "", {kCal9890}},
      // Only -1 and 127 are failures: a tool the shell could not find is not.
      {"", "AT+ZNGF=0", 0, 32512, kNoFile, OK, "", {kCal9890, kStatus9890}},
      {"", "AT+ZNGF=0", 1, 127, kNoFile, ERR, "", {kCal9890, kStatus9890}},
      {"", "AT+ZNGF=2", -1, 0, "reg{80}: 6\n", OK, "\r\n1\r\n", {kGrep9890}},
      {"QM0304F_EX", "AT+ZNGF=2", -1, 0, "reg{0080}: 6\n", OK, "\r\n1\r\n", {kGrep98xx}},
      {"", "AT+ZNGF=2", -1, 0, "reg{80}: 4\n", OK, "\r\n0\r\n", {kGrep9890}},
      {"", "AT+ZNGF=2", -1, 0, "reg{80} 6\n", ERR, "", {kGrep9890}},
      {"", "AT+ZNGF=2", 0, 127, "reg{80}: 6\n", ERR, "", {kGrep9890}},
      {"", "AT+ZNGF=2", -1, 0, kNoFile, ERR, "", {kGrep9890}},
      {"", "AT+ZNGF=2", 0, 32512, "reg{80}: 2", OK, "\r\n1\r\n", {kGrep9890}},
      {"", "AT+ZNGF=3", -1, 0, kNoFile, OK, "", {kFinish9890}},
      {"QM0304A", "AT+ZNGF=3", -1, 0, kNoFile, OK, "", {kFinish98xx}},
      {"QM0304A", "AT+ZNGF=3", 0, -1, kNoFile, ERR, "", {kFinish98xx}},
      {"", "AT+ZNGF=1", -1, 0, kNoFile, ERR, "", {}},
      {"", "AT+ZNGF=2,1", -1, 0, "reg{80}: 6\n", ERR, "", {}},
  };
  for (const Case& c : cases) {
    write_file("/dev/__properties__/ro.pemu.product.model", c.model);  // a ro. property, set afresh
    std::filesystem::remove(host_path("/data/AmplifierCal"));
    shell_commands().clear();
    shell_action() = [&](const std::string& command) {
      if (command.find("grep") != std::string::npos && c.cal != kNoFile)
        write_file("/data/AmplifierCal", c.cal);
      return static_cast<int>(shell_commands().size()) - 1 == c.fail_call ? c.fail_status : 0;
    };
    const HandlerAnswer answer = call_handler(smart_speaker_Amplifier_calibrate_handler, c.line);
    EXPECT_EQ(answer.status, c.status) << c.model << " " << c.line << " " << c.cal;
    EXPECT_EQ(answer.body, c.body) << c.model << " " << c.line << " " << c.cal;
    EXPECT_EQ(shell_commands(), c.shell) << c.model << " " << c.line;
  }
}

class I2cCheckTest : public DeviceRootTest {
 protected:
  // The phone's "/d" is a relative link to its debugfs.
  void make_debugfs() {
    make_dir("/sys/kernel/debug");
    std::filesystem::create_directory_symlink("sys/kernel/debug", host_path("/d"));
  }
  void device(const std::string& name, const std::string& status) {
    write_file("/sys/kernel/debug/" + name + "/i2c", status);
  }
  HandlerAnswer check() { return call_handler(i2c_device_test_handler, "AT+JVAUDIO=1"); }
};

TEST_F(I2cCheckTest, FailuresAreListed) {
  EXPECT_EQ(check().body, "\r\n\"OK\"\r\n");  // no /d at all
  EXPECT_EQ(call_handler(i2c_device_test_handler, "AT+JVAUDIO=0").status, ERR);
  make_debugfs();
  device("tfa9890", "OK\n");
  device("wcd9330", "ERROR 0x12\n");
  device("es705", "bus_ERROR\tnack 3");
  device("nested/inner", "ERROR");               // two levels down: not looked at
  write_file("/sys/kernel/debug/i2c", "ERROR");  // a file in /d itself: not a device
  const HandlerAnswer answer = check();
  EXPECT_EQ(answer.status, OK);
  // Directory order decides which failure comes first.
  EXPECT_TRUE(answer.body == "\r\n\"ERROR: ERROR, bus_ERROR\tnack\"\r\n" ||
              answer.body == "\r\n\"ERROR: bus_ERROR\tnack, ERROR\"\r\n")
      << answer.body;
}

TEST_F(I2cCheckTest, StatusAndBodyLimits) {
  make_debugfs();
  device("codec", "ERROR" + std::string(200, 'x'));  // read up to 128 bytes
  EXPECT_EQ(check().body, "\r\n\"ERROR: ERROR" + std::string(123, 'x') + "\"\r\n");
  for (int i = 0; i < 20; ++i) device("dev" + std::to_string(i), "ERROR" + std::string(123, 'e'));
  const HandlerAnswer answer = check();
  EXPECT_LE(answer.body.size(), BODY_LIMIT);
  // Whole tokens of 128 characters, ", " between them, the closing quote always there.
  EXPECT_EQ(answer.body.substr(answer.body.size() - 3), "\"\r\n");
  EXPECT_EQ((answer.body.size() - 3 - 10 - 128) % 130, 0u) << answer.body.size();
}

TEST_F(I2cCheckTest, UnopenableStatusFailsWithEmptyBody) {
  make_debugfs();
  // Made between the failing ones, so that in any directory order failures were likely listed
  // before the walk reaches it.
  for (int i = 0; i < 30; ++i) {
    device("dev" + std::to_string(i), "ERROR");
    if (i != 15) continue;
    make_dir("/sys/kernel/debug/broken");
    std::filesystem::create_symlink("missing", host_path("/sys/kernel/debug/broken/i2c"));
  }
  const HandlerAnswer answer = check();
  EXPECT_EQ(answer.status, ERR);
  EXPECT_EQ(answer.body, "");
}

}  // namespace
