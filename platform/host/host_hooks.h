// Seams of the host build for in-process tests.
#pragma once

// When set, platform_system() hands every command text to the hook and returns its result
// instead of recording and running it.
using ShellHook = int (*)(const char* command);
void host_set_shell_hook(ShellHook hook);

// When set, platform_restart()/platform_power_off() call the hook with "restart" or
// "power-off" instead of ending the process. The hook must not return.
using PowerHook = void (*)(const char* what);
void host_set_power_hook(PowerHook hook);

// Transport workers of the emulated QMI service started and not yet joined: a released client
// leaves none behind, so tests can tell a leaked or unjoined worker without racing the kernel.
int host_qmi_live_workers();
