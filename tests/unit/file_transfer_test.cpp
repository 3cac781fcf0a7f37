#include "commands/file_transfer.h"

#include <sys/stat.h>

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"

namespace {

class FileTransferTest : public PortTest {
 protected:
  // Queues the chunks, one read each, then ends the station's side: a handler that reads
  // past them sees the port fail instead of waiting for good.
  HandlerAnswer transfer(PortKind kind, const std::string& line, const Lines& chunks) {
    port_.open(kind);
    for (const std::string& c : chunks) port_.send(c);
    port_.hang_up();
    return call_handler(jvfile_handler, line);
  }
};

TEST_F(FileTransferTest, StoresExactlyTheBytesSent) {
  std::string all, text;  // every byte value, and its encoding: nibble n as 0x30 + n
  for (int i = 0; i < 256; ++i) {
    all += static_cast<char>(i);
    text += {static_cast<char>(0x30 + (i >> 4)), static_cast<char>(0x30 + (i & 15))};
  }
  struct Case {
    PortKind port;
    std::string line;
    Lines chunks;
    std::string stored;
  };
  const Case cases[] = {
      // Lines of an even length; a line end alone is dropped.
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,256", {text.substr(0, 100) + "\n", "\n", text.substr(100) + "\n"}, all},
      // Each tty read on its own: an odd one adds its pairs and loses its last character.
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,+3", {"3132333"}, "123"},
      // The socket is one stream: pairs straddle reads, line ends are not content.
      {PortKind::socket, "AT+JVFILE=1,ALL.BIN,4", {"31", "3", "2\r\n3", "334"}, "1234"},
      {PortKind::tty, "AT+JVFILE=1,ALL.BIN,-5", {}, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.line);
    write_file("/data/all.bin", "OLD");
    shell_commands().clear();
    EXPECT_EQ(transfer(c.port, c.line, c.chunks).status, RESULT_OK);
    EXPECT_EQ(read_file("/data/all.bin"), c.stored);
    EXPECT_EQ(shell_commands(), Lines{"/system/bin/sh -c \"chmod 777 /data/all.bin\""});
  }
  EXPECT_FALSE(exists(FILE_TRANSFER_PARTIAL));
}

TEST_F(FileTransferTest, RefusedNamesAndLengthsChangeNothing) {
  write_file("/data/target", "T");
  std::filesystem::create_symlink("target", host_path("/data/link"));
  ASSERT_EQ(::mkfifo(host_path("/data/fifo").c_str(), 0600), 0);
  for (const std::string line : {"AT+JVFILE=1,,3", "AT+JVFILE=1,X", "AT+JVFILE=1,A/B,1", "AT+JVFILE=1,..,1",
                                 "AT+JVFILE=1,LINK,1", "AT+JVFILE=1,A;B,1", "AT+JVFILE=1,BIG,2147483648",
                                 "AT+JVFILE=1,BIG,99999999999999999999", "AT+JVFILE=2,FIFO,0",
                                 "AT+JVFILE=1,NAME_OF_24_CHARACTERS_X4,1"}) {
    const HandlerAnswer a = transfer(PortKind::tty, line, {"3132\n"});
    EXPECT_EQ(a.status, RESULT_ERROR) << line;
    EXPECT_EQ(a.body, "") << line;
  }
  EXPECT_EQ(read_file("/data/target"), "T");
  EXPECT_FALSE(exists("/data/big"));
  EXPECT_TRUE(shell_commands().empty());
  EXPECT_EQ(transfer(PortKind::tty, "AT+JVFILE=1,NAME_OF_23_CHARACTERS_X,1", {"31\n"}).status, RESULT_OK);
}

// The name is lower-cased, the digest compared without case; the answer is the one computed.
const HandlerCase kRows[] = {
    {"digest", jvfile_handler, "AT+JVFILE=2,Z0.BIN,900150983CD24FB0D6963F7D28E17F72", {{"/data/z0.bin", "abc"}},
     RESULT_OK, "\"900150983cd24fb0d6963f7d28e17f72\""},
    {"digest_mismatch", jvfile_handler, "AT+JVFILE=2,TEST.BIN,900150983CD24FB0D6963F7D28E17F73",
     {{"/data/test.bin", "abc"}}, RESULT_ERROR, "\"900150983cd24fb0d6963f7d28e17f72\""},
    // A partial file that cannot be made answers ERROR and stores nothing.
    {"partial_unwritable", jvfile_handler, "AT+JVFILE=1,A.BIN,0", {{std::string(FILE_TRANSFER_PARTIAL) + "/x", ""}},
     RESULT_ERROR, "", {}, {{"/data/a.bin", kAbsent}}},
    {"digest_no_file", jvfile_handler, "AT+JVFILE=2,NONE.BIN,0", {}, RESULT_ERROR, "can not open file:/data/none.bin"},
};

INSTANTIATE_TEST_SUITE_P(FileTransfer, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
