// Device information queries: memory, flash, chip, panel, camera and touch identities, SIM
// and card state, the hall switch and the fingerprint sensor.
#pragma once

#include <string_view>

// A SIM state that means a card is in the slot ("READY", "PIN_REQUIRED", ...).
bool sim_state_present(std::string_view state);

// 1 when "ro.pemu.product.model" is exactly `model` ("QM0305" is not "QM0305A"); read afresh
// on every call.
int is_product_model(const char* model);

int jvmodel_handler(char* cmdline, int op, char* response);
int jvram_handler(char* cmdline, int op, char* response);
int jvfq_handler(char* cmdline, int op, char* response);
int jvrid_handler(char* cmdline, int op, char* response);
int jvcpuid_handler(char* cmdline, int op, char* response);
int jvseboot_handler(char* cmdline, int op, char* response);
int jvbbtype_handler(char* cmdline, int op, char* response);
int jvmpps_handler(char* cmdline, int op, char* response);
int jvlcmid_handler(char* cmdline, int op, char* response);
int jvpid_handler(char* cmdline, int op, char* response);
int jvckic_handler(char* cmdline, int op, char* response);
int jvccmid_handler(char* cmdline, int op, char* response);
int jvtwst_handler(char* cmdline, int op, char* response);
int jvdcid_handler(char* cmdline, int op, char* response);
int jvusb_handler(char* cmdline, int op, char* response);
int jvsim_handler(char* cmdline, int op, char* response);
int jvcard_handler(char* cmdline, int op, char* response);
int jvts_handler(char* cmdline, int op, char* response);
int jvhall_handler(char* cmdline, int op, char* response);
int jvzwsb_handler(char* cmdline, int op, char* response);
int jvccm_handler(char* cmdline, int op, char* response);
// AT+JVZSJ and AT+JVIICRC share this row handler; it answers "Not Implement".
int jvzsj_iicrc_handler(char* cmdline, int op, char* response);
