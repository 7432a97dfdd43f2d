// Files as a test makes and looks at them, past the code that it tests.
#ifndef ORVADRCORE_TESTS_TEST_FILES_H
#define ORVADRCORE_TESTS_TEST_FILES_H

#include <sys/types.h>

#include <cstddef>
#include <ctime>
#include <set>
#include <string>

// Writes a file; one that is there is emptied first and keeps its permission bits.
void WriteFile(const std::string& path, const std::string& content);

// The content of a file; "(cannot be read)" where there is none to read.
std::string ReadFile(const std::string& path);

// The permission bits, and the number, of what a path names; links are followed.
mode_t ModeOf(const std::string& path);
ino_t InodeOf(const std::string& path);

// Sets a file's modification time.
void SetModifyTime(const std::string& path, std::time_t seconds, long nanoseconds = 0);

// The names in a directory.
std::set<std::string> NamesIn(const std::string& dir);

// A text whose zero bytes count, from a literal.
template <std::size_t Size>
std::string Bytes(const char (&literal)[Size])
{
    return {literal, Size - 1};
}

// A text of one line.
std::string TenMegabytes();

// Opens a file; the test fails where that cannot be done. The caller closes it.
int OpenFile(const std::string& path, int flags);

bool IsDescriptorOpen(int fd);

// How many descriptors the process has open.
std::size_t CountDescriptors();

// Whether somebody holds a flock on a file that shuts out an exclusive one.
bool IsLocked(const std::string& path);

// A umask as long as the object lives.
class Umask {
  public:
    explicit Umask(mode_t mask);
    Umask(const Umask&) = delete;
    Umask& operator=(const Umask&) = delete;
    ~Umask();

  private:
    mode_t before;
};

#endif
