// The error code and the error record that an operation leaves on its connection.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_ERROR_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_ERROR_H

#include <string>

#include <json/value.h>

namespace OrvaDRCore {

class SqliteError {
  public:
    int GetCode() const { return code_; }
    const Json::Value& GetRecord() const { return record_; }

    // SQLite's code of the last failed statement, extended if that is known; 0 if there is none.
    int GetSqliteCode() const { return sqliteCode_; }
    void SetSqliteCode(int code) { sqliteCode_ = code; }

    // Sets the code, 0 for a success, and removes the record and SQLite's code.
    void Set(int code);

    // Sets 404 and an error object for one failed statement. An empty statement and the code 0 are
    // left out of the object. A text that is too long for a JSON value is left out (the statement)
    // or null (the message).
    void SetFailure(const std::string& command, int sqliteCode, const char* message);

    // Sets 404 and an array of what AsEntry() gave for each failed attempt. SQLite's code stays.
    void SetFailures(Json::Value&& entries);

    // What is set now, as an entry of such an array.
    Json::Value AsEntry() const;

  private:
    int code_ = 0;
    int sqliteCode_ = 0;
    Json::Value record_;
};

}  // namespace OrvaDRCore

#endif
