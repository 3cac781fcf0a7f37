// Identity and provisioning: the board barcode and IMEI in the modem, two further modem
// items, the device-key tool and system properties by name.
#pragma once

int imei_and_pcb_code_on_handler(char* cmdline, int op, char* response);
int nv_66024_handler(char* cmdline, int op, char* response);
int change_sig_system_handler(char* cmdline, int op, char* response);
int RSA_key_handler(char* cmdline, int op, char* response);
int property_set_handler(char* cmdline, int op, char* response);
