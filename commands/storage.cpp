#include "commands/storage.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string_view>
#include <strings.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <unistd.h>

#include "commands/command_util.h"
#include "commands/shell.h"
#include "core/command.h"
#include "core/log.h"
#include "platform/platform.h"
#include "platform/unique_fd.h"
#include "services/ulda_nvram.h"

keep_list clear_sdcard_keep;
keep_list jvfn_keep;

namespace {

constexpr size_t kPathSize = 1024;
// "/storage/sdcard0/": what a full path loses to become relative to the storage.
constexpr size_t kRootPrefixLength = 17;
static_assert(std::string_view(SDCARD_ROOT).size() + 1 == kRootPrefixLength);

// ---- Keep list ----

// Reads one line of at most KEEP_ENTRY_SIZE - 1 characters. A longer line is skipped whole:
// its tail must not be read as a line of its own.
bool read_keep_line(FILE* file, char (&line)[KEEP_ENTRY_SIZE], bool& too_long) {
  if (std::fgets(line, sizeof line, file) == nullptr) return false;
  const size_t length = std::strlen(line);
  too_long = false;
  if (length + 1 == sizeof line && line[length - 1] != '\n') {
    int c = std::fgetc(file);
    if (c != EOF && c != '\n') {
      too_long = true;
      while (c != EOF && c != '\n') c = std::fgetc(file);
    }
  }
  return true;
}

// Fills `keep` from its first entries on; what lies behind them stays (see storage.h).
// Returns the number of file entries written, or -1 when the keep list cannot be opened.
int load_keep_list(keep_list& keep) {
  UniqueFile file(dev_fopen(CLEAR_SDCARD_CFG, "r"));
  if (!file) {
    ATCI_LOGE("cannot open %s", CLEAR_SDCARD_CFG);
    return -1;
  }
  size_t dir_count = 0;
  size_t file_count = 0;
  char line[KEEP_ENTRY_SIZE];
  bool too_long = false;
  while (read_keep_line(file.get(), line, too_long)) {
    if (too_long) {
      ATCI_LOGW("keep list line too long, skipped");
      continue;
    }
    size_t length = std::strlen(line);
    while (length > 0 && std::strchr(" \t\r\n", line[length - 1]) != nullptr) line[--length] = '\0';
    // The path starts at the third character, whatever the second is. An empty path would
    // end the list early, so such a line is skipped.
    if (length < 3) continue;
    const char* path = line + 2;
    if (line[0] == 'd' && dir_count < KEEP_DIR_COUNT)
      std::memcpy(keep.dirs[dir_count++], path, length - 1);
    else if (line[0] == 'f' && file_count < KEEP_FILE_COUNT)
      std::memcpy(keep.files[file_count++], path, length - 1);
    else if (line[0] == 'd' || line[0] == 'f')
      ATCI_LOGW("keep list full, entry %s skipped", path);
  }
  return static_cast<int>(file_count);
}

bool keeps_file(const keep_list& keep, const char* relative) {
  for (size_t i = 0; keep.files[i][0] != '\0'; ++i)
    if (std::strcmp(keep.files[i], relative) == 0) return true;
  return false;
}

bool keeps_dir_exactly(const keep_list& keep, const char* relative) {
  for (size_t i = 0; keep.dirs[i][0] != '\0'; ++i)
    if (std::strcmp(keep.dirs[i], relative) == 0) return true;
  return false;
}

// A kept path lies inside `relative` when an entry is longer and begins with it. There is no
// separator check: "DCIM" also begins "DCIM2/x".
bool keeps_inside(const keep_list& keep, std::string_view relative) {
  for (size_t i = 0; keep.dirs[i][0] != '\0'; ++i) {
    const std::string_view entry(keep.dirs[i]);
    if (entry.size() > relative.size() && entry.starts_with(relative)) return true;
  }
  return false;
}

// ---- Walking without following links ----
// The walk opens the card by its device path, as opendir would (the card itself may be a link),
// and reaches everything below it relative to the directory it stands in, by name, never
// through a link: a link is an entry like a file, removed and never followed.

enum class EntryKind { kDirectory, kRegular, kLink, kOther, kGone };

// The directory entry describes the entry itself, never a link's target; fstatat without
// following answers when the file system does not say.
EntryKind entry_kind(int dir_fd, const dirent* entry) {
  switch (entry->d_type) {
    case DT_DIR: return EntryKind::kDirectory;
    case DT_REG: return EntryKind::kRegular;
    case DT_LNK: return EntryKind::kLink;
    case DT_UNKNOWN: break;
    default: return EntryKind::kOther;
  }
  struct stat st {};
  if (::fstatat(dir_fd, entry->d_name, &st, AT_SYMLINK_NOFOLLOW) != 0) return EntryKind::kGone;
  if (S_ISDIR(st.st_mode)) return EntryKind::kDirectory;
  if (S_ISREG(st.st_mode)) return EntryKind::kRegular;
  if (S_ISLNK(st.st_mode)) return EntryKind::kLink;
  return EntryKind::kOther;
}

// Opens the directory `name` of `parent` only if it is one itself: a link that took its place
// since the directory was read is refused, not followed.
UniqueDir open_subdir(int parent, const char* name) {
  UniqueFd fd(::openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!fd.ok()) return nullptr;
  UniqueDir dir(::fdopendir(fd.get()));
  if (dir) fd.release();
  return dir;
}

// The full path of the entry the walk stands on, for keep-list matching and messages. One
// buffer serves the whole walk: each level appends its entry's name and cuts it off again.
struct WalkPath {
  char text[kPathSize];
  size_t length;

