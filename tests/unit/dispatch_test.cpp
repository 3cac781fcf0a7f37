#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstring>
#include <set>
#include <string>
#include <string_view>

#include "core/command.h"
#include "core/dispatch.h"
#include "core/reader.h"
#include "core/transport.h"
#include "core/startup.h"
#include "tests/unit/device_root.h"
#include "tests/unit/station_port.h"

namespace {

class TransportTest : public DeviceRootTest {
 protected:
  void TearDown() override {
    port_.close();
    DeviceRootTest::TearDown();
  }
  void use_socket() { port_.open(PortKind::socket); }
  void use_tty() { port_.open(PortKind::tty); }
  std::string drain() { return port_.drain(); }

  StationPort port_;
};

std::string block(std::string_view text) {
  std::string b(text);
  b.resize(2048, '\0');
  return b;
}

}  // namespace

TEST(Dispatch, FormClasses) {
  const struct {
    const char* line;
    int form;
  } cases[] = {
      {"", OP_INVALID},           {"A", OP_INVALID},          {"AT", OP_BASIC},
      {"ATD112;", OP_BASIC},      {"ATI", OP_BASIC},          {"AT+JVCN=?", OP_TEST},
      {"AT+JVCN?", OP_READ},      {"AT+JVCN?X=1", OP_READ},   {"AT+JVCN=1", OP_SET},
      {"AT+JVCN=1?", OP_READ},    {"AT+JVCN", OP_ACTION},     {"AT+", OP_ACTION},
  };
  for (const auto& c : cases) EXPECT_EQ(classify_command_form(c.line), c.form) << c.line;
}

TEST(Dispatch, TableHas144UniqueUpperCaseRowsThatTakeSetAndAction) {
  std::set<std::string> names;
  for (const CommandEntry& row : command_table) {
    const std::string name(row.name);
    EXPECT_LT(name.size(), sizeof row.name);
    EXPECT_EQ(name.rfind("AT", 0), 0u) << name;
    for (char c : name) EXPECT_FALSE(c >= 'a' && c <= 'z') << name;
    EXPECT_EQ(row.op, OP_SET | OP_ACTION) << name;
    EXPECT_NE(row.handler, nullptr) << name;
    names.insert(name);
  }
  EXPECT_EQ(names.size(), COMMAND_COUNT);
  EXPECT_STREQ(command_table[0].name, "AT+JVCN");
  EXPECT_STREQ(command_table[59].name, "AT+JVRAM");
  EXPECT_STREQ(command_table[143].name, "AT+JVKTV");
}

TEST_F(TransportTest, TtyFramingOfEveryStatus) {
  use_tty();
  const struct {
    int status;
    std::string answer;
  } cases[] = {
      {RESULT_OK, "AT+JVCN\r\n\n1\n\r\nOK\r\n"},
      {RESULT_ERROR, "AT+JVCN\r\n\n1\n\r\nERROR\r\n"},
      {RESULT_BODY_ONLY, "AT+JVCN\r\n\n1\n\r\n\r\n"},
      {RESULT_NOT_IMPLEMENTED, "AT+JVCN\r\n\n1\n\r\nNot Implement\r\n"},
      {7, "AT+JVCN\r\n\n1\n\r\nUNKNOWN\r\n"},
      {-1, "AT+JVCN\r\n\n1\n\r\nUNKNOWN\r\n"},
  };
  for (const auto& c : cases) {
    writeDataToserialByResponseType("AT+JVCN\r\n", "1", c.status);
    EXPECT_EQ(drain(), c.answer) << c.status;
  }
}

TEST_F(TransportTest, TtyAnswerIsCutTo2047Bytes) {
  use_tty();
  const std::string body(3000, 'b');
  writeDataToserialByResponseType("AT+JVCN\r\n", body.c_str(), RESULT_OK);
  const std::string out = drain();
  EXPECT_EQ(out.size(), 2047u);
  EXPECT_EQ(out.substr(0, 10), "AT+JVCN\r\n\n");
}

TEST_F(TransportTest, SocketFramingIsThreeFullBlocks) {
  use_socket();
  writeDataToserialByResponseType("AT+JVCN\r\n", "\r\n\"x\"\r\n", RESULT_OK);
  EXPECT_EQ(drain(), block("AT+JVCN\r\n\n") + block("\r\n\"x\"\r\n\n") + block("OK\r\n\n"));
}

