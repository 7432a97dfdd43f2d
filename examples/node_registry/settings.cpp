#include "settings.h"

#include <charconv>
#include <limits>

namespace NodeRegistry {

namespace {

// Refuses an empty path, which SQLite would take for a temporary database.
bool ReadPath(const std::string& text, std::string& ret_path)
{
    if (text.empty()) return false;
    ret_path = text;
    return true;
}

}  // namespace

const char* const SettingsHelp =
    R"(  --db FILE   the file of the nodes, made when it is missing
              (default ./node_registry.db)
  --status-timeout SECONDS
              refresh the status when it is older (default 30); 0 refreshes it
              on every request
  --status-dir DIRECTORY
              where the status is kept (default: beside FILE); must be the same
              for all programs that use FILE
)";

Reading ReadSetting(int argc, const char* const* argv, int& index, Settings& settings)
{
    const std::string option = argv[index];
    if (option != "--db" && option != "--status-timeout" && option != "--status-dir") {
        return Reading::Unknown;
    }
    if (index + 1 == argc) return Reading::Refused;
    const std::string value = argv[++index];
    bool isTaken = false;
    if (option == "--db") {
        isTaken = ReadPath(value, settings.database);
    } else if (option == "--status-dir") {
        isTaken = ReadPath(value, settings.statusDirectory);
    } else {
        isTaken = ReadNumber(value, 0, std::numeric_limits<int>::max(), settings.statusTimeout);
    }
    return isTaken ? Reading::Taken : Reading::Refused;
}

bool ReadNumber(const std::string& text, int least, int most, int& ret_number)
{
    int number = 0;
    const char* end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc() || rest != end || number < least || number > most) return false;
    ret_number = number;
    return true;
}

}  // namespace NodeRegistry
