#include "commands/factory_flags.h"

#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "core/command.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Props = std::vector<std::pair<std::string, std::string>>;

struct FlagCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Props properties;
  RecordTest::Change before;  // applied to the patterned record before the call
  int status;
  std::string body;
  RecordTest::Change after;  // the expected change; none: the record stays as it was
};
void PrintTo(const FlagCase& c, std::ostream* os) { *os << c.name; }

std::string quoted(const std::string& v) { return "\r\n\"" + v + "\"\r\n"; }

const Props kBooted = {{"init.svc.bootanim", "stopped"}, {"sys.boot_completed", "1"}};

std::vector<FlagCase> flag_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  return {
      {"sn_ok", jvcn_handler, "AT+JVCN=0", kBooted, nullptr, OK, "", [](ulda_nvram& r) { r.is_jvsn_ok = 1; }},
      {"sn_ok_before_boot", jvcn_handler, "AT+JVCN=0", {{"init.svc.bootanim", "running"}, {"sys.boot_completed", "1"}}, nullptr, ERR, "", nullptr},
      {"sn_other_line", jvcn_handler, "AT+JVCN=1", kBooted, nullptr, ERR, "", nullptr},
      {"wallpaper_set", jvmmiui_handler, "AT+JVMMIUI=1,12", {}, nullptr, OK, "", [](ulda_nvram& r) { r.wallpaper_id = 12; }},
      {"wallpaper_not_digits", jvmmiui_handler, "AT+JVMMIUI=1,12a", {}, nullptr, ERR, "", nullptr},
      {"wallpaper_negative", jvmmiui_handler, "AT+JVMMIUI=1,-3", {}, nullptr, ERR, "", nullptr},
      {"wallpaper_beyond_int", jvmmiui_handler, "AT+JVMMIUI=1,99999999999", {}, nullptr, ERR, "", nullptr},
      {"wallpaper_missing", jvmmiui_handler, "AT+JVMMIUI=1", {}, nullptr, ERR, "", nullptr},
      {"wallpaper_read", jvmmiui_handler, "AT+JVMMIUI=0", {}, [](ulda_nvram& r) { r.wallpaper_id = 7; }, OK, quoted("7"), nullptr},
      {"root_clear", jvroot_handler, "AT+JVROOT=0", {}, nullptr, OK, "", [](ulda_nvram& r) { r.is_root = 0; }},
      {"root_read", jvroot_handler, "AT+JVROOT=2", {}, [](ulda_nvram& r) { r.is_root = 1; }, OK, quoted("1"), nullptr},
      {"3g_set", jv3g_handler, "AT+JV3G=1,5", {}, nullptr, OK, "", [](ulda_nvram& r) { r.nomal_3g = 5; }},
      {"3g_equal", jv3g_handler, "AT+JV3G=0", {{"sys.pemu.3g.nomal", "5"}}, [](ulda_nvram& r) { r.nomal_3g = 5; }, OK, quoted("5"), nullptr},
      {"3g_unset_is_0", jv3g_handler, "AT+JV3G=0", {}, [](ulda_nvram& r) { r.nomal_3g = 0; }, OK, quoted("0"), nullptr},
      {"3g_unset_differs", jv3g_handler, "AT+JV3G=0", {}, [](ulda_nvram& r) { r.nomal_3g = 3; }, ERR, "", nullptr},
      {"feature_or", jvfeature_handler, "AT+JVFEATURE=1,4", {}, [](ulda_nvram& r) { r.special_feature = 0x10; }, OK, "", [](ulda_nvram& r) { r.special_feature = 0x14; }},
      {"feature_bit31", jvfeature_handler, "AT+JVFEATURE=1,2147483648", {}, [](ulda_nvram& r) { r.special_feature = 1; }, OK, "", [](ulda_nvram& r) { r.special_feature = INT32_MIN + 1; }},
      {"feature_read_masked", jvfeature_handler, "AT+JVFEATURE=0,6", {}, [](ulda_nvram& r) { r.special_feature = 0x14; }, OK, quoted("4"), nullptr},
      {"feature_missing", jvfeature_handler, "AT+JVFEATURE=1", {}, nullptr, ERR, "", nullptr},
      {"order", jvtestmmi_handler, "AT+JVTESTMMI=1,ABC", {}, nullptr, OK, "", [](ulda_nvram& r) { set_ulda_string(r.test_order, "ABC"); }},
      {"order_cut_to_field", jvtestmmi_handler, "AT+JVTESTMMI=1," + std::string(150, 'O'), {}, nullptr, OK, "", [](ulda_nvram& r) { std::memset(r.test_order, 'O', sizeof r.test_order); }},
      {"order_missing", jvtestmmi_handler, "AT+JVTESTMMI=1", {}, nullptr, ERR, "", nullptr},
      {"sn_read", jvrdnv_handler, "AT+JVRDNV=0", {}, [](ulda_nvram& r) { r.is_jvsn_ok = 1; }, OK, quoted("1"), nullptr},
      {"log_switch", jvqlog_handler, "AT+JVQLOG=1,2", {}, nullptr, OK, "", nullptr},
      {"log_switch_read", jvqlog_handler, "AT+JVQLOG=1,3", {{"persist.sys.is_kro_log", "2"}}, nullptr, OK, "\"2\"\r\n", nullptr},
      {"log_switch_read_unset", jvqlog_handler, "AT+JVQLOG=1,3", {}, nullptr, OK, "\" \"\r\n", nullptr},
      {"log_switch_other", jvqlog_handler, "AT+JVQLOG=1,4", {}, nullptr, ERR, "", nullptr},
      {"wizard_old_rom", jvsyjm_handler, "AT+JVSYJM=1", {{"ro.pemu.rom.version", "ROM_1.5"}}, nullptr, ERR, "", nullptr},
      {"wizard", jvsyjm_handler, "AT+JVSYJM=1", {{"ro.pemu.rom.version", "rom_2.0"}}, nullptr, OK, "", nullptr},
      {"sp_mode", jvdl_handler, "AT+JVDL=1", {}, nullptr, OK, "", nullptr},
      {"null_command", jvnc_handler, "AT+JVNC=1", {}, nullptr, OK, "", nullptr},
      {"null_command_other", jvnc_handler, "AT+JVNC=0", {}, nullptr, ERR, "", nullptr},
      {"g3g", jvg3g_handler, "AT+JVG3G=1", {}, nullptr, ERR, "", nullptr},
      {"qhzs", jvqhzs_handler, "AT+JVQHZS=1", {}, nullptr, ERR, "", nullptr},
  };
}

