# 32-bit ARM with a floating-point unit. CTest runs the tests in an emulator.
set(arch armhf)
set(processor arm)
set(triplet arm-linux-gnueabihf)
set(compiler ${triplet})
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-arm-static -L ${CMAKE_SYSROOT})