TEST_F(TransportTest, DispatcherAnswersKnownNamesOnly) {
  use_tty();
  char unknown[] = "AT+NOSUCH=1";
  EXPECT_EQ(process_cmd_line(unknown), 1);
  EXPECT_EQ(drain(), "");
  // A read form of a known command is refused before any handler runs.
  char read_form[] = "AT+JVLIFE?";
  EXPECT_EQ(process_cmd_line(read_form), 4);
  EXPECT_EQ(drain(), "AT+JVLIFE?\r\n\n\n\r\nNot Implement\r\n");
  // The empty name of a line that starts with '=' is in no row.
  char empty_name[] = "=AT";
  EXPECT_EQ(pemu_command_hdlr(empty_name), 0);
}

TEST_F(TransportTest, SocketReadCountsOneMore) {
  use_socket();
  port_.send("12345");
  char buf[64];
  EXPECT_EQ(readDataFromSerial(buf, sizeof buf), 6);
  port_.hang_up();
  EXPECT_EQ(readDataFromSerial(buf, sizeof buf), 1);
}

TEST_F(TransportTest, ReaderTakesOnlyReadsThatBeginWithAT) {
  use_tty();
  // Each datagram is one read, as a canonical tty delivers one line per read.
  for (const char* read : {"A\n", "T+JVCN\n", " AT+JVCN\n", "at+jvcn\n"})
    port_.send(read);
  char* line = readline(&serial);
  ASSERT_NE(line, nullptr);
  EXPECT_STREQ(line, "at+jvcn");  // the terminator is dropped; case is the reader loop's work
  EXPECT_EQ(serial.state, 3);
}

TEST_F(TransportTest, ReaderKeepsAnEarlierStartWithinOneCall) {
  use_tty();
  // A read with T at byte 1 but no A at byte 0 is taken only after an A was seen in the
  // same call; it is copied whole.
  for (const char* read : {"xT+JVCN\n", "A\n", "xT+JVCN\n"})
    port_.send(read);
  char* line = readline(&serial);
  ASSERT_NE(line, nullptr);
  EXPECT_STREQ(line, "xT+JVCN");
}

TEST_F(TransportTest, SocketLineKeepsItsLastByte) {
  use_socket();
  port_.send("AT+JVCN");
  char* line = readline(&serial);
  ASSERT_NE(line, nullptr);
  EXPECT_STREQ(line, "AT+JVCN");
  EXPECT_EQ(serial.line_len, 8);
}

TEST_F(TransportTest, ReaderLoopAnswersUnknownAndEmergencyLinesItself) {
  use_socket();
  // The loop returns after the over-long line, so the whole exchange runs in-process.
  const std::string long_line = "AT" + std::string(198, 'x');
  for (const std::string& read : {std::string("  "), std::string("ati  "), std::string("atd112;"), long_line}) {
    port_.send(read);
  }
  readerLoop(&serial);
  EXPECT_EQ(drain(), "ATI\r\nERROR\r\nATD112;\r\nOK\r\n\r\nERROR\r\n");
  ASSERT_EQ(shell_commands().size(), 1u);
  EXPECT_EQ(shell_commands()[0],
            "/system/bin/sh -c \"am broadcast -a kro.intent.action.AT_EMERG_CALL\"");
}

TEST(Startup, KernelCommandLine) {
  const struct {
    const char* text;
    bool uart;
    bool sp;
  } cases[] = {
      {"console=sendAT androidboot.uart=uart2", true, true},
      {"androidboot.uart=uart2 console=debugAT", true, false},
      {"console=sendNormal androidboot.uart=uart2", true, false},
      {"console=sendSP", false, true},
      {"console=ttyHSL0 androidboot.uart=uart2", false, false},
      {"console=sendAT  androidboot.uart=uart2", false, true},
      {"console=sendAT androidboot.uart=uart1", false, true},
      {"console androidboot.uart", false, false},
      {"", false, false},
  };
  for (const auto& c : cases) {
    char text[128];
    std::strcpy(text, c.text);
    const KernelCmdlineFlags flags = scan_kernel_cmdline(text);
    EXPECT_EQ(flags.uart, c.uart) << c.text;
    EXPECT_EQ(flags.sp, c.sp) << c.text;
  }
}
