// Shared by the fuzz targets. NAME_fuzz.cpp defines Fuzz(), which is called with one input after
// the other: any bytes. It must return. A sanitizer's finding, an exception and a failed Expect()
// end the program, and libFuzzer keeps the input.
#ifndef ORVADRCORE_FUZZ_H
#define ORVADRCORE_FUZZ_H

#include <cstdio>
#include <cstdlib>
#include <string>

void Fuzz(const std::string& input);

inline void Expect(bool holds, const char* what)
{
    if (holds) return;
    (void)std::fprintf(stderr, "not so: %s\n", what);
    std::abort();
}

// Splits an input. A backslash escapes the next character: "\n" is a newline, "\0" a zero byte, any
// other stands for itself and ends nothing.
class Pieces {
  public:
    explicit Pieces(const std::string& input) : text(input) {}

    bool AtEnd() const { return at >= text.size(); }

    // The text up to `end`, which is skipped, or to the end of the line.
    std::string Until(char end)
    {
        std::string piece;
        for (; !AtEnd() && text[at] != end && text[at] != '\n'; ++at) {
            const bool isEscaped = text[at] == '\\' && at + 1 < text.size();
            piece += isEscaped ? Meaning(text[++at]) : text[at];
        }
        if (!AtEnd() && text[at] == end) ++at;
        return piece;
    }

    // The rest, unchanged.
    std::string Rest() const { return AtEnd() ? std::string() : text.substr(at); }

  private:
    static char Meaning(char escaped)
    {
        if (escaped == 'n') return '\n';
        return escaped == '0' ? '\0' : escaped;
    }

    const std::string& text;
    std::size_t at = 0;
};

#endif
