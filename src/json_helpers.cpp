#include "json_helpers.h"

#include <atomic>
#include <cmath>
#include <cstring>
#include <memory>
#include <sstream>

#include <json/reader.h>
#include <json/writer.h>

#include "file_io.h"
#include "replace_file.h"

namespace OrvaDRCore {

namespace {

void Configure(Json::CharReaderBuilder& builder)
{
    builder["allowComments"] = false;
    builder["allowTrailingCommas"] = false;
    builder["failIfExtra"] = true;
    builder["stackLimit"] = MaxLevels;
}

void Configure(Json::StreamWriterBuilder& builder)
{
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    builder["indentation"] = "";
}

// The configured builder, which takes longer to make than a small document to read. It is made at
// the first use and stays as it is. Threads that come first at once make one each: a lock might be
// held by another thread in a process that forks.
template <class Builder>
const Builder& Kept()
{
    static std::atomic<const Builder*> kept{nullptr};
    const Builder* builder = kept.load(std::memory_order_acquire);
    if (builder == nullptr) {
        auto made = std::make_unique<Builder>();
        Configure(*made);
        if (kept.compare_exchange_strong(builder, made.get(), std::memory_order_acq_rel)) {
            builder = made.release();
        }
    }
    return *builder;
}

enum class Reals { Any, Finite };

// Whether a value has so many levels at most, and none but such real numbers.
bool Holds(const Json::Value& value, int levels, Reals reals)
{
    if (levels <= 0) return false;
    switch (value.type()) {
        case Json::realValue: return reals == Reals::Any || !std::isinf(value.asDouble());
        case Json::arrayValue:
        case Json::objectValue:
            for (const Json::Value& member : value) {
                if (!Holds(member, levels - 1, reals)) return false;
            }
            return true;
        default: return true;
    }
}

}  // namespace

bool fromString(Json::Value& value, const std::string& text)
{
    // The reader takes a zero byte for the end of the text and would pass over what follows it. No
    // JSON document holds one: in strings it is written \u0000.
    if (text.find('\0') != std::string::npos) return false;

    const std::unique_ptr<Json::CharReader> reader(Kept<Json::CharReaderBuilder>().newCharReader());

    // A document that breaks off leaves its first members behind in the reader's output.
    Json::Value document;
    try {
        if (!reader->parse(text.data(), text.data() + text.size(), &document, nullptr))
            return false;
    } catch (const Json::Exception&) {
        return false;
    }
    value.swap(document);
    return true;
}

std::string toString(const Json::Value& value)
{
    const auto& builder = Kept<Json::StreamWriterBuilder>();
    const std::unique_ptr<Json::StreamWriter> writer(builder.newStreamWriter());
    std::ostringstream text;
    text.exceptions(std::ios::badbit);  // or a text for which memory is short comes out cut off
    writer->write(value, &text);
    return text.str();
}

bool NestsAtMost(const Json::Value& value, int levels)
{
    return Holds(value, levels, Reals::Any);
}

bool IsReadable(const Json::Value& value, int levelsAbove)
{
    return Holds(value, MaxLevels - levelsAbove, Reals::Finite);
}

bool fromFile(Json::Value& value, const std::string& path)
{
    std::string text;
    return ReadRegularFile(path, text) && fromString(value, text);
}

bool toFile(const Json::Value& value, const std::string& path)
{
    return ReplaceFile(path, toString(value));
}

const Json::Value* FindMember(const Json::Value& object, const char* key)
{
    if (key == nullptr || !object.isObject()) return nullptr;
    return object.find(key, key + std::strlen(key));
}

bool AsBool(const Json::Value& value)
{
    return value.isConvertibleTo(Json::booleanValue) && value.asBool();
}

std::string AsString(const Json::Value& value)
{
    return value.isConvertibleTo(Json::stringValue) ? value.asString() : std::string();
}

void Clear(Json::Value& value)
{
    if (value.isArray() || value.isObject()) {
        value.clear();
    } else {
        value = Json::Value();
    }
}

}  // namespace OrvaDRCore
