#include <orvacore/orvacore.h>

#include <sys/stat.h>

#include <cstring>

namespace {

constexpr const char* Whitespace = " \t\n\v\f\r";

}  // namespace

char* CoreLibStrTrim(char* text, const char* leading, const char* trailing)
{
    if (text == nullptr) return nullptr;
    if (leading == nullptr) leading = Whitespace;
    if (trailing == nullptr) trailing = Whitespace;

    const char* begin = text + std::strspn(text, leading);
    const char* end = begin + std::strlen(begin);
    while (end > begin && std::strchr(trailing, end[-1]) != nullptr) --end;
    const auto length = static_cast<std::size_t>(end - begin);
    std::memmove(text, begin, length);
    text[length] = '\0';
    return text;
}

bool CoreLibFileExist(const char* path)
{
    struct stat status {};
    return ::stat(path, &status) == 0;
}

int CoreLibFileCheckDir(const char* path)
{
    struct stat status {};
    return ::stat(path, &status) == 0 && S_ISDIR(status.st_mode) ? 1 : 0;
}
