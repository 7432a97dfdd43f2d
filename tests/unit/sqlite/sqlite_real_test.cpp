#include "sqlite/sqlite_real.h"

#include <gtest/gtest.h>

#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>

#include "support/fakes/global_locale.h"
#include "support/fixtures/plain_db.h"
#include "support/fixtures/stored_value.h"

namespace {

using Limits = std::numeric_limits<double>;

// SQLite before 3.43 reads with long doubles. On x86 they have 64 binary digits, and some of the shortest
// texts come out one unit off. With 113, as on 64-bit ARM, none does. With 53, those of a double, as on
// 32-bit ARM, many do, whatever their number of digits.
constexpr int SqliteDigits = std::numeric_limits<long double>::digits;
constexpr bool SqliteIsExact = SqliteDigits > Limits::digits;
constexpr double Misread = 0.612256287772801;
constexpr const char* MisreadText =
    SqliteDigits == 64 ? "0.61225628777280094" : "0.612256287772801";

std::string Written(double number)
{
    std::string text;
    OrvaDRCore::AppendReal(text, number);
    return text;
}

double OfBits(std::uint64_t bits)
{
    double number = 0;
    static_assert(sizeof number == sizeof bits);
    std::memcpy(&number, &bits, sizeof number);
    return number;
}

// What an exact reader reads.
double Read(const std::string& text)
{
    double number = 0;
    std::from_chars(text.data(), text.data() + text.size(), number);
    return number;
}

class SqliteRealTest : public ::testing::Test {
  protected:
    // What SQLite reads.
    StoredValue Stored(const std::string& literal)
    {
        return StoredBy(db.Handle(), "SELECT " + literal).front();
    }

    void ExpectReadBack(double number)
    {
        const std::string text = Written(number);
        EXPECT_EQ(Read(text), number) << text;
        if (SqliteIsExact) {
            EXPECT_EQ(Stored(text), StoredValue(number)) << text;
        }
    }

    PlainDb db{":memory:"};
};

TEST_F(SqliteRealTest, TheTextIsTheShortestWithAPointOrAnExponent)
{
    struct Row {
        double number;
        std::string text;
    };
    const std::vector<Row> rows{
        {0, "0.0"},
        {-0.0, "-0.0"},
        {5, "5.0"},
        {-5, "-5.0"},
        {0.1, "0.1"},
        {0.1 + 0.2, "0.30000000000000004"},
        {3.141592653589793, "3.141592653589793"},
        {100000, "1e+05"},
        {123456, "123456.0"},
        {1e22, "1e+22"},
        {1e-7, "1e-07"},
        {9007199254740993.0, "9007199254740992.0"},
        {Limits::max(), "1.7976931348623157e+308"},
        {Limits::lowest(), "-1.7976931348623157e+308"},
        {Limits::min(), "2.2250738585072014e-308"},
        {Limits::denorm_min(), "5e-324"},
    };
    for (const Row& row : rows) {
        EXPECT_EQ(Written(row.number), row.text);
        ExpectReadBack(row.number);
    }
}

TEST_F(SqliteRealTest, TheSignOfZeroIsKept)
{
    EXPECT_TRUE(std::signbit(std::get<double>(Stored(Written(-0.0)))));
    EXPECT_FALSE(std::signbit(std::get<double>(Stored(Written(0.0)))));
}

TEST_F(SqliteRealTest, InfinitiesAreNumbersThatOverflow)
{
    EXPECT_EQ(Written(Limits::infinity()), "9e999");
    EXPECT_EQ(Written(-Limits::infinity()), "-9e999");
    EXPECT_EQ(Stored("9e999"), StoredValue(Limits::infinity()));
    EXPECT_EQ(Stored("-9e999"), StoredValue(-Limits::infinity()));
}

TEST_F(SqliteRealTest, NotANumberIsNull)
{
    EXPECT_EQ(Written(Limits::quiet_NaN()), "NULL");
    EXPECT_EQ(Written(-Limits::quiet_NaN()), "NULL");
}

TEST_F(SqliteRealTest, TheTextIsAppended)
{
    std::string text = "load=";
    OrvaDRCore::AppendReal(text, 0.25);
    EXPECT_EQ(text, "load=0.25");
}

// SQLite 3.40 on x86 reads the shortest texts of these, 0.612256287772801 and so on, one unit off.
TEST_F(SqliteRealTest, MoreDigitsAreWrittenWhereSqliteWouldMisreadTheShortestText)
{
    for (const double number : {Misread, 0.3365092606871323, 1.681137253005582e-19,
                                2267144481.729038, 1.344263423175451e+308}) {
        ExpectReadBack(number);
        ExpectReadBack(-number);
    }
    EXPECT_EQ(Written(Misread), MisreadText);
}

// Among them are the denormals that need 18 and 19 digits.
TEST_F(SqliteRealTest, SqliteReadsDenormals)
{
    std::mt19937_64 random(7);
    for (int round = 0; round < 20000; ++round) {
        const std::uint64_t bits = random() >> 12U;
        ExpectReadBack(OfBits(bits >> (round % 2 == 0 ? 0 : random() % 52)));
    }
}

TEST_F(SqliteRealTest, SqliteReadsAnyNumber)
{
    std::mt19937_64 random(1);
    for (int round = 0; round < 20000; ++round) {
        const double number = OfBits(random());
        // For some of the smallest numbers there is no text that SQLite before 3.43 reads exactly.
        if (std::isfinite(number) && std::abs(number) > 1e-290) ExpectReadBack(number);
        ExpectReadBack(std::ldexp(1 + OfBits((random() >> 12U) | 0x3ff0000000000000U),
                                  static_cast<int>(random() % 80) - 40));
    }
}

TEST_F(SqliteRealTest, TheSmallestNumbersAreAtMostOneUnitOff)
{
    std::mt19937_64 random(1);
    for (int round = 0; round < 2000; ++round) {
        const double number = std::ldexp(Limits::min(), static_cast<int>(random() % 56)) *
                              OfBits((random() >> 12U) | 0x3ff0000000000000U);
        const std::string text = Written(number);
        EXPECT_EQ(Read(text), number) << text;
        if (!SqliteIsExact) continue;
        const double stored = std::get<double>(Stored(text));
        EXPECT_LE(stored, std::nextafter(number, 1)) << text;
        EXPECT_GE(stored, std::nextafter(number, 0)) << text;
    }
}

TEST_F(SqliteRealTest, TheLocaleDoesNotMatter)
{
    const GlobalLocale locale(new CommaDecimals);
    EXPECT_EQ(Written(0.5), "0.5");
    EXPECT_EQ(Written(Misread), MisreadText);
}

}  // namespace
