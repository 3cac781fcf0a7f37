#include "core/startup.h"
#include "platform/platform.h"

int main() {
  if (platform_init() != 0) return 1;
  platform_log_in_background();
  return atcid_main();
}
