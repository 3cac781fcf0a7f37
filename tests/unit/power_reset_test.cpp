#include "commands/power_reset.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Commands = std::vector<std::string>;

const std::string kNeedPackage = "\r\n\"Need oem or apps package!\"\r\n";

class PowerResetTest : public PortTest {
 protected:
  void SetUp() override {
    PortTest::SetUp();
    make_dir("/cache/recovery");
    write_file("/storage/sdcard0/.clear_sdcard.cfg", "DCIM\n");
    std::filesystem::create_directory_symlink("storage/sdcard0", host_path("/sdcard"));
  }
};

TEST_F(PowerResetTest, RefusedLinesAndFailedRecordsDoNotAnswerEarly) {
  EXPECT_EQ(call_handler(jvgj_handler, "AT+JVGJ=0\t").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvreboot_handler, "AT+JVREBOOT=0").status, RESULT_ERROR);
  std::filesystem::remove(host_path("/storage/sdcard0/.clear_sdcard.cfg"));
  EXPECT_EQ(call_handler(jvrtall_handler, "AT+JVRTALL=1").body,
            "\r\n\"SDcard missing .clear_sdcard.cfg file!\"\r\n");
  break_record_writes();
  EXPECT_EQ(call_handler(jvrt_handler, "AT+JVRT=1").status, RESULT_ERROR);
  EXPECT_EQ(drain(), "");
  EXPECT_TRUE(shell_commands().empty());
}

TEST_F(PowerResetTest, OperatorPackageCommandKeepsTheTailOfALongerOne) {
  EXPECT_EQ(call_handler(jvupdate_handler, "AT+JVUPDATE=3,CMCC").body,
            "\r\n\"Package /storage/sdcard0/oem_CMCC.zip not found!\"\r\n");
  const std::string command = "--update_package=/storage/sdcard0/oem_CMCC.zip/mode=update_local";
  write_file("/cache/recovery/command", command + "TAIL");
  write_file("/storage/sdcard0/oem_CMCC.zip", "zip");
  EXPECT_EQ(call_handler(jvupdate_handler, "AT+JVUPDATE=3,CMCC").status, RESULT_OK);
  EXPECT_EQ(read_file("/cache/recovery/command"), command + "TAIL");
  EXPECT_EQ(drain(), "AT+JVUPDATE=3,CMCC\r\n\r\nOK\r\n");
  EXPECT_EQ(shell_commands(), (Commands{"/system/bin/sh -c \"reboot recovery\""}));
}

TEST_F(PowerResetTest, OperatorUpdateFromTheCard) {
  struct Case {
    const char* line;
    const char* operator_name;
    const char* package;
    std::string answer;  // the body, or the broadcast's mode when it is sent
  };
  const Case cases[] = {
      {"AT+JVUPDATE=1", "", "oem_test.log", kNeedPackage},  // no operator names no package
      {"AT+JVUPDATE=1", "CMCC", "oem_CU.zip", kNeedPackage},
      {"AT+JVUPDATE=1", "CMCC", "oem_CMCC.zip", "update_local"},
      {"AT+JVUPDATE=2", "CMCC", "oem_CMCC.zip", "update_with_clean"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.line) + " " + c.package);
    write_file(std::string("/storage/sdcard0/") + c.package, "zip");
    ulda_nvram record = patterned([&](ulda_nvram& r) { set_ulda_string(r.optr_flag, c.operator_name); });
    put_record(record);
    shell_commands().clear();
    const HandlerAnswer a = call_handler(jvupdate_handler, c.line);
    std::filesystem::remove(host_path(std::string("/storage/sdcard0/") + c.package));
    if (c.answer == kNeedPackage) {
      EXPECT_EQ(a.status, RESULT_ERROR);
      EXPECT_EQ(a.body, kNeedPackage);
      EXPECT_EQ(record_bytes(), bytes_of(record));
      continue;
    }
    EXPECT_EQ(a.status, RESULT_OK);
    EXPECT_EQ(shell_commands(), (Commands{"am broadcast -n com.ulda.engineermode/.UpdateSWReceiver -a "
                                          "android.flashOP.UpdateSW -e mode " + c.answer + " -e optr CMCC"}));
    const bool restore = std::string(c.line) == "AT+JVUPDATE=2";
    if (restore) {
      record.master_clear_armed = 0;
      record.master_clear_flag = 256;
    }
    EXPECT_EQ(record_bytes(), bytes_of(record));
  }
}

}  // namespace
