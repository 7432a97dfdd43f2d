// The one log line of the library:
//
//     sqlite_db.cpp:81(Exec)[ERR][4242]: DB[/var/dr/nodes.db] is not opened
//
// DR_LOG(Err, "DB[%s] is not opened", path) writes it with one syslog call. Ident, facility and mask
// are those of the calling program. The message must be a literal, which the compiler checks against
// its arguments. "%m" is the caller's errno, which DR_LOG does not change.
#ifndef ORVADRCORE_SRC_BASE_LOG_H
#define ORVADRCORE_SRC_BASE_LOG_H

#include <syslog.h>
#include <unistd.h>

#include "base/errno.h"

namespace OrvaDRCore::Log {

struct Level {
    int priority;
    const char* word;
};

inline constexpr Level Err{LOG_ERR, "ERR"};
inline constexpr Level Warn{LOG_WARNING, "WARN"};
inline constexpr Level Notice{LOG_NOTICE, "NOTICE"};
inline constexpr Level Info{LOG_INFO, "INFO"};
inline constexpr Level Debug{LOG_DEBUG, "DEBUG"};

struct Site {
    const char* file;
    int line;
    const char* function;
};

constexpr const char* BaseName(const char* path)
{
    const char* name = path;
    for (const char* at = path; *at != '\0'; ++at) {
        if (*at == '/') name = at + 1;
    }
    return name;
}

// Never called: lets the compiler check a message against its arguments.
[[gnu::format(printf, 1, 2)]] inline void CheckFormat(const char* /*message*/, ...) {}

template <class... Args>
void Write(const Level& level, const Site& site, const char* format, Args... args)
{
    const PreserveErrno preserve;
    ::syslog(level.priority, format, site.file, site.line, site.function, level.word, ::getpid(),
             args...);
}

}  // namespace OrvaDRCore::Log

// The file that lines name. A source with a part of another one's operations defines it before it
// includes this header, because the lines of one public header all name the same file.
#ifndef DR_LOG_FILE
#define DR_LOG_FILE __FILE__
#endif

#define DR_LOG(level, ...) DR_LOG_AS(__func__, level, __VA_ARGS__)

// Writes the line under the name of another function. (__extension__ allows "%m", which is not ISO.)
#define DR_LOG_AS(function, level, ...)                                                       \
    __extension__(false ? ::OrvaDRCore::Log::CheckFormat(__VA_ARGS__)                         \
                        : ::OrvaDRCore::Log::Write(                                           \
                              ::OrvaDRCore::Log::level,                                       \
                              {::OrvaDRCore::Log::BaseName(DR_LOG_FILE), __LINE__, function}, \
                              "%s:%d(%s)[%s][%d]: " __VA_ARGS__))

#endif
