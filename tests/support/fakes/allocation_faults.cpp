#include "support/fakes/allocation_faults.h"

#include <cerrno>
#include <cstdlib>
#include <new>

#if defined(__has_feature)
#define ORVADR_HAS_FEATURE(feature) __has_feature(feature)
#else
#define ORVADR_HAS_FEATURE(feature) 0
#endif

namespace {

bool (*ask)() = nullptr;
long live = 0;

bool Fails()
{
    if (ask == nullptr || !ask()) return false;
    errno = ENOMEM;
    return true;
}

}  // namespace

void AskBeforeAllocating(bool (*fails)())
{
    ask = fails;
}

long CountLiveAllocations()
{
    return live;
}

#if defined(__SANITIZE_ADDRESS__) || ORVADR_HAS_FEATURE(address_sanitizer)

void* operator new(std::size_t size)
{
    void* memory = Fails() ? nullptr : std::malloc(size > 0 ? size : 1);
    if (memory == nullptr) throw std::bad_alloc();
    return memory;
}

void* operator new[](std::size_t size)
{
    return ::operator new(size);
}

void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept
{
    return Fails() ? nullptr : std::malloc(size > 0 ? size : 1);
}

void operator delete(void* memory) noexcept
{
    std::free(memory);
}

void operator delete[](void* memory) noexcept
{
    std::free(memory);
}

void operator delete(void* memory, std::size_t /*size*/) noexcept
{
    std::free(memory);
}

void operator delete[](void* memory, std::size_t /*size*/) noexcept
{
    std::free(memory);
}

void operator delete(void* memory, const std::nothrow_t& /*tag*/) noexcept
{
    std::free(memory);
}

#else

// The C library's own functions, under the names that it keeps for those who replace malloc.
// NOLINTBEGIN(bugprone-reserved-identifier)
extern "C" void* __libc_malloc(std::size_t size);
extern "C" void* __libc_calloc(std::size_t count, std::size_t size);
extern "C" void* __libc_realloc(void* memory, std::size_t size);
extern "C" void __libc_free(void* memory);
// NOLINTEND(bugprone-reserved-identifier)

extern "C" void* malloc(std::size_t size) noexcept
{
    void* memory = Fails() ? nullptr : __libc_malloc(size);
    if (memory != nullptr) ++live;
    return memory;
}

extern "C" void* calloc(std::size_t count, std::size_t size) noexcept
{
    void* memory = Fails() ? nullptr : __libc_calloc(count, size);
    if (memory != nullptr) ++live;
    return memory;
}

extern "C" void* realloc(void* old, std::size_t size) noexcept
{
    if (old == nullptr) return malloc(size);
    if (size == 0) {
        free(old);
        return nullptr;
    }
    return Fails() ? nullptr : __libc_realloc(old, size);
}

extern "C" void free(void* memory) noexcept
{
    if (memory != nullptr) --live;
    __libc_free(memory);
}

#endif
