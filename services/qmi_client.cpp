#include "services/qmi_client.h"

#include <unistd.h>

#include <cerrno>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <mutex>

#include "core/log.h"
#include "core/transport.h"

// The results of the last fixed-message response, written by the callback on the transport's
// thread. Only the requests read them, into their caller's QmiResult.
int32_t qmi_flag = 0;
char return_buffer[1024];
int32_t oem_buf[32];
std::atomic<int32_t> qmi_pending{0};

static_assert(sizeof return_buffer == sizeof QmiResult{}.text &&
              sizeof oem_buf == sizeof QmiResult{}.oem && sizeof oem_buf == 128);

namespace {

// One fixed-message request at a time, from its send to the copy of its results: handlers and
// the GPS poll thread share the globals above.
std::mutex qmi_request_lock;

// Logs under the name of the request being served, as each request function would.
#define QMI_LOG(level, func, fmt, ...) \
  atci_log((level), __LINE__, (func), fmt __VA_OPT__(, ) __VA_ARGS__)

// The eight fixed-message requests differ only in these.
struct FixedMessage {
  const char* name;
  unsigned id;
  bool logs_handles;
  bool logs_release;
  bool logs_pending;
};

constexpr FixedMessage kReadNv{"qmi_kro_read_nv_msg", QMI_KRO_READ_NV_INFO_RESP_MSG_V01, false,
                               true, false};
constexpr FixedMessage kWriteNv{"qmi_kro_write_nv_msg", QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01, true,
                                true, false};
constexpr FixedMessage kGpsOption{"qmi_kro_gps_option_msg", QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01,
                                  true, false, false};
constexpr FixedMessage kSetAntenna{"mutuallySwitchForPrimaryAndDiversity",
                                   QMI_KRO_SET_PRIMARY_DIVERSITY_RESP_MSG_V01, true, false, false};
constexpr FixedMessage kGetAntenna{"getPrimaryAndDiversitymsg",
                                   QMI_KRO_GET_PRIMARY_DIVERSITY_RESP_MSG_V01, true, false, false};
constexpr FixedMessage kSetStatus{"qmi_set_status", QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01, true,
                                  false, true};
constexpr FixedMessage kSim2{"qmi_switch_sim2_status", QMI_PEMU_SWITCH_SIM2_STATUS_RESP_MSG_V01,
                             true, false, false};
constexpr FixedMessage kEfs{"qmi_efs_golden_copy", QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01, true,
                            false, false};

constexpr unsigned kMaxResponse = [] {
  unsigned max = 0;
  for (const auto& m : qmi_kro_message_sizes) max = m.resp > max ? m.resp : max;
  return max;
}();
static_assert(kMaxResponse == sizeof(kro_gps_option_resp_msg_v01));

// The answer of the fixed-message requests is only ever kept in the globals.
void* const kFixedCallbackData = reinterpret_cast<void*>(uintptr_t{2});

constexpr unsigned kMaxServiceEntries = 8;

unsigned as_hex(const void* p) { return static_cast<unsigned>(reinterpret_cast<uintptr_t>(p)); }

// Runs under the request lock.
int send_fixed_locked(const FixedMessage& m, qmi::client_type* clnt, qmi::txn_handle* txn,
                      const void* req) {
  qmi::client_type local_clnt = nullptr;
  qmi::txn_handle local_txn = 0;
  if (clnt == nullptr) clnt = &local_clnt;
  if (txn == nullptr) txn = &local_txn;
  const QmiMessageSizes sizes = qmi_kro_sizes_of(m.id);
  alignas(8) unsigned char resp[kMaxResponse] = {};

  if (qmi_kro_clnt_init(clnt) != 0) {
    QMI_LOG(LOG_LVL_ERR, m.name, "qmi_kro_clnt_init() fail");
    return -1;
  }
  if (m.logs_handles) {
    QMI_LOG(LOG_LVL_DEBUG, m.name, "clnt:%0x,txn:%0x,data_req:%0x,data_resp:%0x\n", as_hex(*clnt),
            static_cast<unsigned>(*txn), as_hex(req), as_hex(resp));
  }
  const int rc = qmi::client_send_msg_async(*clnt, m.id, req, sizes.req, resp, sizes.resp,
                                            kro_rx_cb, kFixedCallbackData, txn);
  QMI_LOG(LOG_LVL_DEBUG, m.name, "KRO: qmi_client_send_msg_async returned %d\n", rc);
  if (rc != qmi::NO_ERR) {
    QMI_LOG(LOG_LVL_ERR, m.name, "KRO: send_msg_async error: %d\n", rc);
    qmi::client_release(*clnt);
    return -1;
  }

  // The callback may already have run and taken the count below zero: it still meets 0.
  qmi_pending.fetch_add(1, std::memory_order_relaxed);
  if (m.logs_pending) QMI_LOG(LOG_LVL_DEBUG, m.name, "********************* pending_async\n");
  ::usleep(200);
  // Acquire: the callback's writes to the result globals are visible once the count is 0.
  while (qmi_pending.load(std::memory_order_acquire) != 0) ::usleep(500);
  if (m.logs_pending) QMI_LOG(LOG_LVL_DEBUG, m.name, "&&&&&&&&&&&&&&&&&&&&&& pending_async\n");

  const int released = qmi::client_release(*clnt);
  if (m.logs_release)
    QMI_LOG(LOG_LVL_DEBUG, m.name, "KRO: qmi_client_release of clnt returned %d\n", released);
  return 0;
}

int send_fixed(const FixedMessage& m, qmi::client_type* clnt, qmi::txn_handle* txn,
               const void* req, QmiResult* result) {
  const std::lock_guard one_at_a_time(qmi_request_lock);
  const int rc = send_fixed_locked(m, clnt, txn, req);
  if (result != nullptr) {
    result->flag = qmi_flag;
    std::memcpy(result->text, return_buffer, sizeof result->text);
    std::memcpy(result->oem, oem_buf, sizeof result->oem);
  }
  return rc;
}

int send_and_wait(const char* func, void* req, unsigned req_len, unsigned msg_id, void* resp,
                  unsigned resp_len, qmi_kro_wait_record* wait) {
  qmi::client_type clnt = nullptr;
  int rc = qmi_kro_clnt_init(&clnt);
  if (rc != 0) {
    QMI_LOG(LOG_LVL_ERR, func, "qmi_kro_clnt_init() fail!");
    return rc;
  }
  if (::sem_init(&wait->sem, 0, 0) != 0) {
    QMI_LOG(LOG_LVL_ERR, func, "Semaphore creation failed (errno=0x%08x)", errno);
    qmi::client_release(clnt);
    return 0;
  }
  QMI_LOG(LOG_LVL_DEBUG, func, "qmi_client_send_msg_async");
  qmi::txn_handle txn = 0;
  rc = qmi::client_send_msg_async(clnt, msg_id, req, req_len, resp, resp_len, qmi_kro_cb_ex, wait,
                                  &txn);
  if (rc != qmi::NO_ERR) {
    QMI_LOG(LOG_LVL_ERR, func, "KRO: send_msg_async error: %d", rc);
    ::sem_destroy(&wait->sem);
    qmi::client_release(clnt);
    return rc;
  }
  int result = 0;
  int waited;
  while ((waited = ::sem_wait(&wait->sem)) != 0 && errno == EINTR) {
  }
  if (waited != 0) {
    result = -1;
    QMI_LOG(LOG_LVL_ERR, func, "Failed to wait for semaphore (errno=0x%08x)", errno);
  }
  // Released before the semaphore goes: after a failed wait the callback may still post.
  qmi::client_release(clnt);
  if (::sem_destroy(&wait->sem) != 0)
    QMI_LOG(LOG_LVL_ERR, func, "Failed to destroy semaphore (errno=0x%08x)", errno);
  return result;
}

// The response as its layout, or null when the transport handed back less than that.
template <typename T>
const T* response_as(const void* resp, unsigned resp_len) {
  return resp != nullptr && resp_len >= sizeof(T) ? static_cast<const T*>(resp) : nullptr;
}

// Text fields need not be terminated inside the message.
void set_return_text(const char* text, size_t field_size) {
  std::snprintf(return_buffer, sizeof return_buffer, "%.*s", static_cast<int>(field_size), text);
}

}  // namespace

