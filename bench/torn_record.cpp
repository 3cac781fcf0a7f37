// The program of bench/torn_record.py: a factory record writer killed over and over while a
// reader checks every record it sees.
//   torn_record ROOT KILLS SEED
// ROOT is a device root with /persist. Each round forks a writer that writes whole records
// with the daemon's own put_ULDA_NV_item, every byte of a record the same and the value
// changing from record to record; the reader (this process, with get_ULDA_NV_item) reads the
// record as fast as it can until a random moment after the writer's first record, kills the
// writer with SIGKILL, and reads once more. A read that fails, or a record of mixed bytes,
// is counted; the exit status is 0 only when there was none.
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <random>
#include <set>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/platform.h"
#include "services/ulda_nvram.h"

namespace {

using Clock = std::chrono::steady_clock;

struct Counts {
  long reads = 0;
  long reads_while_writing = 0;
  long failed = 0;
  long torn = 0;
  int temporary_left = 0;  // kills that landed between the temporary file and the rename
  std::set<int> values;
};

void check_read(Counts& counts) {
  ulda_nvram record;
  std::memset(&record, 0xee, sizeof record);
  ++counts.reads;
  if (get_ULDA_NV_item(&record) != 0) {
    ++counts.failed;
    return;
  }
  const auto* bytes = reinterpret_cast<const unsigned char*>(&record);
  for (size_t i = 1; i < sizeof record; ++i) {
    if (bytes[i] != bytes[0]) {
      ++counts.torn;
      std::fprintf(stderr, "torn record: byte %zu is %d, byte 0 is %d\n", i, bytes[i], bytes[0]);
      return;
    }
  }
  counts.values.insert(bytes[0]);
}

[[noreturn]] void write_forever(int round, int ready) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  ulda_nvram record;
  for (long i = 0;; ++i) {
    std::memset(&record, 1 + static_cast<int>((round * 7 + i) % 250), sizeof record);
    if (put_ULDA_NV_item(&record) != 0) _exit(1);
    if (i == 0 && (::write(ready, "w", 1) != 1 || ::close(ready) != 0)) _exit(1);
  }
}

// Waits up to a generous deadline for the writer's first record.
bool first_record_written(int ready) {
  pollfd p{ready, POLLIN, 0};
  char byte;
  return ::poll(&p, 1, 60000) == 1 && ::read(ready, &byte, 1) == 1;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: %s ROOT KILLS SEED\n", argv[0]);
    return 2;
  }
  ::setenv("ATCID_ROOT", argv[1], 1);
  if (platform_init() != 0) return 2;
  const int kills = std::atoi(argv[2]);
  std::mt19937 random(static_cast<unsigned>(std::strtoul(argv[3], nullptr, 10)));
  ulda_nvram first;
  std::memset(&first, 1, sizeof first);
  if (put_ULDA_NV_item(&first) != 0) {
    std::fprintf(stderr, "no record can be written under %s/persist\n", argv[1]);
    return 2;
  }
  Counts counts;
  const auto start = Clock::now();
  for (int round = 0; round < kills; ++round) {
    int pipe_fds[2];
    if (::pipe2(pipe_fds, O_CLOEXEC) != 0) return 2;
    const pid_t writer = ::fork();
    if (writer < 0) return 2;
    if (writer == 0) {
      ::close(pipe_fds[0]);
      write_forever(round, pipe_fds[1]);
    }
    ::close(pipe_fds[1]);
    const bool started = first_record_written(pipe_fds[0]);
    ::close(pipe_fds[0]);
    if (!started) {
      std::fprintf(stderr, "round %d: the writer wrote no record\n", round);
      ::kill(writer, SIGKILL);
      ::waitpid(writer, nullptr, 0);
      return 2;
    }
    // The kill lands at a random moment of the writer's work, between 0 and 20 ms after its
    // first record: within a record's open, write, flush, rename or directory flush.
    const auto kill_at = Clock::now() + std::chrono::microseconds(random() % 20000);
    do {
      check_read(counts);
      ++counts.reads_while_writing;
    } while (Clock::now() < kill_at);
    ::kill(writer, SIGKILL);
    ::waitpid(writer, nullptr, 0);
    struct stat st {};
    if (dev_stat("/persist/ulda_nvram.tmp", &st) == 0) ++counts.temporary_left;
    check_read(counts);  // what the killed writer left behind
  }
  const double seconds = std::chrono::duration<double>(Clock::now() - start).count();
  std::printf("%d kills in %.1f s; %ld reads (%ld while a writer ran), %zu record values seen\n",
              kills, seconds, counts.reads, counts.reads_while_writing, counts.values.size());
  std::printf("kills that left a half-made temporary record: %d\n", counts.temporary_left);
  std::printf("torn records read: %ld; failed reads: %ld\n", counts.torn, counts.failed);
  return counts.torn == 0 && counts.failed == 0 ? 0 : 1;
}
