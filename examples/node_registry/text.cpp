#include "text.h"

namespace NodeRegistry {

namespace {

// The length of the text's first character; 0 if that is a control character or not UTF-8. The text
// must not be empty.
std::size_t PlainCharacterLength(std::string_view text)
{
    const auto byte = [text](std::size_t index) -> unsigned int {
        return index < text.size() ? static_cast<unsigned char>(text[index]) : 0U;
    };
    const unsigned int lead = byte(0);
    if (lead < 0x80) return lead < 0x20 || lead == 0x7f ? 0 : 1;
    if (lead < 0xc2 || lead > 0xf4) return 0;

    const std::size_t length = lead < 0xe0 ? 2 : lead < 0xf0 ? 3 : 4;
    for (std::size_t index = 1; index < length; ++index) {
        if ((byte(index) & 0xc0U) != 0x80) return 0;
    }
    const unsigned int second = byte(1);
    if (lead == 0xc2 && second < 0xa0) return 0;  // control characters U+0080 to U+009F
    if (lead == 0xe0 && second < 0xa0) return 0;  // overlong form
    if (lead == 0xed && second > 0x9f) return 0;  // a surrogate
    if (lead == 0xf0 && second < 0x90) return 0;  // overlong form
    if (lead == 0xf4 && second > 0x8f) return 0;  // beyond the last character
    return length;
}

}  // namespace

bool IsPlainText(std::string_view text, std::size_t maxBytes)
{
    if (text.empty() || text.size() > maxBytes) return false;
    while (!text.empty()) {
        const std::size_t length = PlainCharacterLength(text);
        if (length == 0) return false;
        text.remove_prefix(length);
    }
    return true;
}

std::string ToPrintable(std::string_view text, std::size_t maxBytes)
{
    std::string printable;
    while (!text.empty()) {
        const std::size_t length = PlainCharacterLength(text);
        if (printable.size() + length > maxBytes || printable.size() == maxBytes) {
            return printable + "...";
        }
        printable += length == 0 ? "?" : text.substr(0, length);
        text.remove_prefix(length == 0 ? 1 : length);
    }
    return printable;
}

}  // namespace NodeRegistry
