// errno around system calls: kept where a cleanup would change it, and calls repeated that a signal
// has interrupted.
#ifndef ORVADRCORE_SRC_BASE_ERRNO_H
#define ORVADRCORE_SRC_BASE_ERRNO_H

#include <cerrno>

namespace OrvaDRCore {

// Gives errno back, at the end of the scope, the value that it had at the beginning.
class PreserveErrno {
  public:
    PreserveErrno() = default;
    PreserveErrno(const PreserveErrno&) = delete;
    PreserveErrno& operator=(const PreserveErrno&) = delete;
    ~PreserveErrno() { errno = error_; }

  private:
    const int error_ = errno;
};

// Makes a system call, which fails with -1, until no signal interrupts it. Returns its result.
template <class Call>
auto RetryOnEintr(Call call)
{
    auto result = call();
    while (result == -1 && errno == EINTR) result = call();
    return result;
}

}  // namespace OrvaDRCore

#endif
