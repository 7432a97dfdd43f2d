// Turns the filter of a list request into a condition.
//
//     {"enabled":true}                              enabled=1
//     {"not_enabled":true}                          enabled!=1
//     {"ids":["a","b"]}                             id IN ( 'a','b' )
//     {"not_ids":["a"]}                             id NOT IN ( 'a' )
//     {"and":[{"enabled":true},{"not_ids":["a"]}]}  (enabled=1) AND (id NOT IN ( 'a' ))
//     {"or":[...]}                                  likewise
#ifndef NODE_REGISTRY_FILTER_H
#define NODE_REGISTRY_FILTER_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// The most filters of one request, including those inside "and" and "or". SQLite refuses conditions
// that nest too deeply, after retries that take seconds; this many it accepts.
constexpr int MaxFilters = 32;

// False, with `ret_condition` unchanged, if the filter has any other form.
bool ToCondition(const Json::Value& filter, std::string& ret_condition);

}  // namespace NodeRegistry

#endif
