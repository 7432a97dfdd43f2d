#include <orvadrcore/sqlite_condition.h>

#include <cmath>
#include <type_traits>

#include "support/fixtures/log_capture.h"

// Conditions have no virtual destructor by contract, so the one derived here has none either.
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"

namespace {

using OrvaDRCore::SqliteAnd;
using OrvaDRCore::SqliteBeginsWith;
using OrvaDRCore::SqliteCondition;
using OrvaDRCore::SqliteContains;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteGreater;
using OrvaDRCore::SqliteGreaterEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteInFamily;
using OrvaDRCore::SqliteLess;
using OrvaDRCore::SqliteLessEqual;
using OrvaDRCore::SqliteNotEqual;
using OrvaDRCore::SqliteNotIn;
using OrvaDRCore::SqliteOr;
using OrvaDRCore::SqliteValue;

using Values = std::vector<SqliteValue>;

// The contract: polymorphic values without a virtual destructor.
template <class... Conditions>
constexpr bool ArePlain = (... && (std::is_polymorphic_v<Conditions> &&
                                   !std::has_virtual_destructor_v<Conditions> &&
                                   std::is_copy_constructible_v<Conditions> &&
                                   std::is_copy_assignable_v<Conditions>));
static_assert(ArePlain<SqliteCondition, SqliteEqual, SqliteNotEqual, SqliteAnd, SqliteOr,
                       SqliteInFamily, SqliteIn, SqliteNotIn>);
static_assert(ArePlain<SqliteLess, SqliteLessEqual, SqliteGreater, SqliteGreaterEqual,
                       SqliteContains, SqliteBeginsWith>);

static_assert(std::is_base_of_v<SqliteInFamily, SqliteIn>);
static_assert(std::is_base_of_v<SqliteInFamily, SqliteNotIn>);

constexpr const char* NullText = nullptr;

// Holds the number but is not valid, because an assignment does not copy validity.
SqliteValue AssignedOnly(int number)
{
    SqliteValue value;
    value = SqliteValue(number);
    return value;
}

class SqliteConditionTest : public LoggedTest {
  protected:
    SqliteConditionTest() : LoggedTest("sqlite_condition.cpp") {}

    // Asks for validity through the base, as the commands do.
    static void ExpectCondition(const SqliteCondition& condition, bool valid,
                                const std::string& text)
    {
        EXPECT_EQ(condition.IsValid(), valid) << text;
        EXPECT_EQ(condition.GetCondition(), text);
    }

