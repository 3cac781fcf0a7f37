// Smart speaker amplifier calibration through the amplifier's debugfs files, and the I2C
// status check of the audio devices under /d.
#pragma once

int smart_speaker_Amplifier_calibrate_handler(char* cmdline, int op, char* response);  // AT+ZNGF
int i2c_device_test_handler(char* cmdline, int op, char* response);  // AT+JVAUDIO
