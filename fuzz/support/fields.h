// Fields of records in an input, one per line: kind, name, value.
//
//     text name=O'Brien
//     int port=-5001
//     unsigned size=4294967295
//     bool enabled=1
#ifndef ORVADRCORE_FUZZ_FIELDS_H
#define ORVADRCORE_FUZZ_FIELDS_H

#include <orvadrcore/sqlite_value.h>

#include <charconv>
#include <string>
#include <variant>

#include "support/fuzz.h"

// What SQLite stores for a value.
using Stored = std::variant<long long, std::string>;

struct Field {
    std::string name;
    std::variant<std::string, int, unsigned int, bool> value;
};

template <class Number>
Number ParseNumber(const std::string& text)
{
    Number number = 0;
    std::from_chars(text.data(), text.data() + text.size(), number);
    return number;
}

// The field on the next line. Its first letter is the kind; unknown letters mean text.
inline Field TakeField(Pieces& pieces)
{
    const std::string kind = pieces.Until(' ');
    Field field{pieces.Until('='), pieces.Until('\n')};
    const std::string& text = std::get<std::string>(field.value);
    switch (kind.empty() ? 't' : kind[0]) {
        case 'i': field.value = ParseNumber<int>(text); break;
        case 'u': field.value = ParseNumber<unsigned int>(text); break;
        case 'b': field.value = ParseNumber<int>(text) != 0; break;
        default: break;
    }
    return field;
}

inline OrvaDRCore::SqliteValue ValueOf(const Field& field)
{
    return std::visit([](const auto& value) { return OrvaDRCore::SqliteValue(value); },
                      field.value);
}

inline Stored StoredOf(const Field& field)
{
    if (const auto* text = std::get_if<std::string>(&field.value)) return *text;
    if (const auto* number = std::get_if<int>(&field.value)) return *number;
    if (const auto* number = std::get_if<unsigned int>(&field.value)) return *number;
    return std::get<bool>(field.value) ? 1 : 0;
}

#endif
