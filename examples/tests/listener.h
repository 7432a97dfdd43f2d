// Listening ports on 127.0.0.1.
#ifndef ORVADRCORE_TESTS_LISTENER_H
#define ORVADRCORE_TESTS_LISTENER_H

#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <vector>

// Accepts connections on a free port.
class Listener {
  public:
    explicit Listener(int backlog = SOMAXCONN)
        : fd_(::socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0))
    {
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address;
        auto* any = reinterpret_cast<sockaddr*>(&address);
        if (::bind(fd_, any, size) != 0 || ::listen(fd_, backlog) != 0 ||
            ::getsockname(fd_, any, &size) != 0) {
            std::abort();
        }
    }
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;
    ~Listener() { ::close(fd_); }

    int Port() const { return ntohs(address.sin_port); }

    // How many connections there have been.
    int Count()
    {
        for (int taken = Accept(); taken >= 0; taken = Accept()) {
            ::close(taken);
            ++count_;
        }
        return count_;
    }

  protected:
    sockaddr_in address{};

  private:
    int Accept() const { return ::accept(fd_, nullptr, nullptr); }

    int fd_;
    int count_ = 0;
};

// A port that neither accepts nor refuses connections, because its queue is full.
class SilentListener : public Listener {
  public:
    SilentListener() : Listener(0)
    {
        constexpr int SettleMSec = 200;
        bool isTaken = true;
        while (isTaken) {
            callers_.push_back(::socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
            (void)::connect(callers_.back(), reinterpret_cast<sockaddr*>(&address), sizeof address);
            pollfd waiting{callers_.back(), POLLOUT, 0};
            isTaken = ::poll(&waiting, 1, SettleMSec) == 1;
        }
    }
    SilentListener(const SilentListener&) = delete;
    SilentListener& operator=(const SilentListener&) = delete;
    ~SilentListener()
    {
        for (const int caller : callers_) ::close(caller);
    }

  private:
    std::vector<int> callers_;
};

#endif
