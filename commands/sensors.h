// Motion and ambient sensor tests and calibrations, with the g-sensor Z stream.
#pragma once

#include <atomic>
#include <pthread.h>

#include "commands/battery.h"

// The Z stream runs while the flag is false; its handle is NO_THREAD when none is recorded.
extern std::atomic<bool> gsensor_test_exit;
extern std::atomic<pthread_t> gsensor_z_thread;

// A sensor value as an integer: truncated toward zero, saturated at the int32 limits, NaN 0.
int sensor_value_to_int(float value);

int jvzljc_handler(char* cmdline, int op, char* response);
int jvdzlp_handler(char* cmdline, int op, char* response);
int jvhwkj_handler(char* cmdline, int op, char* response);
int jvgm_handler(char* cmdline, int op, char* response);
int jvtly_handler(char* cmdline, int op, char* response);
