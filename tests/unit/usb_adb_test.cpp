#include "commands/usb_adb.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "core/command.h"
#include "core/serial.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Commands = std::vector<std::string>;

const std::string kDebugFunctions = "diag,serial_smd,serial_tty,rmnet_bam,mass_storage,adb";

Commands close_adb_commands() {
  return {"am broadcast -a android.intent.ACTION_AT_RESERT_NETWORK_MODE",
          "/system/bin/sh -c \"rm -r /storage/sdcard0/ram_dump\"",
          "am broadcast -a android.intent.action.RESTART_ATCID --ei em 4",
          "/system/bin/sh -c \"rm /cache/recovery/last_ssid_pwd\""};
}

class UsbAdbTest : public PortTest {
 protected:
  void SetUp() override {
    PortTest::SetUp();
    set_property("persist.sys.usb.config", "mtp,adb");
    put_record(patterned([](ulda_nvram& r) { r.adb_flag = 1; }));
  }
  static bool wait_for_watches_to_end() {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    while (usb_watch_count.load() != 0 && std::chrono::steady_clock::now() < deadline)
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
    return usb_watch_count.load() == 0;
  }
};

TEST_F(UsbAdbTest, OpenSetsTheFlagAndTheDebugFunctions) {
  put_record(patterned([](ulda_nvram& r) { r.adb_flag = 0; }));
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=1").status, RESULT_OK);
  EXPECT_EQ(record_bytes(), bytes_of(patterned([](ulda_nvram& r) { r.adb_flag = 1; })));
  EXPECT_EQ(get_property("persist.sys.usb.config"), kDebugFunctions);
  EXPECT_EQ(get_property("persist.sys.kroem"), "1");
  EXPECT_FALSE(exists("/data/at_test"));
  EXPECT_EQ(call_handler(jvdiag_handler, "AT+JVDIAG=0").status, RESULT_OK);
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").body, "\n\"1\"\r\n");
}

TEST_F(UsbAdbTest, CloseAnswersEarlyThenSwitchesToCharging) {
  struct Case {
    const char* line;
    int uart;
    Commands extra;
  };
  const Case cases[] = {
      {"AT+JVADB=0,0", 0, {}},
      {"AT+JVADB=0,1", 0, {"am broadcast -a kro.intent.action.AT_SHUT_DOWN"}},
      {"AT+JVADB=0,0", 1, {}},  // the UART stays: only the framed answer
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.line) + (c.uart ? " uart" : ""));
    put_record(patterned([](ulda_nvram& r) { r.adb_flag = 1; }));
    set_property("persist.sys.usb.config", "mtp,adb");
    shell_commands().clear();
    is_uart_flag = c.uart;
    EXPECT_EQ(call_handler(jvadb_handler, c.line).status, RESULT_OK);
    EXPECT_EQ(drain(), c.uart ? "" : std::string(c.line) + "\r\nOK\r\n");
    EXPECT_EQ(record_bytes(), bytes_of(patterned([](ulda_nvram& r) { r.adb_flag = 0; })));
    EXPECT_EQ(get_property("persist.sys.usb.config"), "charging");
    EXPECT_EQ(get_property("persist.sys.dloadmode"), "0");
    Commands expected = close_adb_commands();
    expected.insert(expected.end(), c.extra.begin(), c.extra.end());
    EXPECT_EQ(shell_commands(), expected);
  }
  EXPECT_EQ(call_handler(jvdiag_handler, "AT+JVDIAG=0").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").body, "\n\"0\"\r\n");
}

TEST_F(UsbAdbTest, FailedCloseLeavesRecordAndUsbAlone) {
  for (const char* line : {"AT+JVADB=0,0", "AT+JVADB=0,1", "AT+JVADB=0,2", "AT+JVADB=0,3"}) {
    SCOPED_TRACE(line);
    write_file("/persist/ulda_nvram", "short");
    EXPECT_EQ(call_handler(jvadb_handler, line).status, RESULT_ERROR);
    put_record(patterned());
    break_record_writes();
    EXPECT_EQ(call_handler(jvadb_handler, line).status, RESULT_ERROR);
    std::filesystem::remove(host_path("/persist/ulda_nvram.tmp"));
    EXPECT_EQ(record_bytes(), bytes_of(patterned()));
  }
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=1").status, RESULT_OK);
  std::filesystem::remove_all(host_path("/data"));  // the scratch file cannot be made
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,0").status, RESULT_ERROR);
  EXPECT_EQ(get_property("persist.sys.usb.config"), kDebugFunctions);
  EXPECT_EQ(drain(), "");
  EXPECT_TRUE(shell_commands().empty());
  // A record that cannot be read answers OK with an empty body.
  write_file("/persist/ulda_nvram", "");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").body, "");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=2").status, RESULT_OK);
  EXPECT_EQ(call_handler(jvdiag_handler, "AT+JVDIAG=0").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,4").status, RESULT_ERROR);
}

TEST_F(UsbAdbTest, RestartAfterClose) {
  EXPECT_EXIT(call_handler(jvadb_handler, "AT+JVADB=0,2"), ::testing::ExitedWithCode(0), "");
  EXPECT_EQ(read_file("/.emu/power.log"), "restart\n");
  EXPECT_EQ(drain(), "AT+JVADB=0,2\r\nOK\r\n");
}

TEST_F(UsbAdbTest, EachWatchEndsWhenTheCableIsPulled) {
  write_file("/sys/class/power_supply/usb/online", "1\n");
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_OK);
  put_record(patterned([](ulda_nvram& r) { r.adb_flag = 1; }));
  EXPECT_EQ(call_handler(jvadb_handler, "AT+JVADB=0,3").status, RESULT_OK);
  EXPECT_EQ(usb_watch_count.load(), 2);
  write_file("/sys/class/power_supply/usb/online", "0\n");
  ASSERT_TRUE(wait_for_watches_to_end());
  const Commands once = close_adb_commands();
  Commands expected = once;
  expected.insert(expected.end(), once.begin(), once.end());
  expected.insert(expected.end(), 2, "am broadcast -a kro.intent.action.AT_SHUT_DOWN");
  EXPECT_EQ(shell_commands(), expected);
}

TEST_F(UsbAdbTest, UsbFunctionsAndMassStorage) {
  struct Case {
    const char* line;
    int status;
    const char* config;
  };
  const Case cases[] = {
      {"AT+JVCOM=1,DIAG", RESULT_OK, "diag,adb"},
      {"at+jvcom=1,adb", RESULT_OK, "adb"},
      {"AT+JVCOM=1,NMEA", RESULT_OK, "serial_smd,serial_tty"},
      {"AT+JVCOM=1,MTP", RESULT_ERROR, "serial_smd,serial_tty"},
      {"AT+JVCOM=1,ADB ", RESULT_ERROR, "serial_smd,serial_tty"},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(call_handler(jvcom_handler, c.line).status, c.status) << c.line;
    EXPECT_EQ(get_property("persist.sys.usb.config"), c.config) << c.line;
  }
  make_dir("/storage/sdcard0");
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=1,1").status, RESULT_ERROR);
  EXPECT_TRUE(shell_commands().empty());
  write_file("/storage/sdcard0/a.jpg", "x");
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=1,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=0,1").status, RESULT_OK);
  EXPECT_EQ(call_handler(omenu_handler, "AT+OMENU=1,0").status, RESULT_ERROR);
  EXPECT_EQ(shell_commands(),
            (Commands{"am broadcast -a kro.intent.action.CHANGE_USBMASS -e status 1",
                      "am broadcast -a kro.intent.action.CHANGE_USBMASS -e status 0"}));
}

}  // namespace
