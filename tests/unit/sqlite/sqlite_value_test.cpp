#include <orvadrcore/sqlite_value.h>

#include <gmock/gmock.h>

#include <climits>
#include <optional>
#include <type_traits>
#include <utility>

#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::SqliteRecord;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using ::testing::ElementsAre;

constexpr const char* NullText = nullptr;

// A value can be read as one of six types and is not converted to others.
template <class T, class = void>
constexpr bool CanBeReadAs = false;
template <class T>
constexpr bool CanBeReadAs<
    T, std::void_t<decltype(std::declval<const SqliteValue&>().GetValue(std::declval<T&>()))>> =
    true;
static_assert(CanBeReadAs<std::string> && CanBeReadAs<unsigned int> && CanBeReadAs<int> &&
              CanBeReadAs<bool> && CanBeReadAs<std::int64_t> && CanBeReadAs<double>);
static_assert(!CanBeReadAs<float> && !CanBeReadAs<short> && !CanBeReadAs<unsigned long> &&
              !CanBeReadAs<char>);

// The value read as T; nothing when the read fails, which must leave the output unchanged.
template <class T>
std::optional<T> Read(const SqliteValue& value, T before)
{
    T out = before;
    if (value.GetValue(out)) return out;
    EXPECT_EQ(out, before);
    return std::nullopt;
}

std::optional<std::string> ReadText(const SqliteValue& value)
{
    return Read<std::string>(value, "before");
}

std::optional<int> ReadInt(const SqliteValue& value)
{
    return Read(value, -77);
}

std::optional<unsigned int> ReadUnsigned(const SqliteValue& value)
{
    return Read(value, 77U);
}

// Reads twice, with different outputs, so that a wrong write shows whatever it wrote.
std::optional<bool> ReadBool(const SqliteValue& value)
{
    const std::optional<bool> first = Read(value, false);
    if (!first) return Read(value, true);
    return first;
}

// Built from a number, then assigned an empty value.
SqliteValue Emptied()
{
    SqliteValue value(1);
    value = SqliteValue();
    return value;
}

// Built empty, then assigned a number.
SqliteValue AssignedOnly(int number)
{
    SqliteValue value;
    value = SqliteValue(number);
    return value;
}

class SqliteValueTest : public LoggedTest {
  protected:
    SqliteValueTest() : LoggedTest("sqlite_value.cpp") {}
};

TEST_F(SqliteValueTest, ADefaultConstructedValueIsNotValid)
{
    const SqliteValue value;
    EXPECT_FALSE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "");
}

TEST_F(SqliteValueTest, AValueIsWrittenAsALiteral)
{
    struct Row {
        SqliteValue value;
        std::string literal;
    };
    const std::vector<Row> rows{
        {42, "42"},
        {-7, "-7"},
        {0, "0"},
        {INT_MAX, "2147483647"},
        {INT_MIN, "-2147483648"},
        {0U, "0"},
        {2147483648U, "2147483648"},
        {UINT_MAX, "4294967295"},
        {true, "1"},
        {false, "0"},
        {std::string("abc"), "'abc'"},
        {std::string(), "''"},
        {std::string("O'Brien"), "'O'Brien'"},  // the contract: not escaped
        {std::string("it's"), "'it's'"},
        {std::string("'"), "'''"},
        {std::string("a\0b", 3), std::string("'a\0b'", 5)},
        {std::string("\xc3\xa4\xff\n"), "'\xc3\xa4\xff\n'"},
    };
    for (const Row& row : rows) {
        EXPECT_TRUE(row.value.IsValid()) << row.literal;
        EXPECT_EQ(row.value.ToFormatedValue(), row.literal);
    }
}

TEST_F(SqliteValueTest, AStringLiteralIsAText)
{
    const SqliteValue value("abc");
    EXPECT_TRUE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "'abc'");
    EXPECT_EQ(ReadText(value), "abc");
    EXPECT_EQ(SqliteValue("").ToFormatedValue(), "''");
}

TEST_F(SqliteValueTest, ACharacterArrayIsAText)
{
    char buffer[] = "abc";
    char* pointer = buffer;
    EXPECT_EQ(SqliteValue(buffer).ToFormatedValue(), "'abc'");
    EXPECT_EQ(SqliteValue(pointer).ToFormatedValue(), "'abc'");
}

