// The modem NV client against the emulated modem service.
#include "services/qmi_client.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "platform/host/host_hooks.h"
#include "tests/unit/device_root.h"
#include "tests/unit/qemu_skips.h"
#include "tests/unit/station_port.h"

namespace {

using Files = std::vector<std::pair<std::string, std::string>>;
using IntRequest = int (*)(qmi::client_type*, qmi::txn_handle*, const kro_int_req_msg_v01*,
                          QmiResult*);

constexpr int32_t kUntouched = 0x5a5a5a5a;

// State and CPU ticks of a process, from /proc/<pid>/stat.
struct ProcSample {
  std::string state;
  long ticks = -1;
};

ProcSample sample(pid_t pid) {
  std::ifstream stat("/proc/" + std::to_string(pid) + "/stat");
  std::string text((std::istreambuf_iterator<char>(stat)), std::istreambuf_iterator<char>());
  ProcSample out;
  if (text.rfind(')') == std::string::npos) return out;
  std::istringstream fields(text.substr(text.rfind(')') + 2));
  long skip, utime = 0, stime = 0;
  fields >> out.state;
  for (int i = 0; i < 10; ++i) fields >> skip;
  fields >> utime >> stime;
  out.ticks = utime + stime;
  return out;
}

class QmiClientTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    port_.open(PortKind::tty);
  }
  void TearDown() override {
    port_.close();
    DeviceRootTest::TearDown();
  }

  // A fresh modem whose last answers left the text "stale", the OEM block all kUntouched and
  // no transport error, with no request logged.
  void reset_modem() {
    std::filesystem::remove_all(host_path("/.emu/modem"));
    std::string oem;
    for (int i = 0; i < 32; ++i) oem += std::to_string(kUntouched) + " ";
    write_file("/.emu/modem/nv/9.oem", oem);
    write_file("/.emu/modem/nv/8", "stale");
    ASSERT_EQ(read_nv(9), 0);
    ASSERT_EQ(read_nv(8), 0);
    std::filesystem::remove_all(host_path("/.emu/modem"));
  }
  std::vector<int32_t> oem_values() const { return {last_.oem, last_.oem + 32}; }
  std::string text() const { return last_.text; }

  void write_files(const Files& files) {
    for (const auto& [path, content] : files) write_file(path, content);
  }

  std::string port_output() { return port_.drain(); }

  std::string last_request() {
    std::istringstream log(read_file("/.emu/modem/requests.log"));
    std::string line, last;
    while (std::getline(log, line)) last = line;
    return last;
  }

  // Every request must leave no answer outstanding and no transport thread behind.
  void expect_settled(const std::string& what) {
    EXPECT_EQ(qmi_pending.load(), 0) << what;
    EXPECT_EQ(host_qmi_live_workers(), 0) << what;
  }

  int read_nv(uint32_t item, uint8_t opt0 = 0, uint8_t opt1 = 0) {
    kro_read_nv_info_req_msg_v01 req{};
    req.nvItem_id = item;
    req.option[0] = opt0;
    req.option[1] = opt1;
    qmi::client_type clnt = nullptr;
    qmi::txn_handle txn = 0;
    return qmi_kro_read_nv_msg(&clnt, &txn, &req, &last_);
  }

  int write_nv(uint32_t item, const std::string& text) {
    kro_write_nv_info_req_msg_v01 req{};
    req.nvItem_id = item;
    req.buffer_valid = 1;
    std::memcpy(req.buffer, text.data(), std::min(text.size(), sizeof req.buffer));
    qmi::client_type clnt = nullptr;
    qmi::txn_handle txn = 0;
    return qmi_kro_write_nv_msg(&clnt, &txn, &req, &last_);
  }

  int int_request(IntRequest fn, int32_t value) {
    kro_int_req_msg_v01 req{value};
    qmi::client_type clnt = nullptr;
    qmi::txn_handle txn = 0;
    return fn(&clnt, &txn, &req, &last_);
  }

  QmiResult last_{};
  StationPort port_;
};

std::vector<int32_t> untouched_oem() { return std::vector<int32_t>(32, kUntouched); }

std::vector<int32_t> oem_of(std::initializer_list<int32_t> head) {
  std::vector<int32_t> v(32, 0);
  std::copy(head.begin(), head.end(), v.begin());
  return v;
}

