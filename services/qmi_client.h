// Client of the modem's custom QMI service: NV items, GPS option, antenna, SIM 2, EFS and
// engineer-mode status. Each request opens its own client, waits for its one answer and
// releases the client again.
#pragma once

#include <semaphore.h>

#include <atomic>
#include <cstdint>
#include <mutex>

#include "platform/qmi_transport.h"
#include "services/qmi_messages.h"

// Results of the last fixed-message response. Read them only after the request returned.
extern int32_t qmi_flag;                  // its transport error
extern char return_buffer[1024];          // its text, cleared by every response
extern int32_t oem_buf[32];               // OEM block of the last NV read that carried one
extern std::atomic<int32_t> qmi_pending;  // requests sent and not yet answered

// One fixed-message request at a time. A caller that reads the results above holds it across
// its request and the reading, so no other thread's request (the GPS poll) lands in between;
// the requests take it again themselves.
extern std::recursive_mutex qmi_request_lock;

// The semaphore variants' wait record.
struct qmi_kro_wait_record {
  sem_t sem;
  int32_t transp_err;
  int32_t msg_id;
};

// 0 on success, -1 without the service object, else the result of the client init.
// Blocks for good while the service is not up.
int qmi_kro_clnt_init(qmi::client_type* clnt);

// Fixed-message requests: 0 once the answer arrived, -1 when it could not be sent.
int qmi_kro_read_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_read_nv_info_req_msg_v01* req);
int qmi_kro_write_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                         const kro_write_nv_info_req_msg_v01* req);
// A valid answer goes straight to the port.
int qmi_kro_gps_option_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_gps_option_req_msg_v01* req);
int mutuallySwitchForPrimaryAndDiversity(qmi::client_type* clnt, qmi::txn_handle* txn,
                                         const kro_int_req_msg_v01* req);
int getPrimaryAndDiversitymsg(qmi::client_type* clnt, qmi::txn_handle* txn,
                              const kro_int_req_msg_v01* req);
int qmi_set_status(qmi::client_type* clnt, qmi::txn_handle* txn, const kro_int_req_msg_v01* req);
int qmi_switch_sim2_status(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_int_req_msg_v01* req);
int qmi_efs_golden_copy(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_int_req_msg_v01* req);

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