TEST_F(SqliteValueTest, ANullTextIsNotValid)
{
    const SqliteValue value(NullText);
    EXPECT_FALSE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "");
}

TEST_F(SqliteValueTest, EscapingDoublesEveryQuote)
{
    struct Row {
        std::string text;
        std::string escaped;
    };
    const std::vector<Row> rows{
        {"", ""},
        {"abc", "abc"},
        {"it's", "it''s"},
        {"'", "''"},
        {"''", "''''"},
        {"'a'", "''a''"},
        {"\"`\\;--%s", "\"`\\;--%s"},
        {std::string("'\0'\xff", 4), std::string("''\0''\xff", 6)},
    };
    for (const Row& row : rows) EXPECT_EQ(SqliteValue::EscapeText(row.text), row.escaped);
    EXPECT_EQ(SqliteValue(SqliteValue::EscapeText("it's")).ToFormatedValue(), "'it''s'");
}

TEST_F(SqliteValueTest, ATextIsReadFromAText)
{
    EXPECT_EQ(ReadText("abc"), "abc");
    EXPECT_EQ(ReadText(""), "");
    EXPECT_EQ(ReadText("it's"), "it's");
    EXPECT_EQ(ReadText(std::string("a\0b", 3)), std::string("a\0b", 3));
}

TEST_F(SqliteValueTest, AnIntegerIsReadFromEveryIntegerThatFits)
{
    EXPECT_EQ(ReadInt(5), 5);
    EXPECT_EQ(ReadInt(-5), -5);
    EXPECT_EQ(ReadInt(INT_MIN), INT_MIN);
    EXPECT_EQ(ReadInt(INT_MAX), INT_MAX);
    EXPECT_EQ(ReadInt(5U), 5);
    EXPECT_EQ(ReadInt(2147483647U), INT_MAX);

    EXPECT_EQ(ReadUnsigned(5U), 5U);
    EXPECT_EQ(ReadUnsigned(UINT_MAX), UINT_MAX);
    EXPECT_EQ(ReadUnsigned(5), 5U);
    EXPECT_EQ(ReadUnsigned(0), 0U);
    EXPECT_EQ(ReadUnsigned(INT_MAX), 2147483647U);
}

TEST_F(SqliteValueTest, ABooleanIsReadFromABooleanAndFromZeroAndOne)
{
    EXPECT_EQ(ReadBool(true), true);
    EXPECT_EQ(ReadBool(false), false);
    EXPECT_EQ(ReadBool(1), true);
    EXPECT_EQ(ReadBool(0), false);
    EXPECT_EQ(ReadBool(1U), true);
    EXPECT_EQ(ReadBool(0U), false);
}

// A value that cannot be read, and its JSON in the log line.
struct Refused {
    SqliteValue value;
    std::string json;
};

TEST_F(SqliteValueTest, OnlyATextIsReadAsAText)
{
    const std::vector<Refused> rows{
        {1, "1"}, {-1, "-1"}, {UINT_MAX, "4294967295"}, {true, "true"}, {{}, "null"},
    };
    for (const Refused& row : rows) {
        EXPECT_EQ(ReadText(row.value), std::nullopt);
        ExpectLines(
            {Warn("GetValue<std::basic_string<char> >", "[" + row.json + "] is not string")});
    }
}

TEST_F(SqliteValueTest, OnlyAnIntegerIsReadAsAnInteger)
{
    const std::vector<Refused> rows{
        {"12", "\"12\""}, {"", "\"\""},       {true, "true"},      {false, "false"},
        {{}, "null"},     {NullText, "null"}, {Emptied(), "null"},
    };
    for (const Refused& row : rows) {
        EXPECT_EQ(ReadInt(row.value), std::nullopt);
        ExpectLines({Warn("GetValue<int>", "[" + row.json + "] is not int")});
        EXPECT_EQ(ReadUnsigned(row.value), std::nullopt);
        ExpectLines({Warn("GetValue<unsigned int>", "[" + row.json + "] is not int")});
    }
}

