# 32-bit x86. An x86 kernel runs the programs; the loader is told where that machine's libraries are.
set(arch i386)
set(processor i686)
set(triplet i386-linux-gnu)
set(compiler i686-linux-gnu)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
set(CMAKE_CROSSCOMPILING_EMULATOR ${CMAKE_SYSROOT}/lib/ld-linux.so.2 --library-path
    ${CMAKE_SYSROOT}/lib/${triplet}:${CMAKE_SYSROOT}/usr/lib/${triplet})
