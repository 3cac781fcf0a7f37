#include "commands/usb_adb.h"

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"
#include "tests/unit/worker_port.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kUsb = "prop:persist.sys.usb.config";

void adb_open(ulda_nvram& r) { r.adb_flag = 1; }
void adb_closed(ulda_nvram& r) { r.adb_flag = 0; }

const HandlerCase kRows[] = {
    {"open", jvadb_handler, "AT+JVADB=1", {{kUsb, "mtp,adb"}}, OK, "", {},
     {{kUsb, "diag,serial_smd,serial_tty,rmnet_bam,mass_storage,adb"}, {"prop:persist.sys.kroem", "1"},
      {"/data/at_test", kAbsent}}, adb_closed, adb_open},
    {"query", jvadb_handler, "AT+JVADB=2", {}, OK, "\n\"1\"\r\n", {}, {}, adb_open},
    // A record that cannot be read still answers OK, with an empty body.
    {"query_unreadable", jvadb_handler, "AT+JVADB=2", {{"/persist/ulda_nvram", "short"}}, OK, ""},
    // A failed close leaves USB as it was, so that the station can retry over the same link.
    {"close_unreadable", jvadb_handler, "AT+JVADB=0,0", {{"/persist/ulda_nvram", "short"}}, ERR, "", {}, {{kUsb, ""}}},
    {"close_unwritable", jvadb_handler, "AT+JVADB=0,3", {{"/persist/ulda_nvram.tmp/x", ""}}, ERR, "", {}, {{kUsb, ""}}},
    {"close_no_scratch", jvadb_handler, "AT+JVADB=0,1", {{"/data", kAbsent}}, ERR, "", {}, {{kUsb, ""}}, adb_open,
     adb_closed},
    // "." leaves the card's directory there and empty.
    {"mass_storage_empty_card", omenu_handler, "AT+OMENU=1,1", {{"/storage/sdcard0/.", ""}}, ERR, ""},
    {"mass_storage", omenu_handler, "AT+OMENU=1,1", {{"/storage/sdcard0/a.jpg", "x"}}, OK, "",
     {"am broadcast -a kro.intent.action.CHANGE_USBMASS -e status 1"}},
};

INSTANTIATE_TEST_SUITE_P(UsbAdb, HandlerTable, ::testing::ValuesIn(kRows), case_name);

class UsbAdbTest : public PortTest {};

// Each AT+JVADB=0,3 starts a watch of its own; each ends, shutting the phone down, once the
// cable is pulled.
TEST_F(UsbAdbTest, EachWatchEndsWhenTheCableIsPulled) {
  const Lines close = {"am broadcast -a android.intent.ACTION_AT_RESERT_NETWORK_MODE",
                       "/system/bin/sh -c \"rm -r /storage/sdcard0/ram_dump\"",
                       "am broadcast -a android.intent.action.RESTART_ATCID --ei em 4",
                       "/system/bin/sh -c \"rm /cache/recovery/last_ssid_pwd\""};
  write_file("/sys/class/power_supply/usb/online", "1\n");
  Lines expected;
  for (int i = 0; i < 2; ++i) {
    put_record(patterned(adb_open));
    EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_OK);
    expected.insert(expected.end(), close.begin(), close.end());
  }
  EXPECT_EQ(running_workers(), 2);
  EXPECT_EQ(drain(), "AT+JVADB=0,3\r\nOK\r\nAT+JVADB=0,3\r\nOK\r\n");
  EXPECT_EQ(record_bytes(), bytes_of(patterned(adb_closed)));
  EXPECT_EQ(get_property("persist.sys.usb.config"), "charging");
  write_file("/sys/class/power_supply/usb/online", "0\n");
  ASSERT_TRUE(wait_until([] { return running_workers() == 0; }));
  expected.insert(expected.end(), 2, "am broadcast -a kro.intent.action.AT_SHUT_DOWN");
  EXPECT_EQ(shell_commands(), expected);
}

}  // namespace
