// The way from a function of the test program to the one whose place it takes.
#ifndef ORVADRCORE_TESTS_REAL_FUNCTION_H
#define ORVADRCORE_TESTS_REAL_FUNCTION_H

#include <dlfcn.h>

#include <cstdlib>

// The function of that name in the libraries behind the program.
template <class Function>
Function* RealFunction(const char* name)
{
    void* symbol = ::dlsym(RTLD_NEXT, name);
    if (symbol == nullptr) std::abort();
    return reinterpret_cast<Function*>(symbol);
}

#endif
