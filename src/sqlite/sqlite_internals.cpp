#include "sqlite/sqlite_internals.h"

#include <array>
#include <charconv>
#include <cmath>

#include "base/json_helpers.h"
#include "sqlite/sqlite_real.h"

namespace OrvaDRCore {

namespace {

void AppendNumber(std::string& text, std::int64_t number)
{
    std::array<char, 24> digits{};  // 64 bits need 20 digits and a sign at most
    char* const begin = digits.data();
    text.append(begin, std::to_chars(begin, begin + digits.size(), number).ptr);
}

void AppendHexadecimal(std::string& text, std::string_view bytes)
{
    constexpr const char* Digits = "0123456789abcdef";
    const std::size_t begin = text.size();
    text.resize(begin + LengthOfBlobLiteral(bytes.size()));
    char* out = text.data() + begin;
    *out++ = 'X';
    *out++ = '\'';
    for (const char byte : bytes) {
        const auto number = static_cast<unsigned char>(byte);
        *out++ = Digits[number / 16];
        *out++ = Digits[number % 16];
    }
    *out = '\'';
}

// SQLite ends a statement at a zero byte, so a text that holds one is written like a blob.
void AppendText(std::string& text, std::string_view bytes)
{
    if (bytes.find('\0') != std::string_view::npos) {
        text += "CAST(";
        AppendHexadecimal(text, bytes);
        text += " AS TEXT)";
        return;
    }
    text += '\'';
    AppendEscaped(text, bytes);
    text += '\'';
}

// By contract a plain text is not escaped.
void AppendPlain(std::string& text, std::string_view bytes)
{
    text += '\'';
    text += bytes;
    text += '\'';
}

}  // namespace

void AppendEscaped(std::string& text, std::string_view unescaped)
{
    std::size_t begin = 0;
    for (std::size_t quote = unescaped.find('\''); quote != std::string_view::npos;
         quote = unescaped.find('\'', begin)) {
        text.append(unescaped, begin, quote + 1 - begin);
        text += '\'';
        begin = quote + 1;
    }
    text.append(unescaped, begin);
}

bool IsStoredAsNull(const SqliteValue& value)
{
    const bool isReal = SqliteInternals::KindOf(value) == SqliteInternals::Kind::Real;
    return value.IsNull() || (isReal && std::isnan(SqliteInternals::RealOf(value)));
}

void AppendLiteral(std::string& text, const SqliteValue& value)
{
    using Internals = SqliteInternals;
    using Kind = Internals::Kind;
    switch (Internals::KindOf(value)) {
        case Kind::Nothing: return;
        case Kind::Boolean:
        case Kind::Integer: return AppendNumber(text, Internals::IntegerOf(value));
        case Kind::Real: return AppendReal(text, Internals::RealOf(value));
        case Kind::PlainText: return AppendPlain(text, Internals::BytesOf(value));
        case Kind::Text: return AppendText(text, Internals::BytesOf(value));
        case Kind::Blob: return AppendHexadecimal(text, Internals::BytesOf(value));
        case Kind::Null: text += "NULL"; return;
    }
}

std::string Shown(const SqliteValue& value)
{
    using Internals = SqliteInternals;
    using Kind = Internals::Kind;
    switch (Internals::KindOf(value)) {
        case Kind::Boolean: return Internals::IntegerOf(value) != 0 ? "true" : "false";
        case Kind::Real: return toString(Internals::RealOf(value));
        case Kind::PlainText:
        case Kind::Text: return toString(ToJsonText(Internals::BytesOf(value)));
        case Kind::Integer:
        case Kind::Blob: return value.ToFormatedValue();
        default: return "null";
    }
}

void AppendPairs(std::string& text, const SqliteValueList& record, const char* between,
                 const char* separator)
{
    const char* before = "";
    for (const auto& [field, value] : record.GetValues()) {
        text += before;
        text += field;
        text += between;
        AppendLiteral(text, value);
        before = separator;
    }
}

std::string BeginStatement(const char* text)
{
    constexpr std::size_t UsualLength = 240;
    std::string statement;
    statement.reserve(UsualLength);
    statement += text;
    return statement;
}

void AppendInsertInto(std::string& text, const std::string& table, bool replacable)
{
    text += replacable ? "INSERT OR REPLACE INTO " : "INSERT INTO ";
    text += table;
    text += ' ';
}

void AppendColumns(std::string& text, const SqliteValueList& record)
{
    text += '(';
    for (const auto& [field, value] : record.GetValues()) (text += field) += ',';
    if (text.back() == ',') text.pop_back();
    text += ") VALUES (";
}

void AppendClause(std::string& text, const char* keyword, const std::string& clause)
{
    if (!clause.empty()) (text += keyword) += clause;
}

}  // namespace OrvaDRCore
