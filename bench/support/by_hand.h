// What the contestants by hand share: SQLite's C interface and files at the level of system calls,
// each call answered for.
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

// What a typed value of a statement or a row needs at least.
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

inline constexpr int BusyTimeoutMSec = 1000;  // as long as the library waits

Database OpenDatabase(const std::string& path, int busyTimeoutMSec = BusyTimeoutMSec);
void ExecText(sqlite3* handle, const std::string& text);
Statement Prepare(sqlite3* handle, const std::string& text);

// The text of a column of the current row.
std::string ColumnText(sqlite3_stmt* statement, int column);

// A file's whole content, and a file that is emptied and written.
std::string ReadFile(const std::string& path);
void WriteFile(const std::string& path, std::string_view text);

// A document of about that size: nodes with numbers, texts and booleans.
Json::Value MakeDocument(std::size_t bytes);

// The document on one line.
std::string ToLine(const Json::Value& document);
Json::Value Parse(const std::string& text);

// Every leaf of a document with its path, without the types: what any reader of JSON can give.
std::string Flatten(const Json::Value& document);

}  // namespace Bench

#endif
