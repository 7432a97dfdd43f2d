// Power cuts while a file is replaced. The directory is rebuilt in each state that the disk can be
// in afterwards: support/processes/power_cut.h.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include <orvadrcore/file.h>

#include "base/json_helpers.h"
#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/power_cut.h"

namespace {

using OrvaDRCore::File;
using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::Key;
using ::testing::Not;

// These documents take two blocks, three and one.
constexpr int Old = 50;
constexpr int New = 100;
constexpr int Later = 3;

void Require(bool succeeded)
{
    if (!succeeded) throw std::runtime_error("an operation failed");
}

bool IsSync(const Change& change)
{
    return change.kind == Kind::Sync;
}

class PowerCutTest : public ProcessTest {
  protected:
    static constexpr mode_t OwnMode = 0640;

    std::string Path() const { return dir.File("document"); }

    void Write(int number) const { Require(OrvaDRCore::toFile(DocumentOf(number), Path())); }

    void WriteOld() const
    {
        Write(Old);
        std::filesystem::permissions(Path(), static_cast<std::filesystem::perms>(OwnMode));
    }

    // Records how an old document is replaced with a new one.
    Record RecordReplacement() const
    {
        WriteOld();
        return RecordChanges(dir.Path(), [this] { Write(New); });
    }

    // The states after a cut that hold neither the old nor the new document with its permission
    // bits.
    static std::vector<Directory> Broken(const Record& record)
    {
        const Directory before{{"document", Stored(Old)}};
        std::vector<Directory> broken;
        for (const Directory& state : StatesAfterAnyCut(before, record)) {
            const auto found = state.find("document");
            if (found == state.end() ||
                (!(found->second == Stored(Old)) && !(found->second == Stored(New)))) {
                broken.push_back(state);
            }
        }
        return broken;
    }

    static StoredFile Stored(int number)
    {
        return {OrvaDRCore::toString(DocumentOf(number)), OwnMode};
    }

    // Rebuilds the directory in each state and calls `check`.
    void ForEachState(const Directory& before, const Record& record,
                      const std::function<void()>& check)
    {
        const std::set<Directory> states = StatesAfterAnyCut(before, record);
        EXPECT_GT(states.size(), record.size());
        for (const Directory& state : states) {
            WriteDirectory(dir.Path(), state);
            check();
            if (!HasFailure()) continue;
            for (const auto& [name, file] : state) {
                ADD_FAILURE() << name << " of " << file.text.size() << " bytes, mode " << std::oct
                              << file.mode;
            }
            return;
        }
        ReportCount("states", static_cast<int>(states.size()));
    }
};

TEST_F(PowerCutTest, AReplacedFileIsTheOldOrTheNewOne)
{
    const Record record = RecordReplacement();
    EXPECT_THAT(Broken(record), ElementsAre());
    ForEachState({{"document", Stored(Old)}}, record, [this] {
        EXPECT_THAT(ReadDirectory(dir.Path())["document"], AnyOf(Stored(Old), Stored(New)));
        Write(Later);
        Json::Value document;
        EXPECT_TRUE(File::Read(Path(), document));
        EXPECT_EQ(NumberOf(document), Later);
        EXPECT_THAT(Files(), ElementsAre("document"));
    });
}

TEST_F(PowerCutTest, ANewFileIsCompleteOrMissing)
{
    const Record record = RecordChanges(dir.Path(), [this] { Write(New); });
    const std::string text = OrvaDRCore::toString(DocumentOf(New));
    int without = 0;
    int with = 0;
    for (const Directory& state : StatesAfterAnyCut({}, record)) {
        const auto found = state.find("document");
        if (found == state.end()) {
            ++without;
        } else {
            ++with;
            EXPECT_EQ(found->second.text, text);
        }
    }
    EXPECT_GT(without, 0);
    EXPECT_GT(with, 0);
}

TEST_F(PowerCutTest, ACacheIsUsableAndCanBeRefreshed)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    const Directory before = ReadDirectory(dir.Path());
    const Record record = RecordChanges(dir.Path(), [this] {
        Require(NumberOf(MakeCache(Mode::Blocking, Gives(New)).Read()) == New);
    });
    ForEachState(before, record, [this] {
        EXPECT_THAT(NumberInFile(), AnyOf(Old, New));
        MakeStale();
        EXPECT_EQ(NumberOf(MakeCache(Mode::Blocking, Gives(Later)).Read()), Later);
        EXPECT_EQ(NumberInFile(), Later);
        EXPECT_THAT(Files(), ElementsAre("x.cached"));
    });
}

// ------------------------------------------------- the model finds what would break

TEST_F(PowerCutTest, WithoutASyncTheFileCanBeDamaged)
{
    Record record = RecordReplacement();
    ASSERT_EQ(std::count_if(record.begin(), record.end(), IsSync), 1);
    record.erase(std::find_if(record.begin(), record.end(), IsSync));

    const std::string text = Stored(New).text;
    const std::string zeros(text.size(), '\0');
    std::vector<StoredFile> found;
    for (const Directory& state : Broken(record)) found.push_back(state.at("document"));
    EXPECT_THAT(found, Contains(StoredFile{"", OwnMode}));
    EXPECT_THAT(found, Contains(StoredFile{text.substr(0, 4096), OwnMode}));
    EXPECT_THAT(found, Contains(StoredFile{text.substr(0, 2048), OwnMode}));
    EXPECT_THAT(found, Contains(StoredFile{zeros, OwnMode}));
    EXPECT_THAT(found, Contains(StoredFile{text.substr(0, 4096) + zeros.substr(4096), OwnMode}));
    EXPECT_THAT(found, Contains(StoredFile{text, 0600}));
}

TEST_F(PowerCutTest, ASyncAfterTheRenameIsTooLate)
{
    Record record = RecordReplacement();
    const auto sync = std::find_if(record.begin(), record.end(), IsSync);
    ASSERT_NE(sync, record.end());
    ASSERT_EQ(record.back().kind, Kind::Rename);
    std::rotate(sync, sync + 1, record.end());
    EXPECT_THAT(Broken(record), Not(ElementsAre()));
}

TEST_F(PowerCutTest, AfterARemovalBeforeTheRenameTheFileCanBeMissing)
{
    Record record = RecordReplacement();
    record.insert(record.end() - 1, Change{Kind::Remove, 0, "document"});
    EXPECT_THAT(Broken(record), Contains(Not(Contains(Key("document")))));
}

TEST_F(PowerCutTest, AFileWrittenInPlaceCanBeDamaged)
{
    WriteOld();
    const Record record =
        RecordChanges(dir.Path(), [this] { Require(File::Write(Path(), DocumentOf(New))); });
    EXPECT_THAT(Broken(record), Contains(Directory{{"document", {"", OwnMode}}}));
}

TEST_F(PowerCutTest, ARenameIsCertainAfterASyncOfTheDirectory)
{
    Record record = RecordReplacement();
    EXPECT_GT(StatesAfterCut({{"document", Stored(Old)}}, record).size(), 1U);
    record.push_back({Kind::SyncDirectory});
    EXPECT_THAT(StatesAfterCut({{"document", Stored(Old)}}, record),
                ElementsAre(Directory{{"document", Stored(New)}}));
}

}  // namespace
