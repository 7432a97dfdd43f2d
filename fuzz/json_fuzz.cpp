// An accepted document is printed and read back unchanged. A refused one leaves the value
// unchanged.
#include <algorithm>
#include <cmath>

#include "base/json_helpers.h"
#include "support/fixtures/jsoncpp_text.h"
#include "support/fuzz.h"

namespace {

// Compares kinds, names and bits. Recurses itself, so that the fuzzer sees the structure of a
// document.
bool IsSame(const Json::Value& one, const Json::Value& other)
{
    if (one.type() != other.type() || one.size() != other.size()) return false;
    if (one.isArray()) return std::equal(one.begin(), one.end(), other.begin(), IsSame);
    if (one.type() == Json::realValue) {
        const bool isSameSign = std::signbit(one.asDouble()) == std::signbit(other.asDouble());
        return isSameSign && one.asDouble() == other.asDouble();
    }
    if (!one.isObject()) return one == other;
    const Json::Value::Members names = one.getMemberNames();
    return names == other.getMemberNames() &&
           std::all_of(names.begin(), names.end(),
                       [&](const std::string& name) { return IsSame(one[name], other[name]); });
}

bool IsControl(char character)
{
    return static_cast<unsigned char>(character) < ' ';
}

}  // namespace

void Fuzz(const std::string& input)
{
    const Json::Value before("as it was");
    Json::Value value(before);
    if (!OrvaDRCore::fromString(value, input)) {
        Expect(value == before, "a text that does not parse leaves the value alone");
        return;
    }
    const std::string text = OrvaDRCore::toString(value);
    Expect(std::none_of(text.begin(), text.end(), IsControl), "a document is one line");

    Expect(text == JsoncppText(value), "a document is printed as by jsoncpp");

    Json::Value back;
    Expect(OrvaDRCore::fromString(back, text), "what was printed is read");
    Expect(IsSame(back, value), "a document comes back as it was");
    Expect(OrvaDRCore::toString(back) == text, "a document is printed alike each time");
}
