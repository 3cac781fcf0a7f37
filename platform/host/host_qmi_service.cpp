// The modem's QMI service on the emulated phone. Its state lives in files under
// /.emu/modem/, read afresh at every request so it can be changed between commands
// (docs/emulator.md). Each client has one worker thread that answers its requests in order
// and calls back from there, as the vendor library does from its own thread.
#include <fcntl.h>
#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <charconv>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <deque>
#include <mutex>
#include <new>
#include <string>
#include <string_view>

#include "platform/host/host_hooks.h"
#include "platform/host/host_root.h"
#include "platform/platform.h"
#include "platform/qmi_transport.h"
#include "platform/qmi_messages.h"

namespace {

constexpr int32_t kServiceId = 0x4b52;  // the maker's service, as the list reports it
constexpr int32_t kIdlMajor = 1;
constexpr int32_t kResultFailure = 1;
constexpr int32_t kErrMalformed = 1;
constexpr int32_t kErrInternal = 3;

constexpr unsigned kMaxRequest = [] {
  unsigned max = 0;
  for (const auto& m : qmi_kro_message_sizes) max = std::max(max, m.req);
  return max;
}();

struct Job {
  unsigned msg_id;
  std::array<unsigned char, kMaxRequest> req;
  void* resp;
  unsigned resp_len;
  qmi::recv_msg_async_cb cb;
  void* cb_data;
};

// Reads at most `max` bytes of a state file; false when it is missing or unreadable.
bool read_state(const std::string& path, std::string& out, size_t max = 4096) {
  UniqueFd fd(dev_open(path.c_str(), O_RDONLY));
  if (!fd.ok()) return false;
  out.assign(max, '\0');
  size_t got = 0;
  while (got < max) {
    const ssize_t n = ::read(fd.get(), out.data() + got, max - got);
    if (n <= 0) break;
    got += static_cast<size_t>(n);
  }
  out.resize(got);
  return true;
}

std::string_view skip_separators(std::string_view s) {
  while (!s.empty() && (s.front() == ' ' || s.front() == '\t' || s.front() == '\n' ||
                        s.front() == '\r' || s.front() == ','))
    s.remove_prefix(1);
  return s;
}

// Parses one int32 at the front of `s` and drops it; false on anything else.
bool take_int(std::string_view& s, int32_t& value) {
  s = skip_separators(s);
  if (!s.empty() && s.front() == '+') s.remove_prefix(1);
  long long v = 0;
  const auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), v);
  if (ec != std::errc() || v < INT32_MIN || v > INT32_MAX) return false;
  s.remove_prefix(static_cast<size_t>(end - s.data()));
  value = static_cast<int32_t>(v);
  return true;
}

// A number file: `absent` when missing, `malformed` when it holds no number.
int32_t state_int(const std::string& path, int32_t absent, int32_t malformed) {
  std::string text;
  if (!read_state(path, text, 64)) return absent;
  std::string_view s(text);
  int32_t value = 0;
  return take_int(s, value) ? value : malformed;
}

// A switch file: 0 when missing, its number when present, -1 when that is no number.
int32_t switch_value(const char* name) {
  return state_int(std::string("/.emu/modem/") + name, 0, qmi::INTERNAL_ERR);
}

// Fills a text field from a file, exactly as stored and cut at the field's size. Returns the
// valid byte: 1 when the file exists, 0 when not, or what "<file>.valid" says.
uint8_t text_answer(const std::string& path, char* field, size_t size) {
  std::string text;
  uint8_t valid = 0;
  if (read_state(path, text, size)) {
    std::memcpy(field, text.data(), text.size());
    valid = 1;
  }
  return static_cast<uint8_t>(state_int(path + ".valid", valid, valid));
}

std::string nv_path(uint32_t item) { return "/.emu/modem/nv/" + std::to_string(item); }

