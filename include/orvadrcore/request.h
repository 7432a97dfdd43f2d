/// \file
/// One call of a web API: which API, method and version, and the parameters.
///
/// \code
///     Request request("DR.Node", 1, "get", Json::Value());
///     request.addParam("name", "backup");
///     request.toStr();    // "DR.Node/get/1"
///     request.toJson();   // {"api":"DR.Node","method":"get","name":"backup","version":1}
/// \endcode
///
/// A request only holds and checks its parts; it sends nothing. In JSON the three reserved keys
/// "api", "method" and "version" stand beside the parameters. Requests are plain values, each used
/// by one thread at a time. Nothing is logged and nothing throws, whatever the JSON looks like,
/// unless memory runs out.
#ifndef ORVADRCORE_REQUEST_H
#define ORVADRCORE_REQUEST_H

#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// A file to send along with a request; only stored here.
struct ORVADRCORE_API UploadFileDescription {
    std::string name;  ///< The name that the other side sees.
    std::string path;  ///< Where the file lies on this side.
};

/// One call of a web API.
class ORVADRCORE_API Request {
  public:
    /// Not valid yet: no API, no method, version -1, time-out 300, no parameters.
    Request() = default;

    /// A request with API, version, method and parameters; the other parts have their defaults.
    /// \param apiName     the API
    /// \param apiVersion  its version, valid above 0; note the place between the two names
    /// \param methodName  the method
    /// \param parameters  the parameters, copied as they are: reserved keys are not taken out
    Request(const std::string& apiName, int apiVersion, const std::string& methodName,
            const Json::Value& parameters);

    /// A default request, then setRequest().
    /// \param request  as in setRequest()
    Request(const Json::Value& request);

    Request(const Request&) = default;             ///< A copy of all parts.
    Request& operator=(const Request&) = default;  ///< \return this request, now such a copy
    virtual ~Request();

    /// Takes a request in its JSON form: "api" and "method" where they are texts and "version"
    /// where it is an integer become the fields of those names; everything else becomes the
    /// parameters, a reserved key of the wrong type included. A field whose key is missing keeps
    /// its value; time-out, upload file and encryption are never taken from JSON.
    /// \param request  the JSON form; a value that is no object is kept as parameters as it is
    void setRequest(const Json::Value& request);

    /// Back to the defaults.
    /// \note isEncryptRequired() keeps its answer, on purpose. Parameters keep their JSON type:
    ///       an object becomes an empty one.
    void clear();

    // --------------------------------------------------------------------------- setting the parts

    /// Stores the version.
    /// \param apiVersion  any number; the request is valid with one above 0
    void setVersion(int apiVersion);

    /// Stores the method.
    /// \param methodName  any text; the request is valid with one that is not empty
    void setMethod(const std::string& methodName);

    /// Stores the API.
    /// \param apiName  any text; the request is valid with one that is not empty
    void setAPI(const std::string& apiName);

    /// Stores the transport's time-out.
    /// \param limit  any number, in the transport's unit
    void setTimeout(int limit);

    /// Stores the file to send along.
    /// \param file  names the file, which is neither opened nor looked up
    void setUploadFile(const UploadFileDescription& file);

    /// Stores whether the transport has to encrypt.
    /// \param required  true when it has to
    /// \return true
    bool setEncryptRequired(bool required);

    // ---------------------------------------------------------------------------- asking for parts

    /// The API.
    /// \return its name; empty by default
    const std::string& getAPI() const { return api; }

    /// The method.
    /// \return its name; empty by default
    const std::string& getMethod() const { return method; }

    /// The version.
    /// \return the number; -1 by default
    int getVersion() const { return version; }

    /// The parameters.
    /// \return what was set, an object in a useful request; null by default
    const Json::Value& getParams() const { return params; }

    /// The time-out, for the transport.
    /// \return the number, in the transport's unit; 300 by default
    int getTimeout() const { return timeout; }

    /// The file to send along.
    /// \return its names; both empty by default
    const UploadFileDescription& getUploadFile() const { return uploadFile; }

    /// Whether the transport has to encrypt.
    /// \return what was set; false by default
    bool isEncryptRequired() const { return encryptRequired; }

    // ---------------------------------------------------------------------------------- parameters

    /// Whether a key is free for parameters.
    /// \param key  the key
    /// \return false for "api", "method" and "version", true for all others
    static bool isValidKey(const std::string& key);

    /// Sets one parameter.
    /// \param key    its key; of two with the same key the later counts
    /// \param value  its value, copied
    /// \return false, nothing changed, for a reserved key, for one of 1 GiB or more, which JSON
    ///         values cannot hold, and when the parameters are neither null nor an object
    bool addParam(const std::string& key, const Json::Value& value);

    /// Sets a parameter for each member of `object`; reserved keys are passed over.
    /// \param object  an object; of an array the elements are taken under their index, any other
    ///                value has no members
    /// \return false, nothing changed, when the parameters are neither null nor an object; passing
    ///         over a reserved key is no failure
    bool addParam(const Json::Value& object);

    // ----------------------------------------------------------------------------------- the whole

    /// Whether API and method are given and the version is above 0.
    /// \return true when all three are so
    bool isValid() const;

    /// The JSON form: the parameters and the three reserved keys, in one object.
    /// \return the object, of a request that is not valid, too. Parameters that are neither null
    ///         nor an object are left out; one with a reserved key gives way. An API or a method
    ///         of 2 GiB or more, which no JSON value can hold, is null
    Json::Value toJson() const;

    /// The request for a reader of the log, without parameters.
    /// \return "API/method/version"
    std::string toStr() const;

  private:
    ORVADRCORE_LOCAL bool takesParams() const;

    int version = -1;
    int timeout = 300;
    std::string api;
    std::string method;
    Json::Value params;
    bool encryptRequired = false;
    UploadFileDescription uploadFile;
};

}  // namespace OrvaDRCore

#endif
