// The audio system's parameter setter (libmedia; libaudioclient on later releases). String8
// and status_t are libutils' own.
#pragma once

#include <utils/Errors.h>
#include <utils/String8.h>

namespace android {

using audio_io_handle_t = int;

class AudioSystem {
 public:
  // Key-value pairs "k1=v1;k2=v2" for one I/O handle; 0 is the default output.
  static status_t setParameters(audio_io_handle_t io_handle, const String8& key_value_pairs);
};

}  // namespace android
