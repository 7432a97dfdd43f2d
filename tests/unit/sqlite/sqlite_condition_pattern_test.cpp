// SqliteContains and SqliteBeginsWith: their texts, and what they match.
#include <orvadrcore/sqlite_condition.h>

#include <string>
#include <vector>

#include "support/fixtures/log_capture.h"
#include "support/fixtures/plain_db.h"

namespace {

using OrvaDRCore::SqliteAnd;
using OrvaDRCore::SqliteBeginsWith;
using OrvaDRCore::SqliteContains;

using Names = std::vector<std::string>;

// How the types appear in the test names.
struct TypeNames {
    template <class T>
    static std::string GetName(int /*index*/)
    {
        return std::is_same_v<T, SqliteContains> ? "Contains" : "BeginsWith";
    }
};

template <class Condition>
class SqlitePatternTest : public LoggedTest {
  protected:
    SqlitePatternTest() : LoggedTest("sqlite_condition.cpp") {}

    // Whether SQLite finds that a text meets the condition.
    static bool Meets(const std::string& text, const Condition& condition)
    {
        PlainDb db(":memory:");
        db.Run("CREATE TABLE t (name TEXT)");
        db.Run("INSERT INTO t VALUES ('" + OrvaDRCore::SqliteValue::EscapeText(text) + "')");
        return db.Run("SELECT count(*) FROM t WHERE " + condition.GetCondition()) == "1";
    }

    static constexpr bool IsContains = std::is_same_v<Condition, SqliteContains>;
};
using Patterns = ::testing::Types<SqliteContains, SqliteBeginsWith>;
TYPED_TEST_SUITE(SqlitePatternTest, Patterns, TypeNames);

TYPED_TEST(SqlitePatternTest, WildcardsBackslashesAndQuotesAreEscaped)
{
    struct Row {
        std::string text;
        std::string pattern;
    };
    const std::string before = this->IsContains ? "name LIKE '%" : "name LIKE '";
    for (const Row& row : std::vector<Row>{
             {"50%", R"(50\%)"},
             {"a_b", R"(a\_b)"},
             {R"(C:\)", R"(C:\\)"},
             {"O'Brien", "O''Brien"},
             {R"('%_\')", R"(''\%\_\\'')"},
             {"[a]*?", "[a]*?"},
             {"%s%n", R"(\%s\%n)"},
             {"\xc3\xa4\xff\n", "\xc3\xa4\xff\n"},
             {"", ""},
         }) {
        const TypeParam condition("name", row.text);
        EXPECT_TRUE(condition.IsValid());
        EXPECT_EQ(condition.GetCondition(), before + row.pattern + R"(%' ESCAPE '\')");
    }
    EXPECT_EQ(TypeParam("lower(name)", "x").GetCondition(),
              "lower(" + before.substr(0, 4) + ")" + before.substr(4) + R"(x%' ESCAPE '\')");
}

TYPED_TEST(SqlitePatternTest, EveryTextMatchesItselfAndOnlyTextsThatHaveIt)
{
    const Names names{"50%", "a_b",  R"(C:\dir\)", "O'Brien's NAS", "'; DROP TABLE t; --", "%",
                      "_",   R"(\)", "''",         R"(\%)",         "\xc3\xa4\xff\n",      "axb",
                      "501"};
    for (const std::string& name : names) {
        for (const std::string& text : names) {
            const std::size_t at = name.find(text);
            EXPECT_EQ(this->Meets(name, TypeParam("name", text)),
                      this->IsContains ? at != std::string::npos : at == 0)
                << name << " with " << text;
        }
    }
}

TYPED_TEST(SqlitePatternTest, OnlyContainsMatchesTheMiddleOfAText)
{
    EXPECT_EQ(this->Meets("backup-01", TypeParam("name", "up-0")), this->IsContains);
    EXPECT_TRUE(this->Meets("backup-01", TypeParam("name", "backup")));
    EXPECT_FALSE(this->Meets("backup-01", TypeParam("name", "backup-01 ")));
}

// SQLite's LIKE does so, as the header says.
TYPED_TEST(SqlitePatternTest, TheCaseOfAsciiLettersDoesNotMatter)
{
    EXPECT_TRUE(this->Meets("BackUp", TypeParam("name", "backU")));
    EXPECT_FALSE(this->Meets("\xc3\x84", TypeParam("name", "\xc3\xa4")));
}

TYPED_TEST(SqlitePatternTest, TheEmptyTextMatchesEverythingButNull)
{
    const TypeParam condition("name", "");
    EXPECT_TRUE(this->Meets("", condition));
    EXPECT_TRUE(this->Meets("x", condition));
    PlainDb db(":memory:");
    db.Run("CREATE TABLE t (name TEXT); INSERT INTO t VALUES (NULL)");
    EXPECT_EQ(db.Run("SELECT count(*) FROM t WHERE " + condition.GetCondition()), "0");
}

TYPED_TEST(SqlitePatternTest, AnEmptyColumnIsRefused)
{
    const std::string before = this->IsContains ? "%" : "";
    const LogLine line = Err("SetValue", "Bad lvalue[] or rvalue['" + before + R"(it''s\%%'])");
    const TypeParam built("", "it's%");
    this->ExpectLines({line});
    EXPECT_FALSE(built.IsValid());
    EXPECT_EQ(built.GetCondition(), "");

    TypeParam set("name", "x");
    const std::string text = set.GetCondition();
    EXPECT_FALSE(set.SetValue("", "it's%"));
    this->ExpectLines({line});
    EXPECT_EQ(set.GetCondition(), text);
}

// LIKE would end at the zero byte and match other texts.
TYPED_TEST(SqlitePatternTest, ATextWithAZeroByteIsRefused)
{
    const LogLine line = Err("SetValue", "Bad lvalue[name] or rvalue[]");
    for (const std::string& text : {std::string("a\0b", 3), std::string(1, '\0')}) {
        const TypeParam built("name", text);
        this->ExpectLines({line});
        EXPECT_FALSE(built.IsValid());

        TypeParam set("name", "x");
        const std::string before = set.GetCondition();
        EXPECT_FALSE(set.SetValue("name", text));
        this->ExpectLines({line});
        EXPECT_EQ(set.GetCondition(), before);
    }
}

TYPED_TEST(SqlitePatternTest, SettingReplacesTheText)
{
    TypeParam condition("name", "x");
    EXPECT_TRUE(condition.SetValue("note", "y"));
    EXPECT_EQ(condition.GetCondition(), TypeParam("note", "y").GetCondition());
    EXPECT_TRUE(condition.SetValue("note", condition.GetCondition()));  // its own text
    EXPECT_EQ(condition.GetCondition(),
              TypeParam("note", TypeParam("note", "y").GetCondition()).GetCondition());
}

TYPED_TEST(SqlitePatternTest, ItIsAnOperandLikeAnyOther)
{
    const SqliteAnd both(TypeParam("name", "%").GetCondition(), "id=3");
    EXPECT_EQ(both.GetCondition(), "(" + TypeParam("name", "%").GetCondition() + ") AND (id=3)");
}

}  // namespace
