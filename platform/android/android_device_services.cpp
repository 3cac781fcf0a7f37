// The maker's factory and sensor test libraries on the phone.
#include <cstdio>

#include "platform/android/vendor/pemufactory.h"
#include "platform/android/vendor/pemusensortest.h"
#include "platform/device_services.h"

int factory_service_request(const char* request, char* answer, size_t size) {
  if (answer == nullptr || size == 0) return -1;
  answer[0] = '\0';
  if (request == nullptr) return -1;
  const char* reply = vendor::sendMessage(request);
  if (reply == nullptr) return -1;
  std::snprintf(answer, size, "%s", reply);
  return 0;
}

int setupwizard_state() { return vendor::isSetupwizardDisabled(); }

int camera_connected_mask() { return vendor::checkCameraDeviceConnect(); }

int pemu_sensor_factory_test(int test, sensor_test_result* result, int reserved, int argument) {
  if (result == nullptr) return -1;
  return vendor::pemu_sensor_factory_test(test, result, reserved, argument);
}

void show_sensor_test_result(const sensor_test_result* result) {
  vendor::show_sensor_test_result(const_cast<sensor_test_result*>(result));
}
