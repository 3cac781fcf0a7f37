#include "commands/power_reset.h"

#include "tests/unit/handler_case.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kCommandFile = "/cache/recovery/command";
const std::string kPackage = "/storage/sdcard0/oem_CMCC.zip";
const std::string kNeedPackage = "\r\n\"Need oem or apps package!\"\r\n";
const std::string kUpdate = "am broadcast -n com.ulda.engineermode/.UpdateSWReceiver -a android.flashOP.UpdateSW -e mode ";
const std::string kInstall = "--update_package=/storage/sdcard0/oem_CMCC.zip/mode=update_local";
const Pairs kCard = {{kPackage, ""}, {"/sdcard/.clear_sdcard.cfg", ""}};

RecordTest::Change optr(const char* name) { return [name](ulda_nvram& r) { set_ulda_string(r.optr_flag, name); }; }
void restore(ulda_nvram& r) { r.master_clear_armed = 0; r.master_clear_flag = 256; }

const HandlerCase kRows[] = {
    // The whole line is compared: a trailing blank does not power the phone off.
    {"power_off_near_miss", jvgj_handler, "AT+JVGJ=0\t", {}, ERR, ""},
    {"restore_no_keep_list", jvrtall_handler, "AT+JVRTALL=1", {}, ERR, "\r\n\"SDcard missing .clear_sdcard.cfg file!\"\r\n"},
    // The command file is written first; a failed record answers nothing early.
    {"master_clear_record_fails", jvrt_handler, "AT+JVRT=1", {{kCommandFile, "old"}, {"/persist/ulda_nvram.tmp/x", ""}},
     ERR, "", {}, {{kCommandFile, std::string("--wipe_data", 12)}}},
    {"operator_package_missing", jvupdate_handler, "AT+JVUPDATE=3,CMCC", {}, ERR,
     "\r\n\"Package /storage/sdcard0/oem_CMCC.zip not found!\"\r\n"},
    // The command file is not truncated: a longer earlier command keeps its tail.
    {"operator_package", jvupdate_handler, "AT+JVUPDATE=3,CMCC", {{kCommandFile, kInstall + "TAIL"}, {kPackage, ""}}, OK,
     "", {"/system/bin/sh -c \"reboot recovery\""},
     {{kCommandFile, kInstall + "TAIL"}, {"port", "AT+JVUPDATE=3,CMCC\r\n\r\nOK\r\n"}}},
    // An empty operator flag must not take every "oem" name for its package.
    {"update_no_operator", jvupdate_handler, "AT+JVUPDATE=1", {{"/storage/sdcard0/oem_test.log", ""}}, ERR, kNeedPackage,
     {}, {}, optr("")},
    {"update_other_operator", jvupdate_handler, "AT+JVUPDATE=1", {{"/storage/sdcard0/oem_CU.zip", ""}}, ERR,
     kNeedPackage, {}, {}, optr("CMCC")},
    {"update", jvupdate_handler, "AT+JVUPDATE=1", kCard, OK, "", {kUpdate + "update_local -e optr CMCC"}, {}, optr("CMCC")},
    {"update_with_restore", jvupdate_handler, "AT+JVUPDATE=2", kCard, OK, "", {kUpdate + "update_with_clean -e optr CMCC"},
     {{"prop:persist.sys.is_kro_log", "0"}}, optr("CMCC"), restore},
};

INSTANTIATE_TEST_SUITE_P(PowerReset, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
