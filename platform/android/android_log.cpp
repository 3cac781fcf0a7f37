// The Android log on the phone: liblog.
#include <android/log.h>

#include "platform/platform.h"

// The text is finished: it goes out as "%s" so a '%' in a logged value stays a character.
void platform_log_write(int priority, const char* tag, const char* text) {
  __android_log_print(priority, tag, "%s", text);
}

// liblog hands lines to the log daemon without waiting for it: nothing to move off the
// caller's thread and nothing held back to flush.
void platform_log_in_background() {}
void platform_log_flush() {}
