// The command table's row type, the handler contract and the answer statuses.
#pragma once

#include <cstddef>
#include <cstdint>

// Handler statuses and the result word the dispatcher makes of them.
inline constexpr int RESULT_OK = 0;                 // "OK"
inline constexpr int RESULT_DONE = 1;               // the handler answered itself
inline constexpr int RESULT_ERROR = 4;              // "ERROR"
inline constexpr int RESULT_BODY_ONLY = 6;          // empty result word
inline constexpr int RESULT_NOT_IMPLEMENTED = 101;  // "Not Implement"

// Line forms, one bit each.
inline constexpr int OP_INVALID = 1;
inline constexpr int OP_BASIC = 2;
inline constexpr int OP_ACTION = 4;
inline constexpr int OP_READ = 8;
inline constexpr int OP_TEST = 16;
inline constexpr int OP_SET = 32;

inline constexpr size_t CMD_LINE_SIZE = 200;   // the handler's copy of the line
inline constexpr size_t RESPONSE_SIZE = 2048;  // the zeroed response body

// (line copy of CMD_LINE_SIZE bytes, form of the line, zeroed body of RESPONSE_SIZE bytes)
using CommandHandler = int (*)(char* cmdline, int op, char* response);

struct CommandEntry {
  char name[24];
  int32_t op;
  CommandHandler handler;
};

inline constexpr size_t COMMAND_COUNT = 144;
extern const CommandEntry command_table[COMMAND_COUNT];

// Rows whose command family is not built yet.
int pending_family_handler(char* cmdline, int op, char* response);
// The provisioning commands that have no behaviour beyond their row.
int unspecified_command_handler(char* cmdline, int op, char* response);
