#include "commands/file_transfer.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <string>
#include <vector>

#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Chunks = std::vector<std::string>;

// Two characters per byte, nibble n as 0x30 + n.
std::string encode(const std::string& bytes) {
  std::string text;
  for (unsigned char b : bytes) text += {static_cast<char>(0x30 + (b >> 4)), static_cast<char>(0x30 + (b & 15))};
  return text;
}

class FileTransferTest : public PortTest {
 protected:
  // Queues the chunks, one read each, then ends the station's side: a handler that reads
  // past them sees the port fail instead of waiting for good.
  HandlerAnswer transfer(const std::string& line, const Chunks& chunks) {
    for (const std::string& c : chunks) port_.send(c);
    port_.hang_up();
    return call_handler(jvfile_handler, line);
  }
};

TEST_F(FileTransferTest, StoresExactlyTheBytesSent) {
  std::string all;
  for (int i = 0; i < 256; ++i) all += static_cast<char>(i);
  const std::string text = encode(all);
  struct Case {
    PortKind port;
    std::string line;
    Chunks chunks;
    std::string stored;
  };
  const Case cases[] = {
      // Lines of an even length; a line end alone is dropped.
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,256", {text.substr(0, 100) + "\n", "\n", text.substr(100) + "\n"}, all},
      // Each tty read on its own: an odd one adds its pairs and loses its last character.
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,3", {"3132333"}, "123"},
      // The socket is one stream: pairs straddle reads, line ends are not content.
      {PortKind::socket, "AT+JVFILE=1,ALL.BIN,4", {"31", "3", "2\r\n3", "334"}, "1234"},
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,-5", {}, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.line);
    port_.open(c.port);
    write_file("/data/all.bin", "OLD");
    shell_commands().clear();
    EXPECT_EQ(transfer(c.line, c.chunks).status, RESULT_OK);
    EXPECT_EQ(read_file("/data/all.bin"), c.stored);
    EXPECT_EQ(shell_commands(), (Chunks{"/system/bin/sh -c \"chmod 777 /data/all.bin\""}));
  }
  EXPECT_FALSE(exists(FILE_TRANSFER_PARTIAL));
}

TEST_F(FileTransferTest, RefusedNamesAndLengthsChangeNothing) {
  write_file("/data/target", "T");
  std::filesystem::create_symlink("target", host_path("/data/link"));
  ASSERT_EQ(::mkfifo(host_path("/data/fifo").c_str(), 0600), 0);
  for (const std::string line : {"AT+JVFILE=1,,3", "AT+JVFILE=1,X", "AT+JVFILE=1,A/B,1",
                                 "AT+JVFILE=1,..,1", "AT+JVFILE=1,LINK,1", "AT+JVFILE=1,A;B,1",
                                 "AT+JVFILE=1,BIG,2147483648", "AT+JVFILE=2,FIFO,0",
                                 "AT+JVFILE=1,NAME_OF_24_CHARACTERS_X4,1"}) {
    port_.open(PortKind::tty);
    const HandlerAnswer a = transfer(line, {"3132\n"});
    EXPECT_EQ(a.status, RESULT_ERROR) << line;
    EXPECT_EQ(a.body, "") << line;
  }
  EXPECT_EQ(read_file("/data/target"), "T");
  EXPECT_FALSE(exists("/data/big"));
  EXPECT_TRUE(shell_commands().empty());
  port_.open(PortKind::tty);
  EXPECT_EQ(transfer("AT+JVFILE=1,NAME_OF_23_CHARACTERS_X,1", {"31\n"}).status, RESULT_OK);
}

TEST_F(FileTransferTest, DigestMismatchAndMissingFile) {
  write_file("/data/test.bin", "abc");
  const HandlerAnswer a = call_handler(jvfile_handler, "AT+JVFILE=2,Test.BIN,900150983cd24fb0d6963f7d28e17f73");
  EXPECT_EQ(a.status, RESULT_ERROR);
  EXPECT_EQ(a.body, "\"900150983cd24fb0d6963f7d28e17f72\"");
  EXPECT_EQ(call_handler(jvfile_handler, "AT+JVFILE=2,none.bin,0").body, "can not open file:/data/none.bin");
}

}  // namespace
