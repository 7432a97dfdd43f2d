// Log lines, names of error codes, and programs that the library starts.
#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cctype>
#include <cstdio>
#include <filesystem>

#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/sqlite_value.h>
#include <orvadrcore/utils.h>

#include "support/bench.h"
#include "support/by_hand.h"

namespace Bench {

namespace {

// What an action logs, with N for each number, because process ids and line numbers differ.
template <class Action>
std::string LinesOf(Action action)
{
    const int fd = ::memfd_create("log", MFD_CLOEXEC);
    const int screen = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3);
    ::dup2(fd, STDERR_FILENO);
    ::openlog("bench", LOG_PERROR, LOG_USER);
    action();
    ::closelog();
    ::openlog("bench", 0, LOG_USER);
    ::dup2(screen, STDERR_FILENO);
    ::close(screen);
    const std::string text = ReadFile("/proc/self/fd/" + std::to_string(fd));
    ::close(fd);
    std::string lines;
    for (const char one : text) {
        const bool digit = std::isdigit(static_cast<unsigned char>(one)) != 0;
        if (!digit) lines += one;
        if (digit && (lines.empty() || lines.back() != 'N')) lines += 'N';
    }
    return lines;
}

// One line at ERR, which reaches the system logger if there is one.
struct OurLine {
    void Run() { path = OrvaDRCore::FileLock::getLockFilePath(""); }
    std::string Result()
    {
        return LinesOf([this] { Run(); });
    }

    std::string path;
};

// The line is formatted in advance.
struct BareLine {
    void Run() { ::syslog(LOG_ERR, "%s", line.c_str()); }
    std::string Result()
    {
        return LinesOf([this] { Run(); });
    }

    std::string line = "file_lock.cpp:33(getLockFilePath)[ERR][" + std::to_string(::getpid()) +
                       "]: Bad lock file[]";
};

struct ContractLine {
    void Run() const
    {
        ::syslog(LOG_ERR, "%s:%d(%s)[%s][%d]: Bad lock file[%s]", "file_lock.cpp", 33,
                 "getLockFilePath", "ERR", ::getpid(), name.c_str());
    }
    std::string Result()
    {
        return LinesOf([this] { Run(); });
    }

    std::string name;
};

// A line at DEBUG in a program that masks that level. No other threads are running.
// NOLINTBEGIN(concurrency-mt-unsafe)
struct Masked {
    Masked() : before(::setlogmask(LOG_UPTO(LOG_INFO))) {}
    Masked(const Masked&) = delete;
    Masked& operator=(const Masked&) = delete;
    ~Masked() { ::setlogmask(before); }
    static std::string Result() { return "nothing"; }

    int before;
};
// NOLINTEND(concurrency-mt-unsafe)

struct OurMasked : Masked {
    void Run() { record.GetValue(field, number); }

    OrvaDRCore::SqliteValueList record;
    std::string field = "missing";
    int number = 0;
};

struct BareMasked : Masked {
    void Run() const { ::syslog(LOG_DEBUG, "%s", line.c_str()); }

    std::string line = "field [missing] is not existed";
};

struct ErrorName {
    std::string Result() const { return name; }

