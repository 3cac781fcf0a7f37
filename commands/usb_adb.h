// USB function mode, debug access (ADB) and USB mass storage; closing the debug access at the
// end of the line, and the cable watch that powers the phone down once the cable is pulled.
#pragma once

// Commits the data partition, and with it the factory record, by writing and syncing a
// 2 MiB scratch file that is then deleted. 0, or -1 when the file cannot be created.
int write_file_to_data();

// Clears the debug flag, answers the station early and switches USB to charging. `cmdline`
// is the line echoed in the early answer. 1 on success, -1 when the record could not be
// changed (USB is then left as it was).
int close_adb(const char* cmdline);


int jvadb_handler(char* cmdline, int op, char* response);
int jvdiag_handler(char* cmdline, int op, char* response);
int jvcom_handler(char* cmdline, int op, char* response);
int omenu_handler(char* cmdline, int op, char* response);
