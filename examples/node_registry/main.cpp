// Answers requests about nodes, line by line: see --help.
#include <syslog.h>

#include <csignal>
#include <cstdlib>
#include <iostream>
#include <string>
#include <system_error>

#include "handler.h"
#include "json_line.h"
#include "line_io.h"
#include "options.h"
#include "pretty.h"

namespace {

using NodeRegistry::DescribeReply;
using NodeRegistry::DescribeRequest;
using NodeRegistry::Handler;
using NodeRegistry::LineReader;
using NodeRegistry::Options;
using NodeRegistry::ToLine;
using NodeRegistry::WriteText;

constexpr int ExitUsage = 2;

int Complain(const std::string& what, int error)
{
    std::cerr << "node_registry: " << what << ": " << std::generic_category().message(error)
              << '\n';
    return EXIT_FAILURE;
}

int Print(const std::string& text)
{
    const int error = WriteText(text);
    return error == 0 ? EXIT_SUCCESS : Complain("standard output", error);
}

int Serve(const Options& options)
{
    LineReader reader(options.input);
    Handler handler(options.settings);
    std::string line;
    while (reader.Read(line)) {
        if (options.isPretty && Print(DescribeRequest(line) + "\n") != EXIT_SUCCESS) {
            return EXIT_FAILURE;
        }
        const Json::Value reply = handler.Answer(line);
        const std::string text = options.isPretty ? DescribeReply(reply) : ToLine(reply);
        if (Print(text + "\n") != EXIT_SUCCESS) return EXIT_FAILURE;
    }
    return reader.GetErrno() == 0 ? EXIT_SUCCESS : Complain(options.input, reader.GetErrno());
}

}  // namespace

int main(int argc, char** argv)
{
    Options options;
    if (!NodeRegistry::ReadOptions(argc, argv, options)) {
        std::cerr << NodeRegistry::UsageText;
        return ExitUsage;
    }
    // A reader that has gone makes a write fail; it must not end the program by a signal.
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    if (!options.help.empty()) return Print(options.help);
    ::openlog("node_registry", LOG_PID | (options.isVerbose ? LOG_PERROR : 0), LOG_USER);
    return Serve(options);
}
