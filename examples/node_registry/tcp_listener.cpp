// tcp_listener PORT: plays a reachable node in the demo. Listens on 127.0.0.1, prints that it does, and
// accepts connections until its standard input ends, because the process at the other end of the pipe
// is gone.
#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

int main(int argc, char** argv)
{
    const long port = argc == 2 ? std::strtol(argv[1], nullptr, 10) : 0;
    const int listener = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int reuse = 1;
    ::setsockopt(listener, SOL_SOCKET, SO_REUSEADDR, &reuse, sizeof reuse);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (port < 1 || port > 65535 ||
        ::bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        ::listen(listener, SOMAXCONN) != 0) {
        std::perror("tcp_listener");
        return EXIT_FAILURE;
    }
    std::printf("listening on 127.0.0.1:%ld\n", port);
    static_cast<void>(std::fflush(stdout));

    std::array<pollfd, 2> waiting{pollfd{STDIN_FILENO, POLLIN, 0}, pollfd{listener, POLLIN, 0}};
    while (::poll(waiting.data(), waiting.size(), -1) > 0 && waiting[0].revents == 0) {
        ::close(::accept(listener, nullptr, nullptr));
    }
    return EXIT_SUCCESS;
}
