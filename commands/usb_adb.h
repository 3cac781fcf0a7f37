// USB function mode, debug access (ADB) and USB mass storage; closing the debug access at the
// end of the line, and the cable watch that powers the phone down once the cable is pulled.
#pragma once

#include <pthread.h>

#include <atomic>

// Commits the data partition, and with it the factory record, by writing and syncing a
// 2 MiB scratch file that is then deleted. 0, or -1 when the file cannot be created.
int write_file_to_data();

// Clears the debug flag, answers the station early and switches USB to charging. `cmdline`
// is the line echoed in the early answer. 1 on success, -1 when the record could not be
// changed (USB is then left as it was).
int close_adb(const char* cmdline);

// Starts `routine` on a detached thread; its handle goes to `handle` when given.
bool start_detached_thread(void* (*routine)(void*), pthread_t* handle = nullptr);

// Cable watches started and not yet ended (each AT+JVADB=0,3 starts one).
extern std::atomic<int> usb_watch_count;

int jvadb_handler(char* cmdline, int op, char* response);
int jvdiag_handler(char* cmdline, int op, char* response);
int jvcom_handler(char* cmdline, int op, char* response);
int omenu_handler(char* cmdline, int op, char* response);