TEST_F(QmiClientTest, ReadNvLeavesTextOrOemBlock) {
  // More than the block holds, over several separators: the first 32 count.
  std::string ints;
  std::vector<int32_t> block(32);
  for (int i = 0; i < 40; ++i) {
    const int v = (i % 2 ? -1 : 1) * (i * 1000003 + 7);
    ints += std::to_string(v) + (i % 3 ? " " : ",\n");
    if (i < 32) block[i] = v;
  }
  const std::string full(256, 'A');
  // clang-format off
  struct Case {
    const char* name;
    uint32_t item;
    uint8_t opt0, opt1;
    Files files;
    std::string want_text;
    std::vector<int32_t> want_oem;
  } cases[] = {
      {"text", 6853, 0, 0, {{"/.emu/modem/nv/6853", "PCB123"}}, "PCB123", untouched_oem()},
      {"text wins over oem", 6853, 0, 0,
       {{"/.emu/modem/nv/6853", "PCB123"}, {"/.emu/modem/nv/6853.oem", "1 2 3"}}, "PCB123", untouched_oem()},
      {"oem only", 65633, 0, 0, {{"/.emu/modem/nv/65633.oem", ints}}, "", block},
      {"oem cut at a bad number", 65633, 0, 0, {{"/.emu/modem/nv/65633.oem", "5, x 9"}}, "", oem_of({5})},
      {"valid byte 2 falls to oem", 550, 1, 1,
       {{"/.emu/modem/nv/550", "IMEI"}, {"/.emu/modem/nv/550.valid", "2"}, {"/.emu/modem/nv/550.oem", "7,8"}},
       "", oem_of({7, 8})},
      {"valid byte 2 without oem", 550, 0, 0,
       {{"/.emu/modem/nv/550", "IMEI"}, {"/.emu/modem/nv/550.valid", "2"}}, "", untouched_oem()},
      {"missing item", 72542, 0, 0, {}, "", untouched_oem()},
      {"text filling the field, oem behind it", 66024, 0, 0,
       {{"/.emu/modem/nv/66024", full}, {"/.emu/modem/nv/66024.oem", "9"}}, full, untouched_oem()},
  };
  // clang-format on
  for (const auto& c : cases) {
    reset_modem();
    write_files(c.files);
    EXPECT_EQ(read_nv(c.item, c.opt0, c.opt1), 0) << c.name;
    EXPECT_EQ(text(), c.want_text) << c.name;
    EXPECT_EQ(oem_values(), c.want_oem) << c.name;
    EXPECT_EQ(last_.flag, 0) << c.name;
    EXPECT_EQ(last_request(), "1 " + std::to_string(c.item) + " " + std::to_string(c.opt0) + "," +
                                  std::to_string(c.opt1))
        << c.name;
    expect_settled(c.name);
  }
}

TEST_F(QmiClientTest, WriteNvStoresTheTextForLaterReads) {
  const std::string full(256, 'Z');
  // clang-format off
  struct Case {
    const char* name;
    std::string value;
    std::string stored;
  } cases[] = {
      {"barcode", "ABC123", "ABC123"},
      {"overwrites", "X", "X"},
      {"empty", "", ""},
      {"unterminated full buffer", full, full},
  };
  // clang-format on
  for (const auto& c : cases) {
    EXPECT_EQ(write_nv(6853, c.value), 0) << c.name;
    EXPECT_EQ(read_file("/.emu/modem/nv/6853"), c.stored) << c.name;
    EXPECT_EQ(last_request(), "2 6853 0,0 " + c.stored) << c.name;
    EXPECT_EQ(last_.flag, 0) << c.name;
    EXPECT_EQ(read_nv(6853), 0) << c.name;
    EXPECT_EQ(text(), c.stored) << c.name;
    expect_settled(c.name);
  }
  EXPECT_FALSE(exists("/.emu/modem/nv/.6853.tmp"));
}

TEST_F(QmiClientTest, StatusAndAntennaRequests) {
  // clang-format off
  struct Case {
    const char* name;
    IntRequest fn;
    int32_t value;
    Files files;
    std::string want_text;
    std::string want_request;
  } cases[] = {
      {"set status default", qmi_set_status, 118, {}, "0", "14 118"},
      {"set status answer", qmi_set_status, 118, {{"/.emu/modem/set_status", "6\n"}}, "6", "14 118"},
      {"set status malformed answer", qmi_set_status, 11, {{"/.emu/modem/set_status", "six"}}, "1", "14 11"},
      {"set status failed response", qmi_set_status, 110, {{"/.emu/modem/response_error", "3"}}, "1", "14 110"},
      {"efs default", qmi_efs_golden_copy, 0, {}, "0", "17 0"},
      {"efs failure", qmi_efs_golden_copy, 0, {{"/.emu/modem/efs_golden_copy", "-3"}}, "-3", "17 0"},
      {"sim2 switch", qmi_switch_sim2_status, 1, {{"/.emu/modem/set_status", "6"}}, "", "15 1"},
      {"antenna switch", mutuallySwitchForPrimaryAndDiversity, -5, {}, "", "11 -5"},
      {"antenna query", getPrimaryAndDiversitymsg, 1, {{"/.emu/modem/antenna", "PRIMARY:1"}}, "PRIMARY:1",
       "12 1"},
      {"antenna query without answer", getPrimaryAndDiversitymsg, 1, {}, "", "12 1"},
      {"antenna query valid byte 3", getPrimaryAndDiversitymsg, 1,
       {{"/.emu/modem/antenna", "DIV"}, {"/.emu/modem/antenna.valid", "3"}}, "", "12 1"},
  };
  // clang-format on
  for (const auto& c : cases) {
    reset_modem();
    write_files(c.files);
    EXPECT_EQ(int_request(c.fn, c.value), 0) << c.name;
    EXPECT_EQ(text(), c.want_text) << c.name;
    EXPECT_EQ(last_.flag, 0) << c.name;
    EXPECT_EQ(oem_values(), untouched_oem()) << c.name;
    EXPECT_EQ(last_request(), c.want_request) << c.name;
    EXPECT_EQ(port_output(), "") << c.name;
    expect_settled(c.name);
  }
}

