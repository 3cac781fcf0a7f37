// The persistent factory record, read and written whole.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "core/command.h"

struct ulda_nvram {
  int32_t gsensor_cali_flag;   // 0
  int32_t master_clear_armed;  // 4
  int32_t master_clear_flag;   // 8
  int32_t adb_flag;            // 12
  uint8_t reserved_16[52];     // 16
  int32_t ps_base_threshold;   // 68
  int32_t als_cali_data;       // 72
  int32_t gsensor_offset_x;    // 76
  int32_t gsensor_offset_y;    // 80
  int32_t gsensor_offset_z;    // 84
  int32_t wallpaper_id;        // 88
  int32_t als_cali_flag;       // 92
  int32_t ps_cali_flag;        // 96
  uint8_t reserved_100[8];     // 100
  int32_t is_root;             // 108
  int32_t is_jvsn_ok;          // 112
  uint8_t reserved_116[4];     // 116
  int32_t gyro_cali_flag;      // 120
  int32_t gyro_offset_x;       // 124
  int32_t gyro_offset_y;       // 128
  int32_t gyro_offset_z;       // 132
  uint8_t reserved_136[4];     // 136
  char test_order[100];        // 140
  int32_t nomal_3g;            // 240
  char optr_flag[16];          // 244
  int32_t lcm_color_type;      // 260
  int32_t sdcard_cali_flag;    // 264
  uint8_t reserved_268[16];    // 268
  int32_t led_result;          // 284
  uint8_t reserved_288[36];    // 288
  int32_t special_feature;     // 324
  uint8_t remainder[208];      // 328: network lock, special product and others
};

inline constexpr size_t ULDA_NVRAM_SIZE = 536;
static_assert(sizeof(ulda_nvram) == ULDA_NVRAM_SIZE);
static_assert(offsetof(ulda_nvram, gsensor_cali_flag) == 0);
static_assert(offsetof(ulda_nvram, master_clear_armed) == 4);
static_assert(offsetof(ulda_nvram, master_clear_flag) == 8);
static_assert(offsetof(ulda_nvram, adb_flag) == 12);
static_assert(offsetof(ulda_nvram, ps_base_threshold) == 68);
static_assert(offsetof(ulda_nvram, als_cali_data) == 72);
static_assert(offsetof(ulda_nvram, gsensor_offset_x) == 76);
static_assert(offsetof(ulda_nvram, gsensor_offset_y) == 80);
static_assert(offsetof(ulda_nvram, gsensor_offset_z) == 84);
static_assert(offsetof(ulda_nvram, wallpaper_id) == 88);
static_assert(offsetof(ulda_nvram, als_cali_flag) == 92);
static_assert(offsetof(ulda_nvram, ps_cali_flag) == 96);
static_assert(offsetof(ulda_nvram, is_root) == 108);
static_assert(offsetof(ulda_nvram, is_jvsn_ok) == 112);
static_assert(offsetof(ulda_nvram, gyro_cali_flag) == 120);
static_assert(offsetof(ulda_nvram, gyro_offset_x) == 124);
static_assert(offsetof(ulda_nvram, gyro_offset_y) == 128);
static_assert(offsetof(ulda_nvram, gyro_offset_z) == 132);
static_assert(offsetof(ulda_nvram, test_order) == 140);
static_assert(offsetof(ulda_nvram, nomal_3g) == 240);
static_assert(offsetof(ulda_nvram, optr_flag) == 244);
static_assert(offsetof(ulda_nvram, lcm_color_type) == 260);
static_assert(offsetof(ulda_nvram, sdcard_cali_flag) == 264);
static_assert(offsetof(ulda_nvram, led_result) == 284);
static_assert(offsetof(ulda_nvram, special_feature) == 324);
static_assert(offsetof(ulda_nvram, remainder) == 328);

// 0 on success; a missing or short record is a failure.
int get_ULDA_NV_item(ulda_nvram* record);
// 0 on success. Crash-safe: a reader sees the old record or the new one.
int put_ULDA_NV_item(const ulda_nvram* record);

// Zeroes `record` and reads the factory record into it; logs a failure with the caller's
// name. RESULT_OK or RESULT_ERROR.
int read_ulda_nvram(const char* caller, ulda_nvram& record);
// Writes the whole record; logs a failure. RESULT_OK or RESULT_ERROR.
int write_ulda_nvram(const char* caller, const ulda_nvram& record);

// The one read-modify-write of the record, so no handler can forget the other bytes:
// read, let `change` set the fields the command owns (returning false writes nothing and
// fails the command), write the whole record back. RESULT_OK or RESULT_ERROR.
template <typename Change>
int update_ulda_nvram(const char* caller, Change&& change) {
  ulda_nvram record;
  if (read_ulda_nvram(caller, record) != RESULT_OK) return RESULT_ERROR;
  if (!change(record)) return RESULT_ERROR;
  return write_ulda_nvram(caller, record);
}

// Sets a string field: the whole field cleared, then at most its width copied. A value as
// long as the field fills it with no terminator.
template <size_t N>
void set_ulda_string(char (&field)[N], const char* value) {
  std::memset(field, 0, N);
  if (value != nullptr) std::memcpy(field, value, strnlen(value, N));
}

// The read-back poll of close_adb: re-reads up to five times until adb_flag reads 0.
// Returns 0 when it did, -1 otherwise.
int poll_adb_flag_cleared();
