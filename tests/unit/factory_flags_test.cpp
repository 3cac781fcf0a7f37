#include "commands/factory_flags.h"

#include <atomic>
#include <chrono>
#include <thread>

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"
#include "tests/unit/worker_port.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kBootanim = "prop:init.svc.bootanim";
const std::string kBooted = "prop:sys.boot_completed";

const HandlerCase kRows[] = {
    {"sn_ok", jvcn_handler, "AT+JVCN=0", {{kBootanim, "stopped"}, {kBooted, "1"}}, OK, "", {}, {}, nullptr,
     [](ulda_nvram& r) { r.is_jvsn_ok = 1; }},
    {"sn_before_boot", jvcn_handler, "AT+JVCN=0", {{kBootanim, "stopped"}, {kBooted, "0"}}, ERR, ""},
    {"wallpaper", jvmmiui_handler, "AT+JVMMIUI=1,12", {}, OK, "", {}, {}, nullptr,
     [](ulda_nvram& r) { r.wallpaper_id = 12; }},
    {"wallpaper_not_digits", jvmmiui_handler, "AT+JVMMIUI=1,12A", {}, ERR, ""},
    {"wallpaper_read", jvmmiui_handler, "AT+JVMMIUI=0", {}, OK, "\r\n\"7\"\r\n", {}, {},
     [](ulda_nvram& r) { r.wallpaper_id = 7; }},
    {"root", jvroot_handler, "AT+JVROOT=0", {}, OK, "", {}, {{"prop:persist.sys.is_root", "0"}}, nullptr,
     [](ulda_nvram& r) { r.is_root = 0; }},
    {"3g", jv3g_handler, "AT+JV3G=1,5", {}, OK, "", {}, {}, nullptr, [](ulda_nvram& r) { r.nomal_3g = 5; }},
    {"3g_unset_is_0", jv3g_handler, "AT+JV3G=0", {}, OK, "\r\n\"0\"\r\n", {}, {}, [](ulda_nvram& r) { r.nomal_3g = 0; }},
    {"3g_differs", jv3g_handler, "AT+JV3G=0", {{"prop:sys.pemu.3g.nomal", "2"}}, ERR, "", {}, {},
     [](ulda_nvram& r) { r.nomal_3g = 3; }},
    {"feature", jvfeature_handler, "AT+JVFEATURE=1,4", {}, OK, "", {}, {}, [](ulda_nvram& r) { r.special_feature = 16; },
     [](ulda_nvram& r) { r.special_feature = 20; }},
    {"feature_read", jvfeature_handler, "AT+JVFEATURE=0,6", {}, OK, "\r\n\"4\"\r\n", {}, {},
     [](ulda_nvram& r) { r.special_feature = 20; }},
    {"order", jvtestmmi_handler, "AT+JVTESTMMI=1,ABC", {}, OK, "", {}, {}, nullptr,
     [](ulda_nvram& r) { set_ulda_string(r.test_order, "ABC"); }},
    {"order_cut", jvtestmmi_handler, "AT+JVTESTMMI=1," + std::string(150, 'O'), {}, OK, "", {}, {}, nullptr,
     [](ulda_nvram& r) { std::memset(r.test_order, 'O', 100); }},
    {"order_unreadable", jvtestmmi_handler, "AT+JVTESTMMI=1,X", {{"/persist/ulda_nvram", "short"}}, ERR, ""},
    // Only the test order leaves the station without an answer when the write fails.
    {"order_unwritable", jvtestmmi_handler, "AT+JVTESTMMI=1,X", {{"/persist/ulda_nvram.tmp/x", ""}}, RESULT_DONE, ""},
    {"log_switch_read", jvqlog_handler, "AT+JVQLOG=1,3", {{"prop:persist.sys.is_kro_log", "2"}}, OK, "\"2\"\r\n"},
    {"wizard_old_rom", jvsyjm_handler, "AT+JVSYJM=1", {{"prop:ro.pemu.rom.version", "ROM_1.5"}}, ERR, ""},
};

INSTANTIATE_TEST_SUITE_P(FactoryFlags, HandlerTable, ::testing::ValuesIn(kRows), case_name);

class FactoryFlagsTest : public RecordTest {};

// A request that was never sent must not pass on the "0" an earlier answer left.
TEST_F(FactoryFlagsTest, EfsGoldenCopyNeedsAnAnswer) {
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
  const bool started = wait_until([&] { return entered > 0; });
  EXPECT_EQ(call_handler(jvkj_handler, "AT+JVKJ=1").status, RESULT_OK);  // starts none
  release = true;
  ASSERT_TRUE(started);
  ASSERT_TRUE(wait_until([] { return !root_integrity_check_running && running_workers() == 0; }));
  EXPECT_EQ(shell_commands(), (Lines{"/system/bin/sh -c \"richk > data/rooIntegityCheck.txt\"",
                                     "/system/bin/sh -c \"chmod 666 /data/rooIntegityCheck.txt\""}));
}

}  // namespace
