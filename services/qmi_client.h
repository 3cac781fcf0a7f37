// Client of the modem's custom QMI service: NV items, GPS option, antenna, SIM 2, EFS and
// engineer-mode status. Each request opens its own client, waits for its one answer and
// releases the client again.
#pragma once

#include <semaphore.h>

#include <atomic>
#include <cstdint>

#include "platform/qmi_messages.h"
#include "platform/qmi_transport.h"

// What a fixed-message request's response left in the client's result globals (`qmi_flag`,
// `return_buffer`, `oem_buf`), copied by the request itself while no other request can run:
// another thread's answer (the GPS poll's) never lands between a request and its reading.
// A request that could not be sent copies what the last response left.
struct QmiResult {
  int32_t flag;     // the transport error
  char text[1024];  // the text, cleared by every response
  int32_t oem[32];  // the OEM block of the last NV read that carried one
};

// Fixed-message requests sent and not yet answered.
extern std::atomic<int32_t> qmi_pending;

// The semaphore variants' wait record.
struct qmi_kro_wait_record {
  sem_t sem;
  int32_t transp_err;
  int32_t msg_id;
};

// 0 on success, -1 without the service object, else the result of the client init.
// Blocks for good while the service is not up.
int qmi_kro_clnt_init(qmi::client_type* clnt);

// Fixed-message requests, one at a time: 0 once the answer arrived, -1 when it could not be
// sent. `result`, when given, gets what the answer left.
int qmi_kro_read_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_read_nv_info_req_msg_v01* req, QmiResult* result = nullptr);
int qmi_kro_write_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                         const kro_write_nv_info_req_msg_v01* req, QmiResult* result = nullptr);
// A valid answer goes straight to the port.
int qmi_kro_gps_option_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_gps_option_req_msg_v01* req, QmiResult* result = nullptr);
int mutuallySwitchForPrimaryAndDiversity(qmi::client_type* clnt, qmi::txn_handle* txn,
                                         const kro_int_req_msg_v01* req,
                                         QmiResult* result = nullptr);
int getPrimaryAndDiversitymsg(qmi::client_type* clnt, qmi::txn_handle* txn,
                              const kro_int_req_msg_v01* req, QmiResult* result = nullptr);
int qmi_set_status(qmi::client_type* clnt, qmi::txn_handle* txn, const kro_int_req_msg_v01* req,
                   QmiResult* result = nullptr);
int qmi_switch_sim2_status(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_int_req_msg_v01* req, QmiResult* result = nullptr);
int qmi_efs_golden_copy(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_int_req_msg_v01* req, QmiResult* result = nullptr);

// Semaphore variants for any thread: the answer lands in the caller's `resp`, its transport
// error and message id in `wait`. 0 on success (also when no semaphore could be made), -1
// when the wait failed, else the init or send error.
int qmi_kro_read_nv_msg_ex(void* req, unsigned req_len, unsigned msg_id, void* resp,
                           unsigned resp_len, qmi_kro_wait_record* wait);
int qmi_kro_write_nv_msg_ex(void* req, unsigned req_len, unsigned msg_id, void* resp,
                            unsigned resp_len, qmi_kro_wait_record* wait);

// Response callbacks, run on the transport's thread.
void kro_rx_cb(qmi::client_type clnt, unsigned msg_id, void* resp, unsigned resp_len, void* cb_data,
               int transp_err);
void qmi_kro_cb_ex(qmi::client_type clnt, unsigned msg_id, void* resp, unsigned resp_len,
                   void* cb_data, int transp_err);
