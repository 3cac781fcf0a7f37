#include "commands/audio_path.h"

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string_view>
#include <unistd.h>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/audio.h"
#include "platform/platform.h"
#include "services/factory_support.h"

AudioTestFlags audio_test_flags{};

namespace {

constexpr uint32_t kDefaultVolume = 100;

// One test case of the audio library with the texts its starter and stopper log.
struct AudioTest {
  const char* start_text;
  const char* stop_text;
  int test_case;
  bool takes_gain;                       // the starter passes its gain; others run at 100
  const char* start_end_text = nullptr;  // when the starter's end text is not its start text
};

constexpr AudioTest kMainEcho{"main echo test for AT test", "exit main echo test for AT test", 1,
                              false};
constexpr AudioTest kSubEcho{"Sub echo test for AT test", "exit Sub echo test for AT test", 4,
                             false};
constexpr AudioTest kHeadsetEcho{"startHeadsetEchoTest for AT test",
                                 "exitHeadsetEchoTest for AT test", 15, false};
constexpr AudioTest kReceive{"Receive test for AT test", "exit Receive test for AT test", 11, true};
constexpr AudioTest kSend{"Send test for AT test", "exit Send test for AT test", 2, true};
// Both KTV starters end with the send test's text.
constexpr AudioTest kKtvEcho{"Ktv echo test for AT test", "exit Ktv Echo test for AT test", 32,
                             true, "Send test for AT test"};
constexpr AudioTest kKtvElectric{"Ktv elec test for AT test", "exit Ktv Elec test for AT test",
                                 31, true, "Send test for AT test"};
constexpr AudioTest kMicToHeadset{"startMic2headset test for AT test",
                                  "exit exitMic2headset test for AT test", 6, true};
constexpr AudioTest kMainToHeadsetRight{"startMain2headsetR test for AT test",
                                        "exit exitMain2headsetR test for AT test", 3, false};
constexpr AudioTest kSubToHeadsetLeft{"startSub2headsetL test for AT test",
                                      "exit exitSub2headsetL test for AT test", 5, false};
constexpr AudioTest kHeadsetToSpeaker{"startHeadset2speaker test for AT test",
                                      "exit exitHeadset2speaker test for AT test", 13, false};
constexpr AudioTest kHeadsetToEarpiece{"startHeadset2earpiece test for AT test",
                                       "exit exitHeadset2earpiece test for AT test", 11, false};
constexpr AudioTest kHeadsetToRightSpeaker{"startHeadset2RightSpeaker test for AT test",
                                           "exit exitHeadset2RightSpeaker test for AT test", 18,
                                           false};
constexpr AudioTest kHeadsetToLeftSpeaker{"startHeadset2LeftSpeaker test for AT test",
                                          "exit exitHeadset2LeftSpeaker test for AT test", 17,
                                          false};
constexpr AudioTest kHeadsetToSpeakerWithGain{"startHeadset2SpeakerWithGain test for AT test",
                                              "exitHeadset2SpeakerWithGain test for AT test", 14,
                                              true};
constexpr AudioTest kHeadsetToEarpieceWithGain{"startHeadset2EarpieceWithGain test for AT test",
                                               "exitHeadset2EarpieceWithGain test for AT test", 12,
                                               true};

// Starters and stoppers log untagged, without the call-site prefix.
int run_test(const AudioTest& test, const char* text, const char* end_text, int on,
             uint32_t volume) {
  atci_log_untagged(LOG_LVL_DEBUG, "========start %s\r\n", text);
  const int result = audio_ftm_process(test.test_case, on, volume);
  atci_log_untagged(LOG_LVL_DEBUG, "audio_ftm_process=%d", result);
  atci_log_untagged(LOG_LVL_DEBUG, "========end %s\r\n", end_text);
  return result;
}

int start_test(const AudioTest& test, uint32_t gain = kDefaultVolume) {
  return run_test(test, test.start_text,
                  test.start_end_text != nullptr ? test.start_end_text : test.start_text, 1,
                  test.takes_gain ? gain : kDefaultVolume);
}

int stop_test(const AudioTest& test) {
  return run_test(test, test.stop_text, test.stop_text, 0, kDefaultVolume);
}

void set_parameters(const char* text) {
  ATCI_LOGD("setParameters %s\n", text);
  audio_set_parameters(text);
}

int atoi_field(std::string_view field) { return static_cast<int>(parse_long(field)); }

// ---- AT+JVMT: receive, send and the shared sub-mic/headset echo loops

struct LoopVariant {
  const char* line;
  bool gain_may_follow;  // compared on its own length
  bool start;
  int AudioTestFlags::*flag;
  const AudioTest* test;
  const char* test_name;  // in the fail texts
  const char* open_text;  // in the already-open text
};

constexpr LoopVariant kLoopVariants[] = {
    {"AT+JVMT=0,1", true, true, &AudioTestFlags::receive, &kReceive, "Receive Test", "0,1"},
    {"AT+JVMT=0,0", false, false, &AudioTestFlags::receive, &kReceive, "Receive Test", ""},
    {"AT+JVMT=1,1", true, true, &AudioTestFlags::send, &kSend, "Send Test", "1,1"},
    {"AT+JVMT=1,0", false, false, &AudioTestFlags::send, &kSend, "Send Test", ""},
    {"AT+JVMT=2,1", false, true, &AudioTestFlags::sub_mic_headset, &kSubEcho, "Sub mic Test",
     "2,1"},
    {"AT+JVMT=2,0", false, false, &AudioTestFlags::sub_mic_headset, &kSubEcho, "Sub mic Test",
     ""},
    {"AT+JVMT=3,1", false, true, &AudioTestFlags::sub_mic_headset, &kHeadsetEcho,
     "Sub mic Test", "2,1"},
    {"AT+JVMT=3,0", false, false, &AudioTestFlags::sub_mic_headset, &kHeadsetEcho,
     "Sub mic Test", ""},
};

int run_loop_variant(const LoopVariant& variant, const char* cmdline) {
  int& flag = audio_test_flags.*variant.flag;
  ATCI_LOGD("+++++++++headset_flag %d+++++++++++++\r\n", flag);
  if (variant.start) {
    if (flag != 0) {
      ATCI_LOGD("**********aleady open AT+JVMT %s**********\r\n", variant.open_text);
      return RESULT_OK;
    }
    const std::string_view gain = comma_field(cmdline, 2);
    const int volume = gain.empty() ? static_cast<int>(kDefaultVolume) : atoi_field(gain);
    if (start_test(*variant.test, static_cast<uint32_t>(volume)) != 0)
      return LOGGED_ERROR("open %s test fail!", variant.test_name);
    flag = 1;
    return RESULT_OK;
  }
  if (flag == 1) {
    if (stop_test(*variant.test) != 0) return LOGGED_ERROR("exit %s test fail!", variant.test_name);
    flag = 0;
  }
  return RESULT_OK;
}

// ---- AT+EALT: main and sub microphone echo loops

struct EchoVariant {
  const char* line;
  bool start;
  int AudioTestFlags::*flag;
  const AudioTest* test;
  const char* mic;               // "main" or "sub"
  bool closes_whatever = false;  // the loop counts as closed whatever its stopper answers
};

constexpr EchoVariant kEchoVariants[] = {
    {"AT+EALT=1,1", true, &AudioTestFlags::main_echo, &kMainEcho, "main"},
    {"AT+EALT=1,2", true, &AudioTestFlags::sub_echo, &kSubEcho, "sub"},
    {"AT+EALT=0,1", false, &AudioTestFlags::main_echo, &kMainEcho, "main"},
    {"AT+EALT=0,2", false, &AudioTestFlags::sub_echo, &kSubEcho, "sub", true},
};

int run_echo_variant(const EchoVariant& variant) {
  int& flag = audio_test_flags.*variant.flag;
  ATCI_LOGD("%s_echo_flag=%d", variant.mic, flag);
  if (variant.start) {
    if (flag != 0) return RESULT_OK;
    if (start_test(*variant.test) != 0)
      return LOGGED_ERROR("open %s mic echo test fail!", variant.mic);
    flag = 1;
    ATCI_LOGD("open %s mic echo test suceess!", variant.mic);
    return RESULT_OK;
  }
  if (flag != 1) return RESULT_OK;
  if (stop_test(*variant.test) != 0 && !variant.closes_whatever)
    return LOGGED_ERROR("close %s mic echo test fail!", variant.mic);
  flag = 0;
  ATCI_LOGD("close %s mic echo test suceess!", variant.mic);
  return RESULT_OK;
}

// ---- AT+JVKTV: the karaoke monitor loops

constexpr const char* kKtvEchoStart = "AT+JVKTV=1,2";
constexpr const char* kKtvElectricStart = "AT+JVKTV=1,1";

// Any start of a KTV loop, or the loop's own stop line, stops a running loop first.
bool stop_ktv_loop(int& flag, const AudioTest& test, const char* stop_line, const char* fail_text,
                   const char* cmdline) {
  if (flag == 0) return true;
  if (!line_is(cmdline, stop_line) && !line_starts_with(cmdline, kKtvElectricStart) &&
      !line_starts_with(cmdline, kKtvEchoStart))
    return true;
  if (stop_test(test) != 0) {
    ATCI_LOGE("%s", fail_text);
    return false;
  }
  set_parameters("SET_LOOPBACK_TYPE=0");
  flag = 0;
  return true;
}

// The gain is the third field; a 0 is taken only when written with a leading '0'.
bool ktv_gain(const char* cmdline, int* gain) {
  const std::string_view field = comma_field(cmdline, 2);
  if (field.empty()) {
    ATCI_LOGE("gain_multiples == NULL");
    return false;
  }
  *gain = atoi_field(field);
  if (*gain == 0 && field.front() != '0') {
    ATCI_LOGE("Invalid AT command: %s\r\n", cmdline);
    return false;
  }
  return true;
}

void set_ktv_parameters(const char* loopback, int gain) {
  set_parameters(loopback);
  char volume[48];
  std::snprintf(volume, sizeof volume, "tc-ktv-mic-volume=%d", gain);
  set_parameters(volume);
}

// ---- Headset routes: no flags, the stop variant always answers OK

enum class RouteGain { kOne, kPair };

struct HeadsetRoute {
  const char* start_line;  // compared on its own length
  const char* stop_line;
  const AudioTest* test;
  RouteGain gain;
};

constexpr HeadsetRoute kMicToHeadsetRoute{"AT+JVMTE=1", "AT+JVMTE=0", &kMicToHeadset,
                                          RouteGain::kOne};
constexpr HeadsetRoute kMainToHeadsetRightRoute{"AT+JVMTER=1", "AT+JVMTER=0",
                                                &kMainToHeadsetRight, RouteGain::kOne};
constexpr HeadsetRoute kSubToHeadsetLeftRoute{"AT+JVVMTEL=1", "AT+JVVMTEL=0", &kSubToHeadsetLeft,
                                              RouteGain::kOne};
constexpr HeadsetRoute kHeadsetToSpeakerRoute{"AT+JVEMTS=1", "AT+JVEMTS=0", &kHeadsetToSpeaker,
                                              RouteGain::kOne};
constexpr HeadsetRoute kHeadsetToEarpieceRoute{"AT+JVEMTR=1", "AT+JVEMTR=0",
                                               &kHeadsetToEarpiece, RouteGain::kOne};
constexpr HeadsetRoute kHeadsetToRightSpeakerRoute{"AT+JVEMTSR=1", "AT+JVEMTSR=0",
                                                   &kHeadsetToRightSpeaker, RouteGain::kOne};
constexpr HeadsetRoute kHeadsetToLeftSpeakerRoute{"AT+JVEMTSL=1", "AT+JVEMTSL=0",
                                                  &kHeadsetToLeftSpeaker, RouteGain::kOne};
constexpr HeadsetRoute kHeadsetToSpeakerWithGainRoute{
    "AT+JVEMTSA=1", "AT+JVEMTSA=0", &kHeadsetToSpeakerWithGain, RouteGain::kPair};
constexpr HeadsetRoute kHeadsetToEarpieceWithGainRoute{
    "AT+JVEMTRA=1", "AT+JVEMTRA=0", &kHeadsetToEarpieceWithGain, RouteGain::kPair};

// A gain field of the route family: present and decimal digits only.
bool route_gain_field(const char* cmdline, int index, uint32_t* value) {
  const std::string_view field = comma_field(cmdline, index);
  if (field.empty()) return false;
  if (!all_digits(field)) {
    ATCI_LOGE("====the gain multiples invalid:%.*s\r\n", static_cast<int>(field.size()),
              field.data());
    return false;
  }
  *value = static_cast<uint32_t>(atoi_field(field));
  return true;
}

bool route_volume(const HeadsetRoute& route, const char* cmdline, uint32_t* volume) {
  if (route.gain == RouteGain::kOne) return route_gain_field(cmdline, 1, volume);
  uint32_t a = 0;
  uint32_t b = 0;
  if (!route_gain_field(cmdline, 1, &a) || !route_gain_field(cmdline, 2, &b)) return false;
  *volume = static_cast<uint8_t>(b) * 256u + static_cast<uint8_t>(a);
  atci_log_untagged(LOG_LVL_DEBUG, "volume = %d\r\n", static_cast<int>(*volume));
  return true;
}

int run_headset_route(const HeadsetRoute& route, const char* cmdline, const char* handler) {
  ATCI_LOGD("%s start\n", handler);
  ATCI_LOGD("===========cmdline %s\r\n", cmdline);
  if (line_starts_with(cmdline, route.start_line)) {
    uint32_t volume = 0;
    if (!route_volume(route, cmdline, &volume)) return RESULT_ERROR;
    if (start_test(*route.test, volume) != 0) return LOGGED_ERROR("open Receive Test test fail!");
    return RESULT_OK;
  }
  if (line_is(cmdline, route.stop_line)) {
    stop_test(*route.test);
    return RESULT_OK;
  }
  return LOGGED_ERROR("========this at command invalid:%s====\r\n", cmdline);
}

// ---- AT+JVXL: loudspeaker playback, run by the audio library itself

constexpr int kSpeakerPlaybackCase = 22;

// ---- AT+JVMD and AT+JVMP: playback in the engineer-mode app

constexpr const char* kMediaPlayerReceiver = "com.ulda.engineermode/.MediaPlayerReceiver";
constexpr const char* kMediaPlayerAction = "kro.intent.action.MEDIA_PLAYER";
constexpr const char* kStopPlayback = "-e action stop";
constexpr size_t kPathSize = 50;
constexpr size_t kExtrasSize = 200;

// A file reference "C:\NAME.MP3": drive C is the internal storage, D the memory card.
struct MediaDrive {
  const char* drive;
  const char* no_suffix_text;
  const char* audio_dir;       // where an MP3 must be
  const char* video_dir;       // where an MP4 must be
  const char* video_view_dir;  // how the video player is told the MP4's path
};

constexpr MediaDrive kMediaDrives[] = {
    {"C:\\", "===========Do not find mp3 =====\r\n", "/sdcard/", "/mnt/sdcard/", "/mnt/sdcard/"},
    {"D:\\", "===========Do not find mp4 =====\r\n", "/storage/sdcard1/", "/storage/sdcard1/",
     "/mnt/sdcard/external_sd/"},
};

// The name runs from after the first backslash to the next '.'.
std::string_view media_name(std::string_view reference) {
  const size_t slash = reference.find('\\');
  if (slash == std::string_view::npos) return {};
  const std::string_view name = reference.substr(slash + 1);
  return name.substr(0, name.find('.'));
}

int play_media_file(const MediaDrive& drive, std::string_view reference) {
  const std::string_view name = media_name(reference);
  const int name_len = static_cast<int>(name.size());
  char path[kPathSize];
  char extras[kExtrasSize];
  if (reference.find(".MP3") != std::string_view::npos) {
    std::snprintf(path, sizeof path, "%s%.*s.mp3", drive.audio_dir, name_len, name.data());
    if (dev_access(path, R_OK) != 0) return LOGGED_ERROR("mp3 OPEN ERROR\n");
    std::snprintf(extras, sizeof extras,
                  "-e action start -e path %s -e output normal --ei volume 60", path);
    sendBroadcastFromAtcid(kMediaPlayerReceiver, kMediaPlayerAction, extras);
    return RESULT_OK;
  }
  if (reference.find(".MP4") != std::string_view::npos) {
    std::snprintf(path, sizeof path, "%s%.*s.mp4", drive.video_dir, name_len, name.data());
    if (dev_access(path, R_OK) != 0) return LOGGED_ERROR("mp4 OPEN ERROR\n");
    std::snprintf(extras, sizeof extras, "-e video_file_path %s%.*s.mp4", drive.video_view_dir,
                  name_len, name.data());
    startActivityFromAtcid("com.ulda.engineermode/.VideoFileView",
                           "android.factorytest.PLAY_VIDEO", extras);
    return RESULT_OK;
  }
  return LOGGED_ERROR("%s", drive.no_suffix_text);
}

int stop_media_playback() {
  const int ret = run_sh_command("input keyevent 4");  // the back key leaves the player
  ATCI_LOGD("=======ret %d \r\n", ret);
  if (sh_command_failed(ret)) return LOGGED_ERROR("===========sent command fail =====\r\n");
  sendBroadcastFromAtcid(kMediaPlayerReceiver, kMediaPlayerAction, kStopPlayback);
  return RESULT_OK;
}

}  // namespace

