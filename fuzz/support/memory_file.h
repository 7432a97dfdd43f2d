// A file in memory. Each open of its path starts at the beginning.
#ifndef ORVADRCORE_FUZZ_MEMORY_FILE_H
#define ORVADRCORE_FUZZ_MEMORY_FILE_H

#include <sys/mman.h>
#include <unistd.h>

#include <string>

#include "support/fuzz.h"

class MemoryFile {
  public:
    MemoryFile() : fd(::memfd_create("fuzz", MFD_CLOEXEC))
    {
        Expect(fd >= 0, "memfd_create works");
    }
    MemoryFile(const MemoryFile&) = delete;
    MemoryFile& operator=(const MemoryFile&) = delete;
    ~MemoryFile() { ::close(fd); }

    std::string Path() const { return "/proc/self/fd/" + std::to_string(fd); }

    void Write(const std::string& content) const
    {
        const bool written =
            ::ftruncate(fd, 0) == 0 &&
            ::pwrite(fd, content.data(), content.size(), 0) == static_cast<ssize_t>(content.size());
        Expect(written, "the file can be written");
    }

  private:
    int fd;
};

#endif
