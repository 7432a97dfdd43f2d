// Extraction, compared with the streams and with File::toType.
#include "base/extraction.h"

#include <gmock/gmock.h>
#include <orvadrcore/file.h>

#include <array>
#include <cfenv>
#include <cmath>
#include <cstring>
#include <locale>
#include <random>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "support/fakes/global_locale.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::Extraction;
using OrvaDRCore::File;

constexpr int Texts = 10'000;

template <class Value>
Value FromStream(const std::string& text, Value value)
{
    std::istringstream(text) >> value;
    return value;
}

template <class Value>
Value FromToType(const std::string& text, Value value)
{
    File::toType(text, value, value);
    return value;
}

template <class Value>
Value FromExtraction(Extraction& extraction, const std::string& text, Value value)
{
    extraction.Read(text, value);
    return value;
}

// The sign of zero counts, too.
template <class Value>
bool Same(const Value& left, const Value& right)
{
    if constexpr (std::is_same_v<Value, double>) {
        return left == right && std::signbit(left) == std::signbit(right);
    } else {
        return left == right;
    }
}

template <class Value>
void ExpectSame(Extraction& extraction, const std::string& text, const Value& before)
{
    const Value read = FromExtraction(extraction, text, before);
    EXPECT_TRUE(Same(read, FromStream(text, before))) << "[" << text << "] " << read;
    EXPECT_TRUE(Same(read, FromToType(text, before))) << "[" << text << "] " << read;
}

void ExpectSameOfAllKinds(Extraction& extraction, const std::string& text)
{
    EXPECT_EQ(FromExtraction(extraction, text, std::string_view("before")),
              FromStream(text, std::string("before")));
    ExpectSame(extraction, text, std::string("before"));
    ExpectSame(extraction, text, 42);
    ExpectSame(extraction, text, 42.5);
}

// Random texts of pieces that occur in numbers, and of some that do not.
std::string MakeText(std::mt19937& random)
{
    static const std::vector<std::string> pieces = {
        "0",    "1",  "7",    "9",    "00",  "12",         "345",    "2147483647", "2147483648",
        "e308", "-",  "+",    ".",    ",",   "e",          "E",      "e-",         "e+5",
        "e400", " ",  "\t",   "\r",   "x",   "0x",         "p",      "inf",        "nan",
        "abc",  "=",  ".5",   "5.",   "'",   "4294967296", "e-400",  "e-320",      "1.234",
        "1,5",  "\v", "\xa0", "1e5",  "d",   "f",          "1e-5",   "'000",       "99999999999",
        "0.1",  "-0", "+-",   "2.25", "1e1", "3.14159265", "e99999", "INF",        Bytes("\0")};
    std::uniform_int_distribution<std::size_t> piece(0, pieces.size() - 1);
    std::string text;
    for (std::size_t count = 1 + piece(random) % 5; count > 0; --count) {
        text += pieces[piece(random)];
    }
    return text;
}

void ExpectSameOfManyTexts()
{
    std::mt19937 random(20'211);  // the same texts in each run
    Extraction extraction;
    for (int count = 0; count < Texts && !::testing::Test::HasFailure(); ++count) {
        ExpectSameOfAllKinds(extraction, MakeText(random));
    }
}

class OtherBlanks : public std::ctype<char> {
  public:
    OtherBlanks() : std::ctype<char>(Table().data()) {}

  private:
    static const std::array<mask, table_size>& Table()
    {
        static const std::array<mask, table_size> table = [] {
            std::array<mask, table_size> made{};
            std::copy_n(classic_table(), table_size, made.begin());
            made[','] = space;
            made['\t'] = punct;
            return made;
        }();
        return table;
    }
};

TEST(ExtractionTest, ReadsManyTextsAsStreamsDo)
{
    ExpectSameOfManyTexts();
}

TEST(ExtractionTest, ReadsManyTextsAsStreamsDoWithADecimalComma)
{
    const GlobalLocale locale(new CommaDecimals);
    ExpectSameOfManyTexts();
}

TEST(ExtractionTest, ReadsManyTextsAsStreamsDoWithOtherBlanks)
{
    const GlobalLocale locale(new OtherBlanks);
    ExpectSameOfManyTexts();
}

TEST(ExtractionTest, ReadsEveryByteAsStreamsDo)
{
    Extraction extraction;
    for (int byte = 0; byte < 256; ++byte) {
        const std::string one(1, static_cast<char>(byte));
        for (const std::string& text : {one, one + "5", "5" + one, "5" + one + "5", "-" + one}) {
            ExpectSameOfAllKinds(extraction, text);
        }
    }
}

TEST(ExtractionTest, ReadsNumbersOfAllSizesToTheLastBit)
{
    std::mt19937_64 random(20'211);
    Extraction extraction;
    for (int count = 0; count < Texts; ++count) {
        const std::uint64_t bits = random();
        double number = 0;
        std::memcpy(&number, &bits, sizeof number);
        if (!std::isfinite(number)) continue;
        for (const char* format : {"%.17g", "%.6g", "%.25e", "%a"}) {
            std::array<char, 64> text{};
            ASSERT_GT(std::snprintf(text.data(), text.size(), format, number), 0);
            ExpectSame(extraction, text.data(), 42.5);
        }
    }
    ExpectSame(extraction, std::string(1000, '9'), 42.5);
    ExpectSame(extraction, "0." + std::string(1000, '0') + "1", 42.5);
    ExpectSame(extraction, std::string(1000, '0') + "1", 42.5);
    ExpectSame(extraction, std::string(1000, '0') + "1", 42);
}

TEST(ExtractionTest, RoundsAsTheProgramHasSet)
{
    for (const int rounding : {FE_UPWARD, FE_DOWNWARD, FE_TOWARDZERO, FE_TONEAREST}) {
        ASSERT_EQ(std::fesetround(rounding), 0);
        Extraction extraction;
        for (const char* text : {"0.1", "-0.1", "0.3", "1e23", "3.14159265358979323846"}) {
            ExpectSame(extraction, text, 42.5);
        }
    }
    EXPECT_EQ(std::fegetround(), FE_TONEAREST);
}

TEST(ExtractionTest, ATextWithoutAWordLeavesTheValue)
{
    Extraction extraction;
    for (const std::string text : {"", " ", " \t\n\v\f\r"}) {
        EXPECT_EQ(FromExtraction(extraction, text, std::string("before")), "before");
        EXPECT_EQ(FromExtraction(extraction, text, std::string_view("before")), "before");
        EXPECT_EQ(FromExtraction(extraction, text, 42), 42);
        EXPECT_EQ(FromExtraction(extraction, text, 42.5), 42.5);
    }
}

TEST(ExtractionTest, UsesTheLocaleOfItsConstruction)
{
    Extraction classic;
    const GlobalLocale locale(new CommaDecimals);
    Extraction comma;
    EXPECT_EQ(FromExtraction(classic, "1.5", 0.0), 1.5);
    EXPECT_EQ(FromExtraction(classic, "1.5e", 1.0), 0.0);  // by a stream
    EXPECT_EQ(FromExtraction(comma, "1.234,5", 0.0), 1234.5);
    EXPECT_EQ(FromExtraction(comma, "1.234", 0), 1234);
}

}  // namespace
