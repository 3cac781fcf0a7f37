# Cross build for the phone's architecture with Debian's cross compiler; libraries (zlib,
# GoogleTest) come from Debian's arm64 multiarch packages. Programs built here run under
# qemu-user: ctest and the integration tests start them through CMAKE_CROSSCOMPILING_EMULATOR.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)
set(CMAKE_LIBRARY_ARCHITECTURE aarch64-linux-gnu)
# No -L sysroot: the loader and the C library must both be the multiarch ones, of one version.
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-aarch64-static)