TEST_F(SqliteValueTest, AnIntegerThatDoesNotFitIsRefused)
{
    EXPECT_EQ(ReadInt(4000000000U), std::nullopt);
    ExpectLines({Warn("GetValue<int>", "[4000000000] is not int")});
    EXPECT_EQ(ReadInt(2147483648U), std::nullopt);
    ExpectLines({Warn("GetValue<int>", "[2147483648] is not int")});
    EXPECT_EQ(ReadUnsigned(-1), std::nullopt);
    ExpectLines({Warn("GetValue<unsigned int>", "[-1] is not int")});
    EXPECT_EQ(ReadUnsigned(INT_MIN), std::nullopt);
    ExpectLines({Warn("GetValue<unsigned int>", "[-2147483648] is not int")});
}

TEST_F(SqliteValueTest, NothingElseIsReadAsABoolean)
{
    const std::vector<Refused> rows{
        {2, "2"},
        {-1, "-1"},
        {INT_MIN, "-2147483648"},
        {2U, "2"},
        {UINT_MAX, "4294967295"},
        {"true", "\"true\""},
        {"1", "\"1\""},
        {{}, "null"},
    };
    for (const Refused& row : rows) {
        EXPECT_EQ(ReadBool(row.value), std::nullopt);
        // Read twice: see ReadBool.
        const LogLine line = Warn("GetValue<bool>", "[" + row.json + "] is not bool");
        ExpectLines({line, line});
    }
}

TEST_F(SqliteValueTest, ARefusedTextIsLoggedAsJson)
{
    const std::vector<Refused> rows{
        {"a\"b\\c", R"("a\"b\\c")"},
        {"two\nlines\t\x01", R"("two\nlines\t\u0001")"},
        {std::string("a\0b", 3), R"("a\u0000b")"},
        {"it's/%s%n", R"("it's/%s%n")"},
        {"\xc3\xa4\xff", "\"\xc3\xa4\xff\""},
    };
    for (const Refused& row : rows) {
        EXPECT_EQ(ReadInt(row.value), std::nullopt);
        ExpectLines({Warn("GetValue<int>", "[" + row.json + "] is not int")});
    }
}

TEST_F(SqliteValueTest, ACopyIsAsValidAsItsOriginal)
{
    for (const SqliteValue& original :
         {SqliteValue(), SqliteValue(7), SqliteValue("abc"), Emptied(), AssignedOnly(7)}) {
        const SqliteValue copy(original);
        EXPECT_EQ(copy.IsValid(), original.IsValid());
        EXPECT_EQ(copy.ToFormatedValue(), original.ToFormatedValue());
    }
}

TEST_F(SqliteValueTest, AMoveKeepsValueAndValidity)
{
    SqliteValue from("abc");
    const SqliteValue to(std::move(from));
    EXPECT_TRUE(to.IsValid());
    EXPECT_EQ(to.ToFormatedValue(), "'abc'");

    SqliteValue empty;
    const SqliteValue stillEmpty(std::move(empty));
    EXPECT_FALSE(stillEmpty.IsValid());
}

// By contract an assignment copies the payload but not the validity, here and in the next tests.
TEST_F(SqliteValueTest, AnEmptyValueThatIsAssignedANumberStaysInvalid)
{
    SqliteValue value;
    EXPECT_EQ(&(value = SqliteValue(1)), &value);
    EXPECT_FALSE(value.IsValid());

    SqliteValue other(2);
    value = other;
    EXPECT_FALSE(value.IsValid());
    value = std::move(other);  // NOLINT(performance-move-const-arg)
    EXPECT_FALSE(value.IsValid());

    SqliteValue ofNullText(NullText);
    ofNullText = SqliteValue("abc");
    EXPECT_FALSE(ofNullText.IsValid());
}

TEST_F(SqliteValueTest, ReadingAndWritingIgnoreValidity)
{
    const SqliteValue value = AssignedOnly(1);
    EXPECT_FALSE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "1");
    EXPECT_EQ(ReadInt(value), 1);
    EXPECT_EQ(ReadUnsigned(value), 1U);
    EXPECT_EQ(ReadBool(value), true);
}

