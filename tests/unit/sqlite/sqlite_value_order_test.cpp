// Records whose fields are added in any order, many of them too: compared with a map.
#include <orvadrcore/sqlite_value.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <ctime>
#include <map>
#include <random>
#include <thread>
#include <type_traits>

namespace {

using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

using Names = std::vector<std::string>;
using Expected = std::map<std::string, int>;

static_assert(std::is_same_v<decltype(std::declval<const SqliteValueList&>().GetValues()),
                             const std::vector<std::pair<std::string, SqliteValue>>&>);
static_assert(std::is_nothrow_move_constructible_v<SqliteValueList> &&
              std::is_nothrow_move_assignable_v<SqliteValueList>);

// Some names are too long to be kept in place.
std::string Name(std::size_t number)
{
    const std::string digits = std::to_string(1'000'000 + number);
    return number % 3 == 0 ? "a field with a long name " + digits : "field" + digits;
}

Names Ascending(std::size_t count)
{
    Names names;
    for (std::size_t i = 0; i < count; ++i) names.push_back(Name(i));
    std::sort(names.begin(), names.end());
    return names;
}

Names Descending(std::size_t count)
{
    Names names = Ascending(count);
    std::reverse(names.begin(), names.end());
    return names;
}

Names Shuffled(std::size_t count)
{
    Names names = Ascending(count);
    std::shuffle(names.begin(), names.end(), std::mt19937(7));
    return names;
}

// The first, the last, the second, the last but one, ...
Names FromBothEnds(std::size_t count)
{
    const Names sorted = Ascending(count);
    Names names;
    for (std::size_t i = 0; i < count; ++i) {
        names.push_back(sorted[i % 2 == 0 ? i / 2 : count - 1 - i / 2]);
    }
    return names;
}

// Each field is the last one but the first `count`.
Names LateFields(std::size_t count)
{
    Names names = Ascending(count);
    std::rotate(names.begin(), names.begin() + static_cast<std::ptrdiff_t>(count / 3), names.end());
    return names;
}

using Order = Names (*)(std::size_t count);
constexpr Order Orders[] = {Ascending, Descending, Shuffled, FromBothEnds, LateFields};

// Both ways to look at all fields, and both ways to find one.
void ExpectFields(const SqliteValueList& record, const Expected& expected)
{
    ASSERT_EQ(record.GetValues().size(), expected.size());
    auto field = record.GetValues().begin();
    for (const auto& [name, number] : expected) {
        EXPECT_EQ(field->first, name);
        EXPECT_TRUE(field->second.IsValid()) << name;
        EXPECT_EQ(&record.GetValue(name), &field->second);
        EXPECT_TRUE(record.HasField(name));
        int out = -1;
        EXPECT_TRUE(record.GetValue(name, out)) << name;
        EXPECT_EQ(out, number) << name;
        ++field;
    }
}

SqliteValueList MakeRecord(const Names& names)
{
    SqliteValueList record;
    int number = 0;
    for (const std::string& name : names) record.AddValue(name, number++);
    return record;
}

Expected MakeMap(const Names& names)
{
    Expected expected;
    int number = 0;
    for (const std::string& name : names) expected[name] = number++;
    return expected;
}

TEST(SqliteValueOrderTest, FieldsAreSortedInWhateverOrderTheyAreAdded)
{
    constexpr std::size_t Counts[] = {1, 2, 3, 32, 33, 34, 35, 67, 68, 200, 3000};
    for (const std::size_t count : Counts) {
        for (const Order order : Orders) {
            const Names names = order(count);
            ExpectFields(MakeRecord(names), MakeMap(names));
        }
    }
}

TEST(SqliteValueOrderTest, AFieldThatIsAddedAgainGetsTheLastValue)
{
    for (const Order order : Orders) {
        Names names = order(500);
        const Names again = Shuffled(500);
        names.insert(names.end(), again.begin(), again.begin() + 250);
        names.insert(names.end(), again.begin() + 100, again.end());
        ExpectFields(MakeRecord(names), MakeMap(names));
    }
}

TEST(SqliteValueOrderTest, ARecordMayBeReadAndChangedInTurns)
{
    std::mt19937 random(11);
    const Names names = Shuffled(700);
    SqliteValueList record;
    Expected expected;
    for (int i = 0; i < 3000; ++i) {
        const std::string& name = names[random() % names.size()];
        switch (random() % 40) {
            case 0: ExpectFields(record, expected); break;
            case 1: EXPECT_EQ(record.HasField(name), expected.count(name) > 0); break;
            case 2: record = SqliteValueList(record); break;
            case 3: record += record; break;
            default: EXPECT_TRUE(record.AddValue(name, i)); expected[name] = i;
        }
    }
    ExpectFields(record, expected);
}

TEST(SqliteValueOrderTest, AValueOfEveryKindKeepsItsPlace)
{
    const std::string text = "a text that is too long to be kept in place";
    const std::vector<SqliteValue> kinds{1,
                                         true,
                                         "it's",
                                         SqliteValue::Text(text),
                                         SqliteValue::Real(0.5),
                                         SqliteValue::Blob(text),
                                         SqliteValue::Null()};
    for (const Order order : Orders) {
        const Names names = order(300);
        SqliteValueList record;
        std::map<std::string, std::string> expected;
        for (std::size_t i = 0; i < names.size(); ++i) {
            const SqliteValue& value = kinds[i % kinds.size()];
            EXPECT_TRUE(record.AddValue(names[i], value));
            expected[names[i]] = value.ToFormatedValue();
        }
        for (const auto& [name, value] : record.GetValues()) {
            EXPECT_TRUE(value.IsValid());
            EXPECT_EQ(value.ToFormatedValue(), expected[name]);
        }
    }
}

// A record that has not been read since its fields were added.
TEST(SqliteValueOrderTest, CopiesAndMovesTakeFieldsThatAreNotSortedYet)
{
    const Names names = Shuffled(300);
    const Expected expected = MakeMap(names);
    {
        const SqliteValueList record = MakeRecord(names);
        const SqliteValueList copy(record);
        ExpectFields(copy, expected);
        ExpectFields(record, expected);
    }
    SqliteValueList record = MakeRecord(names);
    SqliteValueList moved(std::move(record));
    EXPECT_EQ(record.ToStr(), "");  // NOLINT(bugprone-use-after-move): that is what is tested
    EXPECT_TRUE(record.AddValue("b", 1));
    EXPECT_TRUE(record.AddValue("a", 2));
    EXPECT_EQ(record.ToStr(), "a:2, b:1");

    record = std::move(moved);
    EXPECT_EQ(moved.ToStr(), "a:2, b:1");  // NOLINT(bugprone-use-after-move): they are swapped
    moved = record;
    ExpectFields(record, expected);
    ExpectFields(moved, expected);
}

TEST(SqliteValueOrderTest, AddingAListSortsItIn)
{
    const Names names = Shuffled(600);
    const Names half(names.begin() + 200, names.end());
    SqliteValueList record = MakeRecord({names.begin(), names.begin() + 400});
    record += MakeRecord(half);
    Expected expected = MakeMap(names);
    for (const auto& [name, number] : MakeMap(half)) expected[name] = number;
    ExpectFields(record, expected);
}

TEST(SqliteValueOrderTest, ThreadsMayReadARecordThatIsNotSortedYet)
{
    const Names names = Shuffled(2000);
    const Expected expected = MakeMap(names);
    for (int round = 0; round < 10; ++round) {
        const SqliteValueList record = MakeRecord(names);
        std::vector<std::thread> readers;
        for (int reader = 0; reader < 4; ++reader) {
            readers.emplace_back([&] { ExpectFields(record, expected); });
        }
        for (std::thread& reader : readers) reader.join();
    }
}

// CPU time, which other processes hardly change.
template <class Work>
double SecondsOf(Work work)
{
    const std::clock_t begin = std::clock();
    work();
    return static_cast<double>(std::clock() - begin) / CLOCKS_PER_SEC;
}

// Making room for each field would take hundreds of times as long as the map.
TEST(SqliteValueOrderTest, ALargeRecordTakesAboutAsLongAsAMapInEachOrder)
{
    constexpr std::size_t Count = 100'000;
    constexpr double Most = 20;
    for (const Order order : Orders) {
        const Names names = order(Count);
        const double ofMap = SecondsOf([&] { EXPECT_EQ(MakeMap(names).size(), Count); });
        const double ofRecord =
            SecondsOf([&] { EXPECT_EQ(MakeRecord(names).GetValues().size(), Count); });
        EXPECT_LE(ofRecord, Most * ofMap) << ofMap;
    }
}

}  // namespace
