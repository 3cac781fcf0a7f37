#include "commands/factory_flags.h"

#include <gtest/gtest.h>

#include <chrono>
#include <atomic>
#include <string>
#include <thread>

#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

struct FlagCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  const char* property;  // "name=value", or null
  RecordTest::Change before, after;  // no `after`: the record stays as it was
  int status;
  std::string body;
};
void PrintTo(const FlagCase& c, std::ostream* os) { *os << c.name; }

const FlagCase kFlagCases[] = {
    {"sn_ok", jvcn_handler, "AT+JVCN=0", nullptr, nullptr, [](ulda_nvram& r) { r.is_jvsn_ok = 1; }, RESULT_OK, ""},
    {"wallpaper", jvmmiui_handler, "AT+JVMMIUI=1,12", nullptr, nullptr, [](ulda_nvram& r) { r.wallpaper_id = 12; }, RESULT_OK, ""},
    {"wallpaper_not_digits", jvmmiui_handler, "AT+JVMMIUI=1,12a", nullptr, nullptr, nullptr, RESULT_ERROR, ""},
    {"wallpaper_read", jvmmiui_handler, "AT+JVMMIUI=0", nullptr, [](ulda_nvram& r) { r.wallpaper_id = 7; }, nullptr, RESULT_OK, "\r\n\"7\"\r\n"},
    {"root", jvroot_handler, "AT+JVROOT=0", nullptr, nullptr, [](ulda_nvram& r) { r.is_root = 0; }, RESULT_OK, ""},
    {"3g", jv3g_handler, "AT+JV3G=1,5", nullptr, nullptr, [](ulda_nvram& r) { r.nomal_3g = 5; }, RESULT_OK, ""},
    {"3g_unset_is_0", jv3g_handler, "AT+JV3G=0", nullptr, [](ulda_nvram& r) { r.nomal_3g = 0; }, nullptr, RESULT_OK, "\r\n\"0\"\r\n"},
    {"3g_differs", jv3g_handler, "AT+JV3G=0", "sys.pemu.3g.nomal=2", [](ulda_nvram& r) { r.nomal_3g = 3; }, nullptr, RESULT_ERROR, ""},
    {"feature", jvfeature_handler, "AT+JVFEATURE=1,4", nullptr, [](ulda_nvram& r) { r.special_feature = 16; }, [](ulda_nvram& r) { r.special_feature = 20; }, RESULT_OK, ""},
    {"feature_read", jvfeature_handler, "AT+JVFEATURE=0,6", nullptr, [](ulda_nvram& r) { r.special_feature = 20; }, nullptr, RESULT_OK, "\r\n\"4\"\r\n"},
    {"order", jvtestmmi_handler, "AT+JVTESTMMI=1,ABC", nullptr, nullptr, [](ulda_nvram& r) { set_ulda_string(r.test_order, "ABC"); }, RESULT_OK, ""},
    {"order_cut", jvtestmmi_handler, "AT+JVTESTMMI=1," + std::string(150, 'O'), nullptr, nullptr, [](ulda_nvram& r) { std::memset(r.test_order, 'O', 100); }, RESULT_OK, ""},
    {"order_missing", jvtestmmi_handler, "AT+JVTESTMMI=1", nullptr, nullptr, nullptr, RESULT_ERROR, ""},
    {"log_switch_read", jvqlog_handler, "AT+JVQLOG=1,3", "persist.sys.is_kro_log=2", nullptr, nullptr, RESULT_OK, "\"2\"\r\n"},
    {"wizard_old_rom", jvsyjm_handler, "AT+JVSYJM=1", "ro.pemu.rom.version=ROM_1.5", nullptr, nullptr, RESULT_ERROR, ""},
};

class FactoryFlags : public RecordTest, public ::testing::WithParamInterface<FlagCase> {};

TEST_P(FactoryFlags, ChangesOnlyItsField) {
  const FlagCase& c = GetParam();
  set_property("init.svc.bootanim", "stopped");
  set_property("sys.boot_completed", "1");
  if (c.property) {
    const std::string p = c.property;
    set_property(p.substr(0, p.find('=')), p.substr(p.find('=') + 1));
  }
  put_record(patterned(c.before));
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  ulda_nvram expected = patterned(c.before);
  if (c.after) c.after(expected);
  EXPECT_EQ(record_bytes(), bytes_of(expected));
}

INSTANTIATE_TEST_SUITE_P(Lines, FactoryFlags, ::testing::ValuesIn(kFlagCases),
                         [](const auto& info) { return std::string(info.param.name); });

class FactoryFlagsTest : public RecordTest {};

TEST_F(FactoryFlagsTest, RecordFailures) {
  set_property("sys.boot_completed", "0");
  EXPECT_EQ(call_handler(jvcn_handler, "AT+JVCN=0").status, RESULT_ERROR);
  EXPECT_EQ(record_bytes(), bytes_of(patterned()));
  write_file("/persist/ulda_nvram", "short");
  EXPECT_EQ(call_handler(jvroot_handler, "AT+JVROOT=0").status, RESULT_ERROR);
  EXPECT_EQ(get_property("persist.sys.is_root"), "");
  // Only the test order leaves the station without an answer when the write fails.
  EXPECT_EQ(call_handler(jvtestmmi_handler, "AT+JVTESTMMI=1,X").status, RESULT_ERROR);
  put_record(patterned());
  break_record_writes();
  EXPECT_EQ(call_handler(jvtestmmi_handler, "AT+JVTESTMMI=1,X").status, RESULT_DONE);
  EXPECT_EQ(call_handler(jvmmiui_handler, "AT+JVMMIUI=1,3").status, RESULT_ERROR);
  EXPECT_EQ(record_bytes(), bytes_of(patterned()));
}

TEST_F(FactoryFlagsTest, EfsGoldenCopyNeedsTheAnswerZero) {
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_OK);
  write_file("/.emu/modem/efs_golden_copy", "3");
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_ERROR);
  // The "0" an earlier answer left must not pass a request that was never sent.
  std::filesystem::remove(host_path("/.emu/modem/efs_golden_copy"));
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_OK);
  write_file("/.emu/modem/send_error", "5");
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_ERROR);
}

TEST_F(FactoryFlagsTest, OneIntegrityCheckAtATime) {
  std::atomic<int> entered{0};
  std::atomic<bool> release{false};
  shell_action() = [&](const std::string&) {
    ++entered;
    while (!release) std::this_thread::sleep_for(std::chrono::milliseconds(1));
    return 0;
  };
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=1").status, RESULT_OK);
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
  while (entered == 0 && std::chrono::steady_clock::now() < deadline)
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=1").status, RESULT_OK);  // starts none
  release = true;
  while (root_integrity_check_running && std::chrono::steady_clock::now() < deadline)
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  ASSERT_FALSE(root_integrity_check_running);
  EXPECT_EQ(entered, 2);  // the two commands of one check
}

}  // namespace
