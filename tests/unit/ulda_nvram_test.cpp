#include "services/ulda_nvram.h"

#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <optional>
#include <random>
#include <poll.h>
#include <set>
#include <string>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "platform/unique_fd.h"
#include "services/file_io.h"
#include "tests/unit/device_root.h"

namespace {

constexpr char kRecord[] = "/persist/ulda_nvram";
constexpr auto kPatience = std::chrono::seconds(30);

// Hands `bytes` to the next reader of the FIFO at `path` and waits until it has closed it.
bool serve_next_reader(const std::string& path, const std::string& bytes) {
  const auto deadline = std::chrono::steady_clock::now() + kPatience;
  UniqueFd fd;
  while (!(fd = UniqueFd(::open(path.c_str(), O_WRONLY | O_NONBLOCK))).ok()) {
    if (errno != ENXIO || std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  ::fcntl(fd.get(), F_SETFL, 0);
  pollfd reader_gone{fd.get(), 0, 0};
  return write_full(fd.get(), bytes.data(), bytes.size()) && ::poll(&reader_gone, 1, 30000) == 1;
}

class UldaNvramTest : public DeviceRootTest {
 protected:
  // A record whose every byte differs from its neighbours, so a shifted or stray write shows.
  static std::string pattern() {
    std::string bytes(ULDA_NVRAM_SIZE, '\0');
    for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 31 + 7);
    return bytes;
  }
  static std::string le32(uint32_t v) {
    return {static_cast<char>(v), static_cast<char>(v >> 8), static_cast<char>(v >> 16),
            static_cast<char>(v >> 24)};
  }
  static std::string field(const char* text, size_t width) {
    std::string bytes(text, std::min(std::strlen(text), width));
    bytes.resize(width, '\0');
    return bytes;
  }
  bool temp_left() const { return exists("/persist/ulda_nvram.tmp"); }
};

TEST_F(UldaNvramTest, UpdateChangesOnlyTheOwnedBytes) {
  const std::string long_text(150, 'L');
  const std::string exact_text(100, 'E');
  struct Case {
    const char* name;
    std::function<void(ulda_nvram&)> change;
    size_t offset;
    std::string bytes;
  };
  const Case cases[] = {
      {"adb_flag", [](ulda_nvram& r) { r.adb_flag = 0; }, 12, le32(0)},
      {"gsensor_offsets",
       [](ulda_nvram& r) {
         r.gsensor_offset_x = -1;
         r.gsensor_offset_y = 2;
         r.gsensor_offset_z = -300;
       },
       76, le32(-1) + le32(2) + le32(-300)},
      {"test_order short", [](ulda_nvram& r) { set_ulda_string(r.test_order, "1,2,3"); }, 140,
       field("1,2,3", 100)},
      {"test_order exact", [&](ulda_nvram& r) { set_ulda_string(r.test_order, exact_text.c_str()); },
       140, exact_text},
      {"test_order long", [&](ulda_nvram& r) { set_ulda_string(r.test_order, long_text.c_str()); },
       140, field(long_text.c_str(), 100)},
      {"optr_flag long", [](ulda_nvram& r) { set_ulda_string(r.optr_flag, "ABCDEFGHIJKLMNOPQRST"); },
       244, "ABCDEFGHIJKLMNOP"},
      {"sdcard_cali_flag", [](ulda_nvram& r) { r.sdcard_cali_flag = 88; }, 264, le32(88)},
      {"special_feature", [](ulda_nvram& r) { r.special_feature = 0x01020304; }, 324, le32(0x01020304)},
  };
  for (const Case& c : cases) {
    write_file(kRecord, pattern());
    EXPECT_EQ(update_ulda_nvram("test", [&](ulda_nvram& r) {
                c.change(r);
                return true;
              }),
              RESULT_OK)
        << c.name;
    std::string expected = pattern();
    expected.replace(c.offset, c.bytes.size(), c.bytes);
    const std::string stored = read_file(kRecord);
    ASSERT_EQ(stored.size(), ULDA_NVRAM_SIZE) << c.name;
    for (size_t i = 0; i < ULDA_NVRAM_SIZE; ++i)
      ASSERT_EQ(stored[i], expected[i]) << c.name << ": byte " << i;
    EXPECT_FALSE(temp_left()) << c.name;
  }
}

TEST_F(UldaNvramTest, NothingIsWrittenWhenTheReadOrTheChangeFails) {
  struct Case {
    const char* name;
    std::optional<std::string> content;  // none: no record
    bool change_result;
    bool change_called;
  };
  const Case cases[] = {
      {"missing", std::nullopt, true, false},
      {"empty", "", true, false},
      {"short", pattern().substr(0, ULDA_NVRAM_SIZE - 1), true, false},
      {"refused", pattern(), false, true},
  };
  for (const Case& c : cases) {
    std::filesystem::remove(host_path(kRecord));
    if (c.content) write_file(kRecord, *c.content);
    bool called = false;
    const int result = update_ulda_nvram("test", [&](ulda_nvram& r) {
      called = true;
      r.adb_flag = 99;
      return c.change_result;
    });
    EXPECT_EQ(result, RESULT_ERROR) << c.name;
    EXPECT_EQ(called, c.change_called) << c.name;
    EXPECT_EQ(exists(kRecord), c.content.has_value()) << c.name;
    if (c.content) {
      EXPECT_EQ(read_file(kRecord), *c.content) << c.name;
    }
    EXPECT_FALSE(temp_left()) << c.name;
  }
}

TEST_F(UldaNvramTest, PutFailsCleanly) {
  ulda_nvram record{};
  EXPECT_NE(put_ULDA_NV_item(&record), 0) << "no /persist";
  EXPECT_FALSE(exists(kRecord));

  // A temporary file left by a crash is harmless; a record that cannot be replaced is a
  // failure and leaves no temporary file behind.
  write_file("/persist/ulda_nvram.tmp", "left by a crash");
  ASSERT_EQ(put_ULDA_NV_item(&record), 0);
  EXPECT_EQ(read_file(kRecord), std::string(ULDA_NVRAM_SIZE, '\0'));
  EXPECT_FALSE(temp_left());
  std::filesystem::remove(host_path(kRecord));
  make_dir("/persist/ulda_nvram/busy");
  EXPECT_NE(put_ULDA_NV_item(&record), 0);
  EXPECT_FALSE(temp_left());
}

TEST_F(UldaNvramTest, AdbFlagPoll) {
  ulda_nvram record{};
  record.adb_flag = 1;
  const std::string set(reinterpret_cast<const char*>(&record), sizeof record);
  record.adb_flag = 0;
  const std::string cleared(reinterpret_cast<const char*>(&record), sizeof record);

  EXPECT_EQ(poll_adb_flag_cleared(), -1) << "no record";
  write_file(kRecord, cleared);
  EXPECT_EQ(poll_adb_flag_cleared(), 0);
  write_file(kRecord, set);
  EXPECT_EQ(poll_adb_flag_cleared(), -1);

  // The flag reads back 0 only on a later try: the record is a FIFO that serves each read in
  // turn, so the order holds however late either thread runs.
  std::filesystem::remove(host_path(kRecord));
  ASSERT_EQ(::mkfifo(host_path(kRecord).c_str(), 0600), 0);
  bool served = false;
  std::thread clearer([&] {
    served = serve_next_reader(host_path(kRecord), set) &&
             serve_next_reader(host_path(kRecord), cleared);
  });
  EXPECT_EQ(poll_adb_flag_cleared(), 0);
  clearer.join();
  EXPECT_TRUE(served);
}

// A writer killed at random moments: every read sees one whole record, never a mix and never
// a missing or short one.
TEST_F(UldaNvramTest, KilledWriterNeverLeavesATornRecord) {
  make_dir("/persist");
  ulda_nvram record;
  std::memset(&record, 1, sizeof record);
  ASSERT_EQ(put_ULDA_NV_item(&record), 0);

  const unsigned seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  std::set<int> seen;
  int reads = 0;
  for (int round = 0; round < 30; ++round) {
    int wrote[2];
    ASSERT_EQ(::pipe2(wrote, O_CLOEXEC), 0);
    const pid_t writer = ::fork();
    ASSERT_GE(writer, 0);
    if (writer == 0) {
      ::prctl(PR_SET_PDEATHSIG, SIGKILL);
      ulda_nvram mine;
      for (int i = 0; i < 100000; ++i) {
        std::memset(&mine, 1 + (round * 7 + i) % 250, sizeof mine);
        put_ULDA_NV_item(&mine);
        if (i == 0) [[maybe_unused]]
          const ssize_t n = ::write(wrote[1], "w", 1);
      }
      _exit(0);
    }
    ::close(wrote[1]);
    UniqueFd first_write(wrote[0]);
    ::fcntl(first_write.get(), F_SETFL, O_NONBLOCK);
    // The kill lands at a random moment after the writer's first record, however late it runs.
    const auto give_up = std::chrono::steady_clock::now() + kPatience;
    std::optional<std::chrono::steady_clock::time_point> kill_at;
    do {
      char byte;
      if (!kill_at && ::read(first_write.get(), &byte, 1) == 1)
        kill_at = std::chrono::steady_clock::now() + std::chrono::microseconds(random() % 20000);
      ulda_nvram read;
      ASSERT_EQ(get_ULDA_NV_item(&read), 0) << "read " << reads;
      const auto* bytes = reinterpret_cast<const uint8_t*>(&read);
      for (size_t i = 1; i < sizeof read; ++i)
        ASSERT_EQ(bytes[i], bytes[0]) << "torn at byte " << i << " of read " << reads;
      seen.insert(bytes[0]);
      ++reads;
    } while (std::chrono::steady_clock::now() < kill_at.value_or(give_up));
    ::kill(writer, SIGKILL);
    int status = 0;
    ASSERT_EQ(::waitpid(writer, &status, 0), writer);
  }
  ulda_nvram last;
  ASSERT_EQ(get_ULDA_NV_item(&last), 0);
  // Proof the writers did write while being read.
  EXPECT_GT(seen.size(), 5u) << reads << " reads";
}

}  // namespace
