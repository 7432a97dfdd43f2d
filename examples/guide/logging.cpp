// Makes the library log, also to standard error, and splits the lines into their parts.
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <map>
#include <string>

#include <json/value.h>

#include <orvadrcore/file.h>

using OrvaDRCore::File;

namespace {

// [apart]
// Removes the text before `mark`, and the mark, from the line; returns the text.
std::string Take(std::string& line, const std::string& mark)
{
    const std::size_t at = std::min(line.find(mark), line.size());
    std::string part = line.substr(0, at);
    line.erase(0, at + mark.size());
    return part;
}

// Of "guide: file.cpp:60(Write)[ERR][4242]: Empty path to write."
void PrintParts(std::string line)
{
    Take(line, ": ");  // added by syslog
    const std::string file = Take(line, ":");
    const std::string number = Take(line, "(");
    const std::string function = Take(line, ")[");
    const std::string level = Take(line, "][");
    const std::string process = Take(line, "]: ");
    const bool isMine = process == std::to_string(::getpid());
    std::cout << file << ' ' << function << ' ' << level << (isMine ? " mine: " : " other: ")
              << line << '\n';
}
// [/apart]

}  // namespace

int main()
{
    // Redirects standard error to a file, which is read below.
    if (std::freopen("lines.txt", "w", stderr) == nullptr) return EXIT_FAILURE;

    // [setup]
    ::openlog("guide", LOG_PERROR, LOG_DAEMON);  // a daemon would use LOG_PID
    // [/setup]

    File::Write("", Json::Value());
    File::CreateDir("state", 01777);
    std::ofstream("limits.conf") << "timeout 30\n";
    std::map<std::string, int> limits;
    File::Read("limits.conf", limits);

    std::ifstream lines("lines.txt");
    for (std::string line; std::getline(lines, line);) PrintParts(line);
    return EXIT_SUCCESS;
}
