#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <vector>

#include "commands/audio_path.h"
#include "core/command.h"
#include "platform/audio.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Lines = std::vector<std::string>;
constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
constexpr int kNone = -1;

std::string ftm(int test_case, int on, unsigned volume) {
  return "audio_ftm_process " + std::to_string(test_case) + " " + std::to_string(on) + " " +
         std::to_string(volume);
}
std::string param(const std::string& text) { return "setParameters " + text; }

// One command of a sequence; test case `fail_case` answers `fail_value` during it.
struct Step {
  CommandHandler handler;
  std::string line;
  int fail_case;
  int fail_value;
  int status;
  Lines calls;  // the library calls it makes, in order
};

class AudioPathTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    audio_test_flags = {};
  }

  Lines new_calls() {
    std::istringstream in(read_file("/.emu/audio/calls.log"));
    Lines lines;
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    Lines fresh(lines.begin() + static_cast<long>(seen_), lines.end());
    seen_ = lines.size();
    return fresh;
  }

  void run_steps(const std::vector<Step>& steps) {
    for (const Step& step : steps) {
      const std::string result_file = "/.emu/audio/ftm_result." + std::to_string(step.fail_case);
      if (step.fail_case != kNone) write_file(result_file, std::to_string(step.fail_value));
      const HandlerAnswer answer = call_handler(step.handler, step.line);
      EXPECT_EQ(answer.status, step.status) << step.line;
      EXPECT_EQ(answer.body, "") << step.line;
      EXPECT_EQ(new_calls(), step.calls) << step.line;
      if (step.fail_case != kNone) std::filesystem::remove(host_path(result_file));
    }
  }

  size_t seen_ = 0;
};

TEST_F(AudioPathTest, HeadsetRoutes) {
  run_steps({
      {dual_mic_to_headset_handler, "AT+JVMTE=1,50", kNone, 0, OK, {ftm(6, 1, 50)}},
      {dual_mic_to_headset_handler, "AT+JVMTE=1,1A", kNone, 0, ERR, {}},
      {dual_mic_to_headset_handler, "AT+JVMTE=1,", kNone, 0, ERR, {}},
      {dual_mic_to_headset_handler, "AT+JVMTE=1,99999999999999999999999", kNone, 0, OK,
       {ftm(6, 1, 0)}},
      {dual_mic_to_headset_handler, "AT+JVMTE=0", kNone, 0, OK, {ftm(6, 0, 100)}},
      {dual_mic_to_headset_handler, "AT+JVMTE=0,1", kNone, 0, ERR, {}},
      // The other one-gain routes check their gain but run at 100.
      {main_mic_to_headset_right_handler, "AT+JVMTER=1,7", kNone, 0, OK, {ftm(3, 1, 100)}},
      {sub_mic_to_headset_left_handler, "AT+JVVMTEL=1,7", kNone, 0, OK, {ftm(5, 1, 100)}},
      {headset_to_speaker_handler, "AT+JVEMTS=1,7", 13, 5, ERR, {ftm(13, 1, 100)}},
      {headset_to_speaker_handler, "AT+JVEMTS=0", 13, -3, OK, {ftm(13, 0, 100)}},
      {headset_to_earpiece_handler, "AT+JVEMTR=1,7", kNone, 0, OK, {ftm(11, 1, 100)}},
      {headset_to_right_speaker_handler, "AT+JVEMTSR=1,7", kNone, 0, OK, {ftm(18, 1, 100)}},
      {headset_to_left_speaker_handler, "AT+JVEMTSL=1,7", kNone, 0, OK, {ftm(17, 1, 100)}},
      // Gain pairs are unsigned bytes: volume = b * 256 + a.
      {headset_to_speaker_with_gain_handler, "AT+JVEMTSA=1,255,1", kNone, 0, OK,
       {ftm(14, 1, 511)}},
      {headset_to_earpiece_with_gain_handler, "AT+JVEMTRA=1,257,2", kNone, 0, OK,
       {ftm(12, 1, 513)}},
      {headset_to_earpiece_with_gain_handler, "AT+JVEMTRA=1,3", kNone, 0, ERR, {}},
      {headset_to_earpiece_with_gain_handler, "AT+JVEMTRA=0", kNone, 0, OK, {ftm(12, 0, 100)}},
  });
}

