// errno around system calls: keep it during cleanup, repeat calls that a signal interrupts.
#ifndef ORVADRCORE_SRC_BASE_ERRNO_H
#define ORVADRCORE_SRC_BASE_ERRNO_H

#include <cerrno>

namespace OrvaDRCore {

// At the end of the scope, sets errno back to the value that it had at the beginning.
class PreserveErrno {
  public:
    PreserveErrno() = default;
    PreserveErrno(const PreserveErrno&) = delete;
    PreserveErrno& operator=(const PreserveErrno&) = delete;
    ~PreserveErrno() { errno = error_; }

  private:
    const int error_ = errno;
};

// Repeats a system call, one that fails with -1, as long as signals interrupt it.
template <class Call>
auto RetryOnEintr(Call call)
{
    auto result = call();
    while (result == -1 && errno == EINTR) result = call();
    return result;
}

}  // namespace OrvaDRCore

#endif
