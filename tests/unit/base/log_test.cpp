// The log line itself. The tests of each operation check its lines.
#include "base/log.h"

#include <syslog.h>

#include <fstream>

#include "support/fixtures/log_capture.h"

namespace {

class LogTest : public LoggedTest {
  protected:
    LogTest() : LoggedTest("log_test.cpp") {}
};

TEST_F(LogTest, ALevelHasAWordAndAPriority)
{
    DR_LOG(Err, "one");
    DR_LOG(Warn, "two");
    DR_LOG(Notice, "three");
    DR_LOG(Info, "four");
    DR_LOG(Debug, "five");
    ExpectLines({Err("TestBody", "one"), Warn("TestBody", "two"), Notice("TestBody", "three"),
                 Info("TestBody", "four"), Debug("TestBody", "five")});
}

TEST_F(LogTest, ThePrefixHasFileLineFunctionLevelAndProcess)
{
    DR_LOG(Warn, "%s and %d", "text", 42);
    const std::string line = std::to_string(__LINE__ - 1);
    const std::vector<LogRecord> lines = TakeLines();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].priority, LOG_WARNING);
    EXPECT_EQ(lines[0].text, "log_test.cpp:" + line + "(TestBody)[WARN][" +
                                 std::to_string(::getpid()) + "]: text and 42");
}

TEST_F(LogTest, CanBeWrittenUnderTheNameOfAnotherFunction)
{
    DR_LOG_AS("GetValue<int>", Info, "here");
    ExpectLines({Info("GetValue<int>", "here")});
}

TEST_F(LogTest, PrintsTheCallersErrnoAndKeepsIt)
{
    errno = ENOENT;
    DR_LOG(Err, "errno=%m");
    EXPECT_EQ(errno, ENOENT);
    ExpectLines({Err("TestBody", "errno=No such file or directory")});
}

TEST_F(LogTest, DataIsNeverTheFormat)
{
    DR_LOG(Err, "[%s]", "%s%n%d");
    ExpectLines({Err("TestBody", "[%s%n%d]")});
}

TEST(LogBaseNameTest, IsThePartAfterTheLastSlash)
{
    EXPECT_STREQ(OrvaDRCore::Log::BaseName("/a/b/file.cpp"), "file.cpp");
    EXPECT_STREQ(OrvaDRCore::Log::BaseName("file.cpp"), "file.cpp");
    EXPECT_STREQ(OrvaDRCore::Log::BaseName(""), "");
}

}  // namespace
