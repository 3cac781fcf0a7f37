// Qualcomm's QMI client library (libqmi_cci), as far as the NV client calls it. Declared here
// from the calls' contracts; a product checks them against its QMI framework's headers.
#pragma once

#include <cstdint>

namespace vendor {
extern "C" {

using qmi_client_error_type = int;
inline constexpr qmi_client_error_type QMI_NO_ERR = 0;

struct qmi_idl_service_object;
using qmi_idl_service_object_type = const qmi_idl_service_object*;
struct qmi_client_struct;
using qmi_client_type = qmi_client_struct*;
using qmi_txn_handle = void*;
struct qmi_client_os_params;

// One entry of the service list. Only the first entry is ever used; the block is larger than
// the framework's entry, so a list of one entry always fits whatever its real size.
struct qmi_service_info {
  uint32_t word[16];
};

using qmi_client_ind_cb = void (*)(qmi_client_type client, unsigned msg_id, void* ind_buf,
                                   unsigned ind_buf_len, void* ind_cb_data);
using qmi_client_recv_msg_async_cb = void (*)(qmi_client_type client, unsigned msg_id, void* resp,
                                              unsigned resp_len, void* resp_cb_data,
                                              qmi_client_error_type transp_err);

qmi_client_error_type qmi_client_get_service_list(qmi_idl_service_object_type service,
                                                  qmi_service_info* list, unsigned* num_entries,
                                                  unsigned* num_services);
qmi_client_error_type qmi_client_init(qmi_service_info* info, qmi_idl_service_object_type service,
                                      qmi_client_ind_cb ind_cb, void* ind_cb_data,
                                      qmi_client_os_params* os_params, qmi_client_type* client);
qmi_client_error_type qmi_client_send_msg_async(qmi_client_type client, unsigned msg_id, void* req,
                                                unsigned req_len, void* resp, unsigned resp_len,
                                                qmi_client_recv_msg_async_cb resp_cb,
                                                void* resp_cb_data, qmi_txn_handle* txn);
qmi_client_error_type qmi_client_release(qmi_client_type client);

}  // extern "C"
}  // namespace vendor
