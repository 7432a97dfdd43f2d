// What may lie at a path in place of a regular file, there as long as the object lives.
//
//     for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
//         const SpecialFile special(kind, path, text);
//         ...
//     }
#ifndef ORVADRCORE_TESTS_SPECIAL_FILE_H
#define ORVADRCORE_TESTS_SPECIAL_FILE_H

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <ostream>
#include <string>

class SpecialFile {
  public:
    // A FullPipe is one into which somebody has written the text. Device is a link to /dev/zero,
    // which never ends.
    enum class Kind { Pipe, FullPipe, Socket, Device, Directory };

    static constexpr std::array<Kind, 5> Kinds()
    {
        return {Kind::Pipe, Kind::FullPipe, Kind::Socket, Kind::Device, Kind::Directory};
    }

    SpecialFile(Kind kind, std::string place, const std::string& text) : path(std::move(place))
    {
        switch (kind) {
            case Kind::Pipe: EXPECT_EQ(::mkfifo(path.c_str(), Mode), 0); break;
            case Kind::FullPipe:
                EXPECT_EQ(::mkfifo(path.c_str(), Mode), 0);
                writer = ::open(path.c_str(), O_RDWR | O_CLOEXEC);
                EXPECT_EQ(::write(writer, text.data(), text.size()),
                          static_cast<ssize_t>(text.size()));
                break;
            case Kind::Socket: EXPECT_EQ(::mknod(path.c_str(), S_IFSOCK | Mode, 0), 0); break;
            case Kind::Device: std::filesystem::create_symlink("/dev/zero", path); break;
            case Kind::Directory: std::filesystem::create_directory(path); break;
        }
    }
    SpecialFile(const SpecialFile&) = delete;
    SpecialFile& operator=(const SpecialFile&) = delete;
    ~SpecialFile()
    {
        if (writer >= 0) ::close(writer);
        std::error_code isGone;
        std::filesystem::remove(path, isGone);
    }

  private:
    static constexpr mode_t Mode = 0600;

    std::string path;
    int writer = -1;
};

inline std::ostream& operator<<(std::ostream& out, SpecialFile::Kind kind)
{
    constexpr std::array<const char*, 5> Names = {"a pipe", "a pipe with a text", "a socket",
                                                  "a device", "a directory"};
    return out << Names.at(static_cast<std::size_t>(kind));
}

#endif
