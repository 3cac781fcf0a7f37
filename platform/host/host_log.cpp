// The Android log of a host build: logcat-style lines on standard error.
//
// A command logs some twenty lines, and a write per line cost the daemon more than the rest of
// the command. Once the daemon asks for it, a caller only stamps its line and queues it; a
// writer thread formats what has gathered and writes it in one go, lines in the order they were
// logged, within a millisecond or so. Before a shell command and at the end of the process the
// caller writes the queue out itself.
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <mutex>
#include <pthread.h>
#include <string>
#include <sys/time.h>
#include <thread>
#include <unistd.h>

#include "platform/platform.h"

namespace {

// Process and thread ids, asked once per thread instead of twice per line; a fork bumps the
// generation, so the child's thread asks again.
unsigned g_fork_generation = 0;

struct Ids {
  int pid = 0;
  int tid = 0;
  unsigned generation = ~0u;
};

const Ids& my_ids() {
  thread_local Ids ids;
  if (ids.generation != g_fork_generation) {
    ids = {static_cast<int>(::getpid()), static_cast<int>(::gettid()), g_fork_generation};
  }
  return ids;
}

// One logged line as queued: the header, then the tag and the text bytes.
struct Stamp {
  timeval tv;
  int pid;
  int tid;
  int priority;
  unsigned tag_len;  // kNoTag for an untagged line
  size_t text_len;
};
constexpr unsigned kNoTag = ~0u;

// Never destroyed: the writer thread may still run while the process ends.
struct LogState {
  // Writing, under write_mutex (held across the write, so batches leave in order). The last
  // two texts: a reader spinning on a lost connection logs the same pair forever, which
  // logcat's ring buffer absorbs on a phone but would fill a host's disk.
  std::mutex write_mutex;
  std::string recent[2];
  unsigned long suppressed = 0;
  std::string out;
  time_t clock_second = -1;  // the local time of this second, kept: it changes once a second
  tm clock{};
  // The queue, under queue_mutex.
  std::mutex queue_mutex;
  std::condition_variable queue_ready;
  std::string queue;
  bool background = false;
};

LogState& state() {
  static LogState* const log_state = new LogState;
  return *log_state;
}

// Beyond it the caller writes out itself. Small, so a writer kept off the CPU by a busy machine
// lets the queue (and the daemon's memory) grow by no more than a few dozen commands' lines.
constexpr size_t kQueueLimit = size_t{32} << 10;
constexpr auto kGather = std::chrono::microseconds(500);

void format_line(const Stamp& stamp, const char* tag, const char* text, size_t len) {
  static constexpr char kLetters[] = "??VDIWEFS";
  const int priority = stamp.priority;
  const char letter = priority >= 0 && priority <= 8 ? kLetters[priority] : '?';
  if (stamp.tv.tv_sec != state().clock_second) {
    ::localtime_r(&stamp.tv.tv_sec, &state().clock);
    state().clock_second = stamp.tv.tv_sec;
  }
  const tm& clock = state().clock;
  char line[4096];
  int n = std::snprintf(line, sizeof line, "%02d-%02d %02d:%02d:%02d.%03d %5d %5d %c %-8s: %.*s\n",
                        clock.tm_mon + 1, clock.tm_mday, clock.tm_hour, clock.tm_min, clock.tm_sec,
                        static_cast<int>(stamp.tv.tv_usec / 1000), stamp.pid, stamp.tid, letter,
                        tag ? tag : "", static_cast<int>(len), text);
  if (n < 0) return;
  if (n >= static_cast<int>(sizeof line)) {
    n = sizeof line;
    line[n - 1] = '\n';
  }
  state().out.append(line, n);
}

// Under state().write_mutex: one line through the repeat filter into state().out.
void add_line(const Stamp& stamp, const char* tag, const char* text) {
  const std::string_view message(text, stamp.text_len);
  if (message == state().recent[0] || message == state().recent[1]) {
    ++state().suppressed;
    return;
  }
  if (state().suppressed > 0) {
    char note[96];
    const int n = std::snprintf(note, sizeof note, "(the %lu lines before repeated the two above)",
                                state().suppressed);
    format_line(stamp, tag, note, n);
    state().suppressed = 0;
  }
  state().recent[0] = std::move(state().recent[1]);
  state().recent[1] = message;
  format_line(stamp, tag, text, stamp.text_len);
}

// Under state().write_mutex.
void write_out() {
  const char* p = state().out.data();
  size_t left = state().out.size();
  while (left > 0) {
    const ssize_t n = ::write(STDERR_FILENO, p, left);
    if (n <= 0) break;
    p += n;
    left -= static_cast<size_t>(n);
  }
  state().out.clear();
}

// Under state().write_mutex: every queued line, formatted and written.
void write_batch(const std::string& batch) {
  for (size_t at = 0; at < batch.size();) {
    Stamp stamp;
    std::memcpy(&stamp, batch.data() + at, sizeof stamp);
    at += sizeof stamp;
    std::string tag;
    if (stamp.tag_len != kNoTag) {
      tag.assign(batch.data() + at, stamp.tag_len);
      at += stamp.tag_len;
    }
    add_line(stamp, stamp.tag_len == kNoTag ? nullptr : tag.c_str(), batch.data() + at);
    at += stamp.text_len;
  }
  write_out();
}

// Writes out whatever is queued. The write lock is taken first, so an earlier batch still
// being written by another thread leaves before this one.
void drain() {
  const std::lock_guard write_lock(state().write_mutex);
  std::string batch;
  {
    const std::lock_guard lock(state().queue_mutex);
    batch.swap(state().queue);
  }
  write_batch(batch);
}

[[noreturn]] void writer() {
  std::string batch;
  for (;;) {
    {
      std::unique_lock lock(state().queue_mutex);
      state().queue_ready.wait(lock, [] { return !state().queue.empty(); });
    }
    // The rest of a command's lines come within microseconds: gather them into one write, and
    // keep gathering while lines come, so a busy station's commands need no wake-up call.
    do {
      std::this_thread::sleep_for(kGather);
      const std::lock_guard write_lock(state().write_mutex);
      batch.clear();
      {
        const std::lock_guard lock(state().queue_mutex);
        batch.swap(state().queue);
      }
      write_batch(batch);
    } while (!batch.empty());
  }
}

}  // namespace

