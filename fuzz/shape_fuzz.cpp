// A statement that has a shape is that shape with the literals in the places of its parameters.
#include <charconv>
#include <cstdint>
#include <string>
#include <string_view>
#include <system_error>
#include <variant>

#include "sqlite/sqlite_shape.h"
#include "support/fuzz.h"

using OrvaDRCore::Shape;

namespace {

// Takes the literal from the beginning of a text. False if another text is there.
bool Take(std::string_view& text, const Shape::Literal& literal)
{
    if (const auto* expected = std::get_if<std::string_view>(&literal)) {
        const std::string quoted = "'" + std::string(*expected) + "'";
        const bool isThere = text.substr(0, quoted.size()) == quoted;
        if (isThere) text.remove_prefix(quoted.size());
        return isThere;
    }
    std::int64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    return error == std::errc() && number == std::get<std::int64_t>(literal);
}

}  // namespace

void Fuzz(const std::string& input)
{
    Shape shape;
    if (!OrvaDRCore::ReadShape(input, shape)) return;
    std::string_view rest = input;
    auto literal = shape.literals.begin();
    for (const char character : shape.text) {
        if (character == '?') {
            Expect(literal != shape.literals.end(), "each parameter has a literal");
            Expect(Take(rest, *literal++), "the literal is that of the statement");
        } else {
            Expect(!rest.empty() && rest.front() == character, "all else is as it was");
            rest.remove_prefix(1);
        }
    }
    Expect(literal == shape.literals.end(), "each literal has a parameter");
    Expect(rest.empty() || rest == ";", "nothing is left");
}
