// The fixture of every test whose code may log. It takes the place of syslog in the test program
// and keeps what would have gone there; a case states every line that it expects, in order, and
// fails on any other:
//
//     class SqliteDbTest : public LoggedTest {
//       protected:
//         SqliteDbTest() : LoggedTest("sqlite_db.cpp") {}
//     };
//
//     TEST_F(SqliteDbTest, ExecOnAClosedConnectionIsRefused)
//     {
//         EXPECT_FALSE(db.Exec("SELECT 1"));
//         ExpectLines({Err("Exec", "DB[x.db] is not opened")});
//     }
#ifndef ORVADRCORE_TESTS_LOG_CAPTURE_H
#define ORVADRCORE_TESTS_LOG_CAPTURE_H

#include <gtest/gtest.h>

#include <string>
#include <vector>

// A line as it was handed to syslog.
struct LogRecord {
    int priority;
    std::string text;
};

// A line as a test expects it; `file` is empty where it is the fixture's own.
struct LogLine {
    int priority;
    std::string word;
    std::string function;
    std::string message;
    std::string file;

    LogLine In(const std::string& source) const;
};

LogLine Err(const std::string& function, const std::string& message);
LogLine Warn(const std::string& function, const std::string& message);
LogLine Notice(const std::string& function, const std::string& message);
LogLine Info(const std::string& function, const std::string& message);
LogLine Debug(const std::string& function, const std::string& message);

class LoggedTest : public ::testing::Test {
  protected:
    // `sourceFile` is the name that the tested code's lines begin with.
    explicit LoggedTest(const std::string& sourceFile);

    // Fails when a line was written that no ExpectLines asked for.
    void TearDown() override;

    // The lines written since the last call must be exactly these: priority, and the whole text
    // with file, a line number, function, level word, process id and message.
    void ExpectLines(const std::vector<LogLine>& expected);

    // The lines written since the last call, for cases whose lines are not known to the letter.
    static std::vector<LogRecord> TakeLines();

  private:
    std::string file;
};

#endif
