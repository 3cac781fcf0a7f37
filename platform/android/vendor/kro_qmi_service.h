// The maker's QMI service object (its IDL library, shipped with the product's QMI services).
#pragma once

#include <cstdint>

#include "platform/android/vendor/qmi_cci.h"

namespace vendor {
extern "C" {

// Null when the library's object does not match the asked versions.
qmi_idl_service_object_type kro_get_service_object_internal_v01(int32_t idl_maj_version,
                                                                int32_t idl_min_version,
                                                                int32_t library_version);

}  // extern "C"
}  // namespace vendor
