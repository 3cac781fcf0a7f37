// Power-off, restart, master clear, restore and updates from the memory card: the commands
// that end a station's work on the phone.
#pragma once

// Writes `text` (at most 255 characters) into the recovery command file without truncating
// it, so a longer earlier command keeps its tail. 0, or -1.
int write_recovery_command(const char* text);

// Marks the record for a restore and stops the log capture. 1 on success, 0 on failure.
int set_restore_flag();

int jvgj_handler(char* cmdline, int op, char* response);
int jvreboot_handler(char* cmdline, int op, char* response);
int jvrt_handler(char* cmdline, int op, char* response);
int jvrtall_handler(char* cmdline, int op, char* response);
int jvupdate_handler(char* cmdline, int op, char* response);
