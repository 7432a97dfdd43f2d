#include "support/by_hand.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <charconv>

#include "support/bench.h"

namespace Bench {

namespace {

constexpr mode_t NewFileMode = 0666;

void AppendLeaves(std::string& text, const std::string& path, const Json::Value& value)
{
    if (value.isObject()) {
        for (const std::string& name : value.getMemberNames()) {
            std::string below = path;
            below += '.';
            below += name;
            AppendLeaves(text, below, value[name]);
        }
    } else if (value.isArray()) {
        for (const Json::Value& element : value) AppendLeaves(text, path + ".", element);
    } else {
        text += path + "=" + value.asString() + "\n";
    }
}

}  // namespace

void AppendLiteral(std::string& text, int number)
{
    std::array<char, 12> digits{};
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr;
    text.append(digits.data(), end);
}

void AppendLiteral(std::string& text, std::string_view words)
{
    text += '\'';
    text += words;
    text += '\'';
}

void AppendLiteral(std::string& text, const Value& value)
{
    if (const auto* words = std::get_if<std::string>(&value)) {
        AppendLiteral(text, std::string_view(*words));
    } else if (const auto* number = std::get_if<int>(&value)) {
        AppendLiteral(text, *number);
    } else if (const auto* truth = std::get_if<bool>(&value)) {
        text += *truth ? '1' : '0';
    } else {
        text += std::to_string(std::get<unsigned int>(value));
    }
}

void CloseDatabase::operator()(sqlite3* handle) const
{
    sqlite3_close(handle);
}

void Finalize::operator()(sqlite3_stmt* statement) const
{
    sqlite3_finalize(statement);
}

Database OpenDatabase(const std::string& path, int busyTimeoutMSec)
{
    sqlite3* handle = nullptr;
    const int code = sqlite3_open(path.c_str(), &handle);
    Database database(handle);
    Require(code == SQLITE_OK, "cannot open a database");
    Require(sqlite3_busy_timeout(handle, busyTimeoutMSec) == SQLITE_OK, "no busy timeout");
    return database;
}

void ExecText(sqlite3* handle, const std::string& text)
{
    const int code = sqlite3_exec(handle, text.c_str(), nullptr, nullptr, nullptr);
    Require(code == SQLITE_OK, sqlite3_errmsg(handle));
}

Statement Prepare(sqlite3* handle, const std::string& text)
{
    sqlite3_stmt* made = nullptr;
    const int size = static_cast<int>(text.size()) + 1;
    const int code = sqlite3_prepare_v2(handle, text.c_str(), size, &made, nullptr);
    Require(code == SQLITE_OK, sqlite3_errmsg(handle));
    return Statement(made);
}

std::string ColumnText(sqlite3_stmt* statement, int column)
{
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
    return {text, static_cast<std::size_t>(sqlite3_column_bytes(statement, column))};
}

std::string ReadFile(const std::string& path)
{
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    Require(fd >= 0, "cannot open a file for reading");
    struct stat status {};
    std::string text;
    if (::fstat(fd, &status) == 0) text.resize(static_cast<std::size_t>(status.st_size));
    const ssize_t count = ::read(fd, text.data(), text.size());
    ::close(fd);
    Require(count >= 0 && static_cast<std::size_t>(count) == text.size(), "cannot read a file");
    return text;
}

void WriteFile(const std::string& path, std::string_view text)
{
    const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, NewFileMode);
    Require(fd >= 0, "cannot open a file for writing");
    const ssize_t count = ::write(fd, text.data(), text.size());
    ::close(fd);
    Require(count >= 0 && static_cast<std::size_t>(count) == text.size(), "cannot write a file");
}

Json::Value MakeDocument(std::size_t bytes)
{
    constexpr std::size_t BytesOfNode = 118;
    Json::Value document(Json::objectValue);
    Json::Value& nodes = document["nodes"] = Json::Value(Json::arrayValue);
    for (std::size_t made = 0; made < bytes; made += BytesOfNode) {
        const int id = static_cast<int>(nodes.size());
        Json::Value node(Json::objectValue);
        node["id"] = 100000 + id;
        node["name"] = "node-" + std::to_string(100000 + id);
        node["address"] = "192.168.10." + std::to_string(100 + id % 100);
        node["enabled"] = id % 2 == 0;
        node["port"] = 5000 + id % 1000;
        node["state"]["code"] = 400 + id % 100;
        node["state"]["text"] = "waits";
        nodes.append(std::move(node));
    }
    return document;
}

std::string ToLine(const Json::Value& document)
{
    Json::StreamWriterBuilder builder;
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    builder["indentation"] = "";
    return Json::writeString(builder, document);
}

Json::Value Parse(const std::string& text)
{
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    Json::Value document;
    Require(reader->parse(text.data(), text.data() + text.size(), &document, nullptr),
            "cannot parse a document");
    return document;
}

std::string Flatten(const Json::Value& document)
{
    std::string text;
    AppendLeaves(text, "", document);
    return text;
}

}  // namespace Bench
