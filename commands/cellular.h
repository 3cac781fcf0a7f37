// Cellular, SIM and antenna commands: airplane mode, status-bar switches, network search,
// radio type, SIM 2, antennas and DPDT, MEID and WLAN MAC in modem NV, virtual SIM, NFC tag
// and the WLAN connection.
#pragma once

int plan_mode_test_handler(char* cmdline, int op, char* response);     // AT+OFFL
int status_bar_3g_handler(char* cmdline, int op, char* response);      // AT+JVSB3G
int status_bar_data_handler(char* cmdline, int op, char* response);    // AT+JVSBDT
int fast_search_net_handler(char* cmdline, int op, char* response);    // AT+JVSWXFK
int fast_search_test_handler(char* cmdline, int op, char* response);   // AT+JVSFT
int radio_type_handler(char* cmdline, int op, char* response);         // AT+JVRADIO
int set_sim2_status_handler(char* cmdline, int op, char* response);    // AT+JVSIMT
int primary_or_diversity_handler(char* cmdline, int op, char* response);  // AT+JVZFTX
int meid_code_handler(char* cmdline, int op, char* response);          // AT+JVMEID
int wlan_addr_handler(char* cmdline, int op, char* response);          // AT+JVWMAC
int virtual_sim_handler(char* cmdline, int op, char* response);        // AT+JVVSIM
int set_dpdt_status_handler(char* cmdline, int op, char* response);    // AT+JVDPDT
int nfc_tag_handler(char* cmdline, int op, char* response);            // AT+JVNFC
int conn_wifi_handler(char* cmdline, int op, char* response);          // AT+JVCONNWIFI
