// Takes the place of syslog. Each line goes to a function that a test sets; without one it is
// formatted, so that the sanitizers check its arguments, and dropped.
#ifndef ORVADRCORE_TESTS_LOG_SINK_H
#define ORVADRCORE_TESTS_LOG_SINK_H

#include <cstdarg>

using LogSink = void (*)(int priority, const char* format, std::va_list arguments);

// From now on lines go to `sink`.
void SendLogTo(LogSink sink);

// Formats a line and drops it, without allocating.
void DropLine(int priority, const char* format, std::va_list arguments);

#endif
