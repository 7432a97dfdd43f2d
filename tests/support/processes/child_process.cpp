#include "support/processes/child_process.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <utility>

#include "base/errno.h"
#include "support/processes/reap.h"

using OrvaDRCore::RetryOnEintr;

namespace {

// Far longer than any test has to wait: it only ends what hangs.
constexpr int DeadlineMSec = 60'000;

}  // namespace

void ChildProcess::Link::Tell() const
{
    const char byte = 0;
    (void)RetryOnEintr([&] { return ::write(out_, &byte, 1); });
}

bool ChildProcess::Link::Await() const
{
    pollfd waiting{in_, POLLIN, 0};
    if (::poll(&waiting, 1, DeadlineMSec) <= 0) return false;
    char byte = 0;
    return ::read(in_, &byte, 1) == 1;
}

void ChildProcess::Link::Close()
{
    if (in_ >= 0) ::close(in_);
    if (out_ >= 0) ::close(out_);
    in_ = out_ = -1;
}

ChildProcess::ChildProcess(const std::function<void(Link&)>& body)
{
    std::array<int, 2> toChild{};
    std::array<int, 2> fromChild{};
    if (::pipe2(toChild.data(), O_CLOEXEC) < 0 || ::pipe2(fromChild.data(), O_CLOEXEC) < 0) {
        std::abort();
    }
    pid_ = ::fork();
    if (pid_ < 0) std::abort();
    if (pid_ == 0) {
        ::close(toChild[1]);
        ::close(fromChild[0]);
        (void)::signal(SIGPIPE, SIG_IGN);
        ::alarm(DeadlineMSec / 1000);
        Link ours(toChild[0], fromChild[1]);
        try {
            body(ours);
        } catch (...) {
            ::_exit(1);
        }
        ::_exit(0);
    }
    ::close(toChild[0]);
    ::close(fromChild[1]);
    link_ = Link(fromChild[0], toChild[1]);
}

ChildProcess::~ChildProcess()
{
    if (pid_ > 0) {
        Kill(SIGKILL);
        Join();
    }
    link_.Close();
}

void ChildProcess::Kill(int signal) const
{
    ::kill(pid_, signal);
}

int ChildProcess::Join()
{
    return Reap(std::exchange(pid_, -1));
}
