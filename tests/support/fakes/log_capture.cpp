#include "support/fakes/log_capture.h"

#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <utility>

namespace {

std::vector<LogRecord> records;

void Capture(int priority, const char* format, va_list arguments)
{
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, arguments);
    std::string text(static_cast<std::size_t>(length) + 1, '\0');
    (void)std::vsnprintf(text.data(), text.size(), format, again);
    va_end(again);
    text.pop_back();
    records.push_back({priority, std::move(text)});
}

// "file:12(Function)[ERR][34]: message" with the number taken out, which must be one.
std::string WithoutLineNumber(const std::string& text)
{
    const std::size_t colon = text.find(':');
    const std::size_t bracket = text.find('(');
    if (colon == std::string::npos || bracket == std::string::npos || bracket <= colon + 1) {
        return "no line number in: " + text;
    }
    const std::string number = text.substr(colon + 1, bracket - colon - 1);
    if (number.find_first_not_of("0123456789") != std::string::npos || number[0] == '0') {
        return "no line number in: " + text;
    }
    return text.substr(0, colon) + text.substr(bracket);
}

}  // namespace

// What the library calls: the first in plain builds, the second in optimised ones.
extern "C" void syslog(int priority, const char* format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    Capture(priority, format, arguments);
    va_end(arguments);
}

// NOLINTNEXTLINE(bugprone-reserved-identifier)
extern "C" void __syslog_chk(int priority, int flag, const char* format, ...);
// NOLINTNEXTLINE(bugprone-reserved-identifier)
extern "C" void __syslog_chk(int priority, int /*flag*/, const char* format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    Capture(priority, format, arguments);
    va_end(arguments);
}

LogLine LogLine::In(const std::string& source) const
{
    LogLine line = *this;
    line.file = source;
    return line;
}

LogLine Err(const std::string& function, const std::string& message)
{
    return {3, "ERR", function, message, ""};
}

LogLine Warn(const std::string& function, const std::string& message)
{
    return {4, "WARN", function, message, ""};
}

LogLine Notice(const std::string& function, const std::string& message)
{
    return {5, "NOTICE", function, message, ""};
}

LogLine Info(const std::string& function, const std::string& message)
{
    return {6, "INFO", function, message, ""};
}

LogLine Debug(const std::string& function, const std::string& message)
{
    return {7, "DEBUG", function, message, ""};
}

LoggedTest::LoggedTest(const std::string& sourceFile) : file(sourceFile)
{
    records.clear();
}

void LoggedTest::TearDown()
{
    for (const LogRecord& record : TakeLines()) {
        ADD_FAILURE() << "unexpected log line, priority " << record.priority << ": " << record.text;
    }
}

void LoggedTest::ExpectLines(const std::vector<LogLine>& expected)
{
    std::vector<std::string> wanted;
    wanted.reserve(expected.size());
    for (const LogLine& line : expected) {
        wanted.push_back(std::to_string(line.priority) + " " +
                         (line.file.empty() ? file : line.file) + "(" + line.function + ")[" +
                         line.word + "][" + std::to_string(::getpid()) + "]: " + line.message);
    }
    std::vector<std::string> written;
    for (const LogRecord& record : TakeLines()) {
        written.push_back(std::to_string(record.priority) + " " + WithoutLineNumber(record.text));
    }
    EXPECT_EQ(written, wanted);
}

std::vector<LogRecord> LoggedTest::TakeLines()
{
    return std::exchange(records, {});
}