TEST_F(QmiClientTest, GpsOptionAnswerIsWrittenToThePort) {
  const std::string long_text(600, 'G');
  // clang-format off
  struct Case {
    const char* name;
    uint8_t option;
    Files files;
    std::string want_port;
  } cases[] = {
      {"fix", 2, {{"/.emu/modem/gps/2", "$GPGGA,1,2\r\n"}}, "$GPGGA,1,2\r\n"},
      {"no answer for the option", 1, {{"/.emu/modem/gps/2", "other"}}, ""},
      {"non-zero valid byte", 3, {{"/.emu/modem/gps/3", "on"}, {"/.emu/modem/gps/3.valid", "7"}}, "on"},
      {"valid byte 0", 3, {{"/.emu/modem/gps/3", "on"}, {"/.emu/modem/gps/3.valid", "0"}}, ""},
      {"cut at the field", 0, {{"/.emu/modem/gps/0", long_text}}, long_text.substr(0, 515)},
  };
  // clang-format on
  for (const auto& c : cases) {
    reset_modem();
    write_files(c.files);
    kro_gps_option_req_msg_v01 req{c.option};
    qmi::client_type clnt = nullptr;
    qmi::txn_handle txn = 0;
    EXPECT_EQ(qmi_kro_gps_option_msg(&clnt, &txn, &req, &last_), 0) << c.name;
    // Written by the callback before the request returned.
    EXPECT_EQ(port_output(), c.want_port) << c.name;
    EXPECT_EQ(text(), "") << c.name;
    EXPECT_EQ(last_request(), "3 " + std::to_string(c.option)) << c.name;
    expect_settled(c.name);
  }
}

TEST_F(QmiClientTest, FailuresReachTheCallerOnlyAsStatusOrFlag) {
  // clang-format off
  struct Case {
    const char* name;
    Files files;
    bool write;  // else a read of item 6853
    int want_rc;
    int32_t want_flag;
    std::string want_text;
    bool sent;
  } cases[] = {
      {"client init fails", {{"/.emu/modem/init_error", "-2"}}, false, -1, 0, "stale", false},
      {"send fails", {{"/.emu/modem/send_error", "-1"}}, true, -1, 0, "stale", false},
      {"malformed send switch", {{"/.emu/modem/send_error", "yes"}}, false, -1, 0, "stale", false},
      {"switch set to 0", {{"/.emu/modem/send_error", "0"}}, false, 0, 0, "OLD", true},
      {"transport error on read", {{"/.emu/modem/transport_error", "5"}}, false, 0, 5, "", true},
      {"transport error on write", {{"/.emu/modem/transport_error", "-4"}}, true, 0, -4, "", true},
      {"failed write response", {{"/.emu/modem/response_error", "3"}}, true, 0, 0, "", true},
  };
  // clang-format on
  for (const auto& c : cases) {
    reset_modem();
    write_file("/.emu/modem/nv/6853", "OLD");
    write_file("/.emu/modem/nv/6853.oem", "1 2");
    write_files(c.files);
    EXPECT_EQ(c.write ? write_nv(6853, "NEW") : read_nv(6853), c.want_rc) << c.name;
    EXPECT_EQ(last_.flag, c.want_flag) << c.name;
    EXPECT_EQ(text(), c.want_text) << c.name;
    EXPECT_EQ(oem_values(), untouched_oem()) << c.name;
    EXPECT_EQ(read_file("/.emu/modem/nv/6853"), "OLD") << c.name;
    EXPECT_EQ(exists("/.emu/modem/requests.log"), c.sent) << c.name;
    expect_settled(c.name);
  }
}

