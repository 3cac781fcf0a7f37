// Storage tests: mounts, sizes and access of the internal storage and the memory card, the
// OTG mouse, and clearing the internal storage down to its keep list before shipment.
#pragma once

#include <cstddef>

inline constexpr const char* SDCARD_ROOT = "/storage/sdcard0";
inline constexpr const char* CLEAR_SDCARD_CFG = "/storage/sdcard0/.clear_sdcard.cfg";

// Keep-list capacity: entries of KEEP_ENTRY_SIZE bytes; the lists end at an empty entry, which
// the extra last row always is.
inline constexpr size_t KEEP_ENTRY_SIZE = 1024;
inline constexpr size_t KEEP_FILE_COUNT = 200;
inline constexpr size_t KEEP_DIR_COUNT = 200;

struct keep_list {
  char dirs[KEEP_DIR_COUNT + 1][KEEP_ENTRY_SIZE];
  char files[KEEP_FILE_COUNT + 1][KEEP_ENTRY_SIZE];
};

// The lists of clear_sdcard and of AT+JVFN. Each run fills them from the first entry without
// clearing them: entries of an earlier, longer list stay behind the new ones and still count.
extern keep_list clear_sdcard_keep;
extern keep_list jvfn_keep;

// Deletes everything on the internal storage that the keep list does not keep. With the mode
// "update_app", "apps.zip" is kept too. 1 when the keep list was read, 0 when it is missing.
int clear_sdcard(const char* mode);

// Counts, below `path` at any depth, every directory into `dirs` and every other entry into
// `files`. Links are counted, never followed.
void traversal_directory(const char* path, int* dirs, int* files);

int tfst_handler(char* cmdline, int op, char* response);
int jvsd_handler(char* cmdline, int op, char* response);
int jvtfwr_handler(char* cmdline, int op, char* response);
int jvudwr_handler(char* cmdline, int op, char* response);
int jvotg_handler(char* cmdline, int op, char* response);
int jvudroom_handler(char* cmdline, int op, char* response);
int jvdf_handler(char* cmdline, int op, char* response);
int jvfn_handler(char* cmdline, int op, char* response);
int jvsdcali_handler(char* cmdline, int op, char* response);