void platform_log_in_background() {
  const std::lock_guard lock(state().queue_mutex);
  if (state().background) return;
  state().background = true;
  // A forked child has no writer: it logs directly, as before.
  pthread_atfork(nullptr, nullptr, [] {
    ++g_fork_generation;
    state().background = false;
  });
  std::atexit(platform_log_flush);
  std::thread(writer).detach();
}

void platform_log_flush() {
  bool background;
  {
    const std::lock_guard lock(state().queue_mutex);
    background = state().background;
  }
  if (background) drain();
}

void platform_log_write(int priority, const char* tag, const char* text) {
  size_t len = std::strlen(text);
  while (len > 0 && (text[len - 1] == '\n' || text[len - 1] == '\r')) --len;
  Stamp stamp{{}, my_ids().pid, my_ids().tid, priority,
              tag != nullptr ? static_cast<unsigned>(std::strlen(tag)) : kNoTag, len};
  ::gettimeofday(&stamp.tv, nullptr);

  std::unique_lock lock(state().queue_mutex);
  if (!state().background) {
    lock.unlock();
    const std::lock_guard write_lock(state().write_mutex);
    add_line(stamp, tag, text);
    write_out();
    return;
  }
  const bool was_empty = state().queue.empty();
  state().queue.append(reinterpret_cast<const char*>(&stamp), sizeof stamp);
  if (tag != nullptr) state().queue.append(tag, stamp.tag_len);
  state().queue.append(text, len);
  const bool full = state().queue.size() > kQueueLimit;
  lock.unlock();
  if (was_empty) state().queue_ready.notify_one();
  if (full) drain();
}