int qmi_kro_clnt_init(qmi::client_type* clnt) {
  const qmi::service_object_type service = qmi::kro_get_service_object_internal_v01(1, -1, 5);
  if (service == nullptr) {
    ATCI_LOGE("KRO: kro_get_serivce_object failed, verify qmi_kro_api_v01.h and .c match.\n");
    return -1;
  }
  ATCI_LOGD("KRO: qmi_client_notifier_init returned %d\n", 0);

  unsigned num_services = 0;
  int rc = qmi::client_get_service_list(service, nullptr, nullptr, &num_services);
  ATCI_LOGD("KRO: qmi_client_get_service_list() returned %d num_services = %d\n", rc, num_services);
  if (rc != qmi::NO_ERR) {
    // Nothing signals this: without the service the caller stays here, as on the phone.
    std::mutex lock;
    std::condition_variable service_up;
    std::unique_lock<std::mutex> held(lock);
    while (rc != qmi::NO_ERR) {
      service_up.wait(held);
      rc = qmi::client_get_service_list(service, nullptr, nullptr, &num_services);
      ATCI_LOGD("KRO: qmi_client_get_service_list() returned %d num_services = %d\n", rc,
                num_services);
    }
  }

  qmi::service_info info[kMaxServiceEntries] = {};
  unsigned num_entries = num_services < kMaxServiceEntries ? num_services : kMaxServiceEntries;
  rc = qmi::client_get_service_list(service, info, &num_entries, &num_services);
  ATCI_LOGD("KRO: qmi_client_get_service_list() returned %d num_entries = %d num_services = %d\n",
            rc, num_entries, num_services);

  rc = qmi::client_init(&info[0], service, clnt);
  const int32_t* a = info[0].word;
  const int32_t* b = info[1].word;
  ATCI_LOGD("info[0]:%d,%d,%d,%d,%d, info[1]:%d,%d,%d,%d,%d\n", a[0], a[1], a[2], a[3], a[4], b[0],
            b[1], b[2], b[3], b[4]);
  ATCI_LOGD("KRO: qmi_client_init returned %d\n", rc);
  return rc;
}