    void ExpectRefusal(const std::string& message) { ExpectLines({Err("SetValue", message)}); }
};

TEST_F(SqliteConditionTest, AnEmptyConditionIsNotValid)
{
    ExpectCondition(SqliteCondition(), false, "");
    ExpectCondition(SqliteCondition(""), false, "");
    ExpectCondition(SqliteEqual(), false, "");
    ExpectCondition(SqliteNotEqual(), false, "");
    ExpectCondition(SqliteAnd(), false, "");
    ExpectCondition(SqliteOr(), false, "");
    ExpectCondition(SqliteLess(), false, "");
    ExpectCondition(SqliteLessEqual(), false, "");
    ExpectCondition(SqliteGreater(), false, "");
    ExpectCondition(SqliteGreaterEqual(), false, "");
    ExpectCondition(SqliteContains(), false, "");
    ExpectCondition(SqliteBeginsWith(), false, "");
}

TEST_F(SqliteConditionTest, AFinishedTextIsTakenAsItIs)
{
    ExpectCondition(SqliteCondition("x > 5"), true, "x > 5");
    ExpectCondition(SqliteCondition(" "), true, " ");
    ExpectCondition(SqliteCondition("no ' SQL ;%s"), true, "no ' SQL ;%s");
}

TEST_F(SqliteConditionTest, AComparisonHasNoBlanks)
{
    ExpectCondition(SqliteEqual("id", 3), true, "id=3");
    ExpectCondition(SqliteEqual("id", -3), true, "id=-3");
    ExpectCondition(SqliteEqual("id", 4000000000U), true, "id=4000000000");
    ExpectCondition(SqliteEqual("id", "abc"), true, "id='abc'");
    ExpectCondition(SqliteEqual("id", std::string("abc")), true, "id='abc'");
    ExpectCondition(SqliteEqual("id", ""), true, "id=''");
    ExpectCondition(SqliteEqual("id", true), true, "id=1");
    ExpectCondition(SqliteEqual("owner", "it's"), true,
                    "owner='it's'");  // the contract: not escaped
    ExpectCondition(SqliteEqual("lower(a b)", 1), true, "lower(a b)=1");
    ExpectCondition(SqliteNotEqual("id", 3), true, "id!=3");
    ExpectCondition(SqliteNotEqual("state", 0), true, "state!=0");
    ExpectCondition(SqliteNotEqual("state", false), true, "state!=0");
    ExpectCondition(SqliteNotEqual("name", "abc"), true, "name!='abc'");
    ExpectCondition(SqliteLess("id", 3), true, "id<3");
    ExpectCondition(SqliteLessEqual("id", -3), true, "id<=-3");
    ExpectCondition(SqliteGreater("id", 4000000000U), true, "id>4000000000");
    ExpectCondition(SqliteGreaterEqual("name", "abc"), true, "name>='abc'");
}

TEST_F(SqliteConditionTest, AComparisonTakesEveryKind)
{
    ExpectCondition(SqliteEqual("id", SqliteValue::Text("it's")), true, "id='it''s'");
    ExpectCondition(SqliteEqual("id", SqliteValue::Integer(5'000'000'000)), true, "id=5000000000");
    ExpectCondition(SqliteNotEqual("id", SqliteValue::Real(5)), true, "id!=5.0");
    ExpectCondition(SqliteNotEqual("id", SqliteValue::Blob("o")), true, "id!=X'6f'");
}

TEST_F(SqliteConditionTest, NullIsComparedByIs)
{
    ExpectCondition(SqliteEqual("note", SqliteValue::Null()), true, "note IS NULL");
    ExpectCondition(SqliteNotEqual("note", SqliteValue::Null()), true, "note IS NOT NULL");
    // What SQLite stores for not-a-number.
    ExpectCondition(SqliteEqual("load", SqliteValue::Real(std::nan(""))), true, "load IS NULL");
    ExpectCondition(SqliteEqual("note", "NULL"), true, "note='NULL'");
    ExpectCondition(SqliteIn("note", Values{SqliteValue::Null(), SqliteValue::Text("'")}), true,
                    "note IN ( NULL,'''' )");
    ExpectCondition(SqliteEqual("", SqliteValue::Null()), false, "");
    ExpectRefusal("Bad lvalue[] or rvalue[NULL]");
}

// SQL has no rows that are less than NULL.
TEST_F(SqliteConditionTest, OtherComparisonsWriteNullAsItIs)
{
    ExpectCondition(SqliteLess("note", SqliteValue::Null()), true, "note<NULL");
    ExpectCondition(SqliteGreaterEqual("note", SqliteValue::Null()), true, "note>=NULL");
    ExpectCondition(SqliteGreater("note", SqliteValue::Text("it's")), true, "note>'it''s'");
    ExpectCondition(SqliteLessEqual("load", SqliteValue::Real(0.5)), true, "load<=0.5");
}

TEST_F(SqliteConditionTest, AJunctionPutsItsOperandsInParentheses)
{
    const SqliteEqual left("id", 3);
    const SqliteNotEqual right("state", 0);
    ExpectCondition(SqliteAnd(left.GetCondition(), right.GetCondition()), true,
                    "(id=3) AND (state!=0)");
    ExpectCondition(SqliteOr(left.GetCondition(), right.GetCondition()), true,
                    "(id=3) OR (state!=0)");
    ExpectCondition(SqliteAnd("a=1", SqliteOr("b=2", "c=3").GetCondition()), true,
                    "(a=1) AND ((b=2) OR (c=3))");
}

// How the types appear in the test names.
struct TypeNames {
    template <class T>
    static std::string GetName(int /*index*/)
    {
        if (std::is_same_v<T, SqliteEqual>) return "Equal";
        if (std::is_same_v<T, SqliteNotEqual>) return "NotEqual";
        if (std::is_same_v<T, SqliteLess>) return "Less";
        if (std::is_same_v<T, SqliteLessEqual>) return "LessEqual";
        if (std::is_same_v<T, SqliteGreater>) return "Greater";
        if (std::is_same_v<T, SqliteGreaterEqual>) return "GreaterEqual";
        if (std::is_same_v<T, SqliteAnd>) return "And";
        return "Or";
    }
};

// Tests of the six comparisons; SqliteAnd and SqliteOr follow below.
template <class Condition>
class SqliteComparisonTest : public SqliteConditionTest {
};
using Comparisons = ::testing::Types<SqliteEqual, SqliteNotEqual, SqliteLess, SqliteLessEqual,
                                     SqliteGreater, SqliteGreaterEqual>;
TYPED_TEST_SUITE(SqliteComparisonTest, Comparisons, TypeNames);

TYPED_TEST(SqliteComparisonTest, SettingReplacesTheText)
{
    TypeParam condition("a", 1);
    EXPECT_TRUE(condition.SetValue("b", "x"));
    this->ExpectCondition(condition, true, TypeParam("b", "x").GetCondition());
}

TYPED_TEST(SqliteComparisonTest, BadOperandsAreRefused)
{
    struct Row {
        const char* lvalue;
        SqliteValue value;
        const char* message;
    };
    const std::vector<Row> rows{
        {"", 1, "Bad lvalue[] or rvalue[1]"},
        {"", "%s%n", "Bad lvalue[] or rvalue['%s%n']"},
        {"", {}, "Bad lvalue[] or rvalue[]"},
        {"id", {}, "Bad lvalue[id] or rvalue[]"},
        {"id", NullText, "Bad lvalue[id] or rvalue[]"},
        {"id", AssignedOnly(7), "Bad lvalue[id] or rvalue[7]"},
    };
    for (const Row& row : rows) {
        const TypeParam built(row.lvalue, row.value);
        this->ExpectRefusal(row.message);
        this->ExpectCondition(built, false, "");

        TypeParam set("a", 1);
        EXPECT_FALSE(set.SetValue(row.lvalue, row.value)) << row.message;
        this->ExpectRefusal(row.message);
        this->ExpectCondition(set, true, TypeParam("a", 1).GetCondition());
    }
}

template <class Condition>
class SqliteJunctionTest : public SqliteConditionTest {
};
using Junctions = ::testing::Types<SqliteAnd, SqliteOr>;
TYPED_TEST_SUITE(SqliteJunctionTest, Junctions, TypeNames);

// The contract appends here and replaces elsewhere.
TYPED_TEST(SqliteJunctionTest, SettingAgainAppendsToTheText)
{
    TypeParam condition("a", "b");
    EXPECT_TRUE(condition.SetValue("c", "d"));
    this->ExpectCondition(condition, true,
                          TypeParam("a", "b").GetCondition() + TypeParam("c", "d").GetCondition());
}

TYPED_TEST(SqliteJunctionTest, ItsOwnTextCanBeAnOperand)
{
    TypeParam condition("a", "b");
    const std::string text = condition.GetCondition();
    EXPECT_TRUE(condition.SetValue(condition.GetCondition(), condition.GetCondition()));
    this->ExpectCondition(condition, true, text + TypeParam(text, text).GetCondition());
}

TYPED_TEST(SqliteJunctionTest, AnEmptyOperandIsRefused)
{
    struct Row {
        const char* left;
        const char* right;
        const char* message;
    };
    const std::vector<Row> rows{
        {"", "b", "Bad lvalue[] or rvalue[b]"},
        {"a", "", "Bad lvalue[a] or rvalue[]"},
        {"", "", "Bad lvalue[] or rvalue[]"},
        {"%s%n", "", "Bad lvalue[%s%n] or rvalue[]"},
    };
    for (const Row& row : rows) {
        const TypeParam built(row.left, row.right);
        this->ExpectRefusal(row.message);
        this->ExpectCondition(built, false, "");

        TypeParam set("c", "d");
        EXPECT_FALSE(set.SetValue(row.left, row.right)) << row.message;
        this->ExpectRefusal(row.message);
        this->ExpectCondition(set, true, TypeParam("c", "d").GetCondition());
    }
}

TEST_F(SqliteConditionTest, AListOfValuesIsWrittenInParentheses)
{
    ExpectCondition(SqliteIn("id", Values{1, 2, 3}), true, "id IN ( 1,2,3 )");
    ExpectCondition(SqliteIn("id", Values{7}), true, "id IN ( 7 )");
    ExpectCondition(SqliteIn("id", Values{1, 4000000000U, "x", true}), true,
                    "id IN ( 1,4000000000,'x',1 )");
    ExpectCondition(SqliteNotIn("name", Values{"a", "b"}), true, "name NOT IN ( 'a','b' )");
    ExpectCondition(SqliteInFamily("IN", "id", Values{1}), true, "id IN ( 1 )");
    ExpectCondition(SqliteInFamily("NOT IN", "id", Values{1}), true, "id NOT IN ( 1 )");
}

TEST_F(SqliteConditionTest, AnEmptyListIsAccepted)
{
    ExpectCondition(SqliteIn("id", Values{}), true, "id IN (  )");
    ExpectCondition(SqliteNotIn("id", Values{}), true, "id NOT IN (  )");
}

TEST_F(SqliteConditionTest, ASubqueryIsWrittenInParentheses)
{
    ExpectCondition(SqliteIn("id", "SELECT id FROM jobs"), true, "id IN ( SELECT id FROM jobs )");
    ExpectCondition(SqliteNotIn("id", "1,2"), true, "id NOT IN ( 1,2 )");
    ExpectCondition(SqliteInFamily("IN", "id", "it's"), true, "id IN ( it's )");
}

// The contract looks at the keyword, not at the text.
TEST_F(SqliteConditionTest, AListConditionIsValidBeforeItHasAText)
{
    ExpectCondition(SqliteIn(), true, "");
    ExpectCondition(SqliteNotIn(), true, "");
    ExpectCondition(SqliteInFamily("IN"), true, "");
    ExpectCondition(SqliteInFamily("NOT IN"), true, "");
}

TEST_F(SqliteConditionTest, SettingAListReplacesTheText)
{
    SqliteNotIn condition("a", Values{1});
    EXPECT_TRUE(condition.SetValue("b", Values{2, 3}));
    ExpectCondition(condition, true, "b NOT IN ( 2,3 )");
    EXPECT_TRUE(condition.SetValue("c", "SELECT 4"));
    ExpectCondition(condition, true, "c NOT IN ( SELECT 4 )");
    EXPECT_TRUE(condition.SetValue("d", Values{}));
    ExpectCondition(condition, true, "d NOT IN (  )");
}

TEST_F(SqliteConditionTest, ItsOwnTextCanBeAnOperandOfAComparisonAndOfAList)
{
    SqliteEqual equal("id % 1000000007", 3);
    EXPECT_TRUE(equal.SetValue(equal.GetCondition(), true));
    ExpectCondition(equal, true, "id % 1000000007=3=1");
    SqliteIn in("id", "SELECT id FROM jobs");
    EXPECT_TRUE(in.SetValue("id", in.GetCondition()));
    ExpectCondition(in, true, "id IN ( id IN ( SELECT id FROM jobs ) )");
    EXPECT_TRUE(in.SetValue(in.GetCondition(), Values{1}));
    ExpectCondition(in, true, "id IN ( id IN ( SELECT id FROM jobs ) ) IN ( 1 )");
}

TEST_F(SqliteConditionTest, AnUnknownKeywordRefusesEveryValue)
{
    for (const char* keyword :
         {"", "in", "In", "not in", " IN", "IN ", "NOT  IN", "NOTIN", "LIKE", "%s%n"}) {
        const std::string message = "Bad keyword [" + std::string(keyword) + "]";
        SqliteInFamily condition(keyword);
        ExpectLines({});
        EXPECT_FALSE(condition.SetValue("id", Values{1}));
        ExpectRefusal(message);
        EXPECT_FALSE(condition.SetValue("id", "1"));
        ExpectRefusal(message);
        // The keyword is checked first, and only one line is logged.
        EXPECT_FALSE(condition.SetValue("", Values{SqliteValue()}));
        ExpectRefusal(message);
        EXPECT_FALSE(condition.SetValue("", ""));
        ExpectRefusal(message);
        ExpectCondition(condition, false, "");

        ExpectCondition(SqliteInFamily(keyword, "id", Values{1}), false, "");
        ExpectRefusal(message);
        ExpectCondition(SqliteInFamily(keyword, "id", "1"), false, "");
        ExpectRefusal(message);
    }
}

TEST_F(SqliteConditionTest, AListWithoutAColumnIsRefused)
{
    SqliteIn condition("id", Values{1});
    EXPECT_FALSE(condition.SetValue("", Values{2}));
    ExpectRefusal("Bad lvalue[]");
    EXPECT_FALSE(condition.SetValue("", Values{SqliteValue()}));
    ExpectRefusal("Bad lvalue[]");
    ExpectCondition(condition, true, "id IN ( 1 )");

    ExpectCondition(SqliteNotIn("", Values{2}), true, "");
    ExpectRefusal("Bad lvalue[]");
}

// By contract it is empty but valid.
TEST_F(SqliteConditionTest, ABadValueInAListEmptiesTheText)
{
    struct Row {
        Values values;
        const char* message;
    };
    const std::vector<Row> rows{
        {{1, SqliteValue(), 3}, "Invalid rvalue []"},
        {{SqliteValue()}, "Invalid rvalue []"},
        {{1, 2, SqliteValue(NullText)}, "Invalid rvalue []"},
        {{1, AssignedOnly(7), SqliteValue()}, "Invalid rvalue [7]"},
    };
    for (const Row& row : rows) {
        ExpectCondition(SqliteIn("id", row.values), true, "");
        ExpectRefusal(row.message);

        SqliteNotIn condition("id", Values{1});
        EXPECT_FALSE(condition.SetValue("id", row.values));
        ExpectRefusal(row.message);
        ExpectCondition(condition, true, "");
    }
}

TEST_F(SqliteConditionTest, ASubqueryWithAnEmptyOperandIsRefused)
{
    struct Row {
        const char* lvalue;
        const char* value;
        const char* message;
    };
    const std::vector<Row> rows{
        {"", "1", "Bad lvalue[] or value[1]"},
        {"id", "", "Bad lvalue[id] or value[]"},
        {"", "", "Bad lvalue[] or value[]"},
    };
    for (const Row& row : rows) {
        ExpectCondition(SqliteIn(row.lvalue, row.value), true, "");
        ExpectRefusal(row.message);

        SqliteNotIn condition("a", "2");
        EXPECT_FALSE(condition.SetValue(row.lvalue, row.value));
        ExpectRefusal(row.message);
        ExpectCondition(condition, true, "a NOT IN ( 2 )");
    }
}

TEST_F(SqliteConditionTest, ACopyIsIndependent)
{
    const SqliteEqual original("a", 1);
    SqliteEqual copy(original);
    EXPECT_TRUE(copy.SetValue("b", 2));
    ExpectCondition(copy, true, "b=2");
    ExpectCondition(original, true, "a=1");

    SqliteIn list;
    list = SqliteIn("a", Values{1});
    EXPECT_TRUE(list.SetValue("b", "2"));
    ExpectCondition(list, true, "b IN ( 2 )");
}

// A caller's own kind of list, which decides by itself whether it is valid.
// NOLINTNEXTLINE(cppcoreguidelines-virtual-class-destructor)
class AnyKeyword final : public SqliteInFamily {
  public:
    AnyKeyword(const std::string& word, bool answer) : SqliteInFamily(word), valid_(answer) {}
    bool IsValid() const override { return valid_; }

  private:
    bool valid_;
};

TEST_F(SqliteConditionTest, ASubclassDecidesWhetherItIsValid)
{
    AnyKeyword accepting("GLOB", true);
    EXPECT_TRUE(accepting.SetValue("id", Values{1}));
    ExpectCondition(accepting, true, "id GLOB ( 1 )");
    EXPECT_TRUE(accepting.SetValue("id", "2"));
    ExpectCondition(accepting, true, "id GLOB ( 2 )");

    AnyKeyword refusing("IN", false);
    EXPECT_FALSE(refusing.SetValue("id", Values{1}));
    ExpectRefusal("Bad keyword [IN]");
    EXPECT_FALSE(refusing.SetValue("id", "2"));
    ExpectRefusal("Bad keyword [IN]");
    ExpectCondition(refusing, false, "");
}

}  // namespace
