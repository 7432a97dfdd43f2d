#include "command_line.h"

#include <charconv>
#include <limits>
#include <system_error>

namespace NodeRegistry {

namespace {

// An empty path would be refused too late, or taken by SQLite for a temporary database.
CLI::Validator NotEmpty()
{
    return {[](const std::string& text) { return text.empty() ? "must not be empty" : ""; }, ""};
}

}  // namespace

bool ReadNumber(const std::string& text, int least, int most, int& ret_number)
{
    int number = 0;
    const char* end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc() || rest != end || number < least || number > most) return false;
    ret_number = number;
    return true;
}

CLI::Validator Decimal(int least, int most)
{
    const auto toDecimal = [=](std::string& text) {
        int number = 0;
        if (!ReadNumber(text, least, most, number)) {
            return "must be a number from " + std::to_string(least) + " to " + std::to_string(most);
        }
        text = std::to_string(number);
        return std::string();
    };
    return {toDecimal, ""};
}

void AddSettings(CLI::App& app, Settings& ret_settings)
{
    app.add_option("--db", ret_settings.database,
                   "the file of the nodes, made when it is missing\n"
                   "(default ./node_registry.db)")
        ->type_name("FILE")
        ->check(NotEmpty());
    app.add_option("--status-timeout", ret_settings.statusTimeout,
                   "refresh the status when it is older (default 30); 0 refreshes it\n"
                   "on every request")
        ->type_name("SECONDS")
        ->transform(Decimal(0, std::numeric_limits<int>::max()));
    app.add_option("--status-dir", ret_settings.statusDirectory,
                   "where the status is kept (default: beside FILE); must be the same\n"
                   "for all programs that use FILE")
        ->type_name("DIRECTORY")
        ->check(NotEmpty());
}

void AddHelp(CLI::App& app, bool& ret_wantsHelp)
{
    app.set_help_flag();  // CLI11's own, which would hide that another option is wrong
    app.add_flag("--help", ret_wantsHelp, "this text");
}

bool Parse(CLI::App& app, int argc, const char* const* argv)
{
    for (CLI::Option* option : app.get_options()) option->take_last();
    try {
        app.parse(argc, argv);
        return true;
    } catch (const CLI::ParseError&) {
        return false;
    }
}

std::string OptionsText(const CLI::App& app)
{
    constexpr std::size_t NameWidth = 14;
    CLI::Formatter formatter;
    formatter.column_width(NameWidth);
    return formatter.make_groups(&app, CLI::AppFormatMode::Normal);
}

}  // namespace NodeRegistry
