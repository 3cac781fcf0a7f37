// Lights, vibrator, backlight and flashlight commands, with the vibrator and indicator-light
// worker threads.
#pragma once

// "OK" or "ERROR". 1 starts the worker, 0 stops it and waits for its final writes.
const char* vibrateControl(int on);
const char* indicateLightsControl(int on);
const char* buttonlightControl(int on);
const char* lcdBacklightControl(int on, int level);

// 0 when the node cannot be opened, else 1 (also for a state other than 0 or 1).
int Flashlight_setBackWhiteFlashlightState(int state);
int Flashlight_setBackWarmFlashlightState(int state);
int Flashlight_setFrontFlashlightState(int state);

int edft_handler(char* cmdline, int op, char* response);
int jvlight_handler(char* cmdline, int op, char* response);
int mmiled_handler(char* cmdline, int op, char* response);
int jvsg_handler(char* cmdline, int op, char* response);
int jvflight_handler(char* cmdline, int op, char* response);
int sgdjz_handler(char* cmdline, int op, char* response);
int jvsp_handler(char* cmdline, int op, char* response);
int jvbs_handler(char* cmdline, int op, char* response);
