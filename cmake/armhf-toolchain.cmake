# Cross build for the controller: 32-bit ARM, hard float, Debian multiarch
# libraries; tests run under user-mode emulation.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(CMAKE_C_COMPILER arm-linux-gnueabihf-gcc)
set(CMAKE_CXX_COMPILER arm-linux-gnueabihf-g++)
set(CMAKE_LIBRARY_ARCHITECTURE arm-linux-gnueabihf)
set(CMAKE_FIND_ROOT_PATH /usr/arm-linux-gnueabihf /usr/lib/arm-linux-gnueabihf)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY BOTH)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE BOTH)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE BOTH)
# The armhf C library and libstdc++ come from Debian multiarch (scripts/setup
# installs libc6:armhf and libstdc++6:armhf), so qemu-arm finds the loader at
# /lib without -L. The cross toolchain's own copy under
# /usr/arm-linux-gnueabihf crashes threaded programs under qemu: do not use it.
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-arm)
