// GPS and FM: the modem's GPS test and its poll worker, the location track wait, the FM tuner.
#pragma once

#include <atomic>

int gps_handler(char* cmdline, int op, char* response);               // AT+JVGPS
int locate_access_on_handler(char* cmdline, int op, char* response);  // AT+JVDW
int fm_test_handler(char* cmdline, int op, char* response);           // AT+JVFM

// Asks the modem for fresh GPS values every 300 ms until told to stop.
void update_gps_value_thread();

// GPS poll workers running now, and the most that ever ran at once.
extern std::atomic<int> gps_workers_running;
extern std::atomic<int> gps_workers_peak;
