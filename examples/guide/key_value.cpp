// Reads a "key=value" file as texts, as integers and as real numbers. Some of its lines are odd.
#include <cstdlib>
#include <fstream>
#include <iomanip>
#include <iostream>
#include <map>
#include <string>

#include <orvadrcore/file.h>

using OrvaDRCore::File;

namespace {

constexpr const char* Lines =
    "port = 5001\n"
    "    indented = yes\n"
    "name=backup 01\n"
    "two words=1\n"
    "limit=12abc\n"
    "ratio=0.5\n"
    "exponent=1e3\n"
    "hex=0x1F\n"
    "huge=99999999999\n"
    "state=on\n"
    "blank= \n"
    "chain=a=b\n"
    "# comment = 7\n"
    "twice=1\n"
    "twice=2\n"
    " =no key\n"
    "=nothing at all\n"
    "empty=\n"
    "no separator\n"
    "\n";

}  // namespace

int main()
{
    std::ofstream("limits.conf") << Lines;

    // [read]
    std::map<std::string, std::string> texts;
    std::map<std::string, int> integers;
    std::map<std::string, double> reals;
    if (File::Read("limits.conf", texts) < 0) return EXIT_FAILURE;
    if (File::Read("limits.conf", integers) < 0) return EXIT_FAILURE;
    if (File::Read("limits.conf", reals) < 0) return EXIT_FAILURE;
    // [/read]

    std::cout << std::left << std::setw(12) << "key" << std::setw(14) << "text" << std::setw(12)
              << "int"
              << "double\n";
    for (const auto& [key, value] : texts) {
        std::cout << std::setw(12) << "[" + key + "]" << std::setw(14) << "[" + value + "]"
                  << std::setw(12) << integers[key] << reals[key] << '\n';
    }
    return EXIT_SUCCESS;
}
