// Words and numbers read from texts as the standard streams read them, with a stream only where
// something unusual stands in the text or where the program's locale has ways of its own.
#ifndef ORVADRCORE_SRC_BASE_EXTRACTION_H
#define ORVADRCORE_SRC_BASE_EXTRACTION_H

#include <locale>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>

namespace OrvaDRCore {

// Reads values as `std::istringstream(text) >> value` does, under the locale and the rounding that
// the program had when the object was made. Where a stream leaves a value as it was, so does this.
class Extraction {
  public:
    Extraction();

    void Read(std::string_view text, std::string& word) const;
    void Read(std::string_view text, int& number);
    void Read(std::string_view text, double& number);

  private:
    std::string_view SkipBlanks(std::string_view text) const;
    template <class Number>
    void ReadByStream(std::string_view text, Number& number);

    std::locale locale_;
    const std::ctype<char>& kinds_;
    bool plain_;  // numbers are written as in C and rounded to the nearest
    std::optional<std::istringstream> stream_;
};

}  // namespace OrvaDRCore

#endif
