// Bluetooth test: device address in the NV file, DUT mode through bdt, device scan.
#pragma once

#include <cstdint>

// One item of the Bluetooth NV file. Values longer than 7 bytes keep their first 7.
struct bt_nv_item {
  uint32_t id;
  uint32_t second;  // the second header byte, kept as read
  uint8_t length;
  uint8_t value[7];
  bool value_read;  // the whole value was there
};

inline constexpr int BT_NV_ITEMS = 4;

// Fills `items` (room for BT_NV_ITEMS) in file order; returns the number of item headers in
// the file, or -1 when it cannot be opened.
int bt_nv_read(bt_nv_item (&items)[BT_NV_ITEMS]);

int bt_handler(char* cmdline, int op, char* response);  // AT+EMBT