bool write_state(const std::string& path, std::string_view text) {
  const size_t slash = path.rfind('/');
  if (host_make_dirs(path.substr(0, slash).c_str()) != 0) return false;
  const std::string tmp = path.substr(0, slash + 1) + "." + path.substr(slash + 1) + ".tmp";
  {
    UniqueFd fd(dev_open(tmp.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644));
    if (!fd.ok() ||
        ::write(fd.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
      dev_unlink(tmp.c_str());
      return false;
    }
  }
  // Readers see the old item or the new one, never a mix.
  return dev_rename(tmp.c_str(), path.c_str()) == 0;
}

void append_request_log(const std::string& line) {
  if (host_make_dirs("/.emu/modem") != 0) return;
  UniqueFd fd(dev_open("/.emu/modem/requests.log", O_WRONLY | O_CREAT | O_APPEND, 0644));
  if (fd.ok()) [[maybe_unused]]
    const ssize_t n = ::write(fd.get(), line.data(), line.size());
}

template <typename T>
T request_as(const Job& job) {
  static_assert(sizeof(T) <= kMaxRequest);
  T req;
  std::memcpy(&req, job.req.data(), sizeof req);
  return req;
}

// One line per accepted request: the id and what the request asked for.
std::string describe(const Job& job) {
  std::string line = std::to_string(job.msg_id) + " ";
  switch (job.msg_id) {
    case QMI_KRO_READ_NV_INFO_RESP_MSG_V01: {
      const auto r = request_as<kro_read_nv_info_req_msg_v01>(job);
      line += std::to_string(r.nvItem_id) + " " + std::to_string(r.option[0]) + "," +
              std::to_string(r.option[1]);
      break;
    }
    case QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01: {
      const auto r = request_as<kro_write_nv_info_req_msg_v01>(job);
      line += std::to_string(r.nvItem_id) + " " + std::to_string(r.option[0]) + "," +
              std::to_string(r.option[1]) + " ";
      for (char c : std::string_view(r.buffer, strnlen(r.buffer, sizeof r.buffer))) {
        if (c == '\n')
          line += "\\n";
        else
          line += c;
      }
      break;
    }
    case QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01:
      line += std::to_string(request_as<kro_gps_option_req_msg_v01>(job).option);
      break;
    default:
      line += std::to_string(request_as<kro_int_req_msg_v01>(job).value);
      break;
  }
  return line + "\n";
}

void answer_read(const Job& job, kro_read_nv_info_resp_msg_v01& r) {
  const auto req = request_as<kro_read_nv_info_req_msg_v01>(job);
  const std::string path = nv_path(req.nvItem_id);
  r.buffer_valid = text_answer(path, r.buffer, sizeof r.buffer);
  std::string text;
  if (!read_state(path + ".oem", text)) return;
  r.oem_buffer_valid = 1;
  std::string_view s(text);
  for (int32_t& v : r.oem_buffer)
    if (!take_int(s, v)) break;
}

void answer_write(const Job& job, qmi_response_type_v01& r) {
  const auto req = request_as<kro_write_nv_info_req_msg_v01>(job);
  if (req.buffer_valid == 0) {
    r = {kResultFailure, kErrMalformed};
    return;
  }
  const std::string_view text(req.buffer, strnlen(req.buffer, sizeof req.buffer));
  if (!write_state(nv_path(req.nvItem_id), text)) r = {kResultFailure, kErrInternal};
}

// The service's side of one request: fills the zeroed response.
void answer(const Job& job) {
  void* resp = job.resp;
  auto& header = *static_cast<qmi_response_type_v01*>(resp);
  if (const int32_t error = switch_value("response_error"); error != 0) {
    header = {kResultFailure, error};
    return;
  }
  switch (job.msg_id) {
    case QMI_KRO_READ_NV_INFO_RESP_MSG_V01:
      answer_read(job, *static_cast<kro_read_nv_info_resp_msg_v01*>(resp));
      break;
    case QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01:
      answer_write(job, header);
      break;
    case QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01: {
      auto& r = *static_cast<kro_gps_option_resp_msg_v01*>(resp);
      const auto option = request_as<kro_gps_option_req_msg_v01>(job).option;
      r.buffer_valid =
          text_answer("/.emu/modem/gps/" + std::to_string(option), r.buffer, sizeof r.buffer);
      break;
    }
    case QMI_KRO_GET_PRIMARY_DIVERSITY_RESP_MSG_V01: {
      auto& r = *static_cast<kro_get_primary_diversity_resp_msg_v01*>(resp);
      r.buffer_valid = text_answer("/.emu/modem/antenna", r.buffer, sizeof r.buffer);
      break;
    }
    case QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01:
      header.result = state_int("/.emu/modem/set_status", 0, kResultFailure);
      break;
    case QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01:
      header.result = state_int("/.emu/modem/efs_golden_copy", 0, kResultFailure);
      break;
    default:
      break;
  }
}

}  // namespace

