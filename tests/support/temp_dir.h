// A directory of the test's own, removed with all that is in it.
#ifndef ORVADRCORE_TESTS_TEMP_DIR_H
#define ORVADRCORE_TESTS_TEMP_DIR_H

#include <cstdlib>
#include <filesystem>
#include <string>
#include <system_error>

class TempDir {
  public:
    explicit TempDir(const std::filesystem::path& parent = std::filesystem::temp_directory_path())
        : path((parent / "orvadr-test-XXXXXX").string())
    {
        if (::mkdtemp(path.data()) == nullptr) std::abort();
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    ~TempDir()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path, ignored);
    }

    const std::string& Path() const { return path; }
    std::string File(const std::string& name) const { return path + "/" + name; }

  private:
    std::string path;
};

#endif
