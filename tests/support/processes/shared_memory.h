// An object that a test shares with the processes that it forks.
#ifndef ORVADRCORE_TESTS_SHARED_MEMORY_H
#define ORVADRCORE_TESTS_SHARED_MEMORY_H

#include <sys/mman.h>

#include <cstdlib>
#include <new>
#include <type_traits>

template <class T>
class SharedMemory {
  public:
    SharedMemory()
    {
        static_assert(std::is_trivially_destructible_v<T>, "no destructor runs");
        void* memory =
            ::mmap(nullptr, sizeof(T), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        if (memory == MAP_FAILED) std::abort();
        object_ = new (memory) T{};
    }
    SharedMemory(const SharedMemory&) = delete;
    SharedMemory& operator=(const SharedMemory&) = delete;
    ~SharedMemory() { ::munmap(object_, sizeof(T)); }

    T& operator*() const { return *object_; }
    T* operator->() const { return object_; }

  private:
    T* object_ = nullptr;
};

#endif
