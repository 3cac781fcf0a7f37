#include "commands/usb_adb.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"
#include "tests/unit/worker_port.h"

namespace {

using Commands = std::vector<std::string>;

const Commands kCloseAdb = {"am broadcast -a android.intent.ACTION_AT_RESERT_NETWORK_MODE",
                            "/system/bin/sh -c \"rm -r /storage/sdcard0/ram_dump\"",
                            "am broadcast -a android.intent.action.RESTART_ATCID --ei em 4",
                            "/system/bin/sh -c \"rm /cache/recovery/last_ssid_pwd\""};
const std::string kShutDown = "am broadcast -a kro.intent.action.AT_SHUT_DOWN";

class UsbAdbTest : public PortTest {
 protected:
  void SetUp() override {
    PortTest::SetUp();
    set_property("persist.sys.usb.config", "mtp,adb");
    put_record(adb_open());
  }
  static ulda_nvram adb_open() { return patterned([](ulda_nvram& r) { r.adb_flag = 1; }); }
};

TEST_F(UsbAdbTest, OpenSetsTheFlagAndTheDebugFunctions) {
  put_record(patterned([](ulda_nvram& r) { r.adb_flag = 0; }));
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=1").status, RESULT_OK);
  EXPECT_EQ(record_bytes(), bytes_of(adb_open()));
  EXPECT_EQ(get_property("persist.sys.usb.config"),
            "diag,serial_smd,serial_tty,rmnet_bam,mass_storage,adb");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").body, "\n\"1\"\r\n");
}

TEST_F(UsbAdbTest, FailedCloseLeavesRecordAndUsbAlone) {
  write_file("/persist/ulda_nvram", "short");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,0").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").body, "");  // and still OK
  put_record(adb_open());
  break_record_writes();
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_ERROR);
  std::filesystem::remove(host_path("/persist/ulda_nvram.tmp"));
  std::filesystem::remove_all(host_path("/data"));  // no scratch file
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,2").status, RESULT_ERROR);
  EXPECT_EQ(get_property("persist.sys.usb.config"), "mtp,adb");
  EXPECT_EQ(drain(), "");
  EXPECT_TRUE(shell_commands().empty());
  EXPECT_EQ(running_workers(), 0);
}

TEST_F(UsbAdbTest, EachWatchEndsWhenTheCableIsPulled) {
  write_file("/sys/class/power_supply/usb/online", "1\n");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_OK);
  put_record(adb_open());
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_OK);
  EXPECT_EQ(running_workers(), 2);
  EXPECT_EQ(drain(), "AT+JVADB=0,3\r\nOK\r\nAT+JVADB=0,3\r\nOK\r\n");
  EXPECT_EQ(record_bytes(), bytes_of(patterned([](ulda_nvram& r) { r.adb_flag = 0; })));
  EXPECT_EQ(get_property("persist.sys.usb.config"), "charging");
  write_file("/sys/class/power_supply/usb/online", "0\n");
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  Commands expected = kCloseAdb;
  expected.insert(expected.end(), kCloseAdb.begin(), kCloseAdb.end());
  expected.insert(expected.end(), {kShutDown, kShutDown});
  EXPECT_EQ(shell_commands(), expected);
}

TEST_F(UsbAdbTest, MassStorageNeedsACardWithEntries) {
  make_dir("/storage/sdcard0");
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=1,1").status, RESULT_ERROR);
  EXPECT_TRUE(shell_commands().empty());
  write_file("/storage/sdcard0/a.jpg", "x");
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=1,1").status, RESULT_OK);
  EXPECT_EQ(shell_commands(),
            (Commands{"am broadcast -a kro.intent.action.CHANGE_USBMASS -e status 1"}));
}

}  // namespace
