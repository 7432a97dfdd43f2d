#include "sqlite/sqlite_row_reader.h"

#include <algorithm>
#include <numeric>

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

RowReader::RowReader(sqlite3_stmt* statement) : statement_(statement)
{
    const int columns = sqlite3_column_count(statement);
    for (int column = 0; column < columns; ++column) {
        // Null when SQLite has run out of memory.
        const char* name = sqlite3_column_name(statement, column);
        names_.emplace_back(name != nullptr ? name : "");
    }
}

SqliteValueList RowReader::Read(LeftOut leftOut) const
{
    SqliteValueList record;
    int column = 0;
    for (const std::string& name : names_) {
        const int type = sqlite3_column_type(statement_, column);
        const unsigned char* text =
            type == SQLITE_TEXT ? sqlite3_column_text(statement_, column) : nullptr;
        if (type == SQLITE_INTEGER) {
            SqliteInternals::Add(record, name, sqlite3_column_int(statement_, column));
        } else if (text != nullptr) {
            SqliteInternals::Add(record, name, reinterpret_cast<const char*>(text));
        } else {
            leftOut(name, type);
        }
        ++column;
    }
    return record;
}

std::size_t RowReader::Find(const std::string& name)
{
    if (!followers_.empty()) {
        const std::size_t guess = followers_[last_];
        if (guess < names_.size() && names_[guess] == name) return last_ = guess;
    }
    return Search(name);
}

std::size_t RowReader::Search(const std::string& name)
{
    const auto isLess = [this](std::size_t one, std::size_t other) {
        return names_[one] < names_[other];
    };
    if (followers_.size() != names_.size()) {
        sorted_.resize(names_.size());
        std::iota(sorted_.begin(), sorted_.end(), std::size_t{0});
        std::stable_sort(sorted_.begin(), sorted_.end(), isLess);
        followers_.assign(names_.size(), names_.size());
    }
    const auto after = std::upper_bound(
        sorted_.begin(), sorted_.end(), name,
        [this](const std::string& wanted, std::size_t column) { return wanted < names_[column]; });
    if (after == sorted_.begin() || names_[*(after - 1)] != name) return names_.size();
    followers_[last_] = *(after - 1);
    return last_ = *(after - 1);
}

}  // namespace OrvaDRCore