  explicit WalkPath(const char* start) : length(std::strlen(start)) {
    std::memcpy(text, start, length + 1);
  }
  const char* relative() const { return text + kRootPrefixLength; }
  std::string_view relative_view() const {
    return {text + kRootPrefixLength, length - kRootPrefixLength};
  }
};

// Calls visit(dir_fd, name, kind) for every entry of `dir` but "." and "..", with `path` set to
// "path/name" meanwhile. An entry whose path does not fit is skipped rather than cut: a cut
// path would name another file.
template <typename Visit>
void for_each_entry(DIR* dir, WalkPath& path, Visit&& visit) {
  const int fd = ::dirfd(dir);
  const size_t base = path.length;
  while (const dirent* entry = ::readdir(dir)) {
    const char* name = entry->d_name;
    if (name[0] == '.' && (name[1] == '\0' || (name[1] == '.' && name[2] == '\0'))) continue;
    const size_t name_length = std::strlen(name);
    if (base + 1 + name_length >= kPathSize) {
      ATCI_LOGW("path too long, skipped: %s/%s", path.text, name);
      continue;
    }
    path.text[base] = '/';
    std::memcpy(path.text + base + 1, name, name_length + 1);
    path.length = base + 1 + name_length;
    visit(fd, static_cast<const char*>(name), entry_kind(fd, entry));
    path.text[base] = '\0';
    path.length = base;
  }
}

// Removes regular files and links, descends into directories, then removes the directory
// `name` of `parent` (`path` names it). Other entries stay, and so does the directory that
// holds them.
void delete_recursively(int parent, const char* name, WalkPath& path) {
  UniqueDir dir(open_subdir(parent, name));
  if (!dir) {
    std::printf("Fail to read %s : %s\r\n", path.text, std::strerror(errno));
    return;
  }
  for_each_entry(dir.get(), path, [&path](int fd, const char* entry, EntryKind kind) {
    if (kind == EntryKind::kRegular || kind == EntryKind::kLink)
      ::unlinkat(fd, entry, 0);
    else if (kind == EntryKind::kDirectory)
      delete_recursively(fd, entry, path);
  });
  dir.reset();
  ::unlinkat(parent, name, AT_REMOVEDIR);
}

void clean_directory(DIR* dir, WalkPath& path, const keep_list& keep) {
  for_each_entry(dir, path, [&path, &keep](int fd, const char* name, EntryKind kind) {
    if (kind == EntryKind::kGone) return;
    if (kind != EntryKind::kDirectory) {
      if (!keeps_file(keep, path.relative())) ::unlinkat(fd, name, 0);
      return;
    }
    // A directory kept whole wins over a kept path inside it, whatever their order.
    if (keeps_dir_exactly(keep, path.relative())) return;
    if (!keeps_inside(keep, path.relative_view())) {
      delete_recursively(fd, name, path);
      return;
    }
    if (UniqueDir inner = open_subdir(fd, name))
      clean_directory(inner.get(), path, keep);
    else
      ATCI_LOGE("cannot open %s: %s", path.text, std::strerror(errno));
  });
}

// Counts what lies below the directory `dir` (`path` names it).
void count_below(DIR* dir, WalkPath& path, int* dirs, int* files) {
  for_each_entry(dir, path, [&](int fd, const char* name, EntryKind kind) {
    if (kind == EntryKind::kGone) return;
    if (kind != EntryKind::kDirectory) {
      ++*files;
      return;
    }
    ++*dirs;
    if (UniqueDir inner = open_subdir(fd, name))
      count_below(inner.get(), path, dirs, files);
    else
      ATCI_LOGE("cannot open %s: %s", path.text, std::strerror(errno));
  });
}

bool exists(const char* path) {
  struct stat st {};
  return dev_lstat(path, &st) == 0;
}

// ---- Sizes ----

struct StorageSize {
  double total_gb;
  double used_mb;
};

bool storage_size(const char* path, StorageSize& size) {
  struct statfs st {};
  if (dev_statfs(path, &st) != 0) {
    ATCI_LOGE("statfs %s: %s", path, std::strerror(errno));
    return false;
  }
  const auto block = static_cast<uint64_t>(st.f_bsize);
  size.total_gb = static_cast<double>(st.f_blocks * block) * 9.313225746154785e-10;
  size.used_mb = static_cast<double>((st.f_blocks - st.f_bavail) * block) * 9.5367431640625e-7;
  return true;
}

int answer_sizes(char* response, double total_gb, double used_mb) {
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%.2f,%.3f\"\r\n", total_gb, used_mb);
  return RESULT_OK;
}