TEST_F(QmiClientTest, SemaphoreVariantsFillTheCallersBuffers) {
  // clang-format off
  struct Case {
    const char* name;
    Files files;
    bool write;
    unsigned msg_id;
    unsigned resp_len;
    uint8_t valid;  // of the write request
    int want_rc;
    int32_t want_err;
    qmi_response_type_v01 want_resp;
    std::string want_text;    // read answer, or the item file after a write
  } cases[] = {
      {"read", {{"/.emu/modem/nv/1943", "A1000000"}}, false, 1, 404, 1, 0, 0, {0, 0}, "A1000000"},
      {"write", {}, true, 2, 8, 1, 0, 0, {0, 0}, "AABBCCDDEEFF"},
      {"write without valid byte", {}, true, 2, 8, 0, 0, 0, {1, 1}, ""},
      {"write refused", {{"/.emu/modem/response_error", "17"}}, true, 2, 8, 1, 0, 0, {1, 17}, ""},
      {"transport error", {{"/.emu/modem/transport_error", "7"}}, false, 1, 404, 1, 0, 7, {0, 0}, ""},
      {"send error", {{"/.emu/modem/send_error", "-2"}}, false, 1, 404, 1, -2, -1, {0, 0}, ""},
      {"init error", {{"/.emu/modem/init_error", "-3"}}, true, 2, 8, 1, -3, -1, {0, 0}, ""},
      {"response shorter than the layout", {}, false, 1, 100, 1, qmi::INTERNAL_ERR, -1, {0, 0}, ""},
      {"unknown message", {}, false, 99, 404, 1, qmi::INTERNAL_ERR, -1, {0, 0}, ""},
  };
  // clang-format on
  for (const auto& c : cases) {
    reset_modem();
    write_files(c.files);
    // Guard bytes behind the declared length must survive.
    unsigned char resp[512];
    std::memset(resp, 0xee, sizeof resp);
    qmi_kro_wait_record wait{};
    wait.transp_err = -1;
    wait.msg_id = -1;
    int rc;
    if (c.write) {
      kro_write_nv_info_req_msg_v01 req{};
      req.nvItem_id = 4678;
      req.buffer_valid = c.valid;
      std::strcpy(req.buffer, "AABBCCDDEEFF");
      rc = qmi_kro_write_nv_msg_ex(&req, sizeof req, c.msg_id, resp, c.resp_len, &wait);
    } else {
      kro_read_nv_info_req_msg_v01 req{};
      req.nvItem_id = 1943;
      rc = qmi_kro_read_nv_msg_ex(&req, sizeof req, c.msg_id, resp, c.resp_len, &wait);
    }
    EXPECT_EQ(rc, c.want_rc) << c.name;
    EXPECT_EQ(wait.transp_err, c.want_err) << c.name;
    EXPECT_EQ(wait.msg_id, c.want_rc == 0 ? static_cast<int32_t>(c.msg_id) : -1) << c.name;
    for (size_t i = c.resp_len; i < sizeof resp; ++i)
      ASSERT_EQ(resp[i], 0xee) << c.name << " byte " << i;
    if (c.want_rc == 0 && c.want_err == 0) {
      qmi_response_type_v01 header;
      std::memcpy(&header, resp, sizeof header);
      EXPECT_EQ(header.result, c.want_resp.result) << c.name;
      EXPECT_EQ(header.error, c.want_resp.error) << c.name;
    }
    if (c.write) {
      EXPECT_EQ(read_file("/.emu/modem/nv/4678"), c.want_text) << c.name;
    } else if (c.want_rc == 0 && c.want_err == 0) {
      kro_read_nv_info_resp_msg_v01 r;
      std::memcpy(&r, resp, sizeof r);
      EXPECT_EQ(r.buffer_valid, 1) << c.name;
      EXPECT_EQ(std::string(r.buffer), c.want_text) << c.name;
    }
    expect_settled(c.name);
  }
}

// Without the service the request waits for good; a child proves it without holding the run.
TEST_F(QmiClientTest, AbsentServiceBlocksInAConditionWait) {
  write_file("/.emu/modem/absent", "");
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    ::alarm(120);  // never outlive a crashed parent
    _exit(read_nv(6853) == 0 ? 0 : 1);
  }
  // Asleep with its CPU time standing still over a quiet spell: waiting, not polling.
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  ProcSample before = sample(child), after;
  for (;;) {
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    after = sample(child);
    if (after.state == "S" && before.state == "S" && after.ticks == before.ticks) break;
    if (after.state == "Z" || std::chrono::steady_clock::now() > deadline) break;
    before = after;
  }
  EXPECT_EQ(after.state, "S") << "not asleep";
  EXPECT_EQ(after.ticks, before.ticks) << "spent CPU while waiting";
  int status = 0;
  EXPECT_EQ(::waitpid(child, &status, WNOHANG), 0) << "the request returned";

  ::kill(child, SIGKILL);
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFSIGNALED(status));
  EXPECT_FALSE(exists("/.emu/modem/requests.log"));
}

}  // namespace
