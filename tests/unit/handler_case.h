// One row of a command handler's table, and the one parameterised test that runs every table:
// the phone's state before, the line, and everything the station and the phone see after it.
// A family's test file lists its rows and instantiates HandlerTable with them:
//
//   INSTANTIATE_TEST_SUITE_P(Lights, HandlerTable, ::testing::ValuesIn(rows), case_name);
//
// State keys, before and after:
//   "/dev/path" or "sys/relative"  a file's content; kAbsent: removed before, not there after
//   "prop:NAME"                    a property's value
//   "flag:uart", "flag:sp"         (before) the start-up flags, "1" to set
//   "port"                         (after) every byte the station received; when a row does not
//                                  name it, nothing may have been written
// Every row starts on the patterned factory record with `record_before` applied. After the call
// the whole record must be that record with `record_after` applied (none: unchanged), unless
// the row sets "/persist/ulda_nvram" itself, when only its keys are checked.
#pragma once

#include <gtest/gtest.h>

#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "core/command.h"
#include "tests/unit/record_fixture.h"

using Pairs = std::vector<std::pair<std::string, std::string>>;
using Lines = std::vector<std::string>;

inline const std::string kAbsent = "<absent>";

struct HandlerCase {
  std::string name;
  CommandHandler handler;
  std::string line;
  Pairs before;
  int status;
  std::string body;
  Lines shell = {};  // every command text handed to the shell, in order
  Pairs after = {};
  RecordTest::Change record_before = nullptr;
  RecordTest::Change record_after = nullptr;
  int shell_status = 0;     // the wait status the shell returns for every command
  Pairs shell_writes = {};  // files each shell command leaves behind (a tool's output)
};

void PrintTo(const HandlerCase& c, std::ostream* os);
// The name of a row in the test's name.
std::string case_name(const ::testing::TestParamInfo<HandlerCase>& info);

class HandlerTable : public PortTest, public ::testing::WithParamInterface<HandlerCase> {
 protected:
  // Sets the row's state, calls its handler as the dispatcher does and checks every effect.
  void run_case(const HandlerCase& c);
};
