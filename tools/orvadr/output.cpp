#include "output.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <string_view>
#include <utility>

#include <json/writer.h>

#include "base/file_io.h"
#include "text.h"

namespace Orvadr {

namespace {

bool IsSet(const char* variable)
{
    const char* const value = std::getenv(variable);  // NOLINT(concurrency-mt-unsafe)
    return value != nullptr && *value != '\0';
}

bool IsDumbTerminal()
{
    const char* const terminal = std::getenv("TERM");  // NOLINT(concurrency-mt-unsafe)
    return terminal == nullptr || std::string_view(terminal) == "dumb";
}

Screen ScreenOfOutput()
{
    Screen screen;
    if (::isatty(STDOUT_FILENO) == 0) return screen;
    winsize size{};
    if (::ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0) screen.columns = size.ws_col;
    screen.hasColour = !IsSet("NO_COLOR") && !IsDumbTerminal();
    return screen;
}

// An array with an object on each line: short, and easy to read and to compare by line.
std::string ToJsonLines(const Json::Value& objects)
{
    Json::StreamWriterBuilder builder;
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    builder["indentation"] = "";
    const std::unique_ptr<Json::StreamWriter> writer(builder.newStreamWriter());
    std::ostringstream text;
    text.exceptions(std::ios::badbit);
    const char* separator = "[";
    for (const Json::Value& object : objects) {
        text << std::exchange(separator, ",\n ");
        writer->write(ToUtf8(object), &text);
    }
    text << (objects.empty() ? "[]\n" : "]\n");
    return text.str();
}

}  // namespace

ExitCode Print(const Report& report, Style style)
{
    const std::string text = style == Style::Json
                                 ? ToJsonLines(report.objects)
                                 : FormatTable(report.columns, report.objects, ScreenOfOutput());
    const bool isWritten = OrvaDRCore::WriteAll(STDOUT_FILENO, text);
    const int error = errno;
    for (const std::string& remark : report.remarks) {
        (void)std::fprintf(stderr, "orvadr: %s\n", remark.c_str());
    }
    if (isWritten) return report.code;
    (void)std::fprintf(stderr, "orvadr: cannot write to standard output: %s\n",
                       ErrorText(error).c_str());
    return ExitCode::NotSeen;
}

}  // namespace Orvadr