int echo_handler(char* cmdline, int, char*) {
  for (const LoopVariant& variant : kLoopVariants) {
    const bool match = variant.gain_may_follow ? line_starts_with(cmdline, variant.line)
                                               : line_is(cmdline, variant.line);
    if (match) return run_loop_variant(variant, cmdline);
  }
  return LOGGED_ERROR("**********this at command invalid:%s***********\r\n", cmdline);
}

int mic_echo_handler(char* cmdline, int, char*) {
  for (const EchoVariant& variant : kEchoVariants)
    if (line_is(cmdline, variant.line)) return run_echo_variant(variant);
  if (!line_starts_with(cmdline, "AT+EALT=1") && !line_starts_with(cmdline, "AT+EALT=0"))
    return LOGGED_ERROR("======this at command invalid:%s\r\n", cmdline);
  return RESULT_ERROR;
}

int ktv_test_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, kKtvElectricStart) || line_is(cmdline, kKtvEchoStart))
    return LOGGED_ERROR("Invalid AT command: %s\r\n", cmdline);
  AudioTestFlags& flags = audio_test_flags;
  if (!stop_ktv_loop(flags.ktv_echo, kKtvEcho, "AT+JVKTV=0,2", "exit_ktv_echo_test_handler fail!",
                     cmdline) ||
      !stop_ktv_loop(flags.ktv_electric, kKtvElectric, "AT+JVKTV=0,1",
                     "exit_ktv_elec_test_handler fail!", cmdline))
    return RESULT_ERROR;
  int gain = 0;
  if (line_starts_with(cmdline, kKtvEchoStart)) {
    if (!ktv_gain(cmdline, &gain)) return RESULT_ERROR;
    if (start_test(kKtvEcho, static_cast<uint32_t>(gain)) != 0)
      return LOGGED_ERROR("start_ktv_echo_test_handler fail!");
    set_ktv_parameters("SET_LOOPBACK_TYPE=4", gain);
    flags.ktv_echo = 1;
    return RESULT_OK;
  }
  if (line_starts_with(cmdline, kKtvElectricStart)) {
    if (!ktv_gain(cmdline, &gain)) return RESULT_ERROR;
    // The electric loop wants its parameters before it starts.
    set_ktv_parameters("SET_LOOPBACK_TYPE=5", gain);
    if (start_test(kKtvElectric, static_cast<uint32_t>(gain)) != 0)
      return LOGGED_ERROR("start_ktv_elec_test_handler fail!");
    flags.ktv_electric = 1;
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVKTV=0,2") || line_is(cmdline, "AT+JVKTV=0,1")) return RESULT_OK;
  return LOGGED_ERROR("Invalid AT command: %s\r\n", cmdline);
}

