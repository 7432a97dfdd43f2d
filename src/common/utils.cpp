#include <orvadrcore/utils.h>

#include <orvacore/orvacore.h>
#include <orvarandom/orvarandom.h>
#include <unistd.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>

#include "base/json_helpers.h"
#include "base/log.h"

namespace OrvaDRCore {

namespace {

constexpr const char* UuidProgram = "/usr/bin/uuidgen";
constexpr std::string_view VolumePrefix = "/volume";

struct CloseProgram {
    void operator()(FILE* output) const { CoreLibPclose(output); }
};
using Output = std::unique_ptr<FILE, CloseProgram>;

struct Free {
    void operator()(char* text) const { std::free(text); }
};

void Append(std::string& text, const std::string& element)
{
    text += element;
}

void Append(std::string& text, int element)
{
    text += static_cast<char>(static_cast<unsigned char>(element));
}

void Append(std::string& text, bool element)
{
    text += element ? '\1' : '\0';
}

void Append(std::string& text, double element)
{
    // fmod, because no integer type holds every double. Infinity and NaN count as 0.
    const double low = element > 0 ? std::fmod(std::trunc(element), 256.0) : 0.0;
    text += std::isfinite(low) ? static_cast<char>(static_cast<unsigned char>(low)) : '\0';
}

Json::Value ToJson(const std::string& element)
{
    return ToJsonText(element);
}

template <class T>
Json::Value ToJson(T element)
{
    return element;
}

template <class T>
Json::Value ToArray(const std::vector<T>& values)
{
    Json::Value array(Json::arrayValue);
    for (const auto& value : values) array.append(ToJson(value));
    return array;
}

template <class T>
std::string Join(const std::vector<T>& values, const std::string& separator)
{
    std::string text;
    for (const auto& value : values) {
        // Not "is it the first?": the contract drops empty elements at the beginning.
        if (!text.empty()) text += separator;
        Append(text, value);
    }
    return text;
}

}  // namespace

std::string GenerateUUID()
{
    std::string uuid;
    const Output output(CoreLibPopen(UuidProgram, "r", nullptr));
    if (output == nullptr) {
        DR_LOG(Err, "Failed to exec the command [%s].", UuidProgram);
        return uuid;
    }
    char* text = nullptr;
    std::size_t size = 0;
    const ssize_t length = ::getline(&text, &size, output.get());
    const std::unique_ptr<char, Free> line(text);
    // A read error may have cut the line off.
    const bool isWholeLine = length >= 0 && std::ferror(output.get()) == 0;
    if (isWholeLine) uuid = CoreLibStrTrim(line.get(), nullptr, nullptr);
    return uuid;
}

bool RandomSleepInMSec(unsigned int min, unsigned int max)
{
    if (min == 0 || max == 0 || min >= max) {
        DR_LOG(Err, "Invalid period [%u - %u] to sleep", min, max);
        return false;
    }
    ORVA::RANDOM::ORVARandom random;
    ::usleep(random.urandom(min, max) * 1000U);
    return true;
}

template <>
Json::Value Container::ToJsonArray(const std::vector<std::string>& values)
{
    return ToArray(values);
}

template <>
Json::Value Container::ToJsonArray(const std::vector<int>& values)
{
    return ToArray(values);
}

template <>
Json::Value Container::ToJsonArray(const std::vector<bool>& values)
{
    return ToArray(values);
}

template <>
Json::Value Container::ToJsonArray(const std::vector<double>& values)
{
    return ToArray(values);
}

template <>
std::string Container::ToString(const std::vector<std::string>& values,
                                const std::string& separator)
{
    return Join(values, separator);
}

template <>
std::string Container::ToString(const std::vector<int>& values, const std::string& separator)
{
    return Join(values, separator);
}

template <>
std::string Container::ToString(const std::vector<bool>& values, const std::string& separator)
{
    return Join(values, separator);
}

template <>
std::string Container::ToString(const std::vector<double>& values, const std::string& separator)
{
    return Join(values, separator);
}

bool Validator::IsVolPath(const std::string& path)
{
    return path.compare(0, VolumePrefix.size(), VolumePrefix) == 0;
}

}  // namespace OrvaDRCore