// Megabytes in use on the emulated storage, as du counts them.
bool emulated_storage_used_mb(double& used_mb) {
  char line[128];
  const bool read =
      sh_first_line("du -sk /storage/sdcard0/", "/data/udroom", line, sizeof line) > 0;
  if (read) {
    const std::string_view text(line);
    used_mb = static_cast<double>(parse_long(text.substr(0, text.find('\t')))) * 0.0009765625;
  }
  // Removes the OTG scratch file, not /data/udroom: the phone has always done so.
  run_sh_command("rm /data/getevent");
  return read;
}

struct AccessCheck {
  const char* variant;
  const char* path;
};
constexpr AccessCheck kMemoryCardAccess{"AT+JVTFWR=0", "/storage/sdcard1"};
constexpr AccessCheck kInternalStorageAccess{"AT+JVUDWR=0", SDCARD_ROOT};

int answer_access_check(const AccessCheck& check, const char* cmdline) {
  if (!line_is(cmdline, check.variant)) return REJECT_COMMAND_LINE(cmdline);
  return result_of(dev_access(check.path, R_OK | W_OK) == 0);
}

}  // namespace

int clear_sdcard(const char* mode) {
  const int file_count = load_keep_list(clear_sdcard_keep);
  if (file_count < 0) return 0;
  dev_unlink("/storage/sdcard0/.sdimg_check");
  if (mode != nullptr && std::strcmp(mode, "update_app") == 0 &&
      static_cast<size_t>(file_count) < KEEP_FILE_COUNT)
    std::strcpy(clear_sdcard_keep.files[file_count], "apps.zip");
  UniqueDir root(dev_opendir(SDCARD_ROOT));
  if (!root) {
    ATCI_LOGE("cannot open %s: %s", SDCARD_ROOT, std::strerror(errno));
    return 1;
  }
  WalkPath path(SDCARD_ROOT);
  clean_directory(root.get(), path, clear_sdcard_keep);
  return 1;
}

void traversal_directory(const char* path, int* dirs, int* files) {
  UniqueDir dir;
  if (std::strlen(path) < kPathSize) {
    UniqueFd fd(dev_open(path, O_RDONLY | O_DIRECTORY | O_NOFOLLOW));
    if (fd.ok() && (dir = UniqueDir(::fdopendir(fd.get())))) fd.release();
  } else {
    errno = ENAMETOOLONG;
  }
  if (!dir) {
    ATCI_LOGE("cannot open %s: %s", path, std::strerror(errno));
    return;
  }
  WalkPath walked(path);
  count_below(dir.get(), walked, dirs, files);
}

int tfst_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+TFST=0")) return REJECT_COMMAND_LINE(cmdline);
  char version[32];
  int length = read_first_line("/mnt/sdcard/.sdcard_version", version, sizeof version);
  if (length < 0)
    length = read_first_line("/storage/sdcard1/.sdcard_version", version, sizeof version);
  if (length <= 0) return LOGGED_ERROR("no memory card version file");
  return answer_quoted(response, version);
}

int jvsd_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVSD=0")) return REJECT_COMMAND_LINE(cmdline);
  run_sh_command("cat /proc/mounts > /sdcard/mount.txt");
  char mounts[4097];
  const ssize_t count = read_file_head("/sdcard/mount.txt", mounts, sizeof mounts - 1);
  dev_unlink("/sdcard/mount.txt");
  if (count < 1) return LOGGED_ERROR("cannot read /sdcard/mount.txt");
  char emulate[PROPERTY_VALUE_MAX];
  property_get("persist.sys.primary.emulate", emulate, "0");
  const std::string_view text(mounts);
  if (std::strcmp(emulate, "0") == 0)
    return result_of(text.find("/storage/sdcard0") != std::string_view::npos);
  if (std::strcmp(emulate, "1") == 0)
    return result_of(text.find("mnt/shell/emulated") != std::string_view::npos);
  return RESULT_ERROR;
}

int jvtfwr_handler(char* cmdline, int, char*) {
  return answer_access_check(kMemoryCardAccess, cmdline);
}

