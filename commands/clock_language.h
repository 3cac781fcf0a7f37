// The phone's clock through the shell's date tool, and its language and region through the
// engineer-mode application.
#pragma once

int get_system_time_handler(char* cmdline, int op, char* response);
int set_language_handler(char* cmdline, int op, char* response);
int set_default_language_handler(char* cmdline, int op, char* response);
