// Battery and charging commands, and the battery ADC stream's state that other families read.
#pragma once

#include <atomic>
#include <pthread.h>

// The ADC stream's handle: NO_THREAD when none is recorded. A stop forgets it at once.
extern std::atomic<pthread_t> adc_test_thread;
extern std::atomic<bool> eadc_test_exit;

int eadc_handler(char* cmdline, int op, char* response);
int jvdlj_handler(char* cmdline, int op, char* response);
int jvcharge_handler(char* cmdline, int op, char* response);
int jvcharg_handler(char* cmdline, int op, char* response);
int rmchargep_handler(char* cmdline, int op, char* response);
int jvqxgwbh_handler(char* cmdline, int op, char* response);
int jvdisrecharge_handler(char* cmdline, int op, char* response);
int jvdljcs_handler(char* cmdline, int op, char* response);
