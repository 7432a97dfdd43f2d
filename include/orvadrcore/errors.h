/// \file
/// The error codes of the DR feature and their names.
///
/// \code
///     if (!db.InsertRecord(command)) reply["error"]["code"] = db.GetErrCode();
///     ERR::ToString(404);  // "ERR_DATABASE_OPERATION"
/// \endcode
///
/// Codes are plain `int` values. 0 means success and has no name. The library itself sets only
/// BAD_PARAMETER, ERR_NULL_POINTER and ERR_DATABASE_OPERATION, all in SqliteDB; the others are for
/// the programs that use it. Any thread may call ToString().
#ifndef ORVADRCORE_ERRORS_H
#define ORVADRCORE_ERRORS_H

#include <string>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// The error codes.
class ORVADRCORE_API ERR {
  public:
    /// General codes from 400; connections, logins and nodes from 500. Other numbers are unused.
    enum Code : int {
        ERR_DR_MIN = 400,              ///< lower end of the range; not an error
        BAD_PARAMETER = 401,           ///< an argument is missing or malformed
        ERR_ALLOCATE_MEMORY = 402,     ///< out of memory
        ERR_NULL_POINTER = 403,        ///< an object that is needed does not exist
        ERR_DATABASE_OPERATION = 404,  ///< SQLite refused or failed
        ERR_FORK_FAILED = 405,         ///< fork() failed
        ERR_UNKNOWN = 406,             ///< none of the others

        ERR_CONNECTION_FAILED = 500,        ///< the remote node does not answer
        ERR_LOGIN_AUTH_INVALID = 501,       ///< wrong account or password
        ERR_LOGIN_AUTH_DISABLED = 502,      ///< the account is disabled
        ERR_LOGIN_AUTH_PRIVILEGE = 503,     ///< the account lacks the privilege to log in
        ERR_LOGIN_AUTH_REQUIRED_OTP = 504,  ///< a one-time password is required
        ERR_LOGIN_AUTH_INVALID_OTP = 505,   ///< the one-time password is wrong
        ERR_INIT_CREDENTIAL = 506,          ///< the credential could not be set up
        ERR_NODE_NOT_EXIST = 507,           ///< no such node
        ERR_NODE_EXIST = 508,               ///< the node exists already
        ERR_NODE_INVALID_REMOTE_SESSION_CREATE = 509,  ///< the remote session cannot be created
        ERR_NODE_CREATE = 510,                         ///< the node could not be created
        ERR_NODE_SESSION_CREATE = 511,                 ///< the node's session could not be created
        ERR_NODE_SESSION_REMOVE = 512,                 ///< the node's session could not be removed
        ERR_NODE_GET = 513,                            ///< the node could not be read
        ERR_NODE_SET = 514,                            ///< the node could not be changed
        ERR_NODE_LIST = 515,                           ///< the nodes could not be listed
        ERR_CRED_NOT_EXIST = 516,                      ///< no such credential
        ERR_INVALID_CONN = 517,                        ///< the connection cannot be used
        ERR_NOT_SAME_NODE = 518,                       ///< the remote node is not the expected one
        ERR_GET_NODE_INFO = 519,         ///< the node gave no information about itself
        ERR_INVALID_SENDER = 520,        ///< the sender is not accepted
        ERR_INVALID_SESSION = 521,       ///< the session is not accepted
        ERR_NOT_AVALIABLE_CONN = 522,    ///< no free connection; the misspelling stays
        ERR_LOGIN_AUTH = 523,            ///< the login failed for another reason
        ERR_CREDENTIAL_OPERATION = 524,  ///< the credential could not be read or changed
        ERR_NO_PERMISSION = 525,         ///< the caller may not do this
        ERR_NO_SUCH_API = 526,           ///< unknown API, method or version
        ERR_INVALID_USER = 527,          ///< unknown user
        ERR_SESSION_GET = 528,           ///< the session could not be read
        ERR_NODE_UNKNOWN = 599,          ///< another failure of a node

        ERR_DR_MAX = 673,  ///< upper end of the range; not an error
    };

    ERR() = delete;

    /// The enumerator's name; `<UNKNOWN ERR CODE>` for any other number, including 0.
    static std::string ToString(int code);
};

}  // namespace OrvaDRCore

#endif
