#include "child_process.h"

#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <charconv>
#include <csignal>
#include <filesystem>
#include <string>
#include <system_error>
#include <vector>

namespace NodeRegistry {

namespace {

std::vector<int> OpenDescriptors()
{
    std::vector<int> descriptors;
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd", ignored)) {
        const std::string name = entry.path().filename();
        int descriptor = -1;
        std::from_chars(name.data(), name.data() + name.size(), descriptor);
        descriptors.push_back(descriptor);
    }
    return descriptors;
}

// The log's socket is not TCP, so it stays open for syslog().
bool IsTcp(int descriptor)
{
    int protocol = 0;
    socklen_t size = sizeof protocol;
    return ::getsockopt(descriptor, SOL_SOCKET, SO_PROTOCOL, &protocol, &size) == 0 &&
           protocol == IPPROTO_TCP;
}

}  // namespace

void LeaveServer()
{
    for (const int descriptor : OpenDescriptors()) {
        if (IsTcp(descriptor)) ::close(descriptor);
    }
    sigset_t none;
    ::sigemptyset(&none);
    ::pthread_sigmask(SIG_SETMASK, &none, nullptr);
}

}  // namespace NodeRegistry
