// The settings that every program of the registry takes from its command line.
#ifndef NODE_REGISTRY_SETTINGS_H
#define NODE_REGISTRY_SETTINGS_H

#include <string>

namespace NodeRegistry {

struct Settings {
    std::string database = "./node_registry.db";
    std::string statusDirectory;  // empty: the directory of the database
    int statusTimeout = 30;       // in seconds
};

// The help text for the options of ReadSetting().
extern const char* const SettingsHelp;

enum class Reading { Taken, Refused, Unknown };

// Reads the option argv[index] and its value, and moves `index` to the value. Refused: the value is
// missing or wrong. Unknown: not a setting, but perhaps an option of the program.
Reading ReadSetting(int argc, const char* const* argv, int& index, Settings& settings);

// Accepts only a decimal number from `least` to `most`. Otherwise false, and `ret_number` keeps its
// value.
bool ReadNumber(const std::string& text, int least, int most, int& ret_number);

}  // namespace NodeRegistry

#endif
