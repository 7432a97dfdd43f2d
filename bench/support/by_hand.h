// Helpers for the work by hand: SQLite's C interface, and files by system calls. Every call's result
// is checked.
#ifndef ORVADRCORE_BENCH_SUPPORT_BY_HAND_H
#define ORVADRCORE_BENCH_SUPPORT_BY_HAND_H

#include <memory>
#include <string>
#include <string_view>
#include <variant>

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

struct sqlite3;
struct sqlite3_stmt;

namespace Bench {

// The minimum of a typed value in a statement or row.
using Value = std::variant<int, unsigned int, bool, std::string>;

// Appends a value as an SQL literal.
void AppendLiteral(std::string& text, int number);
void AppendLiteral(std::string& text, std::string_view words);
void AppendLiteral(std::string& text, const Value& value);

struct CloseDatabase {
    void operator()(sqlite3* handle) const;
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

struct Finalize {
    void operator()(sqlite3_stmt* statement) const;
};
using Statement = std::unique_ptr<sqlite3_stmt, Finalize>;

inline constexpr int BusyTimeoutMSec = 1000;  // the library's

Database OpenDatabase(const std::string& path, int busyTimeoutMSec = BusyTimeoutMSec);
void ExecText(sqlite3* handle, const std::string& text);
Statement Prepare(sqlite3* handle, const std::string& text);

// A column of the current row, as text.
std::string ColumnText(sqlite3_stmt* statement, int column);

// Reads a whole file; truncates and writes a file.
std::string ReadFile(const std::string& path);
void WriteFile(const std::string& path, std::string_view text);

// A document of about that size, with numbers, texts and booleans.
Json::Value MakeDocument(std::size_t bytes);

// The document on one line.
std::string ToLine(const Json::Value& document);
Json::Value Parse(const std::string& text);

// Every leaf of a document with its path but without its type, so that any JSON reader can be
// compared.
std::string Flatten(const Json::Value& document);

}  // namespace Bench

#endif
