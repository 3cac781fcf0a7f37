#include "commands/gps_fm.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <mutex>

#include "commands/battery.h"
#include "commands/command_util.h"
#include "commands/shell.h"
#include "commands/worker.h"
#include "core/command.h"
#include "core/log.h"
#include "core/transport.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/factory_support.h"
#include "services/qmi_client.h"

std::atomic<int> gps_workers_running{0};
std::atomic<int> gps_workers_peak{0};

namespace {

constexpr const char* kKeepScreenOn = "kro.intent.action.KEEP_CREEN_ON";

bool gps_open = false;
std::atomic<bool> gps_thread_exit{true};
// Only the reader thread starts, stops and joins the worker.
pthread_t gps_thread = NO_THREAD;
// Held by the worker across its look at the stop flag and its request, and by the close
// across its request and the stop: no poll request follows the close. Its pause waits on it,
// so a stop cuts the 300 ms short.
std::mutex gps_poll_lock;
std::condition_variable gps_pause;

int fm_tuner_fd = -1;

int gps_option(uint8_t option) {
  const kro_gps_option_req_msg_v01 req{option};
  return qmi_kro_gps_option_msg(nullptr, nullptr, &req);
}

bool gps_thread_set() { return !pthread_equal(gps_thread, NO_THREAD); }


int gps_open_handler(uint8_t option) {
  if (is_sp == 0) {
    ATCI_LOGD("begin jvgps=1 KEEP_CREEN_ON 2");
    sendBroadcastFromAtcid(nullptr, kKeepScreenOn, "-e status 2");
    ATCI_LOGD("end jvgps=1 KEEP_CREEN_ON 2");
  }
  if (gps_open) {
    ATCI_LOGD("========gps has open\n");
    return RESULT_OK;
  }
  ATCI_LOGD("========gps first  open\n");
  if (gps_option(option) != 0) return LOGGED_ERROR("======send qmi msg fail\n");
  gps_open = true;
  return RESULT_OK;
}

int gps_close_handler() {
  ATCI_LOGD("========gps first close\n");
  {
    const std::lock_guard step(gps_poll_lock);
    if (gps_option(0) != 0) return LOGGED_ERROR("======send qmi msg fail\n");
    gps_open = false;
    gps_thread_exit = true;
  }
  gps_pause.notify_all();
  // Reaped here, so a following =2 can never run beside it.
  if (gps_thread_set()) pthread_join(gps_thread, nullptr);
  gps_thread = NO_THREAD;
  return RESULT_OK;
}

int gps_stream_handler() {
  gps_thread_exit = false;
  if (gps_thread_set()) return RESULT_OK;
  pthread_t thread;
  const int rc = start_worker(&thread, update_gps_value_thread, false);
  if (rc != 0) {
    ATCI_LOGE("fail to create adc_test_thread errno:%d", rc);
    // Whether the battery stream runs decides, as it always has.
    if (pthread_equal(adc_test_thread.load(), NO_THREAD)) return RESULT_ERROR;
  } else {
    gps_thread = thread;
    ATCI_LOGD("========adc_test_thread :%lu\n", static_cast<unsigned long>(thread));
  }
  ATCI_LOGD("create adc_test_thread successfully");
  return RESULT_OK;
}

constexpr const char* kSoundDevice = "sys/devices/virtual/misc/msm_snd/device";

// The sound driver's device file routes the tuner's audio; it must be there to be written.
int route_fm_audio(const char* command) {
  UniqueFd device(dev_open(kSoundDevice, O_RDONLY | O_CLOEXEC));
  if (!device.ok()) return LOGGED_ERROR("=====%s is not exist\n", kSoundDevice);
  device.reset();
  run_sh_command("%s", command);
  return RESULT_OK;
}

bool headset_plugged() {
  char status[2];
  if (read_file_head("/sys/kernel/debug/mbhc_status", status, 1) != 1) return false;
  return (status[0] & ~2) == '1';
}

}  // namespace

void update_gps_value_thread() {
  const int running = gps_workers_running.fetch_add(1) + 1;
  int peak = gps_workers_peak.load();
  while (running > peak && !gps_workers_peak.compare_exchange_weak(peak, running)) {
  }
  std::unique_lock held(gps_poll_lock);
  while (!gps_thread_exit) {
    {
      const WorkerCycle cycle;
      if (gps_option(2) != 0) {
        ATCI_LOGE("======send qmi msg fail\n");
        break;
      }
    }
    if (gps_pause.wait_for(held, std::chrono::milliseconds(300),
                           [] { return gps_thread_exit.load(); }))
      break;
  }
  held.unlock();
  gps_workers_running.fetch_sub(1);
}

int gps_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVGPS=1")) return gps_open_handler(1);
  if (line_is(cmdline, "AT+JVGPS=3")) return gps_open_handler(3);
  if (line_is(cmdline, "AT+JVGPS=0")) return gps_close_handler();
  if (line_is(cmdline, "AT+JVGPS=2") && gps_open) return gps_stream_handler();
  return LOGGED_ERROR("====this at command invalid:%s====\r\n", cmdline);
}

int locate_access_on_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVDW=1"))
    return LOGGED_ERROR("**********this at command invalid:%s***********\r\n", cmdline);
  sendBroadcastFromAtcid(nullptr, kKeepScreenOn, "-e status 3");
  // The phone records its track meanwhile; the station waits for the answer.
  ::sleep(80);
  sendBroadcastFromAtcid(nullptr, kKeepScreenOn, "-e status 4");
  if (dev_access("/data/lcn", R_OK | W_OK) != 0)
    return LOGGED_ERROR("===========LOCATING_TRACKING_PATH WR_OK Fial:%s===========\r\n",
                        "/data/lcn");
  sendBroadcastFromAtcid("com.ulda.engineermode/.ConnWifiReceiver",
                         "kro.intent.action.DISCONNWIFI", nullptr);
  return RESULT_OK;
}

int fm_test_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVFM=0")) {
    if (fm_tuner_fd >= 0) ::close(fm_tuner_fd);
    fm_tuner_fd = -1;
    return route_fm_audio(
        "echo 6 1 1 > /sys/devices/virtual/misc/msm_snd/device");
  }
  if (line_is(cmdline, "AT+JVFM=2")) {
    if (fm_tuner_fd < 0) return RESULT_ERROR;
    int signal = 0;
    platform_fm_tuner_signal(fm_tuner_fd, &signal);
    ATCI_LOGD("======tuner.signal:%d\n", signal);
    return answer_quoted_int(response, signal);
  }
  if (line_is(cmdline, "AT+JVFM=3")) {
    if (headset_plugged()) return RESULT_OK;
    return LOGGED_ERROR("Headset has not benn pluged.");
  }
  if (line_starts_with(cmdline, "AT+JVFM=1")) {
    if (fm_tuner_fd >= 0) return RESULT_OK;
    fm_tuner_fd = dev_open("/dev/radio0", O_RDWR | O_CLOEXEC);
    return route_fm_audio(
        "echo 26 0 1 > /sys/devices/virtual/misc/msm_snd/device");
  }
  return LOGGED_ERROR("=====this at command invalid:%s\r\n", cmdline);
}
