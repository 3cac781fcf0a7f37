// The phone's QMI transport against a fake client library: the daemon's callback gets back
// its own data, the response and the transport error of the library's callback.
#include <gtest/gtest.h>

#include <cstring>

#include "platform/android/vendor/kro_qmi_service.h"
#include "platform/android/vendor/qmi_cci.h"
#include "platform/qmi_transport.h"

namespace {

vendor::qmi_client_struct* const kHandle = reinterpret_cast<vendor::qmi_client_struct*>(0x1000);
unsigned char g_sent[8];
unsigned g_sent_len = 0;

struct Received {
  qmi::client_type client;
  unsigned msg_id;
  void* resp;
  unsigned resp_len;
  void* cb_data;
  int transp_err;
} g_received;

void daemon_callback(qmi::client_type client, unsigned msg_id, void* resp, unsigned resp_len,
                     void* cb_data, int transp_err) {
  g_received = {client, msg_id, resp, resp_len, cb_data, transp_err};
}

}  // namespace

namespace vendor {

qmi_idl_service_object_type kro_get_service_object_internal_v01(int32_t, int32_t, int32_t) {
  return nullptr;
}
qmi_client_error_type qmi_client_get_service_list(qmi_idl_service_object_type, qmi_service_info*,
                                                  unsigned*, unsigned*) {
  return QMI_NO_ERR;
}
qmi_client_error_type qmi_client_init(qmi_service_info* info, qmi_idl_service_object_type,
                                      qmi_client_ind_cb, void*, qmi_client_os_params*,
                                      qmi_client_type* client) {
  *client = info->word[0] == 7 ? kHandle : nullptr;
  return QMI_NO_ERR;
}
// Answers at once, as a library whose response thread wins the race does; a message id of 99
// is refused.
qmi_client_error_type qmi_client_send_msg_async(qmi_client_type client, unsigned msg_id, void* req,
                                                unsigned req_len, void* resp, unsigned resp_len,
                                                qmi_client_recv_msg_async_cb resp_cb,
                                                void* resp_cb_data, qmi_txn_handle*) {
  if (msg_id == 99) return -2;
  std::memcpy(g_sent, req, g_sent_len = req_len);
  resp_cb(client, msg_id, resp, resp_len, resp_cb_data, -7);
  return QMI_NO_ERR;
}
qmi_client_error_type qmi_client_release(qmi_client_type) { return QMI_NO_ERR; }

}  // namespace vendor

TEST(PhoneQmi, ResponseReachesTheDaemonsCallbackWithItsData) {
  qmi::service_info info{};
  info.word[0] = 7;
  qmi::client_type client = nullptr;
  ASSERT_EQ(qmi::client_init(&info, nullptr, &client), qmi::NO_ERR);
  ASSERT_NE(client, nullptr);

  const unsigned char req[4] = {1, 2, 3, 4};
  unsigned char resp[8];
  int data = 0;
  qmi::txn_handle txn = 0;
  ASSERT_EQ(qmi::client_send_msg_async(client, 14, req, sizeof req, resp, sizeof resp,
                                       daemon_callback, &data, &txn),
            qmi::NO_ERR);
  EXPECT_EQ(g_sent_len, 4u);
  EXPECT_EQ(std::memcmp(g_sent, req, 4), 0);
  EXPECT_EQ(g_received.client, client);
  EXPECT_EQ(g_received.msg_id, 14u);
  EXPECT_EQ(g_received.resp, resp);
  EXPECT_EQ(g_received.resp_len, sizeof resp);
  EXPECT_EQ(g_received.cb_data, &data);
  EXPECT_EQ(g_received.transp_err, -7);

  EXPECT_EQ(qmi::client_send_msg_async(client, 99, req, sizeof req, resp, sizeof resp,
                                       daemon_callback, &data, &txn),
            qmi::SERVICE_ERR);
}
