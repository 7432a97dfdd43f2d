// Processes that upgrade one file at the same moment, and those that are killed meanwhile.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_db.h>

#include "support/fixtures/scale.h"
#include "support/fixtures/temp_dir.h"
#include "support/processes/crowd.h"
#include "support/processes/kills.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;

constexpr unsigned int Retries = 5;
constexpr int Processes = 16;
constexpr int StepCount = 6;

// Each step notes that it was run, and adds a column, which fails if it is run twice.
std::vector<std::string> StepsUpTo(int count)
{
    std::vector<std::string> steps = {
        "CREATE TABLE done (step INTEGER); INSERT INTO done VALUES (1)"};
    for (int step = 2; step <= count; ++step) {
        const std::string number = std::to_string(step);
        steps.push_back("ALTER TABLE done ADD COLUMN added" + number +
                        "; INSERT INTO done (step) VALUES (" + number + ")");
    }
    return steps;
}

class UpgradeProcessTest : public ::testing::Test {
  protected:
    std::int64_t Number(const std::string& select)
    {
        SqliteDB db(path, Retries);
        std::int64_t number = -1;
        const auto take = [&](const SqliteRow& row) { return row.GetValue(0, number); };
        EXPECT_TRUE(db.Open() && db.SelectEachByCommand(select, take));
        return number;
    }

    // The steps so far were run once each, and no more of the next one.
    void ExpectVersion(std::int64_t version)
    {
        EXPECT_EQ(Number("PRAGMA user_version"), version);
        const std::int64_t tables = Number("SELECT count(*) FROM sqlite_master");
        EXPECT_EQ(tables, version > 0 ? 1 : 0);
        if (tables == 0) return;
        EXPECT_EQ(Number("SELECT count(*) FROM done"), version);
        EXPECT_EQ(Number("SELECT count(DISTINCT step) FROM done"), version);
        EXPECT_EQ(Number("SELECT max(step) FROM done"), version);
    }

    void RemoveFiles() const
    {
        for (const char* suffix : {"", "-journal"}) std::filesystem::remove(path + suffix);
    }

    const TempDir dir;
    const std::string path = dir.File("jobs.db");
};

TEST_F(UpgradeProcessTest, OfManyProcessesAtOnceEachStepIsRunByOne)
{
    const int rounds = Scaled(3, 30);
    SharedMemory<std::atomic<int>> rows;
    for (int round = 0; round < rounds && !HasFailure(); ++round) {
        RemoveFiles();
        *rows = 0;
        const Crowd crowd(Processes, [&](int) {
            SqliteDB db(path, Retries);
            if (!db.Upgrade(StepsUpTo(StepCount))) throw std::runtime_error("not upgraded");
            *rows += static_cast<int>(db.GetAffectedRows());
        });
        ASSERT_TRUE(crowd.Start());
        EXPECT_TRUE(crowd.Join());
        ExpectVersion(StepCount);
        EXPECT_EQ(*rows, StepCount);  // each process counts what it has changed itself
    }
}

TEST_F(UpgradeProcessTest, OlderProgramsRefuseWhatNewerOnesHaveUpgraded)
{
    const Crowd crowd(Processes, [&](int number) {
        const int known = number % 2 == 0 ? StepCount : StepCount / 2;
        SqliteDB db(path, Retries);
        const bool isUpgraded = db.Upgrade(StepsUpTo(known));
        // An older program may have been early enough.
        if (known == StepCount && !isUpgraded) throw std::runtime_error("not upgraded");
        if (!isUpgraded && db.GetErrCode() != 404) throw std::runtime_error("another code");
    });
    ASSERT_TRUE(crowd.Start());
    EXPECT_TRUE(crowd.Join());
    ExpectVersion(StepCount);
    SqliteDB old(path, Retries);
    EXPECT_FALSE(old.Upgrade(StepsUpTo(StepCount / 2)));
    ExpectVersion(StepCount);
}

TEST_F(UpgradeProcessTest, TheNextProcessGoesOnWhereAKilledOneWas)
{
    constexpr int FewSteps = 2;
    SharedMemory<std::atomic<int>> done;
    const auto upgrade = [&] {
        SqliteDB db(path, 0);
        return db.Upgrade(StepsUpTo(FewSteps));
    };
    const auto prepare = [&] {
        *done = 0;
        RemoveFiles();
    };
    const auto inspect = [&] {
        const std::int64_t version = Number("PRAGMA user_version");
        EXPECT_GE(version, *done == 1 ? FewSteps : 0);
        ExpectVersion(version);
        EXPECT_TRUE(upgrade());
        ExpectVersion(FewSteps);
    };
    KillEverywhere({prepare, [&] { *done = upgrade() ? 1 : 0; }, inspect});
    EXPECT_EQ(*done, 1);
}

}  // namespace
