// Operator customisation: the operator flag in the factory record, the region code the export
// products carry in the modem, and the check that the installed operator software matches.
#pragma once

// 0 when "ro.pemu.product.model" is listed in the release-name list and, when `name` is given,
// one of the keys after it is `name`; -1 otherwise.
int find_release_name(const char* name);

// Writes the region code for `flag` (a country code) into the modem when this product and
// hardware carry one. 0 when written or when nothing is to be written, -1 on failure.
int write_region_code(const char* flag);

int optr_flag_handler(char* cmdline, int op, char* response);
int check_oem_handler(char* cmdline, int op, char* response);