TEST_F(SqliteValueTest, AValueThatIsAssignedAnEmptyOneIsInvalidUntilItIsAssignedAgain)
{
    SqliteValue value(1);
    value = SqliteValue();
    EXPECT_FALSE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "");

    value = SqliteValue("abc");
    EXPECT_TRUE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "'abc'");

    value = AssignedOnly(3);
    EXPECT_TRUE(value.IsValid());
    EXPECT_EQ(value.ToFormatedValue(), "3");
}

TEST_F(SqliteValueTest, SelfAssignmentChangesNothing)
{
    SqliteValue text("abc");
    const SqliteValue& sameText = text;
    text = sameText;
    EXPECT_TRUE(text.IsValid());
    EXPECT_EQ(text.ToFormatedValue(), "'abc'");

    SqliteValue empty;
    const SqliteValue& sameEmpty = empty;
    empty = sameEmpty;
    EXPECT_FALSE(empty.IsValid());
}

class SqliteValueListTest : public LoggedTest {
  protected:
    SqliteValueListTest() : LoggedTest("sqlite_value.cpp") {}

    static SqliteValueList List(
        std::initializer_list<std::pair<const char*, const SqliteValue>> fields)
    {
        SqliteValueList list;
        for (const auto& [field, value] : fields) EXPECT_TRUE(list.AddValue(field, value));
        return list;
    }

    // The list's text. Every value must still be valid.
    static std::string Text(const SqliteValueList& list)
    {
        for (const auto& [field, value] : list.GetValues()) EXPECT_TRUE(value.IsValid()) << field;
        return list.ToStr();
    }
};

TEST_F(SqliteValueListTest, AnEmptyListHasAnEmptyText)
{
    EXPECT_EQ(SqliteValueList().ToStr(), "");
    EXPECT_TRUE(SqliteValueList().GetValues().empty());
}

TEST_F(SqliteValueListTest, TheTextShowsNamesAndLiterals)
{
    EXPECT_EQ(Text(List({{"id", 3}})), "id:3");
    EXPECT_EQ(Text(List({{"id", 3}, {"name", "abc"}})), "id:3, name:'abc'");
    EXPECT_EQ(Text(List({{"a", true}, {"b", UINT_MAX}, {"c", ""}, {"d", "it's"}})),
              "a:1, b:4294967295, c:'', d:'it's'");
}

TEST_F(SqliteValueListTest, FieldsAreSortedByTheBytesOfTheirNames)
{
    EXPECT_EQ(Text(List({{"b", 1}, {"a", 2}})), "a:2, b:1");
    EXPECT_EQ(Text(List({{"name", 1}, {"Name", 2}})), "Name:2, name:1");
    EXPECT_EQ(
        Text(List({{"\xc3\xa4", 1}, {"ab", 2}, {"a", 3}, {"_", 4}, {"Z", 5}, {"10", 6}, {"9", 7}})),
        "10:6, 9:7, Z:5, _:4, a:3, ab:2, \xc3\xa4:1");
}

TEST_F(SqliteValueListTest, AddingAFieldTwiceKeepsTheSecondValue)
{
    SqliteValueList list = List({{"a", 1}, {"a", "text"}});
    EXPECT_EQ(Text(list), "a:'text'");
    EXPECT_TRUE(list.AddValue("a", true));
    EXPECT_EQ(Text(list), "a:1");
    EXPECT_EQ(list.GetValues().size(), 1U);
}

TEST_F(SqliteValueListTest, AnEmptyNameOrABadValueIsRefused)
{
    struct Row {
        const char* field;
        SqliteValue value;
        const char* message;
    };
    const std::vector<Row> rows{
        {"", 1, "Bad Field[] or value [1]"},
        {"", "%s%n", "Bad Field[] or value ['%s%n']"},
        {"", {}, "Bad Field[] or value []"},
        {"a", {}, "Bad Field[a] or value []"},
        {"new", {}, "Bad Field[new] or value []"},
        {"a", NullText, "Bad Field[a] or value []"},
        {"a", Emptied(), "Bad Field[a] or value []"},
        {"a", AssignedOnly(7), "Bad Field[a] or value [7]"},
    };
    SqliteValueList list = List({{"a", 5}});
    for (const Row& row : rows) {
        EXPECT_FALSE(list.AddValue(row.field, row.value)) << row.message;
        ExpectLines({Err("AddValue", row.message)});
    }
    EXPECT_EQ(Text(list), "a:5");
}