namespace qmi {

struct ServiceObject {
  int32_t service_id;
};

struct Client {
  pthread_t worker{};
  std::mutex lock;
  std::condition_variable wake;
  std::deque<Job> jobs;
  bool stopping = false;
  txn_handle last_txn = 0;
};

}  // namespace qmi

namespace {

constexpr qmi::ServiceObject kKroService{kServiceId};

// Counted from before the worker starts until its join has returned.
std::atomic<int> g_live_workers{0};

void serve(qmi::Client* client, const Job& job) {
  const QmiMessageSizes sizes = qmi_kro_sizes_of(job.msg_id);
  const int transp_err = switch_value("transport_error");
  if (transp_err == 0) {
    std::memset(job.resp, 0, sizes.resp);
    answer(job);
  }
  job.cb(client, job.msg_id, job.resp, job.resp_len, job.cb_data, transp_err);
}

void* worker_main(void* arg) {
  auto* client = static_cast<qmi::Client*>(arg);
  std::unique_lock<std::mutex> held(client->lock);
  for (;;) {
    client->wake.wait(held, [client] { return client->stopping || !client->jobs.empty(); });
    if (client->stopping) return nullptr;
    const Job job = client->jobs.front();
    client->jobs.pop_front();
    held.unlock();
    serve(client, job);
    held.lock();
  }
}

}  // namespace

namespace qmi {

service_object_type kro_get_service_object_internal_v01(int idl_major, int, int) {
  return idl_major == kIdlMajor ? &kKroService : nullptr;
}

int client_get_service_list(service_object_type service, service_info* list, unsigned* num_entries,
                            unsigned* num_services) {
  if (service != &kKroService || num_services == nullptr) return INTERNAL_ERR;
  if (dev_access("/.emu/modem/absent", F_OK) == 0) {
    *num_services = 0;
    if (num_entries != nullptr) *num_entries = 0;
    return SERVICE_ERR;
  }
  *num_services = 1;
  if (list != nullptr && num_entries != nullptr) {
    *num_entries = std::min(*num_entries, 1u);
    if (*num_entries == 1) list[0] = service_info{{kServiceId, kIdlMajor, 0, 0, 0}};
  }
  return NO_ERR;
}

int client_init(const service_info* info, service_object_type service, client_type* client) {
  if (client == nullptr || service != &kKroService) return INTERNAL_ERR;
  if (const int32_t error = switch_value("init_error"); error != 0) return error;
  if (info == nullptr || info->word[0] != kServiceId) return SERVICE_ERR;
  auto* c = new (std::nothrow) Client;
  if (c == nullptr) return INTERNAL_ERR;
  ++g_live_workers;
  if (::pthread_create(&c->worker, nullptr, worker_main, c) != 0) {
    --g_live_workers;
    delete c;
    return INTERNAL_ERR;
  }
  *client = c;
  return NO_ERR;
}

int client_send_msg_async(client_type client, unsigned msg_id, const void* req, unsigned req_len,
                          void* resp, unsigned resp_len, recv_msg_async_cb cb, void* cb_data,
                          txn_handle* txn) {
  if (client == nullptr || cb == nullptr) return INTERNAL_ERR;
  if (const int32_t error = switch_value("send_error"); error != 0) return error;
  // What the message's encoder would refuse: an unknown id, or buffers short of its layout.
  const QmiMessageSizes sizes = qmi_kro_sizes_of(msg_id);
  if (sizes.resp == 0 || req == nullptr || resp == nullptr || req_len < sizes.req ||
      resp_len < sizes.resp)
    return INTERNAL_ERR;
  Job job{msg_id, {}, resp, resp_len, cb, cb_data};
  std::memcpy(job.req.data(), req, sizes.req);
  append_request_log(describe(job));
  {
    std::lock_guard<std::mutex> held(client->lock);
    client->jobs.push_back(job);
    if (txn != nullptr) *txn = ++client->last_txn;
  }
  client->wake.notify_one();
  return NO_ERR;
}

int client_release(client_type client) {
  if (client == nullptr || ::pthread_equal(client->worker, ::pthread_self())) return INTERNAL_ERR;
  {
    std::lock_guard<std::mutex> held(client->lock);
    client->stopping = true;
  }
  client->wake.notify_one();
  ::pthread_join(client->worker, nullptr);
  --g_live_workers;
  delete client;
  return NO_ERR;
}

}  // namespace qmi

int host_qmi_live_workers() { return g_live_workers.load(); }
