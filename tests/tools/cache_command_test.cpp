// orvadr cache
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <ctime>
#include <filesystem>
#include <string>

#include <orvadrcore/file_lock.h>

#include "orvadr.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_cache.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"
#include "support/processes/rights.h"

namespace {

using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;

constexpr long Timeout = 3600;

class CacheCommandTest : public ::testing::Test {
  protected:
    // Writes the cache file, as a refresh does that took from `begin` to `finish`.
    void Write(std::int64_t begin = 1000, std::int64_t finish = 1003) const
    {
        EXPECT_TRUE(cache.UpdateWithData("data", begin, finish));
    }

    void SetAge(long seconds) const { SetModifyTime(path, std::time(nullptr) - seconds); }

    Json::Value Look(int code) const
    {
        const Answer answer = Ask({"cache", path});
        EXPECT_EQ(answer.code, code) << answer.err;
        EXPECT_EQ(answer.Only()["path"], path);
        return answer.Only();
    }

    // What it says of a path that is no cache. Nothing else is there afterwards.
    void ExpectUnreadable(const std::string& file, int code, const std::string& reason) const
    {
        const std::set<std::string> before = NamesIn(dir.Path());
        const Answer answer = Ask({"cache", file});
        EXPECT_EQ(answer.code, code) << file;
        EXPECT_EQ(answer.Only()["state"], "unreadable") << file;
        EXPECT_TRUE(answer.Only()["timeout_seconds"].isNull());
        EXPECT_EQ(answer.err, "orvadr: " + file + ": " + reason + "\n");
        EXPECT_EQ(NamesIn(dir.Path()), before);
    }

    TempDir dir;
    TestCache cache{dir.Path(), "status", Timeout, false, -1};
    const std::string path = dir.File("status.cached");
    const std::string pidPath = path + ".pid";
};

TEST_F(CacheCommandTest, ShowsAFreshCache)
{
    Write();
    const Json::Value fresh = Look(AllWell);
    EXPECT_EQ(fresh["state"], "fresh");
    EXPECT_LE(fresh["age_seconds"].asInt(), 60);
    EXPECT_EQ(fresh["timeout_seconds"], Json::Int64{Timeout});
    EXPECT_TRUE(fresh["updater"].isNull());
    EXPECT_EQ(fresh["begin"], 1000);
    EXPECT_EQ(fresh["finish"], 1003);
    EXPECT_EQ(fresh["last_refresh_seconds"], 3.0);
    EXPECT_EQ(fresh["longest_refresh_seconds"], 3);
    EXPECT_EQ(fresh["size_bytes"], Json::Int64(std::filesystem::file_size(path)));
    EXPECT_EQ(fresh["info"], "test cache");
}

TEST_F(CacheCommandTest, ShowsTheLongestOfAllRefreshes)
{
    Write(1000, 1042);
    Write(2000, 2002);
    const Json::Value fresh = Look(AllWell);
    EXPECT_EQ(fresh["last_refresh_seconds"], 2.0);
    EXPECT_EQ(fresh["longest_refresh_seconds"], 42);
}

TEST_F(CacheCommandTest, TellsNoTimesThatTheCacheDoesNotKnow)
{
    EXPECT_TRUE(cache.UpdateWithData("data"));
    const Json::Value fresh = Look(AllWell);
    for (const char* key : {"begin", "finish", "last_refresh_seconds"}) {
        EXPECT_TRUE(fresh[key].isNull()) << key;
    }
}

TEST_F(CacheCommandTest, ShowsAStaleCacheAndDoesNotRefreshIt)
{
    Write();
    SetAge(Timeout + 100);
    const std::string content = ReadFile(path);
    const Json::Value stale = Look(NotWell);
    EXPECT_EQ(stale["state"], "stale");
    EXPECT_GE(stale["age_seconds"].asInt(), Timeout + 100);
    EXPECT_EQ(ReadFile(path), content);
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"status.cached"});
}

TEST_F(CacheCommandTest, TakesACacheFromTheFutureForFreshAsTheLibraryDoes)
{
    Write();
    SetAge(-7200);
    const Json::Value fresh = Look(AllWell);
    EXPECT_EQ(fresh["state"], "fresh");
    EXPECT_LE(fresh["age_seconds"].asInt(), -7000);
    EXPECT_FALSE(cache.IsTimeout());
    EXPECT_THAT(RunOrvadr({"cache", path}).out, HasSubstr("  -"));
}

