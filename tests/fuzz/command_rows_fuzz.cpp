// libFuzzer target: a command line of any row of the table with arbitrary parameters, as the
// reader hands it on, through the dispatcher into an emulated phone. What must never happen:
// a crash, an answer without a result word, a write outside the root, a factory record of
// another size, a worker that outlives its stop command.
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <string>
#include <thread>

#include "commands/worker.h"
#include "core/command.h"
#include "core/dispatch.h"
#include "tests/fuzz/fuzz_phone.h"

namespace {

fuzz::Phone* phone;

// Lines that stop every worker a line can start.
constexpr const char* kStops[] = {"AT+EADC=0",   "AT+JVZLJC=0,0", "AT+JVGPS=0",
                                  "AT+EDFT=6,0", "AT+JVLIGHT=0",  "AT+MMILED=1,0"};

void dispatch(std::string line) {
  try {
    process_cmd_line(line.data());
  } catch (const fuzz::PowerRequest&) {
    // The phone went away after its early answer; the next input finds it serving again.
  }
}

// The answer holds a result line ("\r\n" WORD "\r\n", the word possibly empty), or nothing
// at all when the handler answered nothing itself.
bool has_result_word(const std::string& output) {
  if (output.empty()) return true;
  for (const char* word : {"OK", "ERROR", "Not Implement", "UNKNOWN", ""})
    if (output.find("\r\n" + std::string(word) + "\r\n") != std::string::npos) return true;
  return false;
}

}  // namespace

// The phone's long waits (80 s for a location track, seconds before a restart) would turn
// every input that reaches them into a time-out: here they last a few milliseconds at most.
extern "C" unsigned int sleep(unsigned int) { return 0; }
extern "C" int usleep(useconds_t us) {
  timespec pause{0, static_cast<long>(std::min<useconds_t>(us, 5000)) * 1000};
  return nanosleep(&pause, nullptr);
}

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  phone = new fuzz::Phone(PortKind::tty);
  phone->new_port(true);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  // The reader hands on one line: upper-cased, no line end, below 200 characters (a longer
  // line ends the daemon by design).
  std::string line = command_table[data[0] % COMMAND_COUNT].name;
  for (size_t i = 1; i < size && line.size() < 199; ++i) {
    const char c = static_cast<char>(data[i]);
    if (c == '\0' || c == '\n') break;
    line += static_cast<char>(c >= 'a' && c <= 'z' ? c - 32 : c);
  }
  while (!line.empty() && line.back() == ' ') line.pop_back();

  phone->take_output();
  dispatch(line);
  // The dispatcher's answer is written before it returns; stream lines may follow it.
  if (!has_result_word(phone->take_output())) fuzz::fail("no result word for", line);
  phone->check_bounds();

  for (const char* stop : kStops) dispatch(stop);
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  while (running_workers() != 0) {
    if (std::chrono::steady_clock::now() > deadline) fuzz::fail("a worker kept running after", line);
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return 0;
}