TEST_F(AudioPathTest, LoopFlags) {
  run_steps({
      {echo_handler, "AT+JVMT=0,1", kNone, 0, OK, {ftm(11, 1, 100)}},
      {echo_handler, "AT+JVMT=0,1,40", kNone, 0, OK, {}},
      {echo_handler, "AT+JVMT=0,0", kNone, 0, OK, {ftm(11, 0, 100)}},
      {echo_handler, "AT+JVMT=0,0", kNone, 0, OK, {}},
      // A failed start leaves the flag clear, a failed stop leaves it set.
      {echo_handler, "AT+JVMT=1,1,40", 2, 1, ERR, {ftm(2, 1, 40)}},
      {echo_handler, "AT+JVMT=1,1,-1", kNone, 0, OK, {ftm(2, 1, 4294967295u)}},
      {echo_handler, "AT+JVMT=1,0", 2, 9, ERR, {ftm(2, 0, 100)}},
      {echo_handler, "AT+JVMT=1,0", kNone, 0, OK, {ftm(2, 0, 100)}},
      // Sub mic and headset echo share one flag: 3,0 stops the headset test.
      {echo_handler, "AT+JVMT=2,1", kNone, 0, OK, {ftm(4, 1, 100)}},
      {echo_handler, "AT+JVMT=3,1", kNone, 0, OK, {}},
      {echo_handler, "AT+JVMT=3,0", kNone, 0, OK, {ftm(15, 0, 100)}},
      {echo_handler, "AT+JVMT=2,1,5", kNone, 0, ERR, {}},
      // AT+EALT keeps flags of its own.
      {mic_echo_handler, "AT+EALT=1,1", kNone, 0, OK, {ftm(1, 1, 100)}},
      {mic_echo_handler, "AT+EALT=1,1", kNone, 0, OK, {}},
      {mic_echo_handler, "AT+EALT=0,1", 1, 2, ERR, {ftm(1, 0, 100)}},
      {mic_echo_handler, "AT+EALT=0,1", kNone, 0, OK, {ftm(1, 0, 100)}},
      {mic_echo_handler, "AT+EALT=1,2", 4, 3, ERR, {ftm(4, 1, 100)}},
      {mic_echo_handler, "AT+EALT=1,2", kNone, 0, OK, {ftm(4, 1, 100)}},
      {echo_handler, "AT+JVMT=2,1", kNone, 0, OK, {ftm(4, 1, 100)}},
      // The sub echo stop counts as done whatever the library answers.
      {mic_echo_handler, "AT+EALT=0,2", 4, 3, OK, {ftm(4, 0, 100)}},
      {mic_echo_handler, "AT+EALT=0,2", kNone, 0, OK, {}},
      {mic_echo_handler, "AT+EALT=1,3", kNone, 0, ERR, {}},
      // Speaker playback: deinit after the stop whatever it answered; that answer decides.
      {play_ring_handler, "AT+JVXL=0", kNone, 0, OK, {}},
      {play_ring_handler, "AT+JVXL=1", 22, -5, ERR, {ftm(22, 1, 1)}},
      {play_ring_handler, "AT+JVXL=1", kNone, 0, OK, {ftm(22, 1, 1)}},
      {play_ring_handler, "AT+JVXL=1", kNone, 0, OK, {}},
      {play_ring_handler, "AT+JVXL=0", 22, 3, ERR, {ftm(22, 0, 1), "ftm_hw_deinit"}},
      {play_ring_handler, "AT+JVXL=0", kNone, 0, OK, {ftm(22, 0, 1), "ftm_hw_deinit"}},
      {play_ring_handler, "AT+JVXL=2", kNone, 0, ERR, {}},
  });
}

TEST_F(AudioPathTest, KtvOrders) {
  const std::string loop0 = param("SET_LOOPBACK_TYPE=0");
  run_steps({
      {ktv_test_handler, "AT+JVKTV=1,2", kNone, 0, ERR, {}},
      // Electric: parameters before the start; a failed start keeps them.
      {ktv_test_handler, "AT+JVKTV=1,1,3", 31, 4, ERR,
       {param("SET_LOOPBACK_TYPE=5"), param("tc-ktv-mic-volume=3"), ftm(31, 1, 3)}},
      {ktv_test_handler, "AT+JVKTV=1,1,5", kNone, 0, OK,
       {param("SET_LOOPBACK_TYPE=5"), param("tc-ktv-mic-volume=5"), ftm(31, 1, 5)}},
      // Echo while electric runs: electric stops first; echo parameters follow its start.
      {ktv_test_handler, "AT+JVKTV=1,2,7", kNone, 0, OK,
       {ftm(31, 0, 100), loop0, ftm(32, 1, 7), param("SET_LOOPBACK_TYPE=4"),
        param("tc-ktv-mic-volume=7")}},
      // A bad gain still stops the running loop first.
      {ktv_test_handler, "AT+JVKTV=1,2,X", kNone, 0, ERR, {ftm(32, 0, 100), loop0}},
      {ktv_test_handler, "AT+JVKTV=1,2,0", kNone, 0, OK,
       {ftm(32, 1, 0), param("SET_LOOPBACK_TYPE=4"), param("tc-ktv-mic-volume=0")}},
      {ktv_test_handler, "AT+JVKTV=0,1", kNone, 0, OK, {}},
      {ktv_test_handler, "AT+JVKTV=0,2", 32, 1, ERR, {ftm(32, 0, 100)}},
      {ktv_test_handler, "AT+JVKTV=0,2", kNone, 0, OK, {ftm(32, 0, 100), loop0}},
      {ktv_test_handler, "AT+JVKTV=1,1,", kNone, 0, ERR, {}},
      {ktv_test_handler, "AT+JVKTV=2,2", kNone, 0, ERR, {}},
  });
}

