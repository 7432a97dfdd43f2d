// Reads a file of any bytes as "key=value" lines, compared with a model of the rules.
#include <orvadrcore/file.h>

#include <charconv>
#include <cmath>
#include <cstring>
#include <limits>

#include "support/fuzz.h"
#include "support/memory_file.h"

namespace {

bool IsBlank(char character)
{
    return character != '\0' && std::strchr(" \t\n\v\f\r", character) != nullptr;
}

// The text without leading blanks.
std::string Trimmed(const std::string& text)
{
    std::size_t at = 0;
    while (at < text.size() && IsBlank(text[at])) ++at;
    return text.substr(at);
}

std::size_t CountDigits(const std::string& text, std::size_t at)
{
    const std::size_t end = text.find_first_not_of("0123456789", at);
    return std::min(end, text.size()) - std::min(at, text.size());
}

bool IsSign(const std::string& text, std::size_t at)
{
    return at < text.size() && (text[at] == '+' || text[at] == '-');
}

// The first word.
void ReadAs(const std::string& text, std::string& value)
{
    const std::string trimmed = Trimmed(text);
    std::size_t end = 0;
    while (end < trimmed.size() && !IsBlank(trimmed[end])) ++end;
    value = trimmed.substr(0, end);
}

// The leading integer; out of range the largest or smallest one.
void ReadAs(const std::string& text, int& value)
{
    const std::string trimmed = Trimmed(text);
    const bool isSigned = IsSign(trimmed, 0);
    const std::string digits =
        trimmed.substr(isSigned ? 1 : 0, CountDigits(trimmed, isSigned ? 1 : 0));
    const std::string number = isSigned && trimmed[0] == '-' ? "-" + digits : digits;
    const auto error = std::from_chars(number.data(), number.data() + number.size(), value).ec;
    if (error == std::errc::result_out_of_range) {
        value =
            number[0] == '-' ? std::numeric_limits<int>::min() : std::numeric_limits<int>::max();
    } else if (error != std::errc()) {
        value = 0;
    }
}

// The leading real number; empty without digits, or if it ends after its "e".
void ReadAs(const std::string& text, double& value)
{
    const std::string trimmed = Trimmed(text);
    std::size_t at = IsSign(trimmed, 0) ? 1 : 0;
    std::size_t digits = CountDigits(trimmed, at);
    at += digits;
    if (at < trimmed.size() && trimmed[at] == '.') {
        const std::size_t decimals = CountDigits(trimmed, at + 1);
        digits += decimals;
        at += 1 + decimals;
    }
    bool isWhole = digits > 0;
    if (isWhole && at < trimmed.size() && (trimmed[at] == 'e' || trimmed[at] == 'E')) {
        ++at;
        if (IsSign(trimmed, at)) ++at;
        const std::size_t exponent = CountDigits(trimmed, at);
        at += exponent;
        isWhole = exponent > 0;
    }
    value = isWhole ? std::strtod(trimmed.substr(0, at).c_str(), nullptr) : 0;
    if (std::isinf(value)) value = std::copysign(std::numeric_limits<double>::max(), value);
}

template <class Value>
std::map<std::string, Value> Model(const std::string& text)
{
    std::map<std::string, Value> pairs;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t end = std::min(text.find('\n', at), text.size());
        const std::string line = text.substr(at, end - at);
        at = end + 1;
        const std::size_t equals = line.find('=');
        if (equals == std::string::npos || equals == 0 || equals + 1 == line.size()) continue;
        std::string key;
        Value value{};
        ReadAs(line.substr(0, equals), key);
        ReadAs(line.substr(equals + 1), value);
        pairs.emplace(key, value);
    }
    return pairs;
}

template <class Value>
void Check(const std::string& path, const std::string& text)
{
    std::map<std::string, Value> pairs{{"from before", Value{}}};
    const int count = OrvaDRCore::File::Read(path, pairs);
    Expect(count == static_cast<int>(pairs.size()), "the answer is the number of pairs");
    Expect(pairs == Model<Value>(text), "the pairs are those of the lines");
}

void CheckAllTypes(const MemoryFile& file, const std::string& text)
{
    file.Write(text);
    Check<std::string>(file.Path(), text);
    Check<int>(file.Path(), text);
    Check<double>(file.Path(), text);
}

}  // namespace

void Fuzz(const std::string& input)
{
    static const MemoryFile file;
    CheckAllTypes(file, input);
    CheckAllTypes(file, input + "\nlarge=" + std::string(10'000, ' '));  // its lines are sorted
}
