// The phone's log: the level table against liblog's priorities, and the texts as liblog gets
// them, through a fake __android_log_print.
#include "core/log.h"

#include <android/log.h>
#include <gtest/gtest.h>

#include <cstdarg>
#include <cstdio>
#include <string>
#include <vector>

namespace {

struct Entry {
  int priority;
  bool tagged;
  std::string tag;
  std::string text;
};
std::vector<Entry> g_entries;

}  // namespace

extern "C" int __android_log_print(int prio, const char* tag, const char* fmt, ...) {
  char text[8192];
  va_list args;
  va_start(args, fmt);
  std::vsnprintf(text, sizeof text, fmt, args);
  va_end(args);
  g_entries.push_back({prio, tag != nullptr, tag ? tag : "", text});
  return 1;
}

TEST(PhoneLog, LevelsBecomeLiblogPriorities) {
  constexpr int kExpected[8] = {ANDROID_LOG_SILENT, ANDROID_LOG_SILENT, ANDROID_LOG_FATAL,
                                ANDROID_LOG_ERROR,  ANDROID_LOG_WARN,   ANDROID_LOG_INFO,
                                ANDROID_LOG_INFO,   ANDROID_LOG_DEBUG};
  g_entries.clear();
  for (int level = 0; level < 8; ++level) atci_log(level, 7, "f", "level %d", level);
  ASSERT_EQ(g_entries.size(), 8u);
  for (int level = 0; level < 8; ++level) {
    EXPECT_EQ(g_entries[level].priority, kExpected[level]) << "level " << level;
    EXPECT_EQ(g_entries[level].tag, "ATCID");
    EXPECT_EQ(g_entries[level].text, "7:f(): level " + std::to_string(level));
  }
}

TEST(PhoneLog, TextReachesLiblogVerbatimAndUntaggedStaysUntagged) {
  g_entries.clear();
  ATCI_LOGW("%s", "50%s done %n");
  atci_log_untagged(LOG_LVL_DEBUG, "========start %s\r\n", "x");
  ASSERT_EQ(g_entries.size(), 2u);
  EXPECT_NE(g_entries[0].text.find("(): 50%s done %n"), std::string::npos);
  EXPECT_EQ(g_entries[0].priority, ANDROID_LOG_WARN);
  EXPECT_FALSE(g_entries[1].tagged);
  EXPECT_EQ(g_entries[1].text, "========start x\r\n");
  EXPECT_EQ(g_entries[1].priority, ANDROID_LOG_DEBUG);
}