class FactoryFlags : public RecordTest, public ::testing::WithParamInterface<FlagCase> {};

TEST_P(FactoryFlags, AnswersAndChangesOnlyItsField) {
  const FlagCase& c = GetParam();
  for (const auto& [name, value] : c.properties) set_property(name, value);
  put_record(patterned(c.before));
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  ulda_nvram expected = patterned(c.before);
  if (c.after) c.after(expected);
  EXPECT_EQ(record_bytes(), bytes_of(expected));
}

INSTANTIATE_TEST_SUITE_P(Lines, FactoryFlags, ::testing::ValuesIn(flag_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class FactoryFlagsTest : public RecordTest {};

TEST_F(FactoryFlagsTest, RecordFailures) {
  write_file("/persist/ulda_nvram", "short");
  EXPECT_EQ(call_handler(jvtestmmi_handler, "AT+JVTESTMMI=1,X").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvroot_handler, "AT+JVROOT=0").status, RESULT_ERROR);
  EXPECT_EQ(get_property("persist.sys.is_root"), "");
  EXPECT_EQ(call_handler(jvrdnv_handler, "AT+JVRDNV=0").status, RESULT_ERROR);
  // A write that fails leaves the station without an answer for the test order only.
  put_record(patterned());
  break_record_writes();
  EXPECT_EQ(call_handler(jvtestmmi_handler, "AT+JVTESTMMI=1,X").status, RESULT_DONE);
  EXPECT_EQ(call_handler(jvmmiui_handler, "AT+JVMMIUI=1,3").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvroot_handler, "AT+JVROOT=0").status, RESULT_ERROR);
  EXPECT_EQ(record_bytes(), bytes_of(patterned()));
}

TEST_F(FactoryFlagsTest, RootFlagClearsThePropertyAndSyncsData) {
  set_property("persist.sys.is_root", "1");
  EXPECT_EQ(call_handler(jvroot_handler, "AT+JVROOT=0").status, RESULT_OK);
  EXPECT_EQ(get_property("persist.sys.is_root"), "0");
  EXPECT_FALSE(exists("/data/at_test"));
}

