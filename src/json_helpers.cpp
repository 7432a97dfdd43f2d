#include "json_helpers.h"

#include <cstring>
#include <memory>

#include <json/reader.h>
#include <json/writer.h>

#include "file_io.h"

namespace OrvaDRCore {

bool fromString(Json::Value& value, const std::string& text)
{
    // The reader takes a zero byte for the end of the text and would pass over what follows it. No
    // JSON document holds one: in strings it is written \u0000.
    if (text.find('\0') != std::string::npos) return false;

    Json::CharReaderBuilder builder;
    builder["allowComments"] = false;
    builder["allowTrailingCommas"] = false;
    builder["failIfExtra"] = true;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());

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
    Json::StreamWriterBuilder builder;
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

bool fromFile(Json::Value& value, const std::string& path)
{
    const FileDescriptor file(path, O_RDONLY);
    std::string text;
    return file.IsOpen() && ReadAll(file.Get(), text) && fromString(value, text);
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
