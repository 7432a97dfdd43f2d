// From a fake to the function that it replaces.
#ifndef ORVADRCORE_TESTS_REAL_FUNCTION_H
#define ORVADRCORE_TESTS_REAL_FUNCTION_H

#include <dlfcn.h>

#include <array>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <utility>

// What the C library calls a function. On 32-bit machines the compiler replaces the names of those that
// have 64-bit sizes or times, here as in the library.
inline const char* SymbolOf(const char* name)
{
    constexpr bool IsReplaced = sizeof(std::time_t) > sizeof(long);
    constexpr std::array<std::pair<const char*, const char*>, 7> Replaced{{
        {"clock_gettime", "__clock_gettime64"},
        {"fcntl", "__fcntl_time64"},
        {"fstat", "__fstat64_time64"},
        {"lstat", "__lstat64_time64"},
        {"open", "open64"},
        {"stat", "__stat64_time64"},
        {"time", "__time64"},
    }};
    for (const auto& [plain, symbol] : Replaced) {
        if (IsReplaced && std::strcmp(name, plain) == 0) return symbol;
    }
    return name;
}

// The function of that name in the shared libraries.
template <class Function>
Function* RealFunction(const char* name)
{
    void* symbol = ::dlsym(RTLD_NEXT, SymbolOf(name));
    if (symbol == nullptr) std::abort();
    return reinterpret_cast<Function*>(symbol);
}

#endif
