// The daemon's Android log: tag "ATCID", every text prefixed "%d:%s(): " from the call site.
#pragma once

// Syslog-style levels, turned into Android priorities by android_log_lvl_convert.
inline constexpr int LOG_LVL_ERR = 3;
inline constexpr int LOG_LVL_WARNING = 4;
inline constexpr int LOG_LVL_INFO = 6;
inline constexpr int LOG_LVL_DEBUG = 7;

extern const int android_log_lvl_convert[8];

void atci_log(int level, int line, const char* func, const char* fmt, ...)
    __attribute__((format(printf, 4, 5)));
// Untagged and without the call-site prefix, for the few callers that log so.
void atci_log_untagged(int level, const char* fmt, ...) __attribute__((format(printf, 2, 3)));

#define ATCI_LOG(level, fmt, ...) atci_log((level), __LINE__, __func__, fmt __VA_OPT__(, ) __VA_ARGS__)
#define ATCI_LOGE(fmt, ...) ATCI_LOG(LOG_LVL_ERR, fmt __VA_OPT__(, ) __VA_ARGS__)
#define ATCI_LOGW(fmt, ...) ATCI_LOG(LOG_LVL_WARNING, fmt __VA_OPT__(, ) __VA_ARGS__)
#define ATCI_LOGI(fmt, ...) ATCI_LOG(LOG_LVL_INFO, fmt __VA_OPT__(, ) __VA_ARGS__)
#define ATCI_LOGD(fmt, ...) ATCI_LOG(LOG_LVL_DEBUG, fmt __VA_OPT__(, ) __VA_ARGS__)
