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
/// like, each question gets an answer, nothing throws unless memory runs out, and nothing is
/// logged. A response is a plain value, used by one thread at a time. References that it gives out
/// are good until it changes.
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

    /// A copy of the reply.
    /// \param other  where it comes from
    Response(const Response& other);
    Response& operator=(const Response&) = default;  ///< \return this response, now a copy, too

    /// As setResp(const std::string&), the answer dropped: ask isValid().
    /// \param text  the reply as JSON text
    Response(const std::string& text);

    /// As above.
    /// \param text  the reply as JSON text; null is a text that does not parse
    Response(const char* text);

    /// Takes a reply that is parsed already.
    /// \param reply  the reply, copied; any value
    Response(const Json::Value& reply);
    virtual ~Response();

    /// Parses a reply. The whole text must be one JSON document.
    /// \param text  the reply as JSON text
    /// \return false when it is no JSON document; the reply is null then, whatever it was before
    bool setResp(const std::string& text);

    /// As above.
    /// \param text  the reply as JSON text; null is a text that does not parse
    /// \return as above
    bool setResp(const char* text);

    /// Takes a reply that is parsed already.
    /// \param reply  the reply, copied; any value
    void setResp(const Json::Value& reply);

    /// Drops the reply's content: an object or array becomes empty, anything else null.
    void clear();

    // ----------------------------------------------------------------------------- the whole reply

    /// The whole reply.
    /// \return the reply as it is; null when there is none
    const Json::Value& getResp() const { return resp; }

    /// Whether this is a reply at all.
    /// \return true for an object with a member "success"
    bool isValid() const;

    /// Whether the call succeeded.
    /// \return true for a valid reply whose "success" is true, as a boolean: a number that is not 0
    ///         is true, a text never
    bool isSuccess() const;

    // -------------------------------------------------------------------------------------- errors

    /// The "code" of "error", of a valid reply.
    /// \return the code; -1 when it is absent or no integer of 32 bits
    int getErrCode() const;

    /// The "errors" of "error", of a valid reply.
    /// \return a copy; null when it is absent
    Json::Value getErrMsg() const;

    /// The "error" of any reply.
    /// \return a copy; null when it is absent
    Json::Value getErr() const;

    // ---------------------------------------------------------------------------------------- data

    /// Whether the reply is a success and has "data".
    /// \return true when it is and has
    bool hasData() const;

    /// The "data" of a successful reply.
    /// \return the value; null when there is none
    const Json::Value& getData() const;

    /// Whether "data" has a member.
    /// \param key  the member's name
    /// \return true when it is there
    bool hasDataField(const char* key) const;

    /// A member of "data".
    /// \param key  the member's name
    /// \return the member; null when it is absent
    const Json::Value& getDataField(const char* key) const;

    /// A member of "data" that is a text.
    /// \param key  the member's name
    /// \return the text; empty for any other member: numbers are not converted
    std::string getDataFieldtoStr(const char* key) const;

    // ----------------------------------------------------------------------- a task that is polled

    /// Whether the task has ended.
    /// \return the "finish" of "data" as a boolean, as in isSuccess()
    bool isPollFinish() const;

    /// Whether the task succeeded.
    /// \return the "success" of "data" as a boolean, as in isSuccess()
    bool isPollSuccess() const;

    /// The "task_id" of "data", as text.
    /// \return the id: numbers and booleans are converted; empty when it is absent, an array or an
    ///         object
    std::string getTaskId() const;

    // ---------------------------------------------------------------------------- any other member

    /// Whether the reply has a member, be it a success or not.
    /// \param key  the member's name
    /// \return true when it is there
    bool hasField(const char* key) const;

    /// A member of the reply, be it a success or not.
    /// \param key  the member's name
    /// \return the member; null when it is absent
    const Json::Value& getField(const char* key) const;

    /// Whether "data" has "additional".
    /// \return true when it is there
    bool hasAdditional() const;

    /// The "additional" of "data".
    /// \return the value; null when it is absent
    const Json::Value& getAdditional() const;

  private:
    ORVADRCORE_LOCAL const Json::Value* findData() const;
    ORVADRCORE_LOCAL const Json::Value* findDataField(const char* key) const;
    ORVADRCORE_LOCAL const Json::Value* findErrorField(const char* key) const;

    // Behind the references that are given out for what is absent; always null.
    Json::Value emptyValue;
    Json::Value resp;
};

}  // namespace OrvaDRCore

#endif
