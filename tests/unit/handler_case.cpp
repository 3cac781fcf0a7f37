#include "tests/unit/handler_case.h"

#include <cctype>
#include <filesystem>

#include "tests/unit/handler_call.h"

namespace {

bool starts_with(const std::string& key, const char* prefix) { return key.rfind(prefix, 0) == 0; }

}  // namespace

void PrintTo(const HandlerCase& c, std::ostream* os) { *os << c.name << " (" << c.line << ")"; }

std::string case_name(const ::testing::TestParamInfo<HandlerCase>& info) {
  std::string name = info.param.name;
  for (char& ch : name)
    if (!std::isalnum(static_cast<unsigned char>(ch))) ch = '_';
  return name;
}

void HandlerTable::run_case(const HandlerCase& c) {
  bool own_record = false;
  put_record(patterned(c.record_before));
  for (const auto& [key, value] : c.before) {
    if (starts_with(key, "prop:")) {
      set_property(key.substr(5), value);
    } else if (key == "flag:uart") {
      is_uart_flag = value == "1";
    } else if (key == "flag:sp") {
      is_sp = value == "1";
    } else {
      own_record = own_record || key == "/persist/ulda_nvram";
      if (value == kAbsent)
        std::filesystem::remove_all(host_path(key));
      else
        write_file(key, value);
    }
  }
  shell_action() = [this, &c](const std::string&) {
    for (const auto& [path, content] : c.shell_writes) write_file(path, content);
    return c.shell_status;
  };

  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
  EXPECT_EQ(shell_commands(), c.shell);
  bool port_named = false;
  for (const auto& [key, value] : c.after) {
    if (key == "port") {
      port_named = true;
      EXPECT_EQ(drain(), value) << "port";
    } else if (starts_with(key, "prop:")) {
      EXPECT_EQ(get_property(key.substr(5)), value) << key;
    } else if (value == kAbsent) {
      EXPECT_FALSE(exists(key)) << key;
    } else {
      EXPECT_EQ(read_file(key), value) << key;
    }
  }
  if (!port_named) {
    EXPECT_EQ(drain(), "") << "port";
  }
  if (!own_record) {
    const RecordTest::Change both = [&c](ulda_nvram& r) {
      if (c.record_before) c.record_before(r);
      if (c.record_after) c.record_after(r);
    };
    EXPECT_EQ(record_bytes(), bytes_of(patterned(both))) << "factory record";
  }
}

TEST_P(HandlerTable, AnswersAndEffects) { run_case(GetParam()); }
