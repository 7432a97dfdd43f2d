/// \file
/// The reply to one web-API call: made by the handler, read by the caller.
///
/// \code
///     return Response(Response::Success(data)).toLine();   // {"data":{"id":"n1"},"success":true}
///
///     const Response response(text);
///     if (!response.isSuccess()) return response.getErrCode();
///     const std::string id = response.getDataFieldtoStr("id");
/// \endcode
///
/// Only these keys have a meaning:
/// \code
///     {"success": true,  "data": {"task_id": "t1", "finish": true, "success": true, ...}}
///     {"success": false, "error": {"code": 507, "errors": ...}}
/// \endcode
///
/// Replies come from other machines, so any text or JSON is accepted and every question has an
/// answer. A member of the wrong type counts as missing. Nothing is logged, and nothing throws
/// unless memory runs out. Use a response from one thread at a time; references to its parts are
/// good until it changes.
#ifndef ORVADRCORE_RESPONSE_H
#define ORVADRCORE_RESPONSE_H

#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// The reply to one web-API call.
///
/// A null `key` counts as missing. A failed reply never returns its data, but a successful one does
/// return its error.
class ORVADRCORE_API Response {
  public:
    /// A null reply: not valid.
    Response() = default;

    Response(const Response& other);                 ///< Copies the reply.
    Response& operator=(const Response&) = default;  ///< Copies the reply.

    /// As setResp(). Text that does not parse gives a null reply: ask isValid().
    Response(const std::string& text);
    Response(const char* text);          ///< Null is text that does not parse.
    Response(const Json::Value& reply);  ///< Any value.
    virtual ~Response();

    /// Parses a reply: the whole text must be one JSON document.
    /// \return false if it is not. The reply is null then, and the old one is lost
    bool setResp(const std::string& text);
    bool setResp(const char* text);          ///< Null is text that does not parse.
    void setResp(const Json::Value& reply);  ///< Any value.

    /// Empties the reply: an object or array keeps its type, anything else becomes null.
    void clear();

    // --------------------------------------------------------------------------------- new replies

    /// The reply of a handler that has done its work: {"success":true,"data":data}. Null data is left
    /// out: hasData() is false then.
    static Json::Value Success(const Json::Value& data = Json::Value());

    /// The reply of a handler that has failed: {"success":false,"error":{"code":code,"errors":errors}}.
    /// Null errors are left out.
    /// \param code  one of `errors.h`, such as SqliteDB::GetErrCode()
    /// \param errors  what else is known, of any type, such as SqliteDB::GetErr()
    static Json::Value Failure(int code, const Json::Value& errors = Json::Value());

    // --------------------------------------------------------------------------------- whole reply

    /// The reply as JSON on one line, without a newline at its end; "null" for a null reply. Line ends
    /// in its strings are escaped, other bytes are written as they are.
    /// \warning Also writes what setResp() refuses: infinities, and more than 1000 levels.
    std::string toLine() const;

    const Json::Value& getResp() const { return resp_; }

    /// Whether the reply is an object with a member "success".
    bool isValid() const;

    /// Whether "success" is true. A number other than 0 is true; a string never is.
    bool isSuccess() const;

    // -------------------------------------------------------------------------------------- errors

    /// The "code" of "error"; -1 if there is none, if it is not a 32-bit integer, or if the reply is
    /// not valid.
    int getErrCode() const;

    /// A copy of the "errors" of "error"; null if there are none or the reply is not valid.
    Json::Value getErrMsg() const;

    /// A copy of "error", even of a reply that is not valid; null if there is none.
    Json::Value getErr() const;

    // ---------------------------------------------------------------------------------------- data

    /// Whether the reply is a success and has "data".
    bool hasData() const;

    /// "data"; null unless hasData().
    const Json::Value& getData() const;

    /// Whether hasData(), and "data" has a member `key`.
    bool hasDataField(const char* key) const;

    /// The member of "data"; null unless hasDataField().
    const Json::Value& getDataField(const char* key) const;

    /// The member of "data" if it is a string, otherwise an empty one: numbers are not converted.
    std::string getDataFieldtoStr(const char* key) const;

    // ----------------------------------------------------------------------- a task that is polled

    bool isPollFinish() const;   ///< Whether "finish" of "data" is true, as in isSuccess().
    bool isPollSuccess() const;  ///< Whether "success" of "data" is true, as in isSuccess().

    /// "task_id" of "data". Numbers and booleans are converted; empty if it is missing, an array or
    /// an object.
    std::string getTaskId() const;

    // ------------------------------------------------------------------------------- other members

    /// Whether the reply, successful or not, has a member `key`.
    bool hasField(const char* key) const;

    /// The member; null unless hasField().
    const Json::Value& getField(const char* key) const;

    bool hasAdditional() const;                ///< hasDataField("additional")
    const Json::Value& getAdditional() const;  ///< getDataField("additional")

  private:
    ORVADRCORE_LOCAL const Json::Value* findData() const;
    ORVADRCORE_LOCAL const Json::Value* findDataField(const char* key) const;
    ORVADRCORE_LOCAL const Json::Value* findErrorField(const char* key) const;

    Json::Value emptyValue_;  // always null; what references to missing members refer to
    Json::Value resp_;
};

}  // namespace OrvaDRCore

#endif
