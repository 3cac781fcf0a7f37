// Calls a command handler as the dispatcher does: a 200-byte copy of the line and a zeroed
// 2048-byte body, each followed by guard bytes that must come back untouched.
#pragma once

#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>

#include "core/command.h"

struct HandlerAnswer {
  int status;
  std::string body;
};

inline HandlerAnswer call_handler(CommandHandler handler, const std::string& line) {
  constexpr size_t kGuard = 64;
  constexpr char kGuardByte = '\x5a';
  std::array<char, CMD_LINE_SIZE + kGuard> cmdline{};
  std::array<char, RESPONSE_SIZE + kGuard> body{};
  std::memset(cmdline.data() + CMD_LINE_SIZE, kGuardByte, kGuard);
  std::memset(body.data() + RESPONSE_SIZE, kGuardByte, kGuard);
  line.copy(cmdline.data(), CMD_LINE_SIZE - 1);
  const int status = handler(cmdline.data(), line.find('=') != std::string::npos ? OP_SET : OP_ACTION,
                             body.data());
  for (size_t i = 0; i < kGuard; ++i) {
    EXPECT_EQ(cmdline[CMD_LINE_SIZE + i], kGuardByte) << "line buffer overrun: " << line;
    EXPECT_EQ(body[RESPONSE_SIZE + i], kGuardByte) << "body overrun: " << line;
  }
  EXPECT_EQ(body[RESPONSE_SIZE - 1], '\0') << "body not terminated: " << line;
  return {status, std::string(body.data())};
}