int dual_mic_to_headset_handler(char* cmdline, int, char*) {
  return run_headset_route(kMicToHeadsetRoute, cmdline, __func__);
}
int main_mic_to_headset_right_handler(char* cmdline, int, char*) {
  return run_headset_route(kMainToHeadsetRightRoute, cmdline, __func__);
}
int sub_mic_to_headset_left_handler(char* cmdline, int, char*) {
  return run_headset_route(kSubToHeadsetLeftRoute, cmdline, __func__);
}
int headset_to_speaker_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToSpeakerRoute, cmdline, __func__);
}
int headset_to_earpiece_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToEarpieceRoute, cmdline, __func__);
}
int headset_to_right_speaker_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToRightSpeakerRoute, cmdline, __func__);
}
int headset_to_left_speaker_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToLeftSpeakerRoute, cmdline, __func__);
}
int headset_to_speaker_with_gain_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToSpeakerWithGainRoute, cmdline, __func__);
}
int headset_to_earpiece_with_gain_handler(char* cmdline, int, char*) {
  return run_headset_route(kHeadsetToEarpieceWithGainRoute, cmdline, __func__);
}

int play_ring_handler(char* cmdline, int, char*) {
  int& playing = audio_test_flags.speaker_playback;
  if (line_is(cmdline, "AT+JVXL=1")) {
    if (playing != 0) return RESULT_OK;
    const int result = audio_ftm_process(kSpeakerPlaybackCase, 1, 1);
    if (result != 0) return LOGGED_ERROR("Start Speaker Playback failed, error %d\n", result);
    playing = 1;
    return RESULT_OK;
  }
  if (line_is(cmdline, "AT+JVXL=0")) {
    if (playing != 1) return RESULT_OK;
    const int result = audio_ftm_process(kSpeakerPlaybackCase, 0, 1);
    ftm_hw_deinit();
    if (result != 0) return LOGGED_ERROR("Close Speaker Playback failed, error %d\n", result);
    playing = 0;
    return RESULT_OK;
  }
  return LOGGED_ERROR("========this at command invalid:%s====\r\n", cmdline);
}

