// Start-up: kernel command line and "persist.sys.kroem" choose the port, then the reader runs.
#pragma once

struct KernelCmdlineFlags {
  bool uart;  // console mode and "androidboot.uart=uart2" both seen
  bool sp;    // console mode "sendAT" or "sendSP"
};

// Scans a kernel command line in place (tokens are cut where they are read).
KernelCmdlineFlags scan_kernel_cmdline(char* text);

// main() of the daemon once the platform is ready.
int atcid_main();
