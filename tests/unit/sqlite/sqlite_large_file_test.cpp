// A database of more than 3 GiB. Most of it is a hole, so that it takes no room on disk.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <orvadrcore/sqlite_command.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "support/fixtures/sqlite_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

constexpr std::uint32_t PageSize = 4096;
constexpr std::uint32_t PageCount = (std::uint64_t{3} << 30U) / PageSize;
constexpr std::int64_t HoleEnd = std::int64_t{PageCount} * PageSize;

class LargeFileTest : public SqliteFixture {
  protected:
    LargeFileTest()
    {
        Run("PRAGMA page_size=4096;CREATE TABLE t(id INTEGER PRIMARY KEY, data TEXT);");
        Lengthen(path, HoleEnd);
        WritePageCount();
    }

    // Tells SQLite that the hole belongs to the database. New pages then come after it.
    void WritePageCount() const
    {
        constexpr off_t PageCountAt = 28;
        std::array<unsigned char, 4> bytes{};
        for (std::size_t i = 0; i < bytes.size(); ++i) {
            bytes[i] = static_cast<unsigned char>(PageCount >> (24 - 8 * i));
        }
        const int fd = OpenFile(path, O_WRONLY);
        EXPECT_EQ(::pwrite(fd, bytes.data(), bytes.size(), PageCountAt), 4);
        ::close(fd);
    }

    struct stat Status() const
    {
        struct stat status {};
        EXPECT_EQ(::stat(path.c_str(), &status), 0);
        return status;
    }

    bool Insert(int id, const std::string& text)
    {
        InsertCommand command;
        command.SetTable(table);
        command.AddFieldValue("id", id);
        command.AddFieldValue("data", SqliteValue::Text(text));
        return db.InsertRecord(command);
    }

    const SqliteTableHandler table{"t", "id INTEGER PRIMARY KEY, data TEXT"};
};

TEST_F(LargeFileTest, RecordsAreWrittenAfterThreeGigabytesAndReadBack)
{
    const std::string text(std::size_t{5} * PageSize, 'x');  // takes pages of its own
    EXPECT_TRUE(Insert(1, text + "1"));
    EXPECT_TRUE(Insert(2, text + "2"));
    EXPECT_GT(Status().st_size, HoleEnd);
    EXPECT_LT(Status().st_blocks, 1024) << "the file has no hole";

    OrvaDRCore::SqliteDB other(path, 0);
    SelectCommand select;
    select.SetTable(table);
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    EXPECT_TRUE(other.SelectRecords(select, rows));
    ASSERT_EQ(rows.size(), 2U);
    std::string data;
    EXPECT_TRUE(rows[1].GetValue("data", data));
    EXPECT_EQ(data, text + "2");
}

TEST_F(LargeFileTest, AFailedTransactionTruncatesTheFileToItsSizeBefore)
{
    EXPECT_TRUE(Insert(1, "one"));
    const std::int64_t size = Status().st_size;
    std::vector<SqliteValueList> rows(2);
    for (SqliteValueList& row : rows) {
        row.AddValue("id", 2);  // twice
        row.AddValue("data", SqliteValue::Text(std::string(std::size_t{3} << 20U, 'x')));
    }
    EXPECT_FALSE(db.InsertRecords(table, rows));
    TakeLines();
    EXPECT_EQ(Status().st_size, size);
    EXPECT_EQ(Run("SELECT id FROM t;"), "1");
}

}  // namespace
