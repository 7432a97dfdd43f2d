// A record's fields as one text: name, `between`, literal; pairs separated by `separator`.
#ifndef ORVADRCORE_SRC_PAIRS_H
#define ORVADRCORE_SRC_PAIRS_H

#include <string>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

inline std::string JoinPairs(const SqliteValueList& record, const char* between,
                             const char* separator)
{
    std::string text;
    for (const auto& [field, value] : record.GetValues()) {
        if (!text.empty()) text += separator;
        text += field;
        text += between;
        text += value.ToFormatedValue();
    }
    return text;
}

}  // namespace OrvaDRCore

#endif
