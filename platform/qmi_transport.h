// The modem's QMI client library, as far as the NV client needs it. On the phone these wrap the
// vendor library; a host build answers them with the simulated modem service. Response
// callbacks run on a thread of the transport's own, never on the sender's.
#pragma once

#include <cstdint>

namespace qmi {

// Results of the library calls.
inline constexpr int NO_ERR = 0;
inline constexpr int INTERNAL_ERR = -1;
inline constexpr int SERVICE_ERR = -2;

struct ServiceObject;  // the service's IDL object, opaque
struct Client;         // one open client, opaque

using service_object_type = const ServiceObject*;
using client_type = Client*;
using txn_handle = uintptr_t;

// One entry of the service list: opaque beyond the first words, which the client logs.
struct service_info {
  int32_t word[16];
};

using recv_msg_async_cb = void (*)(client_type client, unsigned msg_id, void* resp,
                                   unsigned resp_len, void* cb_data, int transp_err);

// Null when the library's object does not match the asked versions.
service_object_type kro_get_service_object_internal_v01(int idl_major, int idl_minor,
                                                        int tool_version);

// With no list only counts the services; with a list fills at most *num_entries of them.
int client_get_service_list(service_object_type service, service_info* list, unsigned* num_entries,
                            unsigned* num_services);

// Opens a client on one service entry, with no indication callback.
int client_init(const service_info* info, service_object_type service, client_type* client);

// Queues one request; the request is copied before it returns. The callback gets `resp`
// back, filled unless transp_err is non-zero; `resp` must stay valid until then.
int client_send_msg_async(client_type client, unsigned msg_id, const void* req, unsigned req_len,
                          void* resp, unsigned resp_len, recv_msg_async_cb cb, void* cb_data,
                          txn_handle* txn);

// Returns once no callback of the client is running; pending requests get none. Never call
// it from a callback.
int client_release(client_type client);

}  // namespace qmi
