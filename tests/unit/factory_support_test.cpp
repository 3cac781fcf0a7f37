#include "services/factory_support.h"

#include <climits>
#include <cstring>
#include <string>
#include <vector>

#include "services/md5.h"
#include "tests/unit/device_root.h"

namespace {

class FactorySupportTest : public DeviceRootTest {};

using Request = int (*)(const char*, const char*, const char*);

std::string md5_hex(const std::string& text, size_t piece) {
  MD5_CTX context;
  MD5_Init(&context);
  for (size_t at = 0; at < text.size(); at += piece)
    md5_update(&context, text.data() + at, std::min(piece, text.size() - at));
  unsigned char digest[16];
  MD5_Final(digest, &context);
  char hex[33];
  for (int i = 0; i < 16; ++i) std::snprintf(hex + 2 * i, 3, "%02x", digest[i]);
  return hex;
}

TEST_F(FactorySupportTest, FrameworkRequestsRunOneAmCommandLine) {
  constexpr char kEm[] = "com.ulda.engineermode";
  struct Case {
    Request request;
    const char* component;
    const char* action;
    const char* extras;
    const char* command;
  };
  const Case cases[] = {
      {sendBroadcastFromAtcid, nullptr, "kro.intent.action.KEEP_CREEN_ON", "-e status 2",
       "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 2"},
      {sendBroadcastFromAtcid, "com.ulda.engineermode/.KeepScreenOnReceiver", "", "--ez state true",
       "am broadcast -n com.ulda.engineermode/.KeepScreenOnReceiver --ez state true"},
      {startActivityFromAtcid, "com.ulda.engineermode/.ATLcmTest", "android.factorytest.ATLCM", nullptr,
       "am start -n com.ulda.engineermode/.ATLcmTest -a android.factorytest.ATLCM"},
      {startServiceFromAtcid, "com.ulda.engineermode/.StartAtcidService", nullptr, nullptr,
       "am startservice -n com.ulda.engineermode/.StartAtcidService"},
      {stopActivityFromAtcid, kEm, nullptr, nullptr, "am force-stop com.ulda.engineermode"},
      // Station text in the extras: blanks split words, anything else stays inside one word.
      {sendBroadcastFromAtcid, "com.ulda.engineermode/.ConnWifiReceiver", "kro.intent.action.CONNWIFI",
       "-e ssid A;REBOOT -e pwd (null)",
       "am broadcast -n com.ulda.engineermode/.ConnWifiReceiver -a kro.intent.action.CONNWIFI "
       "-e ssid 'A;REBOOT' -e pwd '(null)'"},
      {sendBroadcastFromAtcid, nullptr, "x", "  --es command\topen\n -e pwd IT'S $(ID) ",
       "am broadcast -a x --es command open -e pwd 'IT'\\''S' '$(ID)'"},
  };
  for (const Case& c : cases) {
    shell_commands().clear();
    EXPECT_EQ(c.request(c.component, c.action, c.extras), 0) << c.command;
    EXPECT_EQ(shell_commands(), std::vector<std::string>{c.command});
  }
  shell_commands().clear();
  EXPECT_EQ(killprocess("ptt_socket_app", 1), 0);
  EXPECT_EQ(killprocess("ptt_socket_app", 0), 0);
  EXPECT_NE(stopActivityFromAtcid(nullptr, nullptr, nullptr), 0);
  EXPECT_NE(killprocess("", 1), 0);
  EXPECT_EQ(shell_commands(),
            (std::vector<std::string>{"killall -9 ptt_socket_app", "killall ptt_socket_app"}));
  shell_action() = [](const std::string&) { return 1 << 8; };
  EXPECT_NE(sendBroadcastFromAtcid(nullptr, "a", nullptr), 0);
}

TEST_F(FactorySupportTest, ReadFromFileAndWriteInt) {
  make_dir("/data/a_directory");
  struct Case {
    const char* content;  // null: no file
    const char* path;
    int size;
    int result;
    const char* text;
  };
  const Case cases[] = {
      {"123\n", "sys/class/block/mmcblk0/size", 100, 4, "123\n"},
      {"abcdef", "/sys/x", 4, 3, "abc"},
      {"x", "/sys/x", 1, 0, ""},
      {"x", "/sys/x", 0, -1, "########"},
      {nullptr, "/sys/missing", 100, -1, ""},
      {nullptr, "/data/a_directory", 100, -1, ""},
  };
  for (const Case& c : cases) {
    if (c.content) write_file(c.path, c.content);
    char buffer[101];
    std::memset(buffer, '#', sizeof buffer);
    const int result = readFromFile(c.path, buffer, c.size);
    EXPECT_EQ(result < 0 ? -1 : result, c.result) << c.path;
    EXPECT_EQ(std::string(buffer, std::strlen(c.text)), c.text) << c.path;
    EXPECT_EQ(buffer[c.size], '#') << "wrote past the buffer: " << c.path;
  }

  for (const auto& [value, text] : {std::pair{255, "255"}, {0, "0"}, {INT_MIN, "-2147483648"}}) {
    write_file("/sys/class/leds/red/brightness", "1000\n");
    EXPECT_EQ(write_int("/sys/class/leds/red/brightness", value), 0);
    EXPECT_EQ(read_file("/sys/class/leds/red/brightness"), text);
  }
  EXPECT_NE(write_int("/sys/class/leds/none/brightness", 1), 0);
  EXPECT_FALSE(exists("/sys/class/leds/none/brightness"));
}

TEST_F(FactorySupportTest, SubstringStripsQuotesAndBlanks) {
  const std::pair<const char*, const char*> cases[] = {
      {" \"A B\" \r\n", "A B"}, {"PLAIN", "PLAIN"}, {"\"OPEN", "OPEN"},
      {"\"\"", ""},            {"   ", ""},        {"\"IN\"SIDE\"", "IN\"SIDE"},
  };
  for (const auto& [in, out] : cases) {
    char token[32];
    std::snprintf(token, sizeof token, "%s", in);
    substring(token);
    EXPECT_STREQ(token, out) << in;
  }
}

TEST_F(FactorySupportTest, Md5MatchesRfc1321AndMd5sum) {
  const std::pair<std::string, const char*> suite[] = {
      {"", "d41d8cd98f00b204e9800998ecf8427e"},
      {"a", "0cc175b9c0f1b6a831c399e269772661"},
      {"abc", "900150983cd24fb0d6963f7d28e17f72"},
      {"message digest", "f96b697d7cb7938d525a2f31aaf161d0"},
      {"abcdefghijklmnopqrstuvwxyz", "c3fcd3d76192e4007dfb496cca67e13b"},
      {"ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789",
       "d174ab98d277d9f5a5611c2c9f419d9f"},
      {"12345678901234567890123456789012345678901234567890123456789012345678901234567890",
       "57edf4a22be3c955ac49da2e2107b67a"},
  };
  for (const auto& [text, digest] : suite) {
    for (size_t piece : {size_t{1}, size_t{7}, size_t{64}, size_t{1000}})
      EXPECT_EQ(md5_hex(text, piece), digest) << text << " in pieces of " << piece;
  }

  // Reference digest from md5sum over the same bytes; longer than one read chunk.
  std::string bytes(200003, '\0');
  for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>((i * 7 + 3) % 256);
  write_file("/sdcard/apps.zip", bytes);
  MD5_CTX context;
  MD5_Init(&context);
  ASSERT_EQ(MD5_Update_File(&context, "/sdcard/apps.zip"), 0);
  unsigned char digest[16];
  MD5_Final(digest, &context);
  const unsigned char expected[16] = {0x71, 0xea, 0x1a, 0x23, 0x45, 0xbc, 0x50, 0x10,
                                      0x90, 0xed, 0x0f, 0x67, 0xce, 0xd1, 0x3f, 0x5e};
  EXPECT_EQ(std::memcmp(digest, expected, 16), 0);
  EXPECT_NE(MD5_Update_File(&context, "/sdcard/missing.zip"), 0);
}

TEST_F(FactorySupportTest, ServiceStateFromTheEmulatedPhone) {
  EXPECT_STREQ(sendMessage("check_board"), "0");
  EXPECT_EQ(isSetupwizardDisabled(), 0);
  EXPECT_EQ(checkCameraDeviceConnect(0), 3);

  write_file("/.emu/factory/check_board", "1\n");
  write_file("/.emu/setupwizard", "2\n");
  write_file("/.emu/camera", "one");
  EXPECT_STREQ(sendMessage("check_board"), "1");
  EXPECT_EQ(isSetupwizardDisabled(), 2);
  EXPECT_EQ(checkCameraDeviceConnect(0), 0);

  // A request never names a file outside /.emu/factory/.
  write_file("/.emu/secret", "0");
  for (const char* request : {"../secret", "", "a b", "/etc/passwd"}) {
    const char* answer = sendMessage(request);
    ASSERT_NE(answer, nullptr);
    EXPECT_STREQ(answer, "") << request;
  }
}

TEST_F(FactorySupportTest, SensorTestResultsFromTheEmulatedPhone) {
  struct Case {
    const char* config;  // null: nothing configured
    int32_t success;
    std::vector<float> values;
  };
  const Case cases[] = {
      {nullptr, 1, {0, 0, 0, 0}},
      {"success=0\n", 0, {0, 0, 0}},
      {"values=1.5 -2 9.81\n", 1, {1.5f, -2.f, 9.81f, 0}},
      {"success=abc\nvalues=1 x 3\n", 0, {1, 0, 0}},
  };
  for (const Case& c : cases) {
    std::filesystem::remove(host_path("/.emu/sensor/48"));
    if (c.config) write_file("/.emu/sensor/48", c.config);
    sensor_test_result result;
    std::memset(&result, 0x5a, sizeof result);
    EXPECT_EQ(pemu_sensor_factory_test(48, &result, 0, 0), 0);
    EXPECT_EQ(result.success, c.success) << (c.config ? c.config : "(none)");
    for (size_t i = 0; i < c.values.size(); ++i) EXPECT_FLOAT_EQ(result.values[i], c.values[i]) << i;
    EXPECT_FLOAT_EQ(result.values[27], 0.f) << "every word is filled";
  }

  // The g-sensor stream reads its value as a float from the fourth word.
  write_file("/.emu/sensor/49", "success=1\nvalues=0.1 0.2 -9.5\n");
  sensor_test_result result{};
  pemu_sensor_factory_test(49, &result, 0, 0);
  float fourth;
  std::memcpy(&fourth, reinterpret_cast<const char*>(&result) + 12, sizeof fourth);
  EXPECT_FLOAT_EQ(fourth, -9.5f);

  // More values than words: the record ends at 116 bytes.
  std::string many = "values=";
  for (int i = 1; i <= 40; ++i) many += std::to_string(i) + " ";
  write_file("/.emu/sensor/51", many);
  struct {
    sensor_test_result result;
    int32_t guard = 0x12345678;
  } guarded;
  pemu_sensor_factory_test(51, &guarded.result, 0, 0);
  EXPECT_FLOAT_EQ(guarded.result.values[27], 28.f);
  EXPECT_EQ(guarded.guard, 0x12345678);
}

}  // namespace
