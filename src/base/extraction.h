// Reads words and numbers from texts as the standard streams do. An actual stream, which is slow,
// is used only for unusual texts and unusual locales.
#ifndef ORVADRCORE_SRC_BASE_EXTRACTION_H
#define ORVADRCORE_SRC_BASE_EXTRACTION_H

#include <locale>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>

namespace OrvaDRCore {

// Each Read() does what `std::istringstream(text) >> value` does, also where that leaves the value as
// it was. The program's locale and rounding at construction count.
class Extraction {
  public:
    Extraction();

    void Read(std::string_view text, std::string& word) const;
    void Read(std::string_view text, std::string_view& word) const;  // a part of `text`
    void Read(std::string_view text, int& number);
    void Read(std::string_view text, double& number);

  private:
    std::string_view SkipBlanks(std::string_view text) const;
    template <class Number>
    void ReadByStream(std::string_view text, Number& number);

    std::locale locale_;
    const std::ctype<char>& kinds_;
    bool isPlain_;  // the C locale, rounding to the nearest
    std::optional<std::istringstream> stream_;
};

}  // namespace OrvaDRCore

#endif