TEST_F(SqliteValueListTest, AMovedValueIsTakenUnlessItIsRefused)
{
    SqliteValueList record;
    SqliteValue text("a text that is not short");
    // The moved-from value is what is tested. NOLINTBEGIN(bugprone-use-after-move)
    EXPECT_FALSE(record.AddValue("", std::move(text)));
    EXPECT_TRUE(text.IsValid());
    EXPECT_TRUE(record.AddValue("name", std::move(text)));
    EXPECT_FALSE(text.IsValid());
    SqliteValue another("another");
    EXPECT_TRUE(record.AddValue("name", std::move(another)));
    EXPECT_FALSE(another.IsValid());
    // NOLINTEND(bugprone-use-after-move)
    EXPECT_EQ(record.ToStr(), "name:'another'");
    ExpectLines({Err("AddValue", "Bad Field[] or value ['a text that is not short']")});
}

TEST_F(SqliteValueListTest, AListsOwnValueCanBeAdded)
{
    SqliteValueList list = List({{"a", "x"}});
    EXPECT_TRUE(list.AddValue("b", list.GetValue("a")));
    EXPECT_TRUE(list.AddValue("a", list.GetValue("a")));
    EXPECT_EQ(Text(list), "a:'x', b:'x'");
}

TEST_F(SqliteValueListTest, HasFieldTellsWhetherAFieldExists)
{
    const SqliteValueList list = List({{"a", 1}});
    EXPECT_TRUE(list.HasField("a"));
    EXPECT_FALSE(list.HasField("A"));
    EXPECT_FALSE(list.HasField("b"));
    ExpectLines({});
    EXPECT_FALSE(list.HasField(""));
    ExpectLines({Err("HasField", "Invalid field []")});
}

TEST_F(SqliteValueListTest, GetValueReturnsAReference)
{
    SqliteValueList list = List({{"a", 1}});
    const SqliteValue& value = list.GetValue("a");
    EXPECT_EQ(&value, &list.GetValues().front().second);
    EXPECT_TRUE(list.AddValue("a", 2));
    EXPECT_EQ(value.ToFormatedValue(), "2");
}

TEST_F(SqliteValueListTest, AMissingFieldsValueIsNotValid)
{
    const SqliteValueList list = List({{"a", 1}});
    struct Row {
        const char* field;
        LogLine line;
    };
    const std::vector<Row> rows{
        {"", Err("GetValue", "Invalid field []")},
        {"b", Warn("GetValue", "Failed to find field [b]")},
        {"A", Warn("GetValue", "Failed to find field [A]")},
        {"%s%n", Warn("GetValue", "Failed to find field [%s%n]")},
    };
    for (const Row& row : rows) {
        const SqliteValue& value = list.GetValue(row.field);
        ExpectLines({row.line});
        EXPECT_FALSE(value.IsValid());
        EXPECT_EQ(value.ToFormatedValue(), "");
    }
    EXPECT_EQ(Text(list), "a:1");
}

TEST_F(SqliteValueListTest, AFieldIsReadAsItsType)
{
    const SqliteValueList list = List({{"t", "abc"}, {"i", -3}, {"u", UINT_MAX}, {"b", true}});
    std::string text;
    EXPECT_TRUE(list.GetValue("t", text));
    EXPECT_EQ(text, "abc");
    int number = 0;
    EXPECT_TRUE(list.GetValue("i", number));
    EXPECT_EQ(number, -3);
    unsigned int size = 0;
    EXPECT_TRUE(list.GetValue("u", size));
    EXPECT_EQ(size, UINT_MAX);
    bool truth = false;
    EXPECT_TRUE(list.GetValue("b", truth));
    EXPECT_TRUE(truth);
}

// How the types appear in the test names.
struct TypeNames {
    template <class T>
    static std::string GetName(int /*index*/)
    {
        if (std::is_same_v<T, std::string>) return "Text";
        if (std::is_same_v<T, bool>) return "Bool";
        if (std::is_same_v<T, int>) return "Int";
        if (std::is_same_v<T, std::int64_t>) return "Int64";
        if (std::is_same_v<T, double>) return "Double";
        return "Unsigned";
    }
};

