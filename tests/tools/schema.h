// Checks JSON against the part of JSON Schema that docs/orvadr.schema.json uses.
#ifndef ORVADRCORE_TESTS_SCHEMA_H
#define ORVADRCORE_TESTS_SCHEMA_H

#include <string>

#include <json/value.h>

// What is wrong with a value, with its place; empty if nothing is.
std::string FindMismatch(const Json::Value& value, const Json::Value& rule,
                         const Json::Value& schema, const std::string& place = "");

// The schema of the program's output.
const Json::Value& OrvadrSchema();

#endif
