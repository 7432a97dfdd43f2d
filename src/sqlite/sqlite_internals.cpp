#include "sqlite/sqlite_internals.h"

#include <array>
#include <charconv>

namespace OrvaDRCore {

namespace {

template <class Integer>
void AppendNumber(std::string& text, Integer number)
{
    std::array<char, 24> digits{};  // 64 bits need 20 digits and a sign at most
    char* const begin = digits.data();
    text.append(begin, std::to_chars(begin, begin + digits.size(), number).ptr);
}

void AppendQuoted(std::string& text, const Json::Value& payload)
{
    const char* begin = nullptr;
    const char* end = nullptr;
    payload.getString(&begin, &end);
    text += '\'';
    text.append(begin, end);
    text += '\'';
}

}  // namespace

void AppendLiteral(std::string& text, const SqliteValue& value)
{
    const Json::Value& payload = SqliteInternals::Payload(value);
    switch (payload.type()) {
        case Json::stringValue: return AppendQuoted(text, payload);
        case Json::booleanValue: text += payload.asBool() ? '1' : '0'; return;
        case Json::intValue: return AppendNumber(text, payload.asLargestInt());
        case Json::uintValue: return AppendNumber(text, payload.asLargestUInt());
        default: return;
    }
}

std::string JoinPairs(const SqliteValueList& record, const char* between, const char* separator)
{
    std::string text;
    for (const auto& [field, value] : record.GetValues()) {
        if (!text.empty()) text += separator;
        text += field;
        text += between;
        AppendLiteral(text, value);
    }
    return text;
}

}  // namespace OrvaDRCore