// The tests that are the same for every type.
template <class T>
class SqliteFieldReadTest : public SqliteValueListTest {
};

using FieldTypes = ::testing::Types<std::string, bool, int, unsigned int, std::int64_t, double>;
TYPED_TEST_SUITE(SqliteFieldReadTest, FieldTypes, TypeNames);

// DEBUG here, WARN in the form that returns a reference: the contract.
TYPED_TEST(SqliteFieldReadTest, AMissingFieldIsRefused)
{
    const SqliteValueList list = this->List({{"a", 1}});
    TypeParam out{};
    EXPECT_FALSE(list.GetValue("b", out));
    this->ExpectLines({Debug("GetValue", "field [b] is not existed")});
    EXPECT_FALSE(list.GetValue("", out));
    this->ExpectLines({Err("GetValue", "Invalid field []")});
    EXPECT_EQ(out, TypeParam{});
}

TEST_F(SqliteValueListTest, AFieldOfAnotherKindIsRefused)
{
    const SqliteValueList list = List({{"t", "12"}, {"i", -1}});
    std::string text = "before";
    EXPECT_FALSE(list.GetValue("i", text));
    EXPECT_EQ(text, "before");
    ExpectLines({Warn("GetValue<std::basic_string<char> >", "[-1] is not string")});
    bool truth = true;
    EXPECT_FALSE(list.GetValue("i", truth));
    EXPECT_TRUE(truth);
    ExpectLines({Warn("GetValue<bool>", "[-1] is not bool")});
    int number = 77;
    EXPECT_FALSE(list.GetValue("t", number));
    EXPECT_EQ(number, 77);
    ExpectLines({Warn("GetValue<int>", "[\"12\"] is not int")});
    unsigned int size = 77;
    EXPECT_FALSE(list.GetValue("i", size));
    EXPECT_EQ(size, 77U);
    ExpectLines({Warn("GetValue<unsigned int>", "[-1] is not int")});
}

TEST_F(SqliteValueListTest, AddingAListOverwritesSharedFieldsAndAddsTheRest)
{
    SqliteValueList list = List({{"a", 1}, {"b", 2}});
    const SqliteValueList other = List({{"b", "new"}, {"c", 3}});
    EXPECT_EQ(&(list += other), &list);
    EXPECT_EQ(Text(list), "a:1, b:'new', c:3");
    EXPECT_EQ(Text(other), "b:'new', c:3");

    list += SqliteValueList();
    EXPECT_EQ(Text(list), "a:1, b:'new', c:3");
}

TEST_F(SqliteValueListTest, AddingAListToItselfChangesNothing)
{
    SqliteValueList list = List({{"a", 1}, {"b", "x"}});
    list += list;
    EXPECT_EQ(Text(list), "a:1, b:'x'");
}

TEST_F(SqliteValueListTest, AssignmentReplacesAllFields)
{
    const SqliteValueList other = List({{"b", "new"}, {"c", 3}});
    SqliteValueList list = List({{"a", 1}, {"b", 2}});
    EXPECT_EQ(&(list = other), &list);
    EXPECT_EQ(Text(list), "b:'new', c:3");
    EXPECT_EQ(Text(other), "b:'new', c:3");

    list = SqliteValueList();
    EXPECT_EQ(Text(list), "");
}

TEST_F(SqliteValueListTest, SelfAssignmentChangesNothing)
{
    SqliteValueList list = List({{"a", 1}, {"b", "x"}});
    SqliteValueList& same = list;
    list = same;
    EXPECT_EQ(Text(list), "a:1, b:'x'");
    list = std::move(same);
    EXPECT_EQ(Text(list), "a:1, b:'x'");
}

TEST_F(SqliteValueListTest, ReferencesStayValidWhenAListIsAssignedOrAddedToItself)
{
    SqliteValueList list = List({{"a", 1}, {"b", "a text that is too long to be kept in place"}});
    const SqliteValue& text = list.GetValue("b");
    const std::string& field = list.GetValues().begin()->first;
    SqliteValueList& same = list;
    list = same;
    list += same;
    list = std::move(same);
    EXPECT_EQ(text.ToFormatedValue(), "'a text that is too long to be kept in place'");
    EXPECT_EQ(field, "a");
}

