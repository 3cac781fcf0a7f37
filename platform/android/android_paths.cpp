// Device paths on the phone: the real file system, through plain libc calls.
#include <fcntl.h>
#include <unistd.h>

#include "platform/platform.h"

int platform_init() { return 0; }

// Close-on-exec keeps the port and the frame buffer out of every shell child.
int dev_open(const char* path, int flags, mode_t mode) {
  return ::open(path, flags | O_CLOEXEC, mode);
}
FILE* dev_fopen(const char* path, const char* mode) { return ::fopen(path, mode); }
DIR* dev_opendir(const char* path) { return ::opendir(path); }
int dev_stat(const char* path, struct stat* st) { return ::stat(path, st); }
int dev_lstat(const char* path, struct stat* st) { return ::lstat(path, st); }
int dev_access(const char* path, int mode) { return ::access(path, mode); }
int dev_unlink(const char* path) { return ::unlink(path); }
int dev_rmdir(const char* path) { return ::rmdir(path); }
int dev_mkdir(const char* path, mode_t mode) { return ::mkdir(path, mode); }
int dev_rename(const char* from, const char* to) { return ::rename(from, to); }
int dev_statfs(const char* path, struct statfs* st) { return ::statfs(path, st); }
ssize_t dev_readlink(const char* path, char* buf, size_t size) {
  return ::readlink(path, buf, size);
}
