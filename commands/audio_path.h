// Audio path tests: loops run by the audio factory-test library (receiver, microphones,
// headset routes, the KTV monitor, the loudspeaker) and tone and media playback in the
// engineer-mode app.
#pragma once

// Which loop tests run, 0 off and 1 running. The tests live in the audio library from their
// start command to their stop command; the daemon keeps only these flags, so a restart
// forgets them.
struct AudioTestFlags {
  int receive;
  int send;
  int sub_mic_headset;  // one flag for the sub-mic echo and the headset echo tests of AT+JVMT
  int main_echo;
  int sub_echo;
  int ktv_echo;
  int ktv_electric;
  int speaker_playback;
};
extern AudioTestFlags audio_test_flags;

int echo_handler(char* cmdline, int op, char* response);        // AT+JVMT
int mic_echo_handler(char* cmdline, int op, char* response);    // AT+EALT
int ktv_test_handler(char* cmdline, int op, char* response);    // AT+JVKTV
int dual_mic_to_headset_handler(char* cmdline, int op, char* response);            // AT+JVMTE
int main_mic_to_headset_right_handler(char* cmdline, int op, char* response);      // AT+JVMTER
int sub_mic_to_headset_left_handler(char* cmdline, int op, char* response);        // AT+JVVMTEL
int headset_to_speaker_handler(char* cmdline, int op, char* response);             // AT+JVEMTS
int headset_to_earpiece_handler(char* cmdline, int op, char* response);            // AT+JVEMTR
int headset_to_right_speaker_handler(char* cmdline, int op, char* response);       // AT+JVEMTSR
int headset_to_left_speaker_handler(char* cmdline, int op, char* response);        // AT+JVEMTSL
int headset_to_speaker_with_gain_handler(char* cmdline, int op, char* response);   // AT+JVEMTSA
int headset_to_earpiece_with_gain_handler(char* cmdline, int op, char* response);  // AT+JVEMTRA
int play_ring_handler(char* cmdline, int op, char* response);   // AT+JVXL
int ring_test_handler(char* cmdline, int op, char* response);   // AT+JVMD
int play_media_handler(char* cmdline, int op, char* response);  // AT+JVMP
