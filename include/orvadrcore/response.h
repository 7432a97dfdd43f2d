/// \file
/// The reply of one web-API call, and the questions that callers ask of it.
///
/// \code
///     const Response response(text);
///     if (!response.isSuccess()) return response.getErrCode();
///     const std::string id = response.getDataFieldtoStr("id");
/// \endcode
///
/// A reply looks like this, and no other keys are read:
/// \code
///     {"success": true,  "data": {"task_id": "t1", "finish": true, "success": true, ...}}
///     {"success": false, "error": {"code": 507, "errors": ...}}
/// \endcode
///
/// Replies come from remote nodes and may be broken in every way: whatever the text or JSON looks
/// like, each question gets an answer, nothing throws and nothing is logged. A response is a plain
/// value, used by one thread at a time. References that it gives out are good until it changes.
#ifndef ORVADRCORE_RESPONSE_H
#define ORVADRCORE_RESPONSE_H

#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// The reply of one web-API call.
///
/// A key is a C string; null counts as a key that is absent. A value of the wrong kind counts as
/// absent, too. No data of a failed reply is ever given out; errors are, also of a successful one.
class ORVADRCORE_API Response {
  public:
    /// A null reply: not valid.
    Response() = default;

    Response(const Response& other);  ///< Copies the reply.
    Response& operator=(const Response&) = default;
    Response(const std::string& text);   ///< As setResp(), the answer dropped.
    Response(const char* text);          ///< As above; null is a text that does not parse.
    Response(const Json::Value& reply);  ///< Copies the reply.
    virtual ~Response();

    /// Parses a reply. The whole text must be one JSON document.
    /// \return false when it is not; the reply is null then, whatever it was before
    bool setResp(const std::string& text);
    bool setResp(const char* text);          ///< As above; null is a text that does not parse.
    void setResp(const Json::Value& reply);  ///< Copies the reply.

    /// Drops the reply's content: an object or array becomes empty, anything else null.
    void clear();

    const Json::Value& getResp() const { return resp; }  ///< The whole reply.

    bool isValid() const;    ///< Whether the reply is an object with a member "success".
    bool isSuccess() const;  ///< Whether the reply is valid and "success" is true, as a boolean.

    /// The "code" of "error", of a valid reply; -1 when it is absent or no integer.
    int getErrCode() const;

    /// A copy of "errors" of "error", of a valid reply; null when it is absent.
    Json::Value getErrMsg() const;

    /// A copy of "error", of any reply; null when it is absent.
    Json::Value getErr() const;

    bool hasData() const;                ///< Whether the reply is a success and has "data".
    const Json::Value& getData() const;  ///< "data" of a successful reply, otherwise null.

    bool hasDataField(const char* key) const;                ///< Whether "data" has a member.
    const Json::Value& getDataField(const char* key) const;  ///< A member of "data", or null.

    /// A member of "data" that is a text; empty for any other: numbers are not converted.
    std::string getDataFieldtoStr(const char* key) const;

    bool isPollFinish() const;   ///< Whether the task has ended: "finish" of "data", as a boolean.
    bool isPollSuccess() const;  ///< Whether it succeeded: "success" of "data", as a boolean.

    /// "task_id" of "data", as text: numbers and booleans are converted; empty when it is absent,
    /// an array or an object.
    std::string getTaskId() const;

    bool hasField(const char* key) const;                ///< Whether any reply has a member.
    const Json::Value& getField(const char* key) const;  ///< A member of any reply, or null.

    bool hasAdditional() const;                ///< Whether "data" has "additional".
    const Json::Value& getAdditional() const;  ///< "additional" of "data", or null.

  private:
    const Json::Value* findData() const;
    const Json::Value* findDataField(const char* key) const;
    const Json::Value* findErrorField(const char* key) const;

    // Behind the references that are given out for what is absent; always null.
    Json::Value emptyValue;
    Json::Value resp;
};

}  // namespace OrvaDRCore

#endif
