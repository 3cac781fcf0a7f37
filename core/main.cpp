#include "core/startup.h"
#include "platform/platform.h"

int main() {
  if (platform_init() != 0) return 1;
  return atcid_main();
}
