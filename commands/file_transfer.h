// File transfer into the data partition over the port, two characters per byte, and its MD5
// check.
#pragma once

// Where a transfer is received until all of it is written and synced. Longer than any name
// a station may give, so it never stands for a stored file.
inline constexpr const char* FILE_TRANSFER_PARTIAL = "/data/.atcid-file-transfer.partial";

int jvfile_handler(char* cmdline, int op, char* response);
