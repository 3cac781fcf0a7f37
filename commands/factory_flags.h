// Factory flags kept in the factory record, log captures and one-shot provisioning tools.
#pragma once

#include <atomic>

// True while the root integrity check runs; at most one runs at a time.
extern std::atomic<bool> root_integrity_check_running;

int jvcn_handler(char* cmdline, int op, char* response);
int jvmmiui_handler(char* cmdline, int op, char* response);
int jvroot_handler(char* cmdline, int op, char* response);
int jv3g_handler(char* cmdline, int op, char* response);
int jvfeature_handler(char* cmdline, int op, char* response);
int jvtestmmi_handler(char* cmdline, int op, char* response);
int jvkj_handler(char* cmdline, int op, char* response);
int jvdl_handler(char* cmdline, int op, char* response);
int jvnc_handler(char* cmdline, int op, char* response);
int jvlog_handler(char* cmdline, int op, char* response);
int jvefs_handler(char* cmdline, int op, char* response);
int jvrdnv_handler(char* cmdline, int op, char* response);
int jvqlog_handler(char* cmdline, int op, char* response);
int jvlogat_handler(char* cmdline, int op, char* response);
int jvsyjm_handler(char* cmdline, int op, char* response);
int jvg3g_handler(char* cmdline, int op, char* response);
int jvqhzs_handler(char* cmdline, int op, char* response);
