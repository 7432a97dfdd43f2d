#include "test_files.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace {

struct stat StatusOf(const std::string& path)
{
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0) << path << " gives errno " << errno;
    return status;
}

}  // namespace

void WriteFile(const std::string& path, const std::string& content)
{
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file.write(content.data(), static_cast<std::streamsize>(content.size()));
    file.close();
    EXPECT_TRUE(file) << path << " cannot be written";
}

std::string ReadFile(const std::string& path)
{
    std::ifstream file(path, std::ios::binary);
    if (!file) return "(cannot be read)";
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}

mode_t ModeOf(const std::string& path)
{
    return StatusOf(path).st_mode & 07777;
}

ino_t InodeOf(const std::string& path)
{
    return StatusOf(path).st_ino;
}

void SetModifyTime(const std::string& path, std::time_t seconds, long nanoseconds)
{
    const std::array<timespec, 2> times{timespec{0, UTIME_OMIT}, timespec{seconds, nanoseconds}};
    EXPECT_EQ(::utimensat(AT_FDCWD, path.c_str(), times.data(), 0), 0) << path;
}

std::set<std::string> NamesIn(const std::string& dir)
{
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(dir)) {
        names.insert(entry.path().filename().string());
    }
    return names;
}

std::string TenMegabytes()
{
    std::string text;
    text.resize(10'000'000, 'x');
    return text;
}

int OpenFile(const std::string& path, int flags)
{
    const int fd = ::open(path.c_str(), flags | O_CLOEXEC, 0644);
    EXPECT_GE(fd, 0) << path << " gives errno " << errno;
    return fd;
}

bool IsDescriptorOpen(int fd)
{
    return ::fcntl(fd, F_GETFD) >= 0;
}

std::size_t CountDescriptors()
{
    return NamesIn("/proc/self/fd").size() - 1;  // less the one that reads the directory
}

bool IsLocked(const std::string& path)
{
    const int fd = OpenFile(path, O_RDONLY);
    const bool taken = ::flock(fd, LOCK_EX | LOCK_NB) == 0;
    ::close(fd);
    return !taken;
}

Umask::Umask(mode_t mask) : before(::umask(mask)) {}

Umask::~Umask()
{
    ::umask(before);
}
