/// \file
/// One call of a web API: API, method, version and parameters.
///
/// \code
///     Request request("DR.Node", 1, "get", Json::Value());
///     request.addParam("name", "backup");
///     request.toStr();    // "DR.Node/get/1"
///     request.toJson();   // {"api":"DR.Node","method":"get","name":"backup","version":1}
///
///     if (!Request::FromText(line, request) || !request.isValid()) { ... }
/// \endcode
///
/// A request holds and checks its parts; it sends nothing. Its JSON form is one flat object: the
/// reserved keys "api", "method" and "version", and next to them the parameters. Use a request from
/// one thread at a time. Nothing is logged. No JSON makes it throw; only running out of memory does.
#ifndef ORVADRCORE_REQUEST_H
#define ORVADRCORE_REQUEST_H

#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// A file to upload with a request.
struct ORVADRCORE_API UploadFileDescription {
    std::string name;  ///< What the server calls it.
    std::string path;  ///< Where it is on this machine. The library never opens it.
};

/// One call of a web API.
class ORVADRCORE_API Request {
  public:
    /// Not valid yet: empty names, version -1, timeout 300, null parameters, no encryption.
    Request() = default;

    /// Note that the version comes between the two names. `params` is copied unchanged, even if it
    /// contains reserved keys.
    Request(const std::string& api, int version, const std::string& method,
            const Json::Value& params);

    /// A default request, then setRequest().
    Request(const Json::Value& request);

    Request(const Request&) = default;             ///< Copies every part.
    Request& operator=(const Request&) = default;  ///< Copies every part.
    virtual ~Request();

    /// Reads a request from a text that is one JSON object and nothing else: no comments, nothing
    /// after the object but blanks, at most 1000 levels. If a key occurs twice, the later value counts.
    /// Nothing stays of what `request` was: it becomes Request(object), whatever the object lacks.
    /// \return false, with `request` unchanged, for any other text. True says nothing about the
    ///         members: ask isValid()
    static bool FromText(const std::string& text, Request& request);

    /// Reads the JSON form. "api" and "method" must be strings, "version" an integer; everything
    /// else becomes the parameters, including a reserved key of the wrong type. A part whose key is
    /// missing keeps its value. Timeout, upload file and encryption are never read from JSON. A
    /// value that is not an object is kept as the parameters.
    void setRequest(const Json::Value& request);

    /// Restores the defaults, except that isEncryptRequired() does not change and that an object or
    /// array of parameters becomes an empty one, not null.
    void clear();

    // ------------------------------------------------------------------------------------- setters
    // Any value is stored; isValid() judges it.

    void setVersion(int version);
    void setMethod(const std::string& method);
    void setAPI(const std::string& api);
    void setTimeout(int timeout);  ///< In whatever unit the transport uses.
    void setUploadFile(const UploadFileDescription& file);
    bool setEncryptRequired(bool required);  ///< \return true, always

    // ------------------------------------------------------------------------------------- getters

    const std::string& getAPI() const { return api_; }
    const std::string& getMethod() const { return method_; }
    int getVersion() const { return version_; }
    const Json::Value& getParams() const { return params_; }
    int getTimeout() const { return timeout_; }
    const UploadFileDescription& getUploadFile() const { return uploadFile_; }
    bool isEncryptRequired() const { return encryptRequired_; }

    // ---------------------------------------------------------------------------------- parameters

    /// False for the reserved keys "api", "method" and "version".
    static bool isValidKey(const std::string& key);

    /// Sets one parameter, or replaces it.
    /// \return false, nothing changed, if the key is reserved or 1 GiB or longer (a JSON object
    ///         cannot hold such a key), or if the parameters are neither null nor an object
    bool addParam(const std::string& key, const Json::Value& value);

    /// Sets each member of `object`, skipping reserved keys: that is not a failure. An array's
    /// elements get their index as key. Other values have no members.
    /// \return false, nothing changed, if the parameters are neither null nor an object
    bool addParam(const Json::Value& object);

    // ------------------------------------------------------------------------------- whole request

    /// Whether API and method are not empty and the version is above 0.
    bool isValid() const;

    /// The JSON form, of an invalid request, too. The three parts replace parameters with reserved
    /// keys. Parameters that are neither null nor an object are left out. An API or method of 2 GiB
    /// or more becomes null, because a JSON value cannot hold it.
    Json::Value toJson() const;

    /// "API/method/version", without parameters: safe to log.
    std::string toStr() const;

  private:
    ORVADRCORE_LOCAL void takeReservedKeys();
    ORVADRCORE_LOCAL bool takesParams() const;

    int version_ = -1;
    int timeout_ = 300;
    std::string api_;
    std::string method_;
    Json::Value params_;
    bool encryptRequired_ = false;
    UploadFileDescription uploadFile_;
};

}  // namespace OrvaDRCore

#endif
