// Texts that come from outside: which are accepted, and how any may be shown.
#ifndef NODE_REGISTRY_TEXT_H
#define NODE_REGISTRY_TEXT_H

#include <cstddef>
#include <string>
#include <string_view>

namespace NodeRegistry {

// Whether a text has 1 to `maxBytes` bytes, all of them UTF-8, and no control characters.
bool IsPlainText(std::string_view text, std::size_t maxBytes);

// The text for a terminal: a question mark for every byte that IsPlainText would refuse, and "..."
// for what is beyond `maxBytes`.
std::string ToPrintable(std::string_view text, std::size_t maxBytes);

}  // namespace NodeRegistry

#endif
