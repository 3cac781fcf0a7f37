// The phone's power requests, over primitives a test can replace: the sequence is logic, the
// system calls behind it are not run anywhere but on a phone.
#pragma once

struct PhonePowerOps {
  void (*sync)();
  int (*reboot)(int command);  // reboot(2); returns only when refused
  int (*property_set)(const char* key, const char* value);
  void (*sleep_ms)(unsigned ms);
};

enum class PowerRequest { restart, power_off };

// Flushes the file systems and asks the kernel to restart or power off. When the kernel
// refuses (no CAP_SYS_BOOT under the product's policy) init is asked instead through
// "sys.powerctl" and given time to act. Returns only when neither took the phone away.
void phone_power_request(const PhonePowerOps& ops, PowerRequest request);

inline constexpr unsigned kInitShutdownGraceMs = 10000;
