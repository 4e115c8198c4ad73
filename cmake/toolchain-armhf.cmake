# Debian's cross compiler for 32-bit Arm; programs run under qemu-user. `./dev cross` makes the sysroot.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(CMAKE_CXX_COMPILER arm-linux-gnueabihf-g++)
set(CMAKE_LIBRARY_ARCHITECTURE arm-linux-gnueabihf)

get_filename_component(VX_ARM_SYSROOT ${CMAKE_CURRENT_LIST_DIR}/../build/armhf-sysroot ABSOLUTE)

set(CMAKE_FIND_ROOT_PATH ${VX_ARM_SYSROOT} /usr/arm-linux-gnueabihf)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# Where Debian keeps the headers that differ from machine to machine.
set(CMAKE_CXX_FLAGS_INIT "-Wno-psabi -isystem ${VX_ARM_SYSROOT}/usr/include/arm-linux-gnueabihf")

# A sanitizer looks for leaks as a tracer of its own process, which the emulator is not; it takes its options from the
# environment of the emulator, not from what -E says. It also takes addresses above 3 GiB for nobody's, which the emulator
# hands out when there are no others left: what was freed is not kept for long.
set(CMAKE_CROSSCOMPILING_EMULATOR
    env ASAN_OPTIONS=detect_leaks=0:quarantine_size_mb=16
    qemu-arm -L /usr/arm-linux-gnueabihf -E LD_LIBRARY_PATH=${VX_ARM_SYSROOT}/lib/arm-linux-gnueabihf)
