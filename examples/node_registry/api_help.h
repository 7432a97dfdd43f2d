// The API DR.Node for people: its methods, parameters, replies and error codes.
#ifndef NODE_REGISTRY_API_HELP_H
#define NODE_REGISTRY_API_HELP_H

namespace NodeRegistry {

// Part of both programs' --help.
extern const char* const ApiHelp;

}  // namespace NodeRegistry

#endif
