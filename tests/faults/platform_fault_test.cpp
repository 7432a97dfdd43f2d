// The platform layer as the library uses it, and what needs nothing else, with every call failing
// once.
#include <orvacore/orvacore.h>
#include <orvadrcore/utils.h>
#include <orvarandom/orvarandom.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <memory>

#include "fault.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

using OrvaDRCore::Container;
using OrvaDRCore::GenerateUUID;
using OrvaDRCore::RandomSleepInMSec;

TEST(PlatformFaults, PidFileCreate)
{
    EveryCallFails("CoreLibProcPidFileCreate", [] {
        const TempDir dir;
        const std::string path = dir.File("a pid file");
        const Outcome outcome =
            WithFault([&] { return CoreLibProcPidFileCreate(path.c_str()) == 0; });
        EXPECT_EQ(CoreLibReadPidFile(path.c_str()), outcome.succeeded ? ::getpid() : 0);
        EXPECT_EQ(CoreLibProcPidFileCreate(path.c_str()), 0);
        EXPECT_EQ(CoreLibReadPidFile(path.c_str()), ::getpid());
        EXPECT_EQ(NamesIn(dir.Path()).size(), 1U) << "a temporary file is left";
    });
}

TEST(PlatformFaults, ReadPidFile)
{
    EveryCallFails("CoreLibReadPidFile", [] {
        const TempDir dir;
        const std::string path = dir.File("a pid file");
        ASSERT_EQ(CoreLibProcPidFileCreate(path.c_str()), 0);
        pid_t pid = 0;
        const Outcome outcome = WithFault([&] {
            pid = CoreLibReadPidFile(path.c_str());
            return pid != 0;
        });
        EXPECT_EQ(pid, outcome.succeeded ? ::getpid() : 0);
        EXPECT_EQ(CoreLibReadPidFile(path.c_str()), ::getpid());
    });
}

TEST(PlatformFaults, ProcAlive)
{
    EveryCallFails("CoreLibProcAlive", [] {
        const Outcome outcome = WithFault([] { return CoreLibProcAlive(::getpid()) == 1; });
        EXPECT_TRUE(outcome.succeeded || outcome.threw) << "a living process counts as dead";
    });
}

TEST(PlatformFaults, Exec)
{
    EveryCallFails("CoreLibExec", [] {
        const TempDir dir;
        const std::string path = dir.File("made");
        WithFault([&] {
            return CoreLibExec("/bin/mkdir", path.c_str(), nullptr, nullptr, nullptr) == 0;
        });
        EXPECT_EQ(CoreLibExec("/bin/mkdir", "-p", path.c_str(), nullptr, nullptr), 0);
    });
}

TEST(PlatformFaults, Popen)
{
    EveryCallFails("CoreLibPopen and CoreLibPclose", [] {
        int code = -1;
        const auto run = [&] {
            std::array<char, 16> line{};
            FILE* output = CoreLibPopen("/bin/echo", "r", "word", nullptr);
            if (output == nullptr) return false;
            const bool isRead = std::fgets(line.data(), line.size(), output) != nullptr;
            code = CoreLibPclose(output);
            return isRead && std::string(line.data()) == "word\n";
        };
        const Outcome outcome = WithFault(run);
        EXPECT_FALSE(outcome.threw);
        EXPECT_TRUE(run());
        EXPECT_EQ(code, 0);
    });
}

TEST(PlatformFaults, ForkDetached)
{
    EveryCallFails("CoreLibProcForkEx", [] {
        const TempDir dir;
        const std::string path = dir.File("made");
        const Outcome outcome = WithFault([&path] {
            const pid_t pid = CoreLibProcForkEx(CORELIB_FORK_DETACHED);
            if (pid == 0) ::_exit(::mkdir(path.c_str(), 0700));
            return pid > 0;
        });
        // After a failure the child may have run all the same: only its report was lost.
        if (outcome.succeeded) {
            EXPECT_EQ(ModeOf(path), 0700U);
        }
    });
}

TEST(PlatformFaults, GenerateUuid)
{
    EveryCallFails("GenerateUUID", [] {
        std::string uuid;
        const Outcome outcome = WithFault([&] {
            uuid = GenerateUUID();
            return !uuid.empty();
        });
        EXPECT_EQ(uuid.size(), outcome.succeeded ? 36U : 0U);
        EXPECT_EQ(GenerateUUID().size(), 36U);
    });
}

TEST(PlatformFaults, RandomSleep)
{
    EveryCallFails("RandomSleepInMSec", [] {
        EXPECT_TRUE(WithFault([] { return RandomSleepInMSec(1, 2); }).succeeded);
    });
}

TEST(PlatformFaults, Containers)
{
    EveryCallFails("Container", [] {
        const std::vector<std::string> texts{"a text that is long enough", "and another one"};
        const auto join = [&texts] {
            return Container::ToString(texts, ", ") + Container::ToJsonArray(texts)[1].asString();
        };
        std::string text;
        WithFault([&] {
            text = join();
            return true;
        });
        if (!text.empty()) {
            EXPECT_EQ(text, join());
        }
    });
}