int ring_test_handler(char* cmdline, int, char*) {
  // Only the text before the first ',' is the command; the next field is the volume.
  char command[CMD_LINE_SIZE];
  std::snprintf(command, sizeof command, "%s", cmdline);
  command[std::strcspn(command, ",")] = '\0';
  const std::string_view volume = comma_field(cmdline, 1);
  const int volume_len = static_cast<int>(volume.size());
  ATCI_LOGD("=======volume: %.*s\r\n", volume_len, volume.data());
  if (line_starts_with(command, "AT+JVMD=1")) {
    char extras[kExtrasSize];
    std::snprintf(extras, sizeof extras,
                  "-e action start -e path /system/media/audio/ui/1KHz_tone_0dB.mp3 "
                  "-e output normal --ei volume %.*s",
                  volume_len, volume.data());
    sendBroadcastFromAtcid(kMediaPlayerReceiver, kMediaPlayerAction, extras);
    return RESULT_OK;
  }
  if (line_is(command, "AT+JVMD=0")) {
    sendBroadcastFromAtcid(kMediaPlayerReceiver, kMediaPlayerAction, kStopPlayback);
    return RESULT_OK;
  }
  return LOGGED_ERROR("=====this at command invalid:%s\r\n", cmdline);
}

int play_media_handler(char* cmdline, int, char*) {
  if (line_is(cmdline, "AT+JVMP=0")) return stop_media_playback();
  if (!line_starts_with(cmdline, "AT+JVMP=1"))
    return LOGGED_ERROR("**********this at command invalid:%s***********\r\n", cmdline);
  const std::string_view reference = comma_field(cmdline, 1);
  for (const MediaDrive& drive : kMediaDrives)
    if (reference.find(drive.drive) != std::string_view::npos)
      return play_media_file(drive, reference);
  return LOGGED_ERROR("===========Do not find play file =====\r\n");
}
