// Answers requests about nodes over HTTP: see --help and README.md.
#include <pthread.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <iostream>
#include <string>
#include <system_error>
#include <thread>

#include "options.h"
#include "server.h"

namespace {

using NodeService::Address;
using NodeService::Options;
using NodeService::Server;

constexpr int ExitUsage = 2;

std::string ToText(const Address& address, int port)
{
    const bool isIpv6 = address.host.find(':') != std::string::npos;
    return (isIpv6 ? "[" + address.host + "]" : address.host) + ":" + std::to_string(port);
}

// The signals that end the service, blocked in every thread. The main thread waits for them.
sigset_t BlockEndSignals()
{
    sigset_t signals;
    ::sigemptyset(&signals);
    ::sigaddset(&signals, SIGTERM);
    ::sigaddset(&signals, SIGINT);
    ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    return signals;
}

bool Print(const std::string& text)
{
    std::cout << text << std::flush;
    if (std::cout.good()) return true;
    std::cerr << "node_service: standard output cannot be written\n";
    return false;
}

int Serve(const Options& options)
{
    const sigset_t endSignals = BlockEndSignals();
    Server server(options);
    if (!server.Bind()) {
        const std::string why =
            errno != 0 ? std::generic_category().message(errno) : "no such address";
        std::cerr << "node_service: cannot listen on "
                  << ToText(options.address, options.address.port) << ": " << why << '\n';
        return EXIT_FAILURE;
    }
    if (!Print("listening on " + ToText(options.address, server.GetPort()) + "\n")) {
        return EXIT_FAILURE;
    }
    bool wasStopped = false;
    std::thread accepting([&] {
        wasStopped = server.Run();
        ::kill(::getpid(), SIGTERM);  // wakes the main thread when accepting has failed
    });
    int signal = 0;
    ::sigwait(&endSignals, &signal);
    server.Stop();
    accepting.join();
    if (!wasStopped) std::cerr << "node_service: cannot accept connections any more\n";
    return wasStopped ? EXIT_SUCCESS : EXIT_FAILURE;
}

}  // namespace

int main(int argc, char** argv)
{
    Options options;
    if (!NodeService::ReadOptions(argc, argv, options)) {
        std::cerr << NodeService::UsageText;
        return ExitUsage;
    }
    // A client that has gone makes a write fail; it must not end the service by a signal.
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    if (!options.help.empty()) return Print(options.help) ? EXIT_SUCCESS : EXIT_FAILURE;
    ::openlog("node_service", LOG_PID | (options.isVerbose ? LOG_PERROR : 0), LOG_DAEMON);
    return Serve(options);
}