TEST_F(CacheCommandTest, ShowsTimesAfterJanuary2038)
{
    constexpr std::int64_t In2040 = 2'208'988'800;
    Write(In2040, In2040 + 3);
    SetModifyTime(path, In2040 + 3);
    const Json::Value look = Look(AllWell);
    EXPECT_EQ(look["begin"], Json::Int64{In2040});
    EXPECT_EQ(look["finish"], Json::Int64{In2040 + 3});
    EXPECT_NEAR(look["age_seconds"].asDouble(),
                static_cast<double>(std::time(nullptr) - (In2040 + 3)), 60);
}

TEST_F(CacheCommandTest, TakesACacheWithoutATimeOutForStale)
{
    WriteFile(path, R"({"cached_data":1})");
    EXPECT_EQ(Look(NotWell)["state"], "stale");
}

TEST_F(CacheCommandTest, ShowsAMissingCache)
{
    const Json::Value missing = Look(NotWell);
    EXPECT_EQ(missing["state"], "missing");
    for (const char* key : {"age_seconds", "size_bytes", "longest_refresh_seconds", "info"}) {
        EXPECT_TRUE(missing[key].isNull()) << key;
    }
    EXPECT_EQ(Ask({"cache", path + "/below"}).Only()["state"], "missing");
    std::filesystem::create_symlink("nowhere", dir.File("dangling"));
    EXPECT_EQ(Ask({"cache", dir.File("dangling")}).Only()["state"], "missing");
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(CacheCommandTest, ShowsWhoRefreshesAndSinceWhen)
{
    const ChildProcess updater([&](ChildProcess::Link& link) {
        if (CoreLibProcPidFileCreate(pidPath.c_str()) == 0) link.Tell();
        link.Await();
    });
    ASSERT_TRUE(updater.Await());
    SetModifyTime(pidPath, 1'000'000'000);
    const Json::Value found = Look(NotWell)["updater"];
    EXPECT_EQ(found["pid"], updater.Pid());
    EXPECT_THAT(found["command"].asString(), HasSubstr("tool_tests"));
    EXPECT_EQ(found["since"], 1'000'000'000);

    Write();
    EXPECT_EQ(Look(AllWell)["updater"], found) << "beside a fresh cache, too";
    EXPECT_THAT(RunOrvadr({"cache", path}).out,
                HasSubstr(" " + std::to_string(updater.Pid()) + " "));
    EXPECT_THAT(RunOrvadr({"cache", path}).out, HasSubstr(" since 2001-09-"));
}

TEST_F(CacheCommandTest, ShowsARefreshThatIsUnderWay)
{
    if (!BecomeRoot()) return;  // an ordinary user cannot take the lock
    ChildProcess updater([&](ChildProcess::Link& link) {
        cache.produce = [&](Json::Value& data) {
            link.Tell();
            data = "new";
            return link.Await();
        };
        EXPECT_EQ(cache.Read(), "new");
    });
    ASSERT_TRUE(updater.Await());
    EXPECT_EQ(Look(NotWell)["updater"]["pid"], updater.Pid());
    updater.Tell();
    EXPECT_EQ(updater.Join(), 0);
    EXPECT_TRUE(Look(AllWell)["updater"].isNull());
    std::filesystem::remove_all("/tmp/.orvadr_lock" + dir.Path());
}

TEST_F(CacheCommandTest, ShowsNoUpdaterThatIsDeadOrCannotBeRead)
{
    Write();
    ChildProcess dead([&](ChildProcess::Link&) { CoreLibProcPidFileCreate(pidPath.c_str()); });
    EXPECT_EQ(dead.Join(), 0);
    EXPECT_TRUE(Look(AllWell)["updater"].isNull()) << "it has ended";
    WriteFile(pidPath, std::to_string(::getpid()) + "\n1\n");
    EXPECT_TRUE(Look(AllWell)["updater"].isNull()) << "another process has its id";
    WriteFile(pidPath, "garbage");
    EXPECT_TRUE(Look(AllWell)["updater"].isNull());

    std::filesystem::remove(pidPath);
    ASSERT_EQ(::mkfifo(pidPath.c_str(), 0600), 0);
    EXPECT_TRUE(Look(AllWell)["updater"].isNull()) << "a pipe";
}

TEST_F(CacheCommandTest, TellsWhatIsNoDocument)
{
    for (const char* text : {"", "garbage", "{\"cached_data\":", "{} {}", "\xff\xfe"}) {
        WriteFile(path, text);
        ExpectUnreadable(path, NotWell, "no JSON document");
    }
    for (const char* text : {"[]", "{}", "1"}) {
        WriteFile(path, text);
        ExpectUnreadable(path, NotWell, "no document of a cache");
    }
}

TEST_F(CacheCommandTest, NeitherWaitsForNorOpensWhatIsNoFile)
{
    const std::string pipe = dir.File("pipe");
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    ExpectUnreadable(pipe, NotSeen, "no regular file");
    ExpectUnreadable(dir.Path(), NotSeen, "no regular file");
    ExpectUnreadable("/dev/zero", NotSeen, "no regular file");
    std::filesystem::create_symlink("loop", dir.File("loop"));
    ExpectUnreadable(dir.File("loop"), NotSeen, "Too many levels of symbolic links");
    ExpectUnreadable("/" + std::string(300, 'x'), NotSeen, "File name too long");
}

TEST_F(CacheCommandTest, TakesLittleMemoryForAHugeFile)
{
    WriteFile(path, "");
    ASSERT_EQ(::truncate(path.c_str(), 1L << 30), 0);
    CheckInChild([&] {
        ExpectUnreadable(path, NotWell, "no JSON document");
        WriteFile(path, " {");
        ASSERT_EQ(::truncate(path.c_str(), 1L << 30), 0);
        ExpectUnreadable(path, NotSeen, "larger than 16 MiB, not read");
        rusage usage{};
        ASSERT_EQ(::getrusage(RUSAGE_CHILDREN, &usage), 0);
        constexpr long MostKiB = 200'000;
        EXPECT_LT(usage.ru_maxrss, MostKiB);
    });
}

TEST_F(CacheCommandTest, TellsWhatItMayNotRead)
{
    Write();
    WriteFile(pidPath, std::to_string(::getpid()));
    std::filesystem::permissions(path, std::filesystem::perms::none);
    std::filesystem::permissions(pidPath, std::filesystem::perms::none);
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Answer answer = Ask({"cache", path});
        EXPECT_EQ(answer.code, NotSeen);
        EXPECT_EQ(answer.Only()["state"], "unreadable");
        EXPECT_THAT(answer.err, HasSubstr("orvadr: " + path + ": Permission denied\n"));
        EXPECT_THAT(answer.err, HasSubstr("orvadr: " + pidPath + ": Permission denied\n"));
    });
}

TEST_F(CacheCommandTest, TellsTheWorstOfSeveralCaches)
{
    Write();
    const Answer answer =
        Ask({"cache", path, dir.File("no"), "--", "-x", "[a,b]", dir.Path(), path});
    EXPECT_EQ(answer.code, NotSeen);
    ASSERT_EQ(answer.objects.size(), 6U);
    EXPECT_EQ(answer.objects[3]["path"], "[a,b]");
    EXPECT_EQ(Ask({"cache", path, path}).code, AllWell);
}

TEST_F(CacheCommandTest, ShowsATableForPeople)
{
    Write();
    const ProgramResult result = RunOrvadr({"cache", path});
    EXPECT_EQ(result.code, AllWell);
    EXPECT_THAT(result.out,
                MatchesRegex("STATE  AGE  TIME-OUT  LAST  LONGEST  SIZE   FILE\n"
                             "fresh  [0-9]+s   1h 00m    3s    3s       [0-9]+ B  .*cached\n"));
    EXPECT_THAT(result.err, IsEmpty());
}

TEST_F(CacheCommandTest, NeedsAFile)
{
    EXPECT_EQ(RunOrvadr({"cache"}).code, WrongUsage);
    EXPECT_EQ(RunOrvadr({"cache", ""}).code, WrongUsage);
}

}  // namespace
