#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "commands/clock_language.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Commands = std::vector<std::string>;

class ClockTest : public DeviceRootTest {};

TEST_F(ClockTest, ParsesDateOutput) {
  struct Case {
    const char* output;  // what `date` left in the scratch file; nullptr: nothing
    int status;
    std::string body;
  };
  auto body = [](const char* date, const char* time, const char* week) {
    return std::string("\r\n\"") + date + "\"\r\n\"" + time + "\"\r\n\"" + week + "\"\r\n";
  };
  const Case cases[] = {
      {"Sun Nov 15 08:20:00 UTC 2026\n", RESULT_OK, body("2026-11-15", "08:20:00", "7")},
      // busybox pads a one-digit day with a blank
      {"Mon Nov  2 08:20:00 UTC 2026\n", RESULT_OK, body("2026-11-2", "08:20:00", "1")},
      {"Sat Dec 31 23:59:59 CST 2022\r\n", RESULT_OK, body("2022-12-31", "23:59:59", "6")},
      {"Wed Jan 07 00:00:00 UTC 2026", RESULT_OK, body("2026-1-07", "00:00:00", "3")},
      {"Xyz Foo 15 08:20:00 UTC 2026\n", RESULT_OK, body("2026-13-15", "08:20:00", "8")},
      {"Sun Nov 15 08:20:00 2026\n", RESULT_ERROR, ""},
      {"Sun Nov 15 08:20:00 UTC \n", RESULT_ERROR, ""},
      {"", RESULT_ERROR, ""},
      {nullptr, RESULT_ERROR, ""},
  };
  make_dir("/data");
  for (const Case& c : cases) {
    shell_commands().clear();
    std::filesystem::remove(host_path("/data/systemtime"));
    shell_action() = [this, &c](const std::string&) {
      if (c.output != nullptr) write_file("/data/systemtime", c.output);
      return 0;
    };
    const HandlerAnswer answer = call_handler(get_system_time_handler, "AT+JVSJ=0");
    EXPECT_EQ(answer.status, c.status) << (c.output ? c.output : "none");
    EXPECT_EQ(answer.body, c.body) << (c.output ? c.output : "none");
    EXPECT_EQ(shell_commands(), Commands{"/system/bin/sh -c \"date > /data/systemtime\""});
  }
}

TEST_F(ClockTest, SetsDateWithCheckedFields) {
  struct Case {
    const char* line;
    int shell_status;
    int status;
    const char* command;  // nullptr: nothing runs
  };
  const char* kSet = "/system/bin/sh -c \"date -s 20261115.082000 \"";
  const Case cases[] = {
      {"AT+JVSJ=1,2026-11-15,08:20:00", 0, RESULT_OK, kSet},
      {"AT+JVSJ=1,2026-11-15,08:20:00", 1 << 8, RESULT_OK, kSet},  // whatever the tool says
      {"AT+JVSJ=1,2026-11-15,08:20:00,9", 0, RESULT_OK, kSet},
      {"AT+JVSJ=1,2026-1-5,8:2:0", 0, RESULT_OK, "/system/bin/sh -c \"date -s 202615.820 \""},
      {"AT+JVSJ=1,2026-11-15", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=1,2026-11-15,08:20", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=1,2026-11-15,08:20:00;REBOOT", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=1,2026-11-$(X),08:20:00", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=1,2026-11-15,08:20: 0", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=2", 0, RESULT_ERROR, nullptr},
      {"AT+JVSJ=0,1", 0, RESULT_ERROR, nullptr},
  };
  for (const Case& c : cases) {
    shell_commands().clear();
    shell_action() = [&c](const std::string&) { return c.shell_status; };
    const HandlerAnswer answer = call_handler(get_system_time_handler, c.line);
    EXPECT_EQ(answer.status, c.status) << c.line;
    EXPECT_EQ(answer.body, "") << c.line;
    EXPECT_EQ(shell_commands(), c.command ? Commands{c.command} : Commands{}) << c.line;
  }
}

class LanguageTest : public DeviceRootTest {};

TEST_F(LanguageTest, BroadcastsChanges) {
  const std::string kBroadcast =
      "am broadcast -n com.ulda.engineermode/.ATSetLanguageReceiver "
      "-a kro.intent.action.AT_SET_LANGUAGE ";
  struct Case {
    CommandHandler handler;
    const char* line;
    const char* language;  // "persist.sys.language" before; nullptr: unset
    int status;
    std::string body;
    std::string extras;  // of the one broadcast; empty: none sent
  };
  const Case cases[] = {
      {set_language_handler, "AT+JVLC=1", nullptr, RESULT_OK, "",
       "-e language default -e region default"},
      {set_language_handler, "AT+JVLC=1,ZH,CN", nullptr, RESULT_OK, "", "-e language ZH -e region CN"},
      {set_language_handler, "AT+JVLC=1,ZH", nullptr, RESULT_ERROR, "", ""},
      {set_language_handler, "AT+JVLC=1,", nullptr, RESULT_ERROR, "", ""},
      {set_language_handler, "AT+JVLC=1,ZH,C N", nullptr, RESULT_ERROR, "", ""},
      {set_language_handler, "AT+JVLC=1,ZH,$(ID)", nullptr, RESULT_ERROR, "", ""},
      {set_language_handler, "AT+JVLC=0", nullptr, RESULT_OK, "\"en\",\"US\"", ""},
      {set_language_handler, "AT+JVLC=0", "zh", RESULT_OK, "\"zh\",\"CN\"", ""},
      {set_language_handler, "AT+JVLC=2", nullptr, RESULT_ERROR, "", ""},
      {set_default_language_handler, "AT+JVLANGUAGE=1", "zh", RESULT_OK, "", ""},
      {set_default_language_handler, "AT+JVLANGUAGE=1", nullptr, RESULT_OK, "",
       "-e language zh -e region CN"},
      {set_default_language_handler, "AT+JVLANGUAGE=0", nullptr, RESULT_OK, "", ""},
      {set_default_language_handler, "AT+JVLANGUAGE=0", "EN", RESULT_OK, "", ""},
      {set_default_language_handler, "AT+JVLANGUAGE=0", "zh", RESULT_OK, "",
       "-e language en -e region US"},
      {set_default_language_handler, "AT+JVLANGUAGE=2", "zh", RESULT_ERROR, "", ""},
  };
  for (const Case& c : cases) {
    shell_commands().clear();
    std::filesystem::remove(host_path("/dev/__properties__/persist.sys.language"));
    std::filesystem::remove(host_path("/dev/__properties__/persist.sys.country"));
    if (c.language != nullptr) {
      set_property("persist.sys.language", c.language);
      set_property("persist.sys.country", "CN");
    }
    const HandlerAnswer answer = call_handler(c.handler, c.line);
    EXPECT_EQ(answer.status, c.status) << c.line;
    EXPECT_EQ(answer.body, c.body) << c.line;
    EXPECT_EQ(shell_commands(), c.extras.empty() ? Commands{} : Commands{kBroadcast + c.extras})
        << c.line;
  }
}

}  // namespace
