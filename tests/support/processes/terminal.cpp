#include "support/processes/terminal.h"

#include <poll.h>
#include <pty.h>
#include <signal.h>
#include <unistd.h>

#include <array>
#include <cstdlib>

#include "support/processes/reap.h"

namespace {

constexpr int DeadlineMSec = 100'000;  // for each piece of output

[[noreturn]] void Become(const std::vector<std::string>& arguments,
                         const std::vector<std::string>& environment)
{
    ::setenv("TERM", "xterm", 1);
    ::unsetenv("NO_COLOR");
    for (const std::string& variable : environment) {
        ::putenv(const_cast<char*>(variable.c_str()));
    }
    std::vector<char*> words;
    words.reserve(arguments.size() + 1);
    for (const std::string& argument : arguments) {
        words.push_back(const_cast<char*>(argument.c_str()));
    }
    words.push_back(nullptr);
    ::execv(words[0], words.data());
    ::_exit(127);
}

std::string WithoutCarriageReturns(const std::string& text)
{
    std::string result;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const bool endsLine = text[at] == '\r' && at + 1 < text.size() && text[at + 1] == '\n';
        if (!endsLine) result += text[at];
    }
    return result;
}

}  // namespace

ProgramResult RunInTerminal(const std::vector<std::string>& arguments, unsigned short columns,
                            const std::vector<std::string>& environment,
                            const std::function<std::string(const std::string&)>& onOutput)
{
    winsize size{};
    size.ws_col = columns;
    size.ws_row = 25;
    int terminal = -1;
    const pid_t pid = ::forkpty(&terminal, nullptr, nullptr, &size);
    if (pid < 0) std::abort();
    if (pid == 0) Become(arguments, environment);

    std::string text;
    while (true) {
        pollfd output{terminal, POLLIN, 0};
        std::array<char, 4096> piece{};
        if (::poll(&output, 1, DeadlineMSec) <= 0) {
            ::kill(pid, SIGKILL);
            break;
        }
        const ssize_t count = ::read(terminal, piece.data(), piece.size());
        if (count <= 0) break;  // EIO: the program has ended
        text.append(piece.data(), static_cast<std::size_t>(count));
        const std::string typed = onOutput ? onOutput(text) : std::string();
        if (!typed.empty() && ::write(terminal, typed.data(), typed.size()) < 0) break;
    }
    ::close(terminal);
    return {Reap(pid), WithoutCarriageReturns(text), ""};
}
