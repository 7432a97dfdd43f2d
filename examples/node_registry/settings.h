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

}  // namespace NodeRegistry

#endif
