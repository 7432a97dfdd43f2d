#include "support/fakes/log_sink.h"

#include <syslog.h>

#include <array>
#include <cstdio>

namespace {

LogSink current = DropLine;

}  // namespace

void SendLogTo(LogSink sink)
{
    current = sink;
}

void DropLine(int /*priority*/, const char* format, std::va_list arguments)
{
    constexpr std::size_t LineSize = 8192;
    static std::array<char, LineSize> line;
    (void)std::vsnprintf(line.data(), line.size(), format, arguments);
}

// Plain builds call syslog, optimised ones __syslog_chk.
extern "C" void syslog(int priority, const char* format, ...)
{
    std::va_list arguments;
    va_start(arguments, format);
    current(priority, format, arguments);
    va_end(arguments);
}

// NOLINTNEXTLINE(bugprone-reserved-identifier)
extern "C" void __syslog_chk(int priority, int flag, const char* format, ...);
// NOLINTNEXTLINE(bugprone-reserved-identifier)
extern "C" void __syslog_chk(int priority, int /*flag*/, const char* format, ...)
{
    std::va_list arguments;
    va_start(arguments, format);
    current(priority, format, arguments);
    va_end(arguments);
}