int jvudwr_handler(char* cmdline, int, char*) {
  return answer_access_check(kInternalStorageAccess, cmdline);
}

int jvotg_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVOTG=1")) return REJECT_COMMAND_LINE(cmdline);
  run_sh_command("ls /dev/input > /data/getevent");
  bool mouse = false;
  if (UniqueFile file{dev_fopen("/data/getevent", "r")}) {
    char line[1024];
    while (!mouse && std::fgets(line, sizeof line, file.get()) != nullptr) {
      line[std::strcspn(line, "\n")] = '\0';
      mouse = std::strstr(line, "mouse") != nullptr;
    }
  } else {
    ATCI_LOGE("cannot open /data/getevent");
  }
  run_sh_command("rm /data/getevent");
  return result_of(mouse);
}

int jvudroom_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVUDROOM=0")) return REJECT_COMMAND_LINE(cmdline);
  char emulate[PROPERTY_VALUE_MAX];
  property_get("persist.sys.primary.emulate", emulate, "0");
  StorageSize size{};
  if (std::strcmp(emulate, "0") == 0) {
    if (!storage_size(SDCARD_ROOT, size)) return RESULT_ERROR;
    return answer_sizes(response, size.total_gb, size.used_mb);
  }
  if (std::strcmp(emulate, "1") == 0) {
    double used_mb = 0;
    if (!storage_size("/data", size) || !emulated_storage_used_mb(used_mb)) return RESULT_ERROR;
    return answer_sizes(response, size.total_gb, used_mb);
  }
  return RESULT_OK;
}

int jvdf_handler(char* cmdline, int, char*) {
  if (!line_is(cmdline, "AT+JVDF=1")) return REJECT_COMMAND_LINE(cmdline);
  return result_of(clear_sdcard(nullptr) == 1);
}

int jvfn_handler(char* cmdline, int, char* response) {
  if (!line_is(cmdline, "AT+JVFN=0")) return REJECT_COMMAND_LINE(cmdline);
  if (load_keep_list(jvfn_keep) < 0) return RESULT_ERROR;
  int dirs = 0;
  int files = 0;
  bool clean = true;
  if (UniqueDir root{dev_opendir(SDCARD_ROOT)}) {
    WalkPath path(SDCARD_ROOT);
    for_each_entry(root.get(), path, [&](int fd, const char* name, EntryKind kind) {
      if (kind == EntryKind::kGone) return;
      if (kind != EntryKind::kDirectory) {
        if (keeps_file(jvfn_keep, path.relative())) ++files;
        if (strncasecmp(name, "oem_", 4) == 0) clean = false;
      } else if (keeps_dir_exactly(jvfn_keep, path.relative())) {
        if (UniqueDir inner = open_subdir(fd, name))
          count_below(inner.get(), path, &dirs, &files);
        else
          ATCI_LOGE("cannot open %s: %s", path.text, std::strerror(errno));
        ++dirs;
      }
    });
  }
  // Test leftovers, logs and the image check mark: any of them fails the check.
  static constexpr const char* kLeftovers[] = {
      "/storage/sdcard0/相机",         "/storage/sdcard0/Camera",
      "/storage/sdcard0/DCIM",         "/storage/sdcard0/factory_test.amr",
      "/storage/sdcard0/apps.zip",     "/storage/sdcard0/krolog",
      "/storage/sdcard0/mtklog",       "/storage/sdcard0/.sdimg_check",
  };
  for (const char* leftover : kLeftovers)
    if (exists(leftover)) clean = false;
  std::snprintf(response, RESPONSE_SIZE, "\r\n\"%d, %d\"\r\n", dirs, files);
  return result_of(clean);
}

int jvsdcali_handler(char* cmdline, int, char* response) {
  if (line_is(cmdline, "AT+JVSDCALI=0"))
    return answer_record_int(__func__, response, &ulda_nvram::sdcard_cali_flag);
  if (!line_is(cmdline, "AT+JVSDCALI=1")) return REJECT_COMMAND_LINE(cmdline);
  return update_ulda_nvram(__func__, [](ulda_nvram& record) {
    struct statfs before {};
    struct statfs after {};
    if (dev_statfs(SDCARD_ROOT, &before) != 0) return false;
    if (!shell_succeeded(run_sh_command("vdc volume calibrate /storage/sdcard0")))
      return false;
    if (dev_statfs(SDCARD_ROOT, &after) != 0) return false;
    const auto bytes = [](const struct statfs& st) {
      return static_cast<long double>(st.f_blocks) * static_cast<long double>(st.f_bsize);
    };
    if (bytes(before) == bytes(after)) {
      ATCI_LOGE("sizeof scard is wrong!!!");
      return false;
    }
    constexpr int32_t kCalibrated = 88;  // 'X'
    record.sdcard_cali_flag = kCalibrated;
    return true;
  });
}
