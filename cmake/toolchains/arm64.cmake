# 64-bit ARM. CTest runs the tests in an emulator.
set(arch arm64)
set(processor aarch64)
set(triplet aarch64-linux-gnu)
set(compiler ${triplet})
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-aarch64-static -L ${CMAKE_SYSROOT})
