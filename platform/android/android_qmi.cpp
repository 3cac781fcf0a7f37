// The QMI transport on the phone: Qualcomm's client library and the maker's service object.
#include <cstring>
#include <new>

#include "platform/android/vendor/kro_qmi_service.h"
#include "platform/android/vendor/qmi_cci.h"
#include "platform/qmi_transport.h"

namespace {

static_assert(sizeof(qmi::service_info) == sizeof(vendor::qmi_service_info));

// The library's callback carries its own handle type; the daemon's callback and data ride in
// a record of their own, freed by the response. A client released with a request pending gets
// no response, and the record is the price of that request.
struct PendingResponse {
  qmi::recv_msg_async_cb cb;
  void* cb_data;
};

qmi::client_type ours(vendor::qmi_client_type client) {
  return reinterpret_cast<qmi::client_type>(client);
}
vendor::qmi_client_type theirs(qmi::client_type client) {
  return reinterpret_cast<vendor::qmi_client_type>(client);
}
vendor::qmi_idl_service_object_type theirs(qmi::service_object_type service) {
  return reinterpret_cast<vendor::qmi_idl_service_object_type>(service);
}

void on_response(vendor::qmi_client_type client, unsigned msg_id, void* resp, unsigned resp_len,
                 void* data, vendor::qmi_client_error_type transp_err) {
  const PendingResponse pending = *static_cast<PendingResponse*>(data);
  delete static_cast<PendingResponse*>(data);
  pending.cb(ours(client), msg_id, resp, resp_len, pending.cb_data, transp_err);
}

}  // namespace

namespace qmi {

service_object_type kro_get_service_object_internal_v01(int idl_major, int idl_minor,
                                                        int tool_version) {
  return reinterpret_cast<service_object_type>(
      vendor::kro_get_service_object_internal_v01(idl_major, idl_minor, tool_version));
}

int client_get_service_list(service_object_type service, service_info* list, unsigned* num_entries,
                            unsigned* num_services) {
  return vendor::qmi_client_get_service_list(theirs(service),
                                             reinterpret_cast<vendor::qmi_service_info*>(list),
                                             num_entries, num_services);
}

int client_init(const service_info* info, service_object_type service, client_type* client) {
  vendor::qmi_service_info entry;
  std::memcpy(&entry, info, sizeof entry);
  vendor::qmi_client_type handle = nullptr;
  const int rc =
      vendor::qmi_client_init(&entry, theirs(service), nullptr, nullptr, nullptr, &handle);
  *client = ours(handle);
  return rc;
}

int client_send_msg_async(client_type client, unsigned msg_id, const void* req, unsigned req_len,
                          void* resp, unsigned resp_len, recv_msg_async_cb cb, void* cb_data,
                          txn_handle* txn) {
  auto* pending = new (std::nothrow) PendingResponse{cb, cb_data};
  if (pending == nullptr) return INTERNAL_ERR;
  vendor::qmi_txn_handle handle = nullptr;
  // The library copies the request before it returns; it never writes it.
  const int rc =
      vendor::qmi_client_send_msg_async(theirs(client), msg_id, const_cast<void*>(req), req_len,
                                        resp, resp_len, on_response, pending, &handle);
  if (rc != NO_ERR) {
    delete pending;
    return rc;
  }
  if (txn != nullptr) *txn = reinterpret_cast<txn_handle>(handle);
  return rc;
}

int client_release(client_type client) { return vendor::qmi_client_release(theirs(client)); }

}  // namespace qmi
