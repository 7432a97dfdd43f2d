// The API DR.Node for people: its methods, parameters, replies and error codes.
#ifndef NODE_REGISTRY_API_HELP_H
#define NODE_REGISTRY_API_HELP_H

namespace NodeRegistry {

// A part of a program's help.
extern const char* const ApiHelp;

}  // namespace NodeRegistry

#endif
