// Pretends to run on an older kernel, by a filter that refuses system calls. The filter cannot be
// removed again: use it in child processes.
#ifndef ORVADRCORE_TESTS_OLD_KERNEL_H
#define ORVADRCORE_TESTS_OLD_KERNEL_H

#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <array>
#include <cerrno>
#include <cstddef>

// From now on the calls with the numbers `first` to `last` fail with `error`, in this process and
// its children. False where the system does not allow filters.
inline bool RefuseCalls(unsigned int first, unsigned int last, unsigned int error)
{
    std::array<sock_filter, 5> filter{{
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JGE | BPF_K, first, 0, 1),
        BPF_JUMP(BPF_JMP | BPF_JGT | BPF_K, last, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | error),
    }};
    const sock_fprog program{filter.size(), filter.data()};
    return ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           ::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

struct OldKernel {
    const char* name;
    bool (*pretend)();
};

constexpr std::array<OldKernel, 2> OldKernels{{
    // Calls are numbered in the order in which they were added. bpf() came with Linux 3.18.
    {"Linux 3.17", [] { return RefuseCalls(SYS_bpf, 0xffff, ENOSYS); }},
    {"a container that refuses calls it does not know",
     [] { return RefuseCalls(SYS_close_range, SYS_close_range, EPERM); }},
}};

#endif
