// WLAN RF test: the driver's factory-test mode driven through iwpriv.
#pragma once

int wifi_handler(char* cmdline, int op, char* response);  // AT+JVWLAN

// 1 when a line of /proc/modules begins with `module`, else 0.
int check_driver_loaded(const char* module);