TEST_F(SqliteValueListTest, AFieldCanGetTheValueOfAnotherFieldOrItsOwn)
{
    SqliteValueList list = List({{"a", 1}, {"b", "a text that is too long to be kept in place"}});
    EXPECT_TRUE(list.AddValue("c", list.GetValue("b")));
    EXPECT_TRUE(list.AddValue("a", list.GetValue("b")));
    EXPECT_TRUE(list.AddValue("b", list.GetValue("b")));
    EXPECT_TRUE(list.AddValue(list.GetValues().begin()->first, list.GetValue("b")));
    for (const char* field : {"a", "b", "c"}) {
        EXPECT_EQ(list.GetValue(field).ToFormatedValue(),
                  "'a text that is too long to be kept in place'");
    }
}

TEST_F(SqliteValueListTest, ATextCanBeReadIntoTheVariableThatNamesItsField)
{
    const SqliteValueList list = List({{"name", "backup"}});
    std::string text = "name";
    EXPECT_TRUE(list.GetValue(text, text));
    EXPECT_EQ(text, "backup");
}

TEST_F(SqliteValueListTest, ACopyIsIndependent)
{
    const SqliteValueList original = List({{"a", 1}});
    SqliteValueList copy(original);
    EXPECT_TRUE(copy.AddValue("a", 2));
    EXPECT_TRUE(copy.AddValue("b", 3));
    EXPECT_EQ(Text(copy), "a:2, b:3");
    EXPECT_EQ(Text(original), "a:1");
}

TEST_F(SqliteValueListTest, AMoveTakesAllFields)
{
    SqliteValueList from = List({{"a", 1}, {"b", "x"}});
    SqliteValueList built(std::move(from));
    EXPECT_EQ(Text(built), "a:1, b:'x'");

    SqliteValueList assigned = List({{"c", 3}});
    assigned = std::move(built);
    EXPECT_EQ(Text(assigned), "a:1, b:'x'");
    EXPECT_TRUE(assigned.AddValue("a", 2));
    EXPECT_EQ(Text(assigned), "a:2, b:'x'");
    EXPECT_FALSE(assigned.GetValue("c").IsValid());
    ExpectLines({Warn("GetValue", "Failed to find field [c]")});
}

// Records how it is called.
class Node : public SqliteRecord {
  public:
    SqliteValueList BuildRecord(const std::vector<std::string>& fields) const override
    {
        calls.emplace_back("BuildRecord");
        SqliteValueList record;
        for (const std::string& field : fields) {
            calls.push_back(field);
            record.AddValue(field, static_cast<int>(calls.size()));
        }
        return record;
    }

    std::vector<std::string> GetRecordFields() const override
    {
        calls.emplace_back("GetRecordFields");
        return {"name", "id"};
    }

    mutable std::vector<std::string> calls;
};

class LoadableNode : public Node {
  public:
    bool LoadRecord(const SqliteValueList& record) override
    {
        calls.push_back("LoadRecord " + record.ToStr());
        return true;
    }
};

class SqliteRecordTest : public SqliteValueListTest {};

TEST_F(SqliteRecordTest, ARecordIsBuiltFromAllItsFields)
{
    const LoadableNode node;
    EXPECT_EQ(Text(node.ToSqliteRecord()), "id:4, name:3");
    EXPECT_THAT(node.calls, ElementsAre("GetRecordFields", "BuildRecord", "name", "id"));
}

TEST_F(SqliteRecordTest, LoadRecordReturnsFalseUnlessOverridden)
{
    const SqliteValueList record = List({{"id", 1}});
    Node node;
    EXPECT_FALSE(node.LoadRecord(record));
    EXPECT_TRUE(node.calls.empty());

    LoadableNode loadable;
    SqliteRecord& base = loadable;
    EXPECT_TRUE(base.LoadRecord(record));
    EXPECT_THAT(loadable.calls, ElementsAre("LoadRecord id:1"));
}

}  // namespace
