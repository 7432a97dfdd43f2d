#include "sqlite/sqlite_real.h"

#include <array>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <string_view>

namespace OrvaDRCore {

namespace {

using Buffer = std::array<char, 48>;

constexpr int MostDigits = 19;  // that SQLite reads of a number

std::string_view Shortest(Buffer& buffer, double number)
{
    char* const begin = buffer.data();
    char* const end = std::to_chars(begin, begin + buffer.size(), number).ptr;
    return {begin, static_cast<std::size_t>(end - begin)};
}

std::string_view WithDigits(Buffer& buffer, double number, int digits)
{
    char* const begin = buffer.data();
    char* const end =
        std::to_chars(begin, begin + buffer.size(), number, std::chars_format::general, digits).ptr;
    return {begin, static_cast<std::size_t>(end - begin)};
}

// digits * 10^exponent
struct Decimal {
    std::uint64_t digits = 0;
    int exponent = 0;
};

constexpr std::uint64_t LargestInteger = std::numeric_limits<std::int64_t>::max();

// The digits that fit into 63 bits; the others count for the exponent only.
Decimal Parse(std::string_view text)
{
    Decimal decimal;
    bool isFraction = false;
    const std::size_t exponentAt = text.find('e');
    for (const char character : text.substr(0, exponentAt)) {
        if (character == '.') isFraction = true;
        if (character < '0' || character > '9') continue;
        const bool fits = decimal.digits < (LargestInteger - 9) / 10;
        if (fits) decimal.digits = decimal.digits * 10 + static_cast<unsigned int>(character - '0');
        decimal.exponent += (fits ? 0 : 1) - (isFraction ? 1 : 0);
    }
    if (exponentAt == std::string_view::npos) return decimal;
    int exponent = 0;
    const bool isPlus = text[exponentAt + 1] == '+';  // which from_chars() refuses
    std::from_chars(text.data() + exponentAt + (isPlus ? 2 : 1), text.data() + text.size(),
                    exponent);
    decimal.exponent += exponent;
    return decimal;
}

long double PowerOfTen(int exponent)
{
    long double power = 1;
    long double factor = 10;
    for (; exponent > 0; exponent >>= 1) {
        if ((exponent & 1) != 0) power *= factor;
        factor *= factor;
    }
    return power;
}

// What SQLite before 3.43 reads: it computes with long doubles and then rounds a second time, and a
// third time for the smallest numbers.
double ReadRoundingTwice(Decimal decimal)
{
    constexpr int LargestPower = 308;  // that is a double
    constexpr int TooSmall = 342;
    for (; decimal.exponent > 0 && decimal.digits < LargestInteger / 10; --decimal.exponent) {
        decimal.digits *= 10;
    }
    for (; decimal.exponent < 0 && decimal.digits % 10 == 0; ++decimal.exponent) {
        decimal.digits /= 10;
    }
    const auto digits = static_cast<long double>(decimal.digits);
    if (decimal.exponent >= 0) return static_cast<double>(digits * PowerOfTen(decimal.exponent));
    const int size = -decimal.exponent;
    if (size < LargestPower) return static_cast<double>(digits / PowerOfTen(size));
    if (size >= TooSmall) return 0;
    return static_cast<double>(digits / PowerOfTen(size - LargestPower)) / 1e308;
}

// As in memory. Registers of 32-bit x86 processors hold more digits and smaller exponents.
double Stored(double number)
{
    const volatile double stored = number;
    return stored;
}

bool IsReadAs(std::string_view text, double number)
{
    return number == 0 || Stored(ReadRoundingTwice(Parse(text))) == std::abs(number);
}

}  // namespace

void AppendReal(std::string& text, double number)
{
    if (std::isnan(number)) {
        text += "NULL";
        return;
    }
    if (std::isinf(number)) {
        text += number < 0 ? "-9e999" : "9e999";
        return;
    }
    Buffer buffer;
    std::string_view decimal = Shortest(buffer, number);
    for (int digits = 17; !IsReadAs(decimal, number); ++digits) {
        if (digits > MostDigits) {
            decimal = Shortest(buffer, number);
            break;
        }
        decimal = WithDigits(buffer, number, digits);
    }
    text += decimal;
    if (decimal.find_first_of(".e") == std::string_view::npos) text += ".0";
}

}  // namespace OrvaDRCore
