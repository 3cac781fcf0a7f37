#include "commands/file_transfer.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <string>
#include <vector>

#include "core/command.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/record_fixture.h"

namespace {

using Chunks = std::vector<std::string>;

// Two characters per byte, each nibble as 0x30 + n.
std::string encode(const std::string& bytes) {
  std::string text;
  for (unsigned char b : bytes) {
    text += static_cast<char>(0x30 + (b >> 4));
    text += static_cast<char>(0x30 + (b & 0x0F));
  }
  return text;
}

std::string all_bytes() {
  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes += static_cast<char>(i);
  return bytes;
}

// Lines of `width` characters, each ended by a line feed, as a station sends them on a tty.
Chunks lines(const std::string& text, size_t width) {
  Chunks out;
  for (size_t i = 0; i < text.size(); i += width) out.push_back(text.substr(i, width) + "\n");
  return out;
}

class FileTransferTest : public PortTest {
 protected:
  // Queues the chunks, one read each, then ends the station's side: a handler that reads
  // past them sees the port fail instead of waiting for good.
  HandlerAnswer transfer(const std::string& line, const Chunks& chunks) {
    for (const std::string& c : chunks)
      EXPECT_EQ(::send(station_, c.data(), c.size(), 0), static_cast<ssize_t>(c.size()));
    ::shutdown(station_, SHUT_WR);
    return call_handler(jvfile_handler, line);
  }
  bool partial_left() const { return exists(FILE_TRANSFER_PARTIAL); }
};

TEST_F(FileTransferTest, StoresExactlyTheBytesSent) {
  struct Case {
    const char* name;
    bool socket;
    std::string line;
    Chunks chunks;
    std::string stored;
  };
  const std::string bytes = all_bytes();
  const Case cases[] = {
      {"tty_lines", false, "AT+JVFILE=1,ALL.BIN,256", [&] {
         Chunks c = lines(encode(bytes), 64);
         c.insert(c.begin() + 2, "\n");  // a stray line end alone is dropped
         return c;
       }(), bytes},
      // An odd chunk adds its pairs and loses its last character.
      {"tty_odd_chunk", false, "AT+JVFILE=1,ALL.BIN,3", {"3132333"}, "123"},
      // Hexadecimal letters keep only their low nibble: the station's encoding is the contract.
      {"tty_letters", false, "AT+JVFILE=1,ALL.BIN,1", {"4a\n"}, "A"},
      // More than announced in the last chunk is written in full.
      {"tty_overrun", false, "AT+JVFILE=1,ALL.BIN,2", {"313233\n"}, "123"},
      {"socket_straddling", true, "AT+JVFILE=1,ALL.BIN,4", {"31", "3", "2\r\n3", "334\n"}, "1234"},
      {"socket_large", true, "AT+JVFILE=1,ALL.BIN,256", {encode(bytes).substr(0, 301), encode(bytes).substr(301)}, bytes},
      {"zero_length", false, "AT+JVFILE=1,ALL.BIN,0", {}, ""},
      {"negative_length", false, "AT+JVFILE=1,ALL.BIN,-5", {}, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    use_port(c.socket ? "socket" : "/dev/ttyGS0");
    write_file("/data/all.bin", "OLD");
    shell_commands().clear();
    const HandlerAnswer a = transfer(c.line, c.chunks);
    EXPECT_EQ(a.status, RESULT_OK);
    EXPECT_EQ(a.body, "");
    EXPECT_EQ(read_file("/data/all.bin"), c.stored);
    EXPECT_FALSE(partial_left());
    EXPECT_EQ(shell_commands(), (std::vector<std::string>{"/system/bin/sh -c \"chmod 777 /data/all.bin\""}));
  }
}

TEST_F(FileTransferTest, CutTransferKeepsTheEarlierFile) {
  for (const char* port : {"/dev/ttyGS0", "socket"}) {
    SCOPED_TRACE(port);
    use_port(port);
    write_file("/data/keep.bin", "OLD");
    EXPECT_EQ(transfer("AT+JVFILE=1,keep.bin,10", {"3132\n"}).status, RESULT_ERROR);
    EXPECT_EQ(read_file("/data/keep.bin"), "OLD");
    EXPECT_FALSE(partial_left());
    use_port(port);
    EXPECT_EQ(transfer("AT+JVFILE=1,new.bin,10", {}).status, RESULT_ERROR);
    EXPECT_FALSE(exists("/data/new.bin"));
  }
  EXPECT_TRUE(shell_commands().empty());
}

TEST_F(FileTransferTest, RefusedNamesAndLengthsChangeNothing) {
  write_file("/data/target", "T");
  std::filesystem::create_symlink("target", host_path("/data/link"));
  make_dir("/data/dir");
  ASSERT_EQ(::mkfifo(host_path("/data/fifo").c_str(), 0600), 0);
  const std::string lines[] = {
      "AT+JVFILE=1,,3",
      "AT+JVFILE=1,X",
      "AT+JVFILE=1," + std::string(24, 'n') + ",1",
      "AT+JVFILE=1,A/B,1",
      "AT+JVFILE=1,.,1",
      "AT+JVFILE=1,..,1",
      "AT+JVFILE=1,LINK,1",
      "AT+JVFILE=1,DIR,1",
      "AT+JVFILE=1,FIFO,1",
      "AT+JVFILE=1,A;REBOOT,1",
      "AT+JVFILE=1,BIG,2147483648",
      "AT+JVFILE=2,LINK,00000000000000000000000000000000",
      "AT+JVFILE=2,FIFO,00000000000000000000000000000000",
      "AT+JVFILE=3,X,1",
  };
  for (const std::string& line : lines) {
    use_port("/dev/ttyGS0");
    const HandlerAnswer a = transfer(line, {"3132\n"});
    EXPECT_EQ(a.status, RESULT_ERROR) << line;
    EXPECT_EQ(a.body, "") << line;
  }
  EXPECT_EQ(read_file("/data/target"), "T");
  EXPECT_FALSE(exists("/data/big"));
  EXPECT_FALSE(partial_left());
  EXPECT_TRUE(shell_commands().empty());
  // The longest name fits.
  use_port("/dev/ttyGS0");
  EXPECT_EQ(transfer("AT+JVFILE=1," + std::string(23, 'N') + ",1", {"31\n"}).status, RESULT_OK);
  EXPECT_EQ(read_file("/data/" + std::string(23, 'n')), "1");
}

TEST_F(FileTransferTest, VerifiesTheDigestOfTheLowerCasedName) {
  write_file("/data/test.bin", "abc");
  const std::string digest = "900150983cd24fb0d6963f7d28e17f72";
  HandlerAnswer a = call_handler(jvfile_handler, "AT+JVFILE=2,TEST.bin,900150983CD24FB0D6963F7D28E17F72");
  EXPECT_EQ(a.status, RESULT_OK);
  EXPECT_EQ(a.body, "\"" + digest + "\"");
  a = call_handler(jvfile_handler, "AT+JVFILE=2,Test.BIN,900150983cd24fb0d6963f7d28e17f73");
  EXPECT_EQ(a.status, RESULT_ERROR);
  EXPECT_EQ(a.body, "\"" + digest + "\"");
  EXPECT_EQ(call_handler(jvfile_handler, "AT+JVFILE=2,test.bin,900150983cd24fb0").status, RESULT_ERROR);
  a = call_handler(jvfile_handler, "AT+JVFILE=2,none.bin," + digest);
  EXPECT_EQ(a.status, RESULT_ERROR);
  EXPECT_EQ(a.body, "can not open file:/data/none.bin");
}

}  // namespace
