// A tokenizer for SQL that shares no code with the library or SQLite.
#ifndef ORVADRCORE_FUZZ_SQL_TOKENS_H
#define ORVADRCORE_FUZZ_SQL_TOKENS_H

#include <cctype>
#include <string>
#include <vector>

#include "support/fuzz.h"

using Tokens = std::vector<std::string>;

inline std::string Quoted(const std::string& name, char quote = '"')
{
    std::string quoted(1, quote);
    for (const char character : name) quoted.append(character == quote ? 2 : 1, character);
    return quoted + quote;
}

// Tokens are texts and names with their quotes, numbers, words, and single other characters.
inline Tokens Tokenize(const std::string& text)
{
    const auto isWord = [](char character) {
        return std::isalnum(static_cast<unsigned char>(character)) != 0 || character == '-';
    };
    Tokens tokens;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t begin = at++;
        if (text[begin] == '\'' || text[begin] == '"') {
            for (; at < text.size(); ++at) {
                if (text[at] != text[begin]) continue;
                if (at + 1 == text.size() || text[at + 1] != text[begin]) break;
                ++at;
            }
            Expect(at++ < text.size(), "every quote that opens closes");
        } else if (isWord(text[begin])) {
            while (at < text.size() && isWord(text[at])) ++at;
        }
        if (text[begin] != ' ') tokens.push_back(text.substr(begin, at - begin));
    }
    return tokens;
}

#endif
