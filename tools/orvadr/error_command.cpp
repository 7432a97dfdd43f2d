#include <strings.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <iterator>
#include <optional>

#include <orvadrcore/errors.h>

#include "base/json_helpers.h"
#include "commands.h"
#include "text.h"

namespace Orvadr {

namespace {

using OrvaDRCore::ERR;
using OrvaDRCore::ToJsonText;

struct Meaning {
    int code;
    const char* text;
};

// Made from the comments in errors.h, so that header and program say the same.
constexpr Meaning Meanings[] = {
#include "error_codes.inc"
};

std::optional<int> ParseCode(const std::string& text)
{
    int code = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, code);
    return error == std::errc() && stop == end ? std::optional<int>(code) : std::nullopt;
}

Json::Value Describe(const Meaning& meaning)
{
    Json::Value object(Json::objectValue);
    object["code"] = meaning.code;
    object["name"] = ERR::ToString(meaning.code);
    object["meaning"] = meaning.text;
    return object;
}

// What there is not, with what is known of it: the number, or the name.
Json::Value DescribeUnknown(const std::string& asked, const std::optional<int>& code)
{
    Json::Value object(Json::objectValue);
    object["code"] = code ? Json::Value(*code) : Json::Value();
    object["name"] = code ? Json::Value() : ToJsonText(asked);
    object["meaning"] = Json::Value();
    return object;
}

void ReportOne(const std::string& asked, Report& report)
{
    const std::optional<int> code = ParseCode(asked);
    const auto* const found =
        std::find_if(std::begin(Meanings), std::end(Meanings), [&](const Meaning& meaning) {
            return code ? *code == meaning.code
                        : ::strcasecmp(asked.c_str(), ERR::ToString(meaning.code).c_str()) == 0;
        });
    if (found != std::end(Meanings)) {
        report.objects.append(Describe(*found));
        return;
    }
    report.objects.append(DescribeUnknown(asked, code));
    report.remarks.push_back("there is no error " + Printable(asked));
    report.Worsen(ExitCode::NotWell);
}

}  // namespace

Report ReportErrors(const std::vector<std::string>& codesOrNames)
{
    Report report;
    report.columns = {TextColumn("CODE", "code", "-"), TextColumn("NAME", "name", "-"),
                      TextColumn("MEANING", "meaning", "-")};
    for (const std::string& asked : codesOrNames) ReportOne(asked, report);
    if (codesOrNames.empty()) {
        for (const Meaning& meaning : Meanings) report.objects.append(Describe(meaning));
    }
    return report;
}

}  // namespace Orvadr
