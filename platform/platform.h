// The platform boundary: everything that differs between the phone and a host build.
// Command and service code reaches the device only through these functions.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <dirent.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/types.h>

// Start-up of the platform layer. On a host build this requires ATCID_ROOT, makes it the
// working directory and prints a message and returns non-zero when it is missing.
int platform_init();

// Device paths. Absolute and relative paths both resolve against the device's root.
int dev_open(const char* path, int flags, mode_t mode = 0);
FILE* dev_fopen(const char* path, const char* mode);
DIR* dev_opendir(const char* path);
int dev_stat(const char* path, struct stat* st);
int dev_lstat(const char* path, struct stat* st);
int dev_access(const char* path, int mode);
int dev_unlink(const char* path);
int dev_rmdir(const char* path);
int dev_mkdir(const char* path, mode_t mode);
int dev_rename(const char* from, const char* to);
int dev_statfs(const char* path, struct statfs* st);
ssize_t dev_readlink(const char* path, char* buf, size_t size);

// Android system properties (libcutils contract).
inline constexpr int PROPERTY_KEY_MAX = 32;
inline constexpr int PROPERTY_VALUE_MAX = 92;
int property_get(const char* key, char* value, const char* default_value);
int property_set(const char* key, const char* value);

// Writes one finished log line for the Android log. A null tag logs untagged.
void platform_log_write(int priority, const char* tag, const char* text);
// The daemon's log lines leave through a writer thread from now on (a host build; the phone's
// log daemon does that already). Flush writes out every line logged so far.
void platform_log_in_background();
void platform_log_flush();

// Runs a command text as system(3) would and returns its wait status.
int platform_system(const char* command);

// Commits written data to storage before the link or the power goes away. A host build
// flushes only the file system of the device root.
void platform_sync();

// The phone goes away: neither returns.
[[noreturn]] void platform_restart();
[[noreturn]] void platform_power_off();

// TCP port of the socket transport.
int platform_tcp_port();
// IPv4 address (network byte order) the socket transport listens on: all interfaces on the
// phone. 0, or -1 when the configured address is not usable.
int platform_tcp_listen_address(uint32_t* address);

// Android wake locks (libhardware_legacy). 0, or -1 when the request could not be made.
inline constexpr int PARTIAL_WAKE_LOCK = 1;
int acquire_wake_lock(int type, const char* name);
int release_wake_lock(const char* name);

// The frame buffer's blank request (FBIOBLANK) on an open frame-buffer descriptor: 0, or -1.
inline constexpr int PLATFORM_FB_BLANK_POWERDOWN = 4;
int platform_fb_blank(int fd, int mode);

// The FM tuner's signal strength: VIDIOC_G_TUNER for tuner 0 on the open radio device. 0 with
// `signal` set; -1 when the tuner cannot be read (`signal` untouched).
int platform_fm_tuner_signal(int fd, int* signal);
