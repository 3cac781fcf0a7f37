// The host log with its writer thread: every line written once, each thread's lines in order,
// repeats folded as before, nothing lost when the process ends. Each case runs in a child
// process (the writer thread must not stay behind in the test binary) with standard error on a
// file that the parent reads.
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <gtest/gtest.h>
#include <map>
#include <regex>
#include <sstream>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "core/log.h"
#include "platform/platform.h"

namespace {

class HostLogTest : public ::testing::Test {
 protected:
  void SetUp() override {
    char path[] = "/tmp/host_log_test.XXXXXX";
    const int fd = ::mkstemp(path);
    ASSERT_GE(fd, 0);
    ::close(fd);
    path_ = path;
  }
  void TearDown() override { ::unlink(path_.c_str()); }

  // Runs `body` in a child whose standard error is the file, with the writer thread started.
  template <typename Body>
  void in_child(Body body) {
    EXPECT_EXIT(
        {
          const int fd = ::open(path_.c_str(), O_WRONLY | O_TRUNC);
          ::dup2(fd, STDERR_FILENO);
          platform_log_in_background();
          body();
          std::exit(0);  // no flush: the end of the process must write the rest
        },
        ::testing::ExitedWithCode(0), "");
  }

  // The texts after the tag, one per line.
  std::vector<std::string> texts() const {
    std::ifstream in(path_);
    std::vector<std::string> out;
    for (std::string line; std::getline(in, line);) {
      const size_t at = line.find("ATCID   : ");
      out.push_back(at == std::string::npos ? "malformed: " + line : line.substr(at + 10));
    }
    return out;
  }

  std::string path_;
};

TEST_F(HostLogTest, EveryThreadsLinesArriveOnceAndInOrder) {
  constexpr int kThreads = 4;
  constexpr int kLines = 2000;
  in_child([] {
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
      threads.emplace_back([t] {
        for (int i = 0; i < kLines; ++i) ATCI_LOGD("thread %d line %d", t, i);
      });
    }
    for (std::thread& thread : threads) thread.join();
  });
  std::map<int, int> next;
  int lines = 0;
  for (const std::string& text : texts()) {
    int t = -1;
    int i = -1;
    ASSERT_EQ(std::sscanf(text.c_str(), "%*d:operator()(): thread %d line %d", &t, &i), 2) << text;
    ASSERT_EQ(i, next[t]) << "thread " << t;
    next[t] = i + 1;
    ++lines;
  }
  EXPECT_EQ(lines, kThreads * kLines);
}

TEST_F(HostLogTest, RepeatsAreFoldedAsWithoutTheWriter) {
  in_child([] {
    ATCI_LOGD("before");
    for (int i = 0; i < 50; ++i) {
      ATCI_LOGE("spin a");
      ATCI_LOGE("spin b");
    }
    platform_log_flush();
    ATCI_LOGI("after");
  });
  const std::vector<std::string> got = texts();
  ASSERT_EQ(got.size(), 5u);
  EXPECT_NE(got[1].find("spin a"), std::string::npos);
  EXPECT_NE(got[2].find("spin b"), std::string::npos);
  EXPECT_EQ(got[3], "(the 98 lines before repeated the two above)");
  EXPECT_NE(got[4].find("after"), std::string::npos);
}

TEST_F(HostLogTest, LinesKeepTheirLogcatShape) {
  in_child([] {
    ATCI_LOGW("short");
    ATCI_LOGI("%s", std::string(5000, 'x').c_str());
    atci_log_untagged(LOG_LVL_ERR, "untagged");
  });
  std::ifstream in(path_);
  std::vector<std::string> lines;
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  ASSERT_EQ(lines.size(), 3u);
  const std::string stamp = R"(\d\d-\d\d \d\d:\d\d:\d\d\.\d\d\d [ \d]{4}\d [ \d]{4}\d )";
  EXPECT_TRUE(std::regex_match(lines[0], std::regex(stamp + R"(W ATCID   : \d+:operator\(\)\(\): short)")))
      << lines[0];
  // Cut to 4,095 bytes before its line feed.
  EXPECT_EQ(lines[1].size(), 4095u);
  EXPECT_TRUE(std::regex_match(lines[1].substr(0, 60), std::regex(stamp + "I ATCID   : .*"))) << lines[1];
  EXPECT_EQ(lines[1].back(), 'x');
  EXPECT_TRUE(std::regex_match(lines[2], std::regex(stamp + "E         : untagged"))) << lines[2];
}

}  // namespace
