#include "base/extraction.h"

#include <cfenv>
#include <charconv>
#include <cmath>
#include <limits>
#include <system_error>

namespace OrvaDRCore {

namespace {

constexpr std::string_view Digits = "0123456789";

// std::from_chars does not take a plus. "+-1" keeps it, and so stays no number.
std::string_view SkipPlus(std::string_view text)
{
    const bool signedTwice = text.size() > 1 && text[1] == '-';
    if (!text.empty() && text[0] == '+' && !signedTwice) text.remove_prefix(1);
    return text;
}

// Whether std::from_chars and a stream agree on what the text begins with. They do not on "inf" and
// "nan", which a stream does not read.
bool BeginsWithDigit(std::string_view text)
{
    const std::size_t at = text.find_first_not_of("-.");
    return at != std::string_view::npos && Digits.find(text[at]) != std::string_view::npos;
}

}  // namespace

Extraction::Extraction()
    : kinds_(std::use_facet<std::ctype<char>>(locale_)),
      isPlain_(locale_ == std::locale::classic() && std::fegetround() == FE_TONEAREST)
{
}

void Extraction::Read(std::string_view text, std::string& word) const
{
    std::string_view read;
    Read(text, read);
    if (!read.empty()) word = read;
}

void Extraction::Read(std::string_view text, std::string_view& word) const
{
    text = SkipBlanks(text);
    if (text.empty()) return;
    const char* end = kinds_.scan_is(std::ctype_base::space, text.begin(), text.end());
    word = text.substr(0, static_cast<std::size_t>(end - text.data()));
}

void Extraction::Read(std::string_view text, int& number)
{
    if (!isPlain_) return ReadByStream(text, number);
    text = SkipBlanks(text);
    if (text.empty()) return;
    text = SkipPlus(text);
    int value = 0;
    const std::errc error = std::from_chars(text.begin(), text.end(), value).ec;
    if (error == std::errc::result_out_of_range) {
        using Limits = std::numeric_limits<int>;
        value = text[0] == '-' ? Limits::min() : Limits::max();
    }
    number = value;
}

void Extraction::Read(std::string_view text, double& number)
{
    const std::string_view digits = SkipPlus(SkipBlanks(text));
    if (!isPlain_ || !BeginsWithDigit(digits)) return ReadByStream(text, number);
    double value = 0;
    const auto [stop, error] = std::from_chars(digits.begin(), digits.end(), value);
    // An exponent without digits fails in a stream; std::from_chars ignores it.
    const bool lacksExponent = stop != digits.end() && (*stop == 'e' || *stop == 'E');
    if (error != std::errc() || !std::isfinite(value) || lacksExponent) {
        return ReadByStream(text, number);
    }
    number = value;
}

std::string_view Extraction::SkipBlanks(std::string_view text) const
{
    const char* begin = kinds_.scan_not(std::ctype_base::space, text.begin(), text.end());
    text.remove_prefix(static_cast<std::size_t>(begin - text.data()));
    return text;
}

template <class Number>
void Extraction::ReadByStream(std::string_view text, Number& number)
{
    if (!stream_) {
        stream_.emplace().imbue(locale_);
        stream_->exceptions(std::ios::badbit);  // or bad_alloc looks like a text without a number
    }
    stream_->clear();
    stream_->str(std::string(text));
    *stream_ >> number;
}

}  // namespace OrvaDRCore