TEST_F(FactoryFlagsTest, LogSwitchReadBack) {
  EXPECT_EQ(call_handler(jvqlog_handler, "AT+JVQLOG=0").status, RESULT_OK);
  EXPECT_EQ(get_property("persist.sys.is_kro_log"), "0");
  // A read-only property that cannot take the value fails the read-back.
  EXPECT_EQ(call_handler(jvqlog_handler, "AT+JVQLOG=1,1").status, RESULT_OK);
  std::filesystem::remove(host_path("/dev/__properties__/persist.sys.is_kro_log"));
  make_dir("/dev/__properties__/persist.sys.is_kro_log");
  EXPECT_EQ(call_handler(jvqlog_handler, "AT+JVQLOG=1,2").status, RESULT_ERROR);
}

TEST_F(FactoryFlagsTest, LogCapturesGoToTheShellExactly) {
  EXPECT_EQ(call_handler(jvlog_handler, "AT+JVLOG=1").status, RESULT_OK);
  EXPECT_EQ(shell_commands(), (std::vector<std::string>{"cat /proc/kmsg > /data/log.txt&",
                                                        "logcat -v time > /data/adb.txt&"}));
  shell_commands().clear();
  EXPECT_EQ(call_handler(jvlogat_handler, "AT+JVLOGAT=1").status, RESULT_OK);
  const std::string sh = "/system/bin/sh -c \"";
  EXPECT_EQ(shell_commands(),
            (std::vector<std::string>{
                sh + "echo file wcd9320.c +p > /d/dynamic_debug/control\"",
                sh + "echo file wcd9xxx-common.c +p > /d/dynamic_debug/control\"",
                sh + "echo file wcd9xxx-mbhc.c +p > /d/dynamic_debug/control\"",
                sh + "echo file wcd9xxx-core.c +p > /d/dynamic_debug/control\"",
                sh + "echo file soc-dapm.c +p > /d/dynamic_debug/control\"",
                sh + "echo 0x21 > /sys/module/pm_8x60/parameters/debug_mask \"",
                sh + "echo 1 > /sys/kernel/debug/clk/debug_suspend\"",
                sh + "echo 1 > /sys/module/msm_show_resume_irq/parameters/debug_mask\"",
                sh + "cat /proc/kmsg > /data/log.txt&\"",
                sh + "logcat -v time > /data/adb.txt&\"",
            }));
  EXPECT_EQ(get_property("com.pemu.atlog"), "1");
  EXPECT_EQ(call_handler(jvlogat_handler, "AT+JVLOGAT=0").status, RESULT_ERROR);
}

TEST_F(FactoryFlagsTest, EfsGoldenCopyNeedsTheAnswerZero) {
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_OK);
  write_file("/.emu/modem/efs_golden_copy", "3");
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_ERROR);
  // The earlier "0" left by a good answer must not pass a request that was never sent.
  std::filesystem::remove(host_path("/.emu/modem/efs_golden_copy"));
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_OK);
  write_file("/.emu/modem/send_error", "5");
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=1").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvefs_handler, "AT+JVEFS=0").status, RESULT_ERROR);
}

TEST_F(FactoryFlagsTest, OneIntegrityCheckAtATime) {
  std::mutex m;
  std::condition_variable cv;
  bool release = false;
  int entered = 0;
  shell_action() = [&](const std::string&) {
    std::unique_lock lock(m);
    ++entered;
    cv.notify_all();
    cv.wait(lock, [&] { return release; });
    return 0;
  };
  write_file("/data/rooIntegityCheck.txt", "old");
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=1").status, RESULT_OK);
  {
    std::unique_lock lock(m);
    ASSERT_TRUE(cv.wait_for(lock, std::chrono::seconds(30), [&] { return entered == 1; }));
  }
  EXPECT_FALSE(exists("/data/rooIntegityCheck.txt"));
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=1").status, RESULT_OK);
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=0").status, RESULT_ERROR);
  {
    std::lock_guard lock(m);
    release = true;
  }
  cv.notify_all();
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  while (root_integrity_check_running.load() && std::chrono::steady_clock::now() < deadline)
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  ASSERT_FALSE(root_integrity_check_running.load());
  EXPECT_EQ(shell_commands(),
            (std::vector<std::string>{
                "/system/bin/sh -c \"richk > data/rooIntegityCheck.txt\"",
                "/system/bin/sh -c \"chmod 666 /data/rooIntegityCheck.txt\""}));
}

}  // namespace
