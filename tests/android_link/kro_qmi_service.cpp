#include "platform/android/vendor/kro_qmi_service.h"

#include <cstdlib>

namespace vendor {

qmi_idl_service_object_type kro_get_service_object_internal_v01(int32_t, int32_t, int32_t) {
  std::abort();
}

}  // namespace vendor
