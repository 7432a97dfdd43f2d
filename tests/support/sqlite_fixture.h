// What the tests of SqliteDB share: a database file with two closed connections to it, a way into
// the file that shares no code with the library, a process that locks it, and the texts of error
// records. No test sleeps: the pauses are counted instead, and each test ends with as many
// connections closed as were opened.
#ifndef ORVADRCORE_TESTS_SQLITE_FIXTURE_H
#define ORVADRCORE_TESTS_SQLITE_FIXTURE_H

#include <gtest/gtest.h>
#include <json/writer.h>
#include <orvadrcore/sqlite_db.h>
#include <sqlite3.h>

#include <string>
#include <vector>

#include "base/json_helpers.h"
#include "support/child_process.h"
#include "support/log_capture.h"
#include "support/pauses.h"
#include "support/plain_db.h"
#include "support/sqlite_faults.h"
#include "support/temp_dir.h"

// A second process that keeps all others out of a database file; with "BEGIN IMMEDIATE" only from
// writing to it.
class LockHolder {
  public:
    explicit LockHolder(const std::string& path, const std::string& begin = "BEGIN EXCLUSIVE")
        : child([&path, &begin](ChildProcess::Link& link) {
              PlainDb db(path);
              db.Run(begin);
              link.Tell();
              link.Await();
              db.Run("COMMIT");
          })
    {
        EXPECT_TRUE(child.Await()) << "the file could not be locked";
    }

    // The file is free when this returns.
    void Release()
    {
        child.Tell();
        EXPECT_EQ(child.Join(), 0);
    }

  private:
    ChildProcess child;
};

// Whether a statement that is stepped has this text. SQLite steps some of its own, which have none.
inline bool IsStatement(sqlite3_stmt* statement, const std::string& text)
{
    const char* sql = sqlite3_sql(statement);
    return sql != nullptr && sql == text;
}

// The query by which a table is looked for.
inline std::string LookFor(const std::string& table)
{
    return "SELECT 1 FROM sqlite_master WHERE type='table' AND name='" + table + "';";
}

// What SQLite answered to a statement.
struct Failure {
    std::string command;
    int code;
    std::string message;
};

inline const char* const Locked = "database is locked";
inline const char* const NoDatabase = "file is not a database";

// The error record of a single failure.
inline std::string ErrorText(const Failure& failure)
{
    return R"({"command":)" + Json::valueToQuotedString(failure.command.c_str()) +
           R"(,"sqlite_errcode":)" + std::to_string(failure.code) + R"(,"sqlite_errmsg":)" +
           Json::valueToQuotedString(failure.message.c_str()) + "}";
}

// The error record of tries that failed one after the other.
inline std::string TriesText(const std::vector<Failure>& failures)
{
    std::string text;
    for (const Failure& failure : failures) {
        text += text.empty() ? "[" : ",";
        text += R"({"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)" +
                ErrorText(failure) + "}";
    }
    return text + "]";
}

// The error record of tries that all failed alike.
inline std::string TriesText(const Failure& failure, std::size_t tries = 1)
{
    return TriesText(std::vector<Failure>(tries, failure));
}

// The lines of a statement that was given up.
inline LogLine ExecGaveUp(const Failure& failure, std::size_t tries = 1)
{
    return Warn("Exec", "Reach retry limit [" + std::to_string(tries) +
                            "], failed to exec command [" + failure.command + "] with err[" +
                            TriesText(failure, tries) + "]");
}

inline LogLine OneRowGaveUp(const Failure& failure, std::size_t tries = 1)
{
    return Warn("SelectByCommand", "Reach retry limit [" + std::to_string(tries) +
                                       "], failed to select command with errors[" +
                                       TriesText(failure, tries) + "] ");
}

inline LogLine ManyRowsGaveUp(const Failure& failure, std::size_t tries = 1)
{
    return Warn("SelectByCommand", "Reach retry limit [" + std::to_string(tries) +
                                       "], failed to exec command [" + failure.command +
                                       "] with errors [" + TriesText(failure, tries) + "]");
}

class SqliteFixture : public LoggedTest {
  protected:
    SqliteFixture() : LoggedTest("sqlite_db.cpp") {}

    void TearDown() override
    {
        db.Close();
        retrying.Close();
        EXPECT_EQ(Opened(), Closed());
        LoggedTest::TearDown();
    }

    // The connections that the library opened and closed in this test.
    int Opened() const { return CountConnections().opened - before.opened; }
    int Closed() const { return CountConnections().closed - before.closed; }

    std::string Run(const std::string& sql) const { return PlainDb(path).Run(sql); }

    static void ExpectErr(const OrvaDRCore::SqliteDB& db, int code,
                          const std::string& record = "null")
    {
        EXPECT_EQ(db.GetErrCode(), code);
        EXPECT_EQ(OrvaDRCore::toString(db.GetErr()), record);
    }

    // So many pauses so far, each of 500 to 1000 milliseconds.
    void ExpectPauses(std::size_t count) const
    {
        EXPECT_EQ(pauses.Taken().size(), count);
        for (const unsigned int microseconds : pauses.Taken()) {
            EXPECT_GE(microseconds, 500'000U);
            EXPECT_LE(microseconds, 1'000'000U);
        }
    }

    const SqliteConnections before = CountConnections();
    const TempDir dir;
    const std::string path = dir.File("test.db");
    Pauses pauses;
    OrvaDRCore::SqliteDB db{path, 0};        // tries once
    OrvaDRCore::SqliteDB retrying{path, 3};  // tries four times
};

#endif
