#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include "commands/battery.h"
#include "commands/lights.h"
#include "commands/sensors.h"
#include "commands/worker.h"
#include "core/command.h"
#include "tests/unit/handler_call.h"
#include "tests/unit/worker_port.h"

namespace {

int refuse(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*) { return EAGAIN; }

class WorkerStart : public WorkerPortTest {
 protected:
  void TearDown() override {
    worker_thread_create = pthread_create;
    WorkerPortTest::TearDown();
  }
};

// A refused thread leaves its family stopped: no stop joins a thread that never ran, and the
// next start really starts one.
TEST_F(WorkerStart, RefusedThreadLeavesTheFamilyStopped) {
  write_file("/sys/class/timed_output/vibrator/enable", "0\n");
  for (const char* node : {"voltage_now", "temp", "current_now"})
    write_file(std::string("/sys/class/power_supply/battery/") + node, "1\n");
  struct Family {
    CommandHandler handler;
    const char* start;
    const char* stop;
  };
  const Family families[] = {
      {edft_handler, "AT+EDFT=6,1", "AT+EDFT=6,0"},
      {jvlight_handler, "AT+JVLIGHT=1", "AT+JVLIGHT=0"},
      {eadc_handler, "AT+EADC=1", "AT+EADC=0"},
      {jvzljc_handler, "AT+JVZLJC=0,1", "AT+JVZLJC=0,0"},
  };
  for (const Family& f : families) {
    worker_thread_create = refuse;
    EXPECT_EQ(call_handler(f.handler, f.start).status, RESULT_ERROR) << f.start;
    EXPECT_EQ(adc_test_thread.load(), NO_THREAD);
    EXPECT_EQ(gsensor_z_thread.load(), NO_THREAD);
    worker_thread_create = pthread_create;
    EXPECT_EQ(call_handler(f.handler, f.start).status, RESULT_OK) << f.start;
    EXPECT_EQ(running_workers(), 1) << f.start;
    EXPECT_EQ(call_handler(f.handler, f.stop).status, RESULT_OK) << f.stop;
    EXPECT_TRUE(wait_until([] { return running_workers() == 0; })) << f.stop;
  }
}

}  // namespace
