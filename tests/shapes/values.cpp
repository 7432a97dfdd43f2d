#include <array>
#include <cstdint>
#include <limits>
#include <utility>

#include "draw.h"

namespace Shapes {

namespace {

using OrvaDRCore::SqliteValue;
using std::string;

constexpr int SmallNumbers = 7;

int SmallNumber(Random& random)
{
    return static_cast<int>(random.Below(SmallNumbers));
}

std::int64_t AnyInteger(Random& random)
{
    using Limits = std::numeric_limits<std::int64_t>;
    constexpr std::array<std::int64_t, 14> Numbers = {-1,
                                                      10,
                                                      255,
                                                      65536,
                                                      2147483647,
                                                      2147483648,
                                                      -2147483648,
                                                      4294967295,
                                                      9007199254740993,
                                                      999999999999999999,
                                                      1000000000000000000,
                                                      9223372036854775806,
                                                      Limits::max() - 1,
                                                      Limits::min()};
    return random.Of(Numbers);
}

double AnyReal(Random& random)
{
    constexpr std::array<double, 12> Numbers = {0.0,
                                                -0.0,
                                                1.0,
                                                1.5,
                                                2.0,
                                                -3.25,
                                                0.1,
                                                1e300,
                                                5e-324,
                                                9007199254740993.0,
                                                std::numeric_limits<double>::infinity(),
                                                std::numeric_limits<double>::quiet_NaN()};
    return random.Of(Numbers);
}

SqliteValue OddValue(Random& random)
{
    switch (random.Below(6)) {
        case 0: return SqliteValue::Integer(AnyInteger(random));
        case 1: return SqliteValue::Real(AnyReal(random));
        case 2: return SqliteValue::Blob(AnyText(random));
        case 3: return {static_cast<unsigned int>(AnyInteger(random))};
        case 4: return {random.OneIn(2)};
        default: return SqliteValue::Null();
    }
}

string OddLiteral(Random& random)
{
    static const std::array<const char*, 56> literals = {"0x1f",
                                                         "0X2",
                                                         "1e3",
                                                         "1.5",
                                                         ".5",
                                                         "5.",
                                                         "1.0",
                                                         "-1",
                                                         "- 1",
                                                         "+1",
                                                         "--1",
                                                         "-0",
                                                         "007",
                                                         "1_000",
                                                         "9223372036854775807",
                                                         "9223372036854775808",
                                                         "-9223372036854775808",
                                                         "12345678901234567890",
                                                         "999999999999999999",
                                                         "1000000000000000000",
                                                         "NULL",
                                                         "null",
                                                         "TRUE",
                                                         "false",
                                                         "''",
                                                         "'a''b'",
                                                         "''''",
                                                         "'a",
                                                         "\"a\"",
                                                         "'?'",
                                                         "'--'",
                                                         "'/*'",
                                                         "'1'",
                                                         "'1.0'",
                                                         "x'61'",
                                                         "X''",
                                                         "x'6'",
                                                         "?",
                                                         "?1",
                                                         ":a",
                                                         "@a",
                                                         "$a",
                                                         "(1)",
                                                         "1+1",
                                                         "'a'||'b'",
                                                         "(SELECT 1)",
                                                         "abs(1)",
                                                         "CAST(X'610062' AS TEXT)",
                                                         "CURRENT_TIME IS NULL",
                                                         "1 -- x",
                                                         "/* x */1",
                                                         "1/**/",
                                                         "a",
                                                         "N'a'",
                                                         "1a",
                                                         "'a\\'"};
    return random.Of(literals);
}

}  // namespace

string AnyText(Random& random)
{
    if (random.Below(4) != 0) return string(1, "abAx1"[random.Below(5)]);
    static const std::array<string, 26> texts = {"",
                                                 "O'Brien",
                                                 "''",
                                                 "'",
                                                 "?",
                                                 "?1",
                                                 "--",
                                                 "/*",
                                                 "*/",
                                                 "%",
                                                 "_",
                                                 "\\",
                                                 "1",
                                                 "1.0",
                                                 "NULL",
                                                 "x y",
                                                 "a ",
                                                 "\xff\xfe",
                                                 "\xc3\xa4",
                                                 "\xc3",
                                                 string("a\0b", 3),
                                                 string("\0", 1),
                                                 string(300, 'x'),
                                                 "'); DROP TABLE u; --",
                                                 "\n",
                                                 "none"};
    return random.Of(texts);
}

SqliteValue AnyValue(Draw& draw)
{
    Random& kind = draw.value.OneIn(5 * draw.tameness) ? draw.value : draw.shape;
    if (draw.IsOdd(6)) return OddValue(draw.value);
    switch (kind.Below(12)) {
        case 0:
        case 1:
        case 2:
        case 3:
        case 4: return {SmallNumber(draw.value)};
        case 5:
            return SqliteValue::Integer(draw.value.OneIn(3) ? AnyInteger(draw.value)
                                                            : SmallNumber(draw.value));
        case 6: return SqliteValue(AnyText(draw.value));  // quotes in it end the literal
        case 7: return {-SmallNumber(draw.value)};
        case 8: return {string(1, "abAx"[draw.value.Below(4)])};
        default: return SqliteValue::Text(AnyText(draw.value));
    }
}

string AnyLiteral(Draw& draw)
{
    return draw.value.OneIn(6 * draw.tameness) ? OddLiteral(draw.value)
                                               : AnyValue(draw).ToFormatedValue();
}

string MaybeMutated(Draw& draw, string statement)
{
    static const std::array<const char*, 30> pieces = {
        " ",    "\t", "\n", ";",        ";;", "'",  "\"",         "--",       "/* c */", "?",
        "(",    ")",  ",",  "=",        "1",  "0x", "e5",         "AND",      " OR ",    "NOT ",
        "null", ".",  "-",  "\xc2\xa0", "`",  "[",  "; SELECT 1", " LIMIT 1", ":a",      "\f"};
    Random& random = draw.value;
    if (!random.OneIn(4 * draw.tameness)) return statement;
    for (std::size_t changes = 1 + random.Below(2); changes > 0; --changes) {
        const std::size_t at = random.Below(statement.size() + 1);
        switch (random.Below(5)) {
            case 0: statement.erase(at, 1 + random.Below(3)); break;
            case 1: statement.append(random.Of(pieces)); break;
            case 2: statement.insert(at, 1, static_cast<char>(random.Below(256))); break;
            default: statement.insert(at, random.Of(pieces)); break;
        }
    }
    return statement;
}

}  // namespace Shapes