TEST_F(AudioPathTest, ResultFiles) {
  struct Case {
    std::string general, specific;  // ftm_result and ftm_result.22; "" for none
    int result;
  };
  for (const Case& c : std::vector<Case>{{"", "", 0}, {"7\n", "", 7}, {"7", "-2\r\n", -2},
                                         {"", "x", -1}, {"3x", "", -1}}) {
    std::filesystem::remove(host_path("/.emu/audio/ftm_result"));
    std::filesystem::remove(host_path("/.emu/audio/ftm_result.22"));
    if (!c.general.empty()) write_file("/.emu/audio/ftm_result", c.general);
    if (!c.specific.empty()) write_file("/.emu/audio/ftm_result.22", c.specific);
    EXPECT_EQ(audio_ftm_process(22, 1, 1), c.result) << c.general << "|" << c.specific;
  }
  audio_set_parameters("a=1\nb=2");
  EXPECT_EQ(new_calls().back(), "setParameters a=1\\nb=2");
}

TEST_F(AudioPathTest, Playback) {
  for (const char* file : {"/sdcard/SONG.mp3", "/mnt/sdcard/CLIP.mp4", "/storage/sdcard1/MOVIE.mp4",
                           "/storage/sdcard1/NNNNNNNNNNNNNNNNNNNNNNNNNNNNNNNN"})
    write_file(file, "");
  const std::string player =
      "am broadcast -n com.ulda.engineermode/.MediaPlayerReceiver -a kro.intent.action.MEDIA_PLAYER";
  const std::string tone = player +
                           " -e action start -e path /system/media/audio/ui/1KHz_tone_0dB.mp3"
                           " -e output normal --ei volume";
  const std::string stop = player + " -e action stop";
  const std::string video =
      "am start -n com.ulda.engineermode/.VideoFileView -a android.factorytest.PLAY_VIDEO "
      "-e video_file_path ";
  const std::string name(40, 'N');
  struct Case {
    CommandHandler handler;
    std::string line;
    int status;
    Lines shell;
  };
  const std::vector<Case> cases = {
      {ring_test_handler, "AT+JVMD=1,60", OK, {tone + " 60"}},
      {ring_test_handler, "AT+JVMD=1", OK, {tone}},
      {ring_test_handler, "AT+JVMD=0,5", OK, {stop}},
      {ring_test_handler, "AT+JVMD=01", ERR, {}},
      {play_media_handler, "AT+JVMP=1,C:\\SONG.MP3", OK,
       {player + " -e action start -e path /sdcard/SONG.mp3 -e output normal --ei volume 60"}},
      {play_media_handler, "AT+JVMP=1,C:\\CLIP.MP4", OK, {video + "/mnt/sdcard/CLIP.mp4"}},
      {play_media_handler, "AT+JVMP=1,D:\\MOVIE.MP4", OK,
       {video + "/mnt/sdcard/external_sd/MOVIE.mp4"}},
      // The 50-byte path is cut: "/storage/sdcard1/" and 32 characters of the name.
      {play_media_handler, "AT+JVMP=1,D:\\" + name + ".MP3", OK,
       {player + " -e action start -e path /storage/sdcard1/" + name.substr(0, 32) +
        " -e output normal --ei volume 60"}},
      {play_media_handler, "AT+JVMP=1,C:\\MOVIE.MP4", ERR, {}},
      {play_media_handler, "AT+JVMP=1,C:\\SONG.WAV", ERR, {}},
      {play_media_handler, "AT+JVMP=1,E:\\A.MP3", ERR, {}},
      {play_media_handler, "AT+JVMP=1", ERR, {}},
      {play_media_handler, "AT+JVMP=0", OK, {"/system/bin/sh -c \"input keyevent 4\"", stop}},
      {play_media_handler, "AT+JVMP=0,1", ERR, {}},
  };
  for (const Case& c : cases) {
    shell_commands().clear();
    const HandlerAnswer answer = call_handler(c.handler, c.line);
    EXPECT_EQ(answer.status, c.status) << c.line;
    EXPECT_EQ(answer.body, "") << c.line;
    EXPECT_EQ(shell_commands(), c.shell) << c.line;
  }
  // The back key's result is compared raw: only -1 and 127 fail, before the stop broadcast.
  for (const int result : {-1, 127, 32512}) {
    shell_commands().clear();
    shell_action() = [result](const std::string& command) {
      return command.rfind("/system/bin/sh", 0) == 0 ? result : 0;
    };
    const bool failed = result != 32512;
    EXPECT_EQ(call_handler(play_media_handler, "AT+JVMP=0").status, failed ? ERR : OK) << result;
    EXPECT_EQ(shell_commands().size(), failed ? 1u : 2u) << result;
  }
}

}  // namespace
