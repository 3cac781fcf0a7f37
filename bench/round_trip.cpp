// The two programs of bench/round_trip.
//   round_trip floor PTY ANSWER_HEX
//     The floor: opens PTY with the daemon's terminal settings, then answers every line it reads
//     with the fixed ANSWER bytes. Prints "ready" once the terminal is set.
//   round_trip station COUNT LINE ANSWER_HEX DAEMON_FD... FLOOR_FD
//     Sends LINE and a line feed COUNT times to each side, in turns, waits for the whole answer
//     each time and prints median and p99 round trips in microseconds, and their ratios to the
//     floor's.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <termios.h>
#include <time.h>
#include <unistd.h>
#include <vector>

namespace {

std::string from_hex(const char* hex) {
  std::string out;
  for (size_t i = 0; hex[i] != '\0' && hex[i + 1] != '\0'; i += 2) {
    out.push_back(static_cast<char>(std::strtol(std::string(hex + i, 2).c_str(), nullptr, 16)));
  }
  return out;
}

int floor_main(const char* path, const std::string& answer) {
  const int fd = ::open(path, O_RDWR | O_NOCTTY);
  if (fd < 0) {
    std::perror(path);
    return 1;
  }
  // As the daemon sets a serial port up.
  termios tio{};
  tcgetattr(fd, &tio);
  tio.c_oflag &= ~(OPOST | OLCUC | OCRNL | ONOCR | ONLRET);
  tio.c_lflag = ICANON;
  tcflush(fd, TCIFLUSH);
  tcsetattr(fd, TCSANOW, &tio);
  std::printf("ready\n");
  std::fflush(stdout);
  char line[6144];
  while (::read(fd, line, sizeof line) > 0) {
    if (::write(fd, answer.data(), answer.size()) != static_cast<ssize_t>(answer.size())) return 1;
  }
  return 0;
}

long long now_ns() {
  timespec ts{};
  clock_gettime(CLOCK_MONOTONIC, &ts);
  return ts.tv_sec * 1'000'000'000LL + ts.tv_nsec;
}

// One round trip in nanoseconds, or -1 when the answer is not the expected one.
long long round_trip(int fd, const std::string& line, const std::string& answer) {
  std::string got(answer.size(), '\0');
  const long long start = now_ns();
  if (::write(fd, line.data(), line.size()) != static_cast<ssize_t>(line.size())) return -1;
  size_t have = 0;
  while (have < got.size()) {
    const ssize_t n = ::read(fd, got.data() + have, got.size() - have);
    if (n <= 0) return -1;
    have += static_cast<size_t>(n);
  }
  const long long elapsed = now_ns() - start;
  return got == answer ? elapsed : -1;
}

struct Figures {
  double median_us;
  double p99_us;
};

Figures figures(std::vector<long long> samples) {
  std::sort(samples.begin(), samples.end());
  const auto at = [&](double q) {
    return samples[static_cast<size_t>(q * (samples.size() - 1))] / 1000.0;
  };
  return {at(0.5), at(0.99)};
}

// The floor is the last descriptor; every other one is a daemon.
int station_main(int count, const std::string& line, const std::string& answer,
                 const std::vector<int>& fds) {
  std::vector<std::vector<long long>> samples(fds.size());
  const int warm_up = std::min(count / 10, 200);
  // Sides take turns in runs of kRun commands: a change of load hits all alike, and what a
  // side does after its answer (logging, say) still delays its next command.
  constexpr int kRun = 10;
  for (int i = 0; i < warm_up + count; i += kRun) {
    for (size_t k = 0; k < fds.size(); ++k) {
      for (int j = i; j < i + kRun && j < warm_up + count; ++j) {
        const long long t = round_trip(fds[k], line, answer);
        if (t < 0) {
          std::fprintf(stderr, "round %d: side %zu gave no or another answer\n", j, k);
          return 1;
        }
        if (j >= warm_up) samples[k].push_back(t);
      }
    }
  }
  std::printf("%d round trips each, in turns of %d\n", count, kRun);
  const Figures floor = figures(samples.back());
  for (size_t k = 0; k + 1 < fds.size(); ++k) {
    const Figures a = figures(samples[k]);
    std::printf("  daemon%-2s median %8.1f us   p99 %8.1f us   ratio median %5.2f  p99 %5.2f\n",
                fds.size() > 2 ? std::to_string(k + 1).c_str() : "", a.median_us, a.p99_us,
                a.median_us / floor.median_us, a.p99_us / floor.p99_us);
  }
  std::printf("  floor    median %8.1f us   p99 %8.1f us\n", floor.median_us, floor.p99_us);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 4 && std::strcmp(argv[1], "floor") == 0) {
    return floor_main(argv[2], from_hex(argv[3]));
  }
  if (argc >= 7 && std::strcmp(argv[1], "station") == 0) {
    std::vector<int> fds;
    for (int i = 5; i < argc; ++i) fds.push_back(std::atoi(argv[i]));
    return station_main(std::atoi(argv[2]), std::string(argv[3]) + "\n", from_hex(argv[4]), fds);
  }
  std::fprintf(stderr, "usage: round_trip floor PTY ANSWER_HEX | "
                       "round_trip station COUNT LINE ANSWER_HEX DAEMON_FD... FLOOR_FD\n");
  return 2;
}
