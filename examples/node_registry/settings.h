// What every program of the registry is told on its command line.
#ifndef NODE_REGISTRY_SETTINGS_H
#define NODE_REGISTRY_SETTINGS_H

#include <string>

namespace NodeRegistry {

struct Settings {
    std::string database = "./node_registry.db";
    std::string statusDirectory;  // that of the database when empty
    int statusTimeout = 30;       // in seconds
};

// The options that ReadSetting() knows, for a program's help.
extern const char* const SettingsHelp;

enum class Reading { Taken, Refused, Unknown };

// Reads the option argv[index] and its value; `index` is moved to the last word that was taken.
// Refused means a value that is missing or wrong, Unknown an option of the program's own.
Reading ReadSetting(int argc, const char* const* argv, int& index, Settings& settings);

// A decimal number from `least` to `most`, and nothing else. False, `ret_number` untouched,
// otherwise.
bool ReadNumber(const std::string& text, int least, int most, int& ret_number);

}  // namespace NodeRegistry

#endif
