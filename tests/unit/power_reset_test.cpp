#include "commands/power_reset.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/command.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Commands = std::vector<std::string>;

const std::string kRebootRecovery = "/system/bin/sh -c \"reboot recovery\"";
const std::string kKeepList = "/storage/sdcard0/.clear_sdcard.cfg";
const std::string kNeedPackage = "\r\n\"Need oem or apps package!\"\r\n";
const std::string kMissingKeepList = "\r\n\"SDcard missing .clear_sdcard.cfg file!\"\r\n";

class PowerResetTest : public PortTest {
 protected:
  void SetUp() override {
    PortTest::SetUp();
    make_dir("/storage/sdcard0");
    std::filesystem::create_directory_symlink("storage/sdcard0", host_path("/sdcard"));
  }
  void set_operator(const char* name) {
    put_record(patterned([name](ulda_nvram& r) { set_ulda_string(r.optr_flag, name); }));
  }
};

TEST_F(PowerResetTest, PowerOffAndRestartAnswerFirst) {
  struct Case {
    CommandHandler handler;
    const char* line;
    const char* early;
    const char* power;
  };
  const Case cases[] = {
      {jvgj_handler, "AT+JVGJ=0", "AT+JVGJ=0\r\nOK\r\n", "power-off\n"},
      {jvgj_handler, "at+jvgj=0", "AT+JVGJ=0\r\nOK\r\n", "power-off\n"},
      {jvreboot_handler, "AT+JVREBOOT=1", "AT+JVREBOOT=1\r\nOK\r\n", "restart\n"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.line);
    std::filesystem::remove(host_path("/.emu/power.log"));
    EXPECT_EXIT(call_handler(c.handler, c.line), ::testing::ExitedWithCode(0), "");
    EXPECT_EQ(read_file("/.emu/power.log"), c.power);
    EXPECT_EQ(drain(), c.early);
  }
  for (const char* line : {"AT+JVGJ=0\t", "AT+JVGJ=1", "AT+JVGJ"})
    EXPECT_EQ(call_handler(jvgj_handler, line).status, RESULT_ERROR) << line;
  EXPECT_EQ(call_handler(jvreboot_handler, "AT+JVREBOOT=0").status, RESULT_ERROR);
  EXPECT_EQ(drain(), "");
}

TEST_F(PowerResetTest, MasterClearWritesTheWipeCommandAndArmsTheRecord) {
  shell_action() = [this](const std::string& command) {
    if (command.find("mkdir /cache/recovery") != std::string::npos) make_dir("/cache/recovery");
    return 0;
  };
  EXPECT_EQ(call_handler(jvrt_handler, "AT+JVRT=1").status, RESULT_OK);
  EXPECT_EQ(read_file("/cache/recovery/command"), std::string("--wipe_data\0", 12));
  EXPECT_EQ(record_bytes(), bytes_of(patterned([](ulda_nvram& r) {
              r.master_clear_flag = 13;
              r.master_clear_armed = 1;
            })));
  EXPECT_EQ(drain(), "AT+JVRT=1\r\nOK\r\n");
  EXPECT_EQ(shell_commands(),
            (Commands{"/system/bin/sh -c \"mkdir /cache/recovery\"", kRebootRecovery}));
  EXPECT_EQ(call_handler(jvrt_handler, "AT+JVRT=0").body, "\r\n\"13\"\r\n");

  // A record that cannot be changed stops before the answer and the reboot.
  shell_commands().clear();
  break_record_writes();
  EXPECT_EQ(call_handler(jvrt_handler, "AT+JVRT=1").status, RESULT_ERROR);
  EXPECT_EQ(drain(), "");
  EXPECT_TRUE(shell_commands().empty());
  EXPECT_EQ(call_handler(jvrt_handler, "AT+JVRT=2").status, RESULT_ERROR);
}

TEST_F(PowerResetTest, RestoreNeedsTheKeepList) {
  HandlerAnswer a = call_handler(jvrtall_handler, "AT+JVRTALL=1");
  EXPECT_EQ(a.status, RESULT_ERROR);
  EXPECT_EQ(a.body, kMissingKeepList);
  write_file(kKeepList, "DCIM\n");
  a = call_handler(jvrtall_handler, "AT+JVRTALL=1");
  EXPECT_EQ(a.status, RESULT_OK);
  EXPECT_EQ(a.body, "");
  EXPECT_EQ(shell_commands(), (Commands{"am broadcast -a kro.intent.action.AT_RESTORE"}));
}

