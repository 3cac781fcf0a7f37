// The factory support library's calling contract (libpemufactory and libpemusensortest).
#pragma once

#include <cstdint>

#include "platform/device_services.h"

// Framework requests; the result is never inspected by a handler.
int sendBroadcastFromAtcid(const char* component, const char* action, const char* extras);
int startActivityFromAtcid(const char* component, const char* action, const char* extras);
int stopActivityFromAtcid(const char* package, const char* action, const char* extras);
int startServiceFromAtcid(const char* component, const char* action, const char* extras);
int killprocess(const char* name, int flag);
// The answer of the factory service; owned by the library.
const char* sendMessage(const char* request);

// Device utilities.
int readFromFile(const char* path, char* buffer, int size);  // negative on failure
int write_int(const char* path, int value);                  // 0 on success
void substring(char* token);  // strips the quotes and blanks around a parameter, in place
int isSetupwizardDisabled();
int checkCameraDeviceConnect(int unused);

struct MD5_CTX {
  uint32_t state[4];
  uint64_t count;  // bytes fed
  uint8_t buffer[64];
};
void MD5_Init(MD5_CTX* context);
int MD5_Update_File(MD5_CTX* context, const char* path);  // 0 on success
void MD5_Final(unsigned char digest[16], MD5_CTX* context);

// Sensor self-tests (`pemu_sensor_factory_test`, `show_sensor_test_result` and their
// 116-byte `sensor_test_result`) are declared with the other platform services.