    int code = OrvaDRCore::ERR::ERR_NODE_NOT_EXIST;
    std::string name;
};

struct OurName : ErrorName {
    void Run()
    {
        benchmark::DoNotOptimize(code);
        name = OrvaDRCore::ERR::ToString(code);
    }
};

// A table with the names that the item needs.
struct BareName : ErrorName {
    void Run()
    {
        static constexpr std::array<const char*, 10> Names{
            "ERR_CONNECTION_FAILED",
            "ERR_LOGIN_AUTH_INVALID",
            "ERR_LOGIN_AUTH_DISABLED",
            "ERR_LOGIN_AUTH_PRIVILEGE",
            "ERR_LOGIN_AUTH_REQUIRED_OTP",
            "ERR_LOGIN_AUTH_INVALID_OTP",
            "ERR_INIT_CREDENTIAL",
            "ERR_NODE_NOT_EXIST",
            "ERR_NODE_EXIST",
            "ERR_NODE_INVALID_REMOTE_SESSION_CREATE"};
        benchmark::DoNotOptimize(code);
        const auto index = static_cast<std::size_t>(code - 500);
        name = std::string(index < Names.size() ? Names[index] : "<UNKNOWN ERR CODE>");
    }
};

// Starts a program and waits for it. Redirects its output to the descriptor, unless that is -1.
void Spawn(std::vector<std::string> arguments, int output)
{
    std::vector<char*> pointers;
    pointers.reserve(arguments.size() + 1);
    for (std::string& argument : arguments) pointers.push_back(argument.data());
    pointers.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    Require(::posix_spawn_file_actions_init(&actions) == 0, "no file actions");
    if (output >= 0) ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
    pid_t pid = -1;
    const int error = ::posix_spawn(&pid, pointers[0], &actions, nullptr, pointers.data(), environ);
    ::posix_spawn_file_actions_destroy(&actions);
    Require(error == 0, "cannot start a program");
    int status = 0;
    Require(::waitpid(pid, &status, 0) == pid && status == 0, "a program failed");
}

// UUIDs differ, so only their form can be compared.
struct Uuid {
    std::string Result() const
    {
        std::string form;
        for (const char one : uuid)
            form += std::isxdigit(static_cast<unsigned char>(one)) ? 'x' : one;
        return form;
    }

    std::string uuid;
};

struct OurUuid : Uuid {
    void Run() { uuid = OrvaDRCore::GenerateUUID(); }
};

struct BareUuid : Uuid {
    void Run()
    {
        std::array<int, 2> pipe{};
        Require(::pipe2(pipe.data(), O_CLOEXEC) == 0, "no pipe");
        Spawn({"/usr/bin/uuidgen"}, pipe[1]);
        std::array<char, 64> text{};
        const ssize_t count = ::read(pipe[0], text.data(), text.size());
        ::close(pipe[0]);
        ::close(pipe[1]);
        Require(count > 1, "no output");
        uuid.assign(text.data(), static_cast<std::size_t>(count) - 1);
    }
};

struct PopenUuid : Uuid {
    void Run()
    {
        std::FILE* output = ::popen("/usr/bin/uuidgen", "re");  // NOLINT(cert-env33-c)
        Require(output != nullptr, "cannot start a program");
        std::array<char, 64> text{};
        const bool got = std::fgets(text.data(), text.size(), output) != nullptr;
        ::pclose(output);
        Require(got, "no output");
        uuid = text.data();
        uuid.pop_back();
    }
};

// Each run first removes the directory: one system call more for all contestants.
struct NewDir {
    std::string Result() const
    {
        struct stat status {};
        Require(::stat(path.c_str(), &status) == 0, "no directory");
        return std::to_string(status.st_mode);
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("new");
};

struct OurDir : NewDir {
    void Run()
    {
        ::rmdir(path.c_str());
        Require(OrvaDRCore::File::CreateDir(path, 0755), "no directory");
    }
};

struct BareDir : NewDir {
    void Run()
    {
        ::rmdir(path.c_str());
        Spawn({"/bin/mkdir", "-p", path, "-m", "755"}, -1);
    }
};

struct LibraryDir : NewDir {
    void Run()
    {
        ::rmdir(path.c_str());
        std::filesystem::create_directories(path);
    }
};

}  // namespace

void AddMisc()
{
    constexpr double OfSyslog = 1.25;
    constexpr double OfSpawn = 1.1;
    Add<OurLine>("log line", Ours);
    Add<BareLine>("log line", Bare);
    Add<ContractLine>("log line", Contract);
    Aim({Bare}, OfSyslog);
    Add<OurMasked>("log line, masked", Ours);
    Add<BareMasked>("log line, masked", Bare);
    Add<OurName>("name of an error code", Ours);
    Add<BareName>("name of an error code", Bare);
    Add<OurUuid>("new UUID", Ours);
    Add<BareUuid>("new UUID", Bare);
    Add<PopenUuid>("new UUID", "popen");
    Aim({Bare}, OfSpawn);
    Add<OurDir>("new directory", Ours);
    Add<BareDir>("new directory", Bare);
    Add<LibraryDir>("new directory", "std::filesystem");
    Aim({Bare}, OfSpawn);
}

}  // namespace Bench
