// Makes the C locale with one facet replaced the program's locale. No installed locale is needed.
#ifndef ORVADRCORE_TESTS_GLOBAL_LOCALE_H
#define ORVADRCORE_TESTS_GLOBAL_LOCALE_H

#include <locale>
#include <string>

// "1.234,5" is one thousand and a bit.
class CommaDecimals : public std::numpunct<char> {
  protected:
    char do_decimal_point() const override { return ','; }
    char do_thousands_sep() const override { return '.'; }
    std::string do_grouping() const override { return "\3"; }
};

// While it lives the program's locale has this facet. The locale owns the facet.
class GlobalLocale {
  public:
    template <class Facet>
    explicit GlobalLocale(Facet* facet)
        : before_(std::locale::global(std::locale(std::locale::classic(), facet)))
    {
    }
    GlobalLocale(const GlobalLocale&) = delete;
    GlobalLocale& operator=(const GlobalLocale&) = delete;
    ~GlobalLocale() { std::locale::global(before_); }

  private:
    std::locale before_;
};

#endif
