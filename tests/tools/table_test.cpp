// Tables and texts for people: in a terminal, in a pipe, with names of any bytes.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <clocale>
#include <cstdint>
#include <cstdlib>

#include "base/json_helpers.h"
#include "orvadr.h"
#include "support/processes/terminal.h"
#include "table.h"
#include "text.h"

namespace {

using Orvadr::Column;
using Orvadr::FormatTable;
using Orvadr::Printable;
using Orvadr::Screen;
using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::Le;
using ::testing::Not;
using ::testing::SizeIs;

class TableTest : public ::testing::Test {
  protected:
    TableTest() { std::setlocale(LC_CTYPE, "C.UTF-8"); }
};

Words LinesOf(const std::string& text)
{
    Words lines(1);
    for (const char character : text) {
        if (character == '\n') {
            lines.emplace_back();
        } else {
            lines.back() += character;
        }
    }
    return lines;
}

Column Shows(const char* title, const char* key)
{
    return {title, [key](const Json::Value& object) { return object[key].asString(); }};
}

Json::Value Rows(const std::string& text)
{
    Json::Value rows;
    EXPECT_TRUE(OrvaDRCore::fromString(rows, text));
    return rows;
}

TEST_F(TableTest, LeavesOutColumnsWithNothingToShow)
{
    const Json::Value rows = Rows(R"([{"a":"1","b":""},{"a":"22","b":""}])");
    EXPECT_EQ(FormatTable({Shows("A", "a"), Shows("B", "b")}, rows, {}), "A\n1\n22\n");
    EXPECT_EQ(FormatTable({Shows("A", "a")}, Rows("[]"), {}), "");
}

TEST_F(TableTest, WrapsTheWidestColumns)
{
    const Json::Value rows =
        Rows(R"([{"a":"short","b":"one two three four","c":"/a/path/without/any/blank"}])");
    const std::vector<Column> columns{Shows("A", "a"), Shows("B", "b"), Shows("C", "c")};
    EXPECT_EQ(FormatTable(columns, rows, Screen{30, false}),
              "A      B           C\n"
              "short  one two     /a/path/wit\n"
              "       three four  hout/any/bl\n"
              "                   ank\n");
    // A screen that is too narrow for any table.
    EXPECT_THAT(FormatTable(columns, rows, Screen{1, false}), HasSubstr("/a/path/"));
}

TEST_F(TableTest, AlignsWideCharacters)
{
    const Json::Value rows =
        Rows("[{\"a\":\"\u00fc\",\"b\":\"x\"},{\"a\":\"\u4e2d\",\"b\":\"y\"}]");
    EXPECT_EQ(FormatTable({Shows("A", "a"), Shows("B", "b")}, rows, {}),
              "A   B\n\u00fc   x\n\u4e2d  y\n");
}

TEST_F(TableTest, ColoursStates)
{
    const Json::Value rows = Rows(R"([{"s":"fresh"},{"s":"stale"},{"s":"damaged"}])");
    EXPECT_EQ(FormatTable({Shows("STATE", "s")}, rows, Screen{0, true}),
              "STATE\n\033[32mfresh\033[0m\n\033[33mstale\033[0m\n\033[31mdamaged\033[0m\n");
}

TEST_F(TableTest, EscapesWhatATerminalWouldObey)
{
    EXPECT_EQ(Printable("a\\b\n\r\t\x1b[31m\x7f"), "a\\\\b\\n\\r\\t\\x1b[31m\\x7f");
    EXPECT_EQ(Printable(std::string("\0", 1)), "\\x00");
    EXPECT_EQ(Printable("Z\u00fcrich \u4e2d \U0001f600"), "Z\u00fcrich \u4e2d \U0001f600");
    EXPECT_EQ(Printable("\u009b31m \u202e \u200b \ufeff"),
              "\\u{9b}31m \\u{202e} \\u{200b} \\u{feff}");
}

TEST_F(TableTest, EscapesBytesThatAreNotUtf8)
{
    EXPECT_EQ(Printable("\xff \x80 \xc3"), "\\xff \\x80 \\xc3");
    EXPECT_EQ(Printable("\xc0\x80 \xe0\x80\x80"), "\\xc0\\x80 \\xe0\\x80\\x80");  // too long
    EXPECT_EQ(Printable("\xed\xa0\x80"), "\\xed\\xa0\\x80");                      // a surrogate
    EXPECT_EQ(Printable("\xf4\x90\x80\x80 \xf8"), "\\xf4\\x90\\x80\\x80 \\xf8");  // too large
    EXPECT_EQ(Printable("\xe4\xb8x"), "\\xe4\\xb8x");
}

TEST_F(TableTest, ReplacesBytesThatAreNotUtf8InJson)
{
    Json::Value value;
    value["a\xff"].append("\xc3\xbc\x80");
    value["b"] = 1;
    EXPECT_EQ(OrvaDRCore::toString(Orvadr::ToUtf8(value)),
              "{\"a\ufffd\":[\"\u00fc\ufffd\"],\"b\":1}");
}

TEST_F(TableTest, ShowsDurationsAndSizes)
{
    EXPECT_EQ(Orvadr::DurationText(0.9), "0s");
    EXPECT_EQ(Orvadr::DurationText(59), "59s");
    EXPECT_EQ(Orvadr::DurationText(-65), "-1m 05s");
    EXPECT_EQ(Orvadr::DurationText(2 * 3600 + 14 * 60 + 59), "2h 14m");
    EXPECT_EQ(Orvadr::DurationText(3 * 86400 + 4 * 3600), "3d 04h");
    EXPECT_EQ(Orvadr::SizeText(999), "999 B");
    EXPECT_EQ(Orvadr::SizeText(1234), "1.2 kB");
    EXPECT_EQ(Orvadr::SizeText(999'999), "1.0 MB");
    EXPECT_EQ(Orvadr::SizeText(1e30), "1000000000000000.0 PB");
}

TEST_F(TableTest, ShowsLocalTime)
{
    ::setenv("TZ", "UTC-5:45", 1);
    ::tzset();
    EXPECT_EQ(Orvadr::TimeText(0), "1970-01-01 05:45:00");
    EXPECT_EQ(Orvadr::TimeText(9'000'000'000'000'000'000), "9000000000000000000");
    ::unsetenv("TZ");
    ::tzset();
}

TEST(TerminalTest, FitsTheTerminal)
{
    for (const std::uint16_t columns : {std::uint16_t{80}, std::uint16_t{40}}) {
        const ProgramResult result = RunInTerminal(CommandLine({"error"}), columns);
        EXPECT_EQ(result.code, AllWell);
        EXPECT_THAT(LinesOf(result.out), Each(SizeIs(Le(std::size_t{columns}))));
        EXPECT_THAT(result.out, HasSubstr("out of memory"));
    }
}

TEST(TerminalTest, ShowsLongNamesOnSeveralLines)
{
    const std::string name = "/" + std::string(150, 'x') + "/" + std::string(100, 'y');
    const ProgramResult result = RunInTerminal(CommandLine({"cache", name}), 80, {"NO_COLOR=1"});
    EXPECT_EQ(result.code, NotWell);
    const Words lines = LinesOf(result.out);
    EXPECT_THAT(lines, Each(SizeIs(Le(80U))));
    ASSERT_GE(lines.size(), 5U);
    EXPECT_EQ(lines[0], "STATE    FILE");
    EXPECT_EQ(lines[1], "missing  /" + std::string(70, 'x'));
}

TEST(TerminalTest, HasColourUnlessThatIsNotWanted)
{
    const Words line = CommandLine({"cache", "/no such file"});
    const std::string colour = "\033[31mmissing\033[0m";
    EXPECT_THAT(RunInTerminal(line, 80).out, HasSubstr(colour));
    EXPECT_THAT(RunInTerminal(line, 80, {"NO_COLOR="}).out, HasSubstr(colour));
    EXPECT_THAT(RunInTerminal(line, 80, {"NO_COLOR=1"}).out, Not(HasSubstr("\033")));
    EXPECT_THAT(RunInTerminal(line, 80, {"TERM=dumb"}).out, Not(HasSubstr("\033")));
    EXPECT_THAT(RunOrvadr({"cache", "/no such file"}).out, Not(HasSubstr("\033")));
    const Words json = CommandLine({"--json", "cache", "/no such file"});
    EXPECT_THAT(RunInTerminal(json, 80).out, Not(HasSubstr("\033")));
}

TEST(TerminalTest, WritesLongLinesIntoAPipe)
{
    const ProgramResult result = RunOrvadr({"error", std::string(300, 'x')});
    EXPECT_THAT(result.out, HasSubstr(std::string(300, 'x')));
}

}  // namespace