int qmi_kro_read_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_read_nv_info_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kReadNv, clnt, txn, req, result);
}
int qmi_kro_write_nv_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                         const kro_write_nv_info_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kWriteNv, clnt, txn, req, result);
}
int qmi_kro_gps_option_msg(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_gps_option_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kGpsOption, clnt, txn, req, result);
}
int mutuallySwitchForPrimaryAndDiversity(qmi::client_type* clnt, qmi::txn_handle* txn,
                                         const kro_int_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kSetAntenna, clnt, txn, req, result);
}
int getPrimaryAndDiversitymsg(qmi::client_type* clnt, qmi::txn_handle* txn,
                              const kro_int_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kGetAntenna, clnt, txn, req, result);
}
int qmi_set_status(qmi::client_type* clnt, qmi::txn_handle* txn, const kro_int_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kSetStatus, clnt, txn, req, result);
}
int qmi_switch_sim2_status(qmi::client_type* clnt, qmi::txn_handle* txn,
                           const kro_int_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kSim2, clnt, txn, req, result);
}
int qmi_efs_golden_copy(qmi::client_type* clnt, qmi::txn_handle* txn,
                        const kro_int_req_msg_v01* req,
                 QmiResult* result) {
  return send_fixed(kEfs, clnt, txn, req, result);
}

int qmi_kro_read_nv_msg_ex(void* req, unsigned req_len, unsigned msg_id, void* resp,
                           unsigned resp_len, qmi_kro_wait_record* wait) {
  return send_and_wait(__func__, req, req_len, msg_id, resp, resp_len, wait);
}
int qmi_kro_write_nv_msg_ex(void* req, unsigned req_len, unsigned msg_id, void* resp,
                            unsigned resp_len, qmi_kro_wait_record* wait) {
  return send_and_wait(__func__, req, req_len, msg_id, resp, resp_len, wait);
}

void kro_rx_cb(qmi::client_type, unsigned msg_id, void* resp, unsigned resp_len, void*,
               int transp_err) {
  std::memset(return_buffer, 0, sizeof return_buffer);
  qmi_flag = transp_err;
  ATCI_LOGD("qmi_flag = %d\n", qmi_flag);

  switch (msg_id) {
    case QMI_KRO_READ_NV_INFO_RESP_MSG_V01:
      if (const auto* r = response_as<kro_read_nv_info_resp_msg_v01>(resp, resp_len)) {
        if (r->buffer_valid == 1) {
          set_return_text(r->buffer, sizeof r->buffer);
        } else if (r->oem_buffer_valid != 0) {
          for (size_t i = 0; i < QMI_KRO_OEM_BUFFER_LEN; ++i) {
            oem_buf[i] = r->oem_buffer[i];
            ATCI_LOGD("oem_buf[%d]:%d\n", static_cast<int>(i), oem_buf[i]);
          }
        }
      }
      break;
    case QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01:
      ATCI_LOGD("=====QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01 \n");
      break;
    case QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01:
      ATCI_LOGD("=====QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01 \n");
      if (const auto* r = response_as<kro_gps_option_resp_msg_v01>(resp, resp_len);
          r && r->buffer_valid != 0)
        write_unsolicited({r->buffer, strnlen(r->buffer, sizeof r->buffer)});
      break;
    case QMI_KRO_SET_FORMAT_RESP_MSG_V01:
      ATCI_LOGD("====set_format \n");
      break;
    case QMI_KRO_SET_PRIMARY_DIVERSITY_RESP_MSG_V01:
      ATCI_LOGD("====setPrimaryAndDiversity \n");
      break;
    case QMI_KRO_GET_PRIMARY_DIVERSITY_RESP_MSG_V01:
      if (const auto* r = response_as<kro_get_primary_diversity_resp_msg_v01>(resp, resp_len);
          r && r->buffer_valid == 1)
        set_return_text(r->buffer, sizeof r->buffer);
      break;
    case QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01:
    case QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01:
      if (const auto* r = response_as<kro_status_resp_msg_v01>(resp, resp_len)) {
        std::snprintf(return_buffer, sizeof return_buffer, "%d", r->result);
        if (msg_id == QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01)
          ATCI_LOGD("QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01 %d\n", r->result);
        else
          ATCI_LOGD("QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01 %d\n", r->result);
      }
      break;
    default:
      break;
  }
  // Release: publishes the globals above to the requester polling the count.
  qmi_pending.fetch_sub(1, std::memory_order_release);
}

void qmi_kro_cb_ex(qmi::client_type, unsigned msg_id, void*, unsigned, void* cb_data,
                   int transp_err) {
  ATCI_LOGD("transp_err: %d, msg_id:%d", transp_err, static_cast<int>(msg_id));
  auto* wait = static_cast<qmi_kro_wait_record*>(cb_data);
  wait->transp_err = transp_err;
  wait->msg_id = static_cast<int32_t>(msg_id);
  ::sem_post(&wait->sem);
}
