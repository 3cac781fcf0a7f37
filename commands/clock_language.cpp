#include "commands/clock_language.h"

#include <cstdio>
#include <cstring>
#include <string_view>
#include <strings.h>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "services/factory_support.h"

namespace {

constexpr const char* kTimeScratch = "/data/systemtime";

// Index 0 holds a blank so that real names count from 1; no match gives the table's size.
constexpr std::string_view kMonthNames[] = {" ",   "Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
constexpr std::string_view kWeekdayNames[] = {" ", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat", "Sun"};

template <size_t N>
int name_number(const std::string_view (&names)[N], std::string_view field) {
  for (size_t i = 0; i < N; ++i)
    if (field.starts_with(names[i])) return static_cast<int>(i);
  return static_cast<int>(N);
}

int read_system_time(char* response) {
  char line[101];
  if (sh_first_line("date", kTimeScratch, line, sizeof line) < 0)
    return LOGGED_ERROR("/data/systemtime open file failed\n");
  ATCI_LOGD("buf=%s\n", line);
  std::string_view rest(line);
  std::string_view fields[6];
  for (std::string_view& field : fields) field = next_token(rest, " ");
  const std::string_view week = fields[0], month = fields[1], day = fields[2], time = fields[3],
                         zone = fields[4];
  std::string_view year = fields[5];
  ATCI_LOGD("========YEAR1: %.*s\n", static_cast<int>(zone.size()), zone.data());
  year = year.substr(0, year.find_first_of("\r\n"));
  if (year.empty()) return LOGGED_ERROR("date output too short: %s", line);
  char date_text[128];
  std::snprintf(date_text, sizeof date_text, "%.*s-%d-%.*s", static_cast<int>(year.size()),
                year.data(), name_number(kMonthNames, month), static_cast<int>(day.size()),
                day.data());
  ATCI_LOGD("====YEAR: %s", date_text);
  ATCI_LOGD("=====WEEK: %d", name_number(kWeekdayNames, week));
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%s\"\r\n\"%.*s\"\r\n\"%d\"\r\n", date_text,
                static_cast<int>(time.size()), time.data(), name_number(kWeekdayNames, week));
  return RESULT_OK;
}

int set_system_time(const char* cmdline) {
  ATCI_LOGD("==entry set date and time \r\n");
  // Each field ends at its own delimiter, which strtok consumes with it: 2026-11-15,08:20:00
  std::string_view rest(cmdline);
  auto field = [&rest](std::string_view ends) {
    const std::string_view token = next_token(rest, ends);
    if (!rest.empty()) rest.remove_prefix(1);
    return token;
  };
  field(",");
  static constexpr std::string_view kEnds[] = {"-", "-", ",", ":", ":", ","};
  std::string_view fields[6];
  for (size_t i = 0; i < 6; ++i) fields[i] = field(kEnds[i]);
  const auto [year, month, day, hour, minute, second] = fields;
  ATCI_LOGD("year=%.*s,month=%.*s,date=%.*s,hour=%.*s,minute=%.*s,second=%.*s\r\n",
            static_cast<int>(year.size()), year.data(), static_cast<int>(month.size()),
            month.data(), static_cast<int>(day.size()), day.data(), static_cast<int>(hour.size()),
            hour.data(), static_cast<int>(minute.size()), minute.data(),
            static_cast<int>(second.size()), second.data());
  // Station text goes into a shell command: digits only.
  for (std::string_view field : fields)
    if (!all_digits(field)) return RESULT_ERROR;
  char command[SH_COMMAND_SIZE];
  if (!sh_command_text(command, "date -s %.*s%.*s%.*s.%.*s%.*s%.*s ",
                       static_cast<int>(year.size()), year.data(), static_cast<int>(month.size()),
                       month.data(), static_cast<int>(day.size()), day.data(),
                       static_cast<int>(hour.size()), hour.data(), static_cast<int>(minute.size()),
                       minute.data(), static_cast<int>(second.size()), second.data()))
    return RESULT_ERROR;
  ATCI_LOGD(" cmd %s\n", command);
  const int ret = run_shell(command);
  ATCI_LOGD("==ret=%d \r\n", ret);
  return RESULT_OK;
}

constexpr const char* kLanguageReceiver = "com.ulda.engineermode/.ATSetLanguageReceiver";
constexpr const char* kSetLanguageAction = "kro.intent.action.AT_SET_LANGUAGE";

void broadcast_language(std::string_view language, std::string_view region) {
  char extras[CMD_LINE_SIZE + 32];
  std::snprintf(extras, sizeof extras, "-e language %.*s -e region %.*s",
                static_cast<int>(language.size()), language.data(),
                static_cast<int>(region.size()), region.data());
  sendBroadcastFromAtcid(kLanguageReceiver, kSetLanguageAction, extras);
}

// Language and region codes are letters, digits, '-' and '_': anything else would change
// the broadcast's words.
bool is_locale_code(std::string_view text) {
  if (text.empty()) return false;
  for (char c : text) {
    const bool ok = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
                    c == '-' || c == '_';
    if (!ok) return false;
  }
  return true;
}

struct DefaultLanguage {
  const char* line;
  const char* language;
  const char* region;
};

constexpr DefaultLanguage kDefaultLanguages[] = {
    {"AT+JVLANGUAGE=0", "en", "US"},
    {"AT+JVLANGUAGE=1", "zh", "CN"},
};

}  // namespace

int get_system_time_handler(char* cmdline, int, char* response) {
  ATCI_LOGD("===========cmdline %s\r\n", cmdline);
  if (line_is(cmdline, "AT+JVSJ=0")) return read_system_time(response);
  if (line_starts_with(cmdline, "AT+JVSJ=1")) return set_system_time(cmdline);
  return LOGGED_ERROR("=====this at command invalid:%s\r\n", cmdline);
}

int set_language_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVLC=1")) {
    sendBroadcastFromAtcid(kLanguageReceiver, kSetLanguageAction,
                           "-e language default -e region default");
    return RESULT_OK;
  }
  if (line_starts_with(cmdline, "AT+JVLC=1,")) {
    CommaFields fields(cmdline);
    const std::string_view language = fields.next();
    const std::string_view region = fields.next();
    if (!is_locale_code(language) || !is_locale_code(region)) return RESULT_ERROR;
    broadcast_language(language, region);
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVLC=0")) {
    char language[PROPERTY_VALUE_MAX];
    char country[PROPERTY_VALUE_MAX];
    property_get("persist.sys.language", language, "en");
    property_get("persist.sys.country", country, "US");
    std::snprintf(response, RESPONSE_SIZE, "\"%s\",\"%s\"", language, country);
    return RESULT_OK;
  }
  return RESULT_ERROR;
}

int set_default_language_handler(char* cmdline, int, char*) {
  for (const DefaultLanguage& wanted : kDefaultLanguages) {
    if (!line_is(cmdline, wanted.line)) continue;
    char current[PROPERTY_VALUE_MAX];
    property_get("persist.sys.language", current, "en");
    ATCI_LOGD("persist.sys.language : %s", current);
    if (strcasecmp(current, wanted.language) == 0) {
      ATCI_LOGD("current language : %s", wanted.language);
      return RESULT_OK;
    }
    broadcast_language(wanted.language, wanted.region);
    return RESULT_OK;
  }
  return LOGGED_ERROR("=======this at command invalid\r\n");
}
