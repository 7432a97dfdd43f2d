#include "json_line.h"

#include <memory>

#include <json/reader.h>
#include <json/writer.h>

namespace NodeRegistry {

bool ParseLine(const std::string& line, Json::Value& ret_object)
{
    // jsoncpp would stop at a zero byte and ignore the rest.
    if (line.find('\0') != std::string::npos) return false;

    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["failIfExtra"] = true;
    builder["strictRoot"] = true;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());

    // Parse into a temporary, because jsoncpp leaves the first members of a broken document behind.
    Json::Value document;
    try {
        if (!reader->parse(line.data(), line.data() + line.size(), &document, nullptr)) {
            return false;
        }
    } catch (const Json::Exception&) {  // nested too deep
        return false;
    }
    if (!document.isObject()) return false;
    ret_object.swap(document);
    return true;
}

std::string ToLine(const Json::Value& value)
{
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return Json::writeString(builder, value);
}

}  // namespace NodeRegistry
