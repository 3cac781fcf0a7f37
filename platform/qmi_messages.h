// Messages of the maker's modem QMI service: ids and the C layouts both sides agree on.
#pragma once

#include <cstddef>
#include <cstdint>

inline constexpr unsigned QMI_KRO_READ_NV_INFO_RESP_MSG_V01 = 1;
inline constexpr unsigned QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01 = 2;
inline constexpr unsigned QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01 = 3;
inline constexpr unsigned QMI_KRO_SET_FORMAT_RESP_MSG_V01 = 9;
inline constexpr unsigned QMI_KRO_SET_PRIMARY_DIVERSITY_RESP_MSG_V01 = 11;
inline constexpr unsigned QMI_KRO_GET_PRIMARY_DIVERSITY_RESP_MSG_V01 = 12;
inline constexpr unsigned QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01 = 14;
inline constexpr unsigned QMI_PEMU_SWITCH_SIM2_STATUS_RESP_MSG_V01 = 15;
inline constexpr unsigned QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01 = 17;

inline constexpr size_t QMI_KRO_NV_BUFFER_SIZE = 256;
inline constexpr size_t QMI_KRO_OEM_BUFFER_LEN = 32;
inline constexpr size_t QMI_KRO_GPS_BUFFER_SIZE = 515;

// Every response starts with the QMI result (0 success, 1 failure) and error code.
struct qmi_response_type_v01 {
  int32_t result;
  int32_t error;
};

struct kro_read_nv_info_req_msg_v01 {
  uint32_t nvItem_id;
  uint8_t option[2];
  uint8_t reserved_6[2];
};

struct kro_read_nv_info_resp_msg_v01 {
  qmi_response_type_v01 resp;
  uint8_t reserved_8[8];
  uint8_t buffer_valid;
  char buffer[QMI_KRO_NV_BUFFER_SIZE];
  uint8_t oem_buffer_valid;
  uint8_t reserved_274[2];
  int32_t oem_buffer[QMI_KRO_OEM_BUFFER_LEN];
};

struct kro_write_nv_info_req_msg_v01 {
  uint32_t nvItem_id;
  uint8_t reserved_4[8];
  uint8_t buffer_valid;
  char buffer[QMI_KRO_NV_BUFFER_SIZE];
  uint8_t option[2];
  uint8_t reserved_271[129];
};

struct kro_gps_option_req_msg_v01 {
  uint8_t option;
};

struct kro_gps_option_resp_msg_v01 {
  qmi_response_type_v01 resp;
  uint8_t buffer_valid;
  char buffer[QMI_KRO_GPS_BUFFER_SIZE];
};

// The 4-byte requests: antenna switch and query, set status, SIM 2 switch, EFS golden copy.
struct kro_int_req_msg_v01 {
  int32_t value;
};

struct kro_get_primary_diversity_resp_msg_v01 {
  qmi_response_type_v01 resp;
  uint8_t reserved_8[8];
  uint8_t buffer_valid;
  char buffer[QMI_KRO_NV_BUFFER_SIZE];
  uint8_t reserved_273[3];
};

// The responses that carry nothing but the result.
using kro_status_resp_msg_v01 = qmi_response_type_v01;

#define QMI_LAYOUT(type, size) static_assert(sizeof(type) == (size), #type)
#define QMI_FIELD(type, field, offset) \
  static_assert(offsetof(type, field) == (offset), #type "." #field)

QMI_LAYOUT(qmi_response_type_v01, 8);
QMI_FIELD(qmi_response_type_v01, result, 0);
QMI_FIELD(qmi_response_type_v01, error, 4);

QMI_LAYOUT(kro_read_nv_info_req_msg_v01, 8);
QMI_FIELD(kro_read_nv_info_req_msg_v01, nvItem_id, 0);
QMI_FIELD(kro_read_nv_info_req_msg_v01, option, 4);

QMI_LAYOUT(kro_read_nv_info_resp_msg_v01, 404);
QMI_FIELD(kro_read_nv_info_resp_msg_v01, buffer_valid, 16);
QMI_FIELD(kro_read_nv_info_resp_msg_v01, buffer, 17);
QMI_FIELD(kro_read_nv_info_resp_msg_v01, oem_buffer_valid, 273);
QMI_FIELD(kro_read_nv_info_resp_msg_v01, oem_buffer, 276);

QMI_LAYOUT(kro_write_nv_info_req_msg_v01, 400);
QMI_FIELD(kro_write_nv_info_req_msg_v01, nvItem_id, 0);
QMI_FIELD(kro_write_nv_info_req_msg_v01, buffer_valid, 12);
QMI_FIELD(kro_write_nv_info_req_msg_v01, buffer, 13);
QMI_FIELD(kro_write_nv_info_req_msg_v01, option, 269);

QMI_LAYOUT(kro_gps_option_req_msg_v01, 1);
QMI_LAYOUT(kro_gps_option_resp_msg_v01, 524);
QMI_FIELD(kro_gps_option_resp_msg_v01, buffer_valid, 8);
QMI_FIELD(kro_gps_option_resp_msg_v01, buffer, 9);

QMI_LAYOUT(kro_int_req_msg_v01, 4);
QMI_LAYOUT(kro_get_primary_diversity_resp_msg_v01, 276);
QMI_FIELD(kro_get_primary_diversity_resp_msg_v01, buffer_valid, 16);
QMI_FIELD(kro_get_primary_diversity_resp_msg_v01, buffer, 17);

#undef QMI_LAYOUT
#undef QMI_FIELD

// Request and response sizes of each message the service knows; 0 for an unknown id.
struct QmiMessageSizes {
  unsigned id;
  unsigned req;
  unsigned resp;
};
inline constexpr QmiMessageSizes qmi_kro_message_sizes[] = {
    {QMI_KRO_READ_NV_INFO_RESP_MSG_V01, 8, 404},
    {QMI_KRO_WRITE_NV_INFO_RESP_MSG_V01, 400, 8},
    {QMI_KRO_GPS_OPTION_INFO_RESP_MSG_V01, 1, 524},
    {QMI_KRO_SET_FORMAT_RESP_MSG_V01, 4, 8},
    {QMI_KRO_SET_PRIMARY_DIVERSITY_RESP_MSG_V01, 4, 8},
    {QMI_KRO_GET_PRIMARY_DIVERSITY_RESP_MSG_V01, 4, 276},
    {QMI_PEMU_SET_EM_STATUS_RESP_MSG_V01, 4, 8},
    {QMI_PEMU_SWITCH_SIM2_STATUS_RESP_MSG_V01, 4, 8},
    {QMI_PEMU_EFS_GOLDEN_COPY_RESP_MSG_V01, 4, 8},
};

constexpr QmiMessageSizes qmi_kro_sizes_of(unsigned id) {
  for (const auto& m : qmi_kro_message_sizes)
    if (m.id == id) return m;
  return {id, 0, 0};
}
