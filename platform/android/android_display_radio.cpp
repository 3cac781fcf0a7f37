// The kernel interfaces of the display and FM tests on the phone: frame-buffer blanking and
// the Video4Linux tuner.
#include <linux/fb.h>
#include <linux/videodev2.h>
#include <sys/ioctl.h>

#include <cstring>

#include "platform/platform.h"

int platform_fb_blank(int fd, int mode) { return ::ioctl(fd, FBIOBLANK, mode); }

// Tuner 0's signal strength.
int platform_fm_tuner_signal(int fd, int* signal) {
  v4l2_tuner tuner;
  std::memset(&tuner, 0, sizeof tuner);
  tuner.index = 0;
  if (::ioctl(fd, VIDIOC_G_TUNER, &tuner) != 0) return -1;
  *signal = static_cast<int>(tuner.signal);
  return 0;
}