TEST_F(PowerResetTest, OperatorPackageThroughRecovery) {
  make_dir("/cache/recovery");
  HandlerAnswer a = call_handler(jvupdate_handler, "AT+JVUPDATE=3,CMCC");
  EXPECT_EQ(a.status, RESULT_ERROR);
  EXPECT_EQ(a.body, "\r\n\"Package /storage/sdcard0/oem_CMCC.zip not found!\"\r\n");
  EXPECT_EQ(call_handler(jvupdate_handler, "AT+JVUPDATE=3").status, RESULT_ERROR);

  // No truncation: the tail of a longer earlier command stays.
  const std::string command = "--update_package=/storage/sdcard0/oem_CMCC.zip/mode=update_local";
  write_file("/cache/recovery/command", command + "TAIL");
  write_file("/storage/sdcard0/oem_CMCC.zip", "zip");
  a = call_handler(jvupdate_handler, "AT+JVUPDATE=3,CMCC");
  EXPECT_EQ(a.status, RESULT_OK);
  EXPECT_EQ(read_file("/cache/recovery/command"), command + "TAIL");
  EXPECT_EQ(drain(), "AT+JVUPDATE=3,CMCC\r\n\r\nOK\r\n");
  EXPECT_EQ(shell_commands(), (Commands{kRebootRecovery}));
}

TEST_F(PowerResetTest, UpdateFromTheCard) {
  struct Case {
    const char* name;
    const char* line;
    const char* operator_name;
    std::vector<std::string> card;
    bool keep_list;
    int status;
    std::string body;
    Commands shell;
    bool restore;
  };
  const std::string update = "am broadcast -n com.ulda.engineermode/.UpdateSWReceiver -a android.flashOP.UpdateSW -e mode ";
  const Case cases[] = {
      {"nothing", "AT+JVUPDATE=1", "CMCC", {}, true, RESULT_ERROR, kNeedPackage, {}, false},
      {"empty_operator", "AT+JVUPDATE=1", "", {"oem_test.log"}, true, RESULT_ERROR, kNeedPackage, {}, false},
      {"other_operator", "AT+JVUPDATE=1", "CMCC", {"oem_CU.zip"}, true, RESULT_ERROR, kNeedPackage, {}, false},
      {"no_keep_list", "AT+JVUPDATE=1", "CMCC", {"oem_CMCC.zip"}, false, RESULT_ERROR, kMissingKeepList, {}, false},
      {"oem_only", "AT+JVUPDATE=1", "CMCC", {"oem_CMCC.zip"}, true, RESULT_OK, "", {update + "update_local -e optr CMCC"}, false},
      {"oem_with_restore", "AT+JVUPDATE=2", "CMCC", {"oem_CMCC.zip"}, true, RESULT_OK, "", {update + "update_with_clean -e optr CMCC"}, true},
      {"apps_other_version", "AT+JVUPDATE=2", "CMCC", {"oem_CMCC.zip", "apps.zip"}, true, RESULT_ERROR,
       "\r\nAPP version is not consistent with the software version!\r\n", {}, false},
      {"apps_only_other_version", "AT+JVUPDATE=1", "", {"apps.zip"}, true, RESULT_ERROR,
       "\r\nAPP version is not consistent with the software version!\r\n", {}, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    std::filesystem::remove_all(host_path("/storage/sdcard0"));
    make_dir("/storage/sdcard0");
    for (const std::string& file : c.card) write_file("/storage/sdcard0/" + file, "not a zip");
    if (c.keep_list) write_file(kKeepList, "DCIM\n");
    set_operator(c.operator_name);
    set_property("persist.sys.is_kro_log", "1");
    shell_commands().clear();
    const HandlerAnswer a = call_handler(jvupdate_handler, c.line);
    EXPECT_EQ(a.status, c.status);
    EXPECT_EQ(a.body, c.body);
    EXPECT_EQ(shell_commands(), c.shell);
    const std::string name = c.operator_name;
    ulda_nvram expected = patterned([&](ulda_nvram& r) { set_ulda_string(r.optr_flag, name.c_str()); });
    if (c.restore) {
      expected.master_clear_armed = 0;
      expected.master_clear_flag = 256;
    }
    EXPECT_EQ(record_bytes(), bytes_of(expected));
    EXPECT_EQ(get_property("persist.sys.is_kro_log"), c.restore ? "0" : "1");
    EXPECT_EQ(drain(), "");
  }
  EXPECT_EQ(call_handler(jvupdate_handler, "AT+JVUPDATE=4").status, RESULT_ERROR);
}

}  // namespace
