// The filter of a list request, turned into a condition.
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

// How many filters one request may hold, those inside "and" and "or" counted. SQLite refuses
// conditions that nest too deep, and what it refuses is retried for seconds: this stays below.
constexpr int MaxFilters = 32;

// False, `ret_condition` untouched, for anything that is not as shown above.
bool ToCondition(const Json::Value& filter, std::string& ret_condition);

}  // namespace NodeRegistry

#endif
