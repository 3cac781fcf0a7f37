// The factory record, kept whole in /persist/ulda_nvram. A write goes to a temporary file
// that is flushed and renamed over the record, so a crash leaves the old record or the new.
#include "services/ulda_nvram.h"

#include <cstring>
#include <fcntl.h>
#include <unistd.h>

#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/file_io.h"

namespace {

constexpr char kDir[] = "/persist";
constexpr char kPath[] = "/persist/ulda_nvram";
constexpr char kTempPath[] = "/persist/ulda_nvram.tmp";

bool write_temp(const ulda_nvram* record) {
  UniqueFd fd(dev_open(kTempPath, O_WRONLY | O_CREAT | O_TRUNC, 0644));
  return fd.ok() && write_full(fd.get(), record, sizeof *record) && ::fsync(fd.get()) == 0;
}

bool sync_dir() {
  UniqueFd dir(dev_open(kDir, O_RDONLY | O_DIRECTORY));
  return dir.ok() && ::fsync(dir.get()) == 0;
}

}  // namespace

int get_ULDA_NV_item(ulda_nvram* record) {
  if (record == nullptr) return -1;
  UniqueFd fd(dev_open(kPath, O_RDONLY));
  if (!fd.ok()) return -1;
  ulda_nvram copy;
  if (read_full(fd.get(), &copy, sizeof copy) != static_cast<ssize_t>(sizeof copy)) return -1;
  std::memcpy(record, &copy, sizeof copy);
  return 0;
}

int put_ULDA_NV_item(const ulda_nvram* record) {
  if (record == nullptr) return -1;
  if (!write_temp(record) || dev_rename(kTempPath, kPath) != 0) {
    dev_unlink(kTempPath);
    return -1;
  }
  return sync_dir() ? 0 : -1;
}

int read_ulda_nvram(const char* caller, ulda_nvram& record) {
  std::memset(&record, 0, sizeof record);
  if (get_ULDA_NV_item(&record) == 0) return RESULT_OK;
  atci_log(LOG_LVL_ERR, __LINE__, caller, "===get_ULDA_NV_item(&ulda_nvram) fail");
  return RESULT_ERROR;
}

int write_ulda_nvram(const char* caller, const ulda_nvram& record) {
  if (put_ULDA_NV_item(&record) == 0) return RESULT_OK;
  atci_log(LOG_LVL_ERR, __LINE__, caller, "===put_ULDA_NV_item(&ulda_nvram) fail");
  return RESULT_ERROR;
}

// Logged under the name of its only caller.
int poll_adb_flag_cleared() {
  constexpr char kCaller[] = "close_adb";
  ulda_nvram record;
  int i = 1;
  for (; i <= 5; ++i) {
    std::memset(&record, 0, sizeof record);
    if (get_ULDA_NV_item(&record) == 0) {
      atci_log(LOG_LVL_DEBUG, __LINE__, kCaller, "===get success i:%d,ulda_nvram.adb_flag:%d", i,
               record.adb_flag);
      if (record.adb_flag == 0) return 0;
    }
    ::usleep(100 * 1000);
  }
  atci_log(LOG_LVL_ERR, __LINE__, kCaller, "===final i:%d,ulda_nvram.adb_flag:%d", i,
           record.adb_flag);
  return -1;
}
