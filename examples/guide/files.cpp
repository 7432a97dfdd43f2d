// JSON documents by path and by descriptor, replacing a document atomically, and directories.
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <string>

#include <json/value.h>

#include <orvadrcore/file.h>

using OrvaDRCore::File;

namespace {

bool WriteAndRead()
{
    // [json]
    Json::Value settings;
    settings["retries"] = 3;
    settings["volumes"].append("/volume1/replica");
    if (!File::Write("settings.json", settings)) return false;

    Json::Value stored;
    if (!File::Read("settings.json", stored)) return false;
    std::cout << "retries: " << stored["retries"].asInt() << '\n';
    // [/json]
    return true;
}

bool ReadWithDefaults()
{
    // [defaults]
    Json::Value limits;
    limits["timeout"] = 30;  // the default if there is no file
    if (!File::Read("limits.json", limits)) {
        std::cout << "limits.json is no JSON document\n";
        return false;
    }
    std::cout << "timeout: " << limits["timeout"].asInt() << '\n';
    // [/defaults]
    return true;
}

// [descriptor]
// A new file that only its owner may read. Fails if the path exists, even as a link.
bool WritePrivate(const std::string& path, const Json::Value& session)
{
    const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    return fd >= 0 && File::Write(fd, session);  // closes the descriptor
}

bool ReadPrivate(const std::string& path, Json::Value& session)
{
    const int fd = ::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (!File::IsRegularFile(fd)) {  // a directory, a pipe, or nothing
        if (fd >= 0) ::close(fd);
        return false;
    }
    return File::Read(fd, session);  // closes the descriptor
}
// [/descriptor]

// [replace]
// Readers see the old document or the new one, never a part. Only one process may write at a time.
bool Replace(const std::string& path, const Json::Value& value)
{
    const std::string next = path + ".new";
    const int fd = ::open(next.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (fd < 0) return false;
    const int kept = ::fcntl(fd, F_DUPFD_CLOEXEC, 0);  // Write() closes the other one
    const bool stored = File::Write(fd, value) && ::fsync(kept) == 0;
    if (kept >= 0) ::close(kept);
    if (stored && std::rename(next.c_str(), path.c_str()) == 0) return true;
    ::unlink(next.c_str());
    return false;
}
// [/replace]

bool UseDirectories()
{
    // [directories]
    const std::string path = "state/nodes/backup-01.json";
    if (!File::CreateDir(File::GetParentDir(path), 0750)) return false;
    if (!File::Write(path, Json::Value("ready"))) return false;
    if (!File::RemoveDir("state")) return false;  // and everything in it
    // [/directories]
    return ::access("state", F_OK) != 0;
}

}  // namespace

int main()
{
    if (!WriteAndRead() || !ReadWithDefaults()) return EXIT_FAILURE;

    Json::Value session;
    if (!WritePrivate("session.json", Json::Value("backup-01"))) return EXIT_FAILURE;
    if (WritePrivate("session.json", Json::Value("backup-02"))) return EXIT_FAILURE;
    if (!ReadPrivate("session.json", session) || ReadPrivate(".", session)) return EXIT_FAILURE;
    std::cout << "session: " << session.asString() << '\n';

    if (!Replace("settings.json", Json::Value("all new"))) return EXIT_FAILURE;
    if (!File::Read("settings.json", session)) return EXIT_FAILURE;
    std::cout << "replaced: " << session.asString() << '\n';
    return UseDirectories() ? EXIT_SUCCESS : EXIT_FAILURE;
}
