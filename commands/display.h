// Display, touch and camera tests: test screens, colour calibration, the sleep-current test
// and the processor clock cap.
#pragma once

int lcmt_handler(char* cmdline, int op, char* response);
int jvlcd_handler(char* cmdline, int op, char* response);
int eqsb_handler(char* cmdline, int op, char* response);
int eslp_handler(char* cmdline, int op, char* response);
int mmiccm_handler(char* cmdline, int op, char* response);
int mmitw_handler(char* cmdline, int op, char* response);
