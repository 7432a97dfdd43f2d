// What orvadr reads. The first input line says what the rest is: the file of a "cache", a "db", the
// kernel's "locks", or any "text" that names something.
#include <algorithm>
#include <cstddef>
#include <fstream>
#include <string>

#include "base/json_helpers.h"
#include "commands.h"
#include "database.h"
#include "kernel_locks.h"
#include "support/fixtures/temp_dir.h"
#include "support/fuzz.h"
#include "table.h"
#include "text.h"

namespace {

constexpr std::size_t Columns = 80;

bool IsPlain(const std::string& text)
{
    for (const char character : text) {
        const auto byte = static_cast<unsigned char>(character);
        if ((byte < ' ' && character != '\n') || byte == '\x7f') return false;
    }
    return true;
}

void CheckText(const std::string& text)
{
    const std::string printable = Orvadr::Printable(text);
    Expect(IsPlain(printable) && printable.find('\n') == std::string::npos,
           "a printable text is one line without control characters");
    const bool isEscaped = printable.find('\\') != std::string::npos;
    Expect(isEscaped || printable == text, "a text that needs no escape stays");
    if (!OrvaDRCore::FitsJsonText(text.size())) return;
    const Json::Value utf8 = Orvadr::ToUtf8(OrvaDRCore::ToJsonText(text));
    Expect(Orvadr::ToUtf8(utf8) == utf8, "UTF-8 stays");
}

// A report can be shown, and read as JSON.
void CheckReport(const Orvadr::Report& report)
{
    for (const std::size_t columns : {std::size_t{0}, Columns}) {
        const std::string table =
            Orvadr::FormatTable(report.columns, report.objects, Orvadr::Screen{columns, false});
        Expect(IsPlain(table) && !table.empty(), "a table is plain");
    }
    for (const std::string& remark : report.remarks) Expect(IsPlain(remark), "a remark is plain");
    Json::Value read;
    const std::string text = OrvaDRCore::toString(Orvadr::ToUtf8(report.objects));
    // An infinity from "info" is written as a number that nobody can read.
    Expect(OrvaDRCore::fromString(read, text) || text.find("1e+9999") != std::string::npos,
           "the report is JSON");
}

std::string FileWith(const std::string& content)
{
    static const TempDir dir;
    std::string path = dir.File("any");
    std::ofstream(path, std::ios::binary) << content;
    return path;
}

}  // namespace

void Fuzz(const std::string& input)
{
    Pieces pieces(input);
    const std::string kind = pieces.Until('\n');
    const std::string content = pieces.Rest();
    if (kind == "cache") {
        CheckReport(Orvadr::ReportCaches({FileWith(content)}));
    } else if (kind == "db") {
        const Orvadr::DatabaseLook look =
            Orvadr::LookAtDatabase(FileWith(content), [](int percent) {
                Expect(percent >= 0 && percent < 100, "a check is never done before its end");
            });
        Expect(look.state != Orvadr::DatabaseState::Missing, "a file is found");
        Expect(look.problems.empty() == (look.state != Orvadr::DatabaseState::Damaged),
               "damage has a name");
    } else if (kind == "locks") {
        const auto lines = std::count(content.begin(), content.end(), '\n') + 1;
        const auto locks = static_cast<std::ptrdiff_t>(Orvadr::ParseLocks(content).size());
        Expect(locks <= lines, "a line has one lock");
        (void)Orvadr::FindMountDevice(content, content.size());
    } else {
        CheckText(content);
    }
}
