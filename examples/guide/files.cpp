// JSON documents by path and by descriptor, files replaced whole, and directories.
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <iostream>
#include <map>
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

bool ReplaceFiles()
{
    // [replace]
    Json::Value settings;
    settings["retries"] = 5;
    if (!File::Replace("settings.json", settings)) return false;
    if (!File::Replace("limits.conf", "timeout=30\nretries=5\n")) return false;
    // [/replace]
    std::map<std::string, int> limits;
    Json::Value stored;
    if (!File::Read("settings.json", stored) || File::Read("limits.conf", limits) != 2)
        return false;
    std::cout << "replaced: " << (stored == settings) << ' ' << limits["timeout"] << '\n';
    return true;
}

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

    if (!ReplaceFiles()) return EXIT_FAILURE;
    return UseDirectories() ? EXIT_SUCCESS : EXIT_FAILURE;
}
