// A value of any shape is printed as jsoncpp's own writer prints it.
//
// An input is a list of lines, each a kind and what belongs to it; "\" escapes as in Pieces:
//
//     {2          an object; for each of two members its name on a line and then its value
//     [3          an array; the three elements follow
//     (3          likewise, but only every other element is set
//     i-5  u7     integers
//     r0.1        a real number
//     sO'Brien    a text
//     t  f  n     true, false, null
#include <json/value.h>

#include <charconv>
#include <cstdint>
#include <cstdlib>

#include "base/json_helpers.h"
#include "support/fixtures/jsoncpp_text.h"
#include "support/fuzz.h"

namespace {

constexpr int DeepestLevel = 300;

template <class Number>
Number ParseNumber(const std::string& text)
{
    Number number = 0;
    std::from_chars(text.data(), text.data() + text.size(), number);
    return number;
}

Json::Value TakeValue(Pieces& pieces, int level);

Json::Value TakeArray(Pieces& pieces, int level, unsigned int count, unsigned int step)
{
    Json::Value array(Json::arrayValue);
    for (unsigned int index = 0; index < count && !pieces.AtEnd(); ++index) {
        array[step * (index + 1) - 1] = TakeValue(pieces, level);
    }
    return array;
}

Json::Value TakeObject(Pieces& pieces, int level, unsigned int count)
{
    Json::Value object(Json::objectValue);
    for (; count > 0 && !pieces.AtEnd(); --count) {
        const std::string name = pieces.Until('\n');
        object[name] = TakeValue(pieces, level);
    }
    return object;
}

Json::Value TakeValue(Pieces& pieces, int level)
{
    const std::string line = pieces.Until('\n');
    if (line.empty() || level > DeepestLevel) return {};
    const std::string rest = line.substr(1);
    switch (line[0]) {
        case '{': return TakeObject(pieces, level + 1, ParseNumber<unsigned int>(rest));
        case '[': return TakeArray(pieces, level + 1, ParseNumber<unsigned int>(rest), 1);
        case '(': return TakeArray(pieces, level + 1, ParseNumber<unsigned int>(rest), 2);
        case 'i': return Json::Int64{ParseNumber<std::int64_t>(rest)};
        case 'u': return Json::UInt64{ParseNumber<std::uint64_t>(rest)};
        case 'r': return std::strtod(rest.c_str(), nullptr);
        case 's': return rest;
        case 't': return true;
        case 'f': return false;
        default: return {};
    }
}

}  // namespace

void Fuzz(const std::string& input)
{
    Pieces pieces(input);
    const Json::Value value = TakeValue(pieces, 1);
    Expect(OrvaDRCore::toString(value) == JsoncppText(value), "a value is printed as by jsoncpp");
}
