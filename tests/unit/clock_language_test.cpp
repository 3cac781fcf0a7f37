#include "commands/clock_language.h"

#include "tests/unit/handler_case.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
constexpr CommandHandler kClock = get_system_time_handler;
constexpr CommandHandler kDefault = set_default_language_handler;
const std::string kSet = "/system/bin/sh -c \"date -s 20261115.082000 \"";
const std::string kLanguage = "prop:persist.sys.language";
const std::string kBroadcast =
    "am broadcast -n com.ulda.engineermode/.ATSetLanguageReceiver -a kro.intent.action.AT_SET_LANGUAGE -e language ";

// AT+JVSJ=0 after `date` printed `output` (kAbsent: nothing) into its scratch file; the answer
// holds the date, the time and the weekday's number.
HandlerCase clock_read(const char* name, const std::string& output, int status, const std::string& date = "",
                       const std::string& time = "", const std::string& week = "") {
  HandlerCase c{name, kClock, "AT+JVSJ=0", {}, status, "", {"/system/bin/sh -c \"date > /data/systemtime\""}};
  if (status == OK) c.body = "\r\n\"" + date + "\"\r\n\"" + time + "\"\r\n\"" + week + "\"\r\n";
  if (output != kAbsent) c.shell_writes = {{"/data/systemtime", output}};
  return c;
}

const HandlerCase kRows[] = {
    clock_read("read", "Sun Nov 15 08:20:00 UTC 2026\n", OK, "2026-11-15", "08:20:00", "7"),
    clock_read("read_day_padded_by_busybox", "Mon Nov  2 08:20:00 UTC 2026\n", OK, "2026-11-2", "08:20:00", "1"),
    clock_read("read_crlf", "Sat Dec 31 23:59:59 CST 2022\r\n", OK, "2022-12-31", "23:59:59", "6"),
    clock_read("read_unknown_names", "Xyz Foo 15 08:20:00 UTC 2026\n", OK, "2026-13-15", "08:20:00", "8"),
    clock_read("read_no_zone", "Sun Nov 15 08:20:00 2026\n", ERR),
    clock_read("read_no_output", kAbsent, ERR),
    {"set_date_fails", kClock, "AT+JVSJ=1,2026-11-15,08:20:00", {}, OK, "", {kSet}, {}, nullptr, nullptr, 1 << 8},
    // Fields go in as sent, without padding.
    {"set_short_fields", kClock, "AT+JVSJ=1,2026-1-5,8:2:0", {}, OK, "", {"/system/bin/sh -c \"date -s 202615.820 \""}},
    {"set_no_time", kClock, "AT+JVSJ=1,2026-11-15", {}, ERR, ""},
    // Station text goes into a shell command: digits only.
    {"set_not_digits", kClock, "AT+JVSJ=1,2026-11-15,08:20:00;REBOOT", {}, ERR, ""},
    {"clock_near_miss", kClock, "AT+JVSJ=0,1", {}, ERR, ""},

    {"language_default", set_language_handler, "AT+JVLC=1", {}, OK, "", {kBroadcast + "default -e region default"}},
    {"language", set_language_handler, "AT+JVLC=1,ZH,CN", {}, OK, "", {kBroadcast + "ZH -e region CN"}},
    {"language_no_region", set_language_handler, "AT+JVLC=1,ZH", {}, ERR, ""},
    {"language_empty", set_language_handler, "AT+JVLC=1,", {}, ERR, ""},
    {"language_not_a_code", set_language_handler, "AT+JVLC=1,ZH,$(ID)", {}, ERR, ""},
    {"language_read_defaults", set_language_handler, "AT+JVLC=0", {}, OK, "\"en\",\"US\""},
    {"language_read", set_language_handler, "AT+JVLC=0", {{kLanguage, "zh"}, {"prop:persist.sys.country", "CN"}}, OK,
     "\"zh\",\"CN\""},
    {"default_zh", kDefault, "AT+JVLANGUAGE=1", {}, OK, "", {kBroadcast + "zh -e region CN"}},
    {"default_en_already", kDefault, "AT+JVLANGUAGE=0", {{kLanguage, "EN"}}, OK, ""},
    {"default_en", kDefault, "AT+JVLANGUAGE=0", {{kLanguage, "zh"}}, OK, "", {kBroadcast + "en -e region US"}},
};

INSTANTIATE_TEST_SUITE_P(ClockLanguage, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
