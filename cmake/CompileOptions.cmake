# Compiler settings, as targets that only our own targets link to. A project that includes this one is
# not affected. The examples are compiled as callers are.
add_library(orvadr_compile_options INTERFACE)
add_library(orvadr_caller_options INTERFACE)
target_link_libraries(orvadr_compile_options INTERFACE orvadr_caller_options)
target_compile_features(orvadr_caller_options INTERFACE cxx_std_17)
target_compile_options(orvadr_caller_options INTERFACE
    -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wold-style-cast -Woverloaded-virtual
    -Wnull-dereference -Wnon-virtual-dtor
    $<$<BOOL:${ORVADR_WARNINGS_AS_ERRORS}>:-Werror>)
# Otherwise sizes of files and times have 32 bits on 32-bit machines. Callers may choose, because no
# public header has a type that depends on it.
if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    target_compile_definitions(orvadr_compile_options INTERFACE _FILE_OFFSET_BITS=64 _TIME_BITS=64)
endif()

if(CMAKE_CXX_COMPILER_ID STREQUAL GNU AND CMAKE_CXX_STANDARD GREATER 17)
    # Since C++20 strings are inlined so far that g++ 12 mistakes "a" + std::string() for an overlap.
    target_compile_options(orvadr_caller_options INTERFACE -Wno-restrict)
endif()

if(ORVADR_SANITIZE)
    set(sanitizers -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
    target_compile_options(orvadr_caller_options INTERFACE ${sanitizers})
    target_link_options(orvadr_caller_options INTERFACE ${sanitizers})
endif()
if(ORVADR_BUILD_FUZZ)
    # Tells the fuzzer which code an input reaches.
    target_compile_options(orvadr_caller_options INTERFACE -fsanitize=fuzzer-no-link)
endif()
if(ORVADR_COVERAGE)
    target_compile_options(orvadr_caller_options INTERFACE --coverage -fprofile-update=atomic)
    target_link_options(orvadr_caller_options INTERFACE --coverage)
endif()
