#include "platform/android/vendor/qmi_cci.h"

#include <cstdlib>

namespace vendor {

qmi_client_error_type qmi_client_get_service_list(qmi_idl_service_object_type, qmi_service_info*,
                                                  unsigned*, unsigned*) {
  std::abort();
}
qmi_client_error_type qmi_client_init(qmi_service_info*, qmi_idl_service_object_type,
                                      qmi_client_ind_cb, void*, qmi_client_os_params*,
                                      qmi_client_type*) {
  std::abort();
}
qmi_client_error_type qmi_client_send_msg_async(qmi_client_type, unsigned, void*, unsigned, void*,
                                                unsigned, qmi_client_recv_msg_async_cb, void*,
                                                qmi_txn_handle*) {
  std::abort();
}
qmi_client_error_type qmi_client_release(qmi_client_type) { std::abort(); }

}  // namespace vendor
