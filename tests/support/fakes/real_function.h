// From a fake to the function that it replaces.
#ifndef ORVADRCORE_TESTS_REAL_FUNCTION_H
#define ORVADRCORE_TESTS_REAL_FUNCTION_H

#include <dlfcn.h>

#include <cstdlib>

// The function of that name in the shared libraries.
template <class Function>
Function* RealFunction(const char* name)
{
    void* symbol = ::dlsym(RTLD_NEXT, name);
    if (symbol == nullptr) std::abort();
    return reinterpret_cast<Function*>(symbol);
}

#endif
