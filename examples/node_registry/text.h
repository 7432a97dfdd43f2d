// Text from outside: what is accepted, and how to show any of it safely.
#ifndef NODE_REGISTRY_TEXT_H
#define NODE_REGISTRY_TEXT_H

#include <cstddef>
#include <string>
#include <string_view>

namespace NodeRegistry {

// Whether the text is valid UTF-8 of 1 to `maxBytes` bytes without control characters.
bool IsPlainText(std::string_view text, std::size_t maxBytes);

// The text, safe for a terminal: each byte that IsPlainText() refuses becomes a question mark, and
// text beyond `maxBytes` becomes "...".
std::string ToPrintable(std::string_view text, std::size_t maxBytes);

}  // namespace NodeRegistry

#endif
