#include <orvadrcore/errors.h>

namespace OrvaDRCore {

namespace {

// A switch, not a map: it compiles into a constant table, so that nothing runs at load time.
constexpr const char* Name(int code)
{
    switch (code) {
        case ERR::ERR_DR_MIN: return "ERR_DR_MIN";
        case ERR::BAD_PARAMETER: return "BAD_PARAMETER";
        case ERR::ERR_ALLOCATE_MEMORY: return "ERR_ALLOCATE_MEMORY";
        case ERR::ERR_NULL_POINTER: return "ERR_NULL_POINTER";
        case ERR::ERR_DATABASE_OPERATION: return "ERR_DATABASE_OPERATION";
        case ERR::ERR_FORK_FAILED: return "ERR_FORK_FAILED";
        case ERR::ERR_UNKNOWN: return "ERR_UNKNOWN";
        case ERR::ERR_CONNECTION_FAILED: return "ERR_CONNECTION_FAILED";
        case ERR::ERR_LOGIN_AUTH_INVALID: return "ERR_LOGIN_AUTH_INVALID";
        case ERR::ERR_LOGIN_AUTH_DISABLED: return "ERR_LOGIN_AUTH_DISABLED";
        case ERR::ERR_LOGIN_AUTH_PRIVILEGE: return "ERR_LOGIN_AUTH_PRIVILEGE";
        case ERR::ERR_LOGIN_AUTH_REQUIRED_OTP: return "ERR_LOGIN_AUTH_REQUIRED_OTP";
        case ERR::ERR_LOGIN_AUTH_INVALID_OTP: return "ERR_LOGIN_AUTH_INVALID_OTP";
        case ERR::ERR_INIT_CREDENTIAL: return "ERR_INIT_CREDENTIAL";
        case ERR::ERR_NODE_NOT_EXIST: return "ERR_NODE_NOT_EXIST";
        case ERR::ERR_NODE_EXIST: return "ERR_NODE_EXIST";
        case ERR::ERR_NODE_INVALID_REMOTE_SESSION_CREATE:
            return "ERR_NODE_INVALID_REMOTE_SESSION_CREATE";
        case ERR::ERR_NODE_CREATE: return "ERR_NODE_CREATE";
        case ERR::ERR_NODE_SESSION_CREATE: return "ERR_NODE_SESSION_CREATE";
        case ERR::ERR_NODE_SESSION_REMOVE: return "ERR_NODE_SESSION_REMOVE";
        case ERR::ERR_NODE_GET: return "ERR_NODE_GET";
        case ERR::ERR_NODE_SET: return "ERR_NODE_SET";
        case ERR::ERR_NODE_LIST: return "ERR_NODE_LIST";
        case ERR::ERR_CRED_NOT_EXIST: return "ERR_CRED_NOT_EXIST";
        case ERR::ERR_INVALID_CONN: return "ERR_INVALID_CONN";
        case ERR::ERR_NOT_SAME_NODE: return "ERR_NOT_SAME_NODE";
        case ERR::ERR_GET_NODE_INFO: return "ERR_GET_NODE_INFO";
        case ERR::ERR_INVALID_SENDER: return "ERR_INVALID_SENDER";
        case ERR::ERR_INVALID_SESSION: return "ERR_INVALID_SESSION";
        case ERR::ERR_NOT_AVALIABLE_CONN: return "ERR_NOT_AVALIABLE_CONN";
        case ERR::ERR_LOGIN_AUTH: return "ERR_LOGIN_AUTH";
        case ERR::ERR_CREDENTIAL_OPERATION: return "ERR_CREDENTIAL_OPERATION";
        case ERR::ERR_NO_PERMISSION: return "ERR_NO_PERMISSION";
        case ERR::ERR_NO_SUCH_API: return "ERR_NO_SUCH_API";
        case ERR::ERR_INVALID_USER: return "ERR_INVALID_USER";
        case ERR::ERR_SESSION_GET: return "ERR_SESSION_GET";
        case ERR::ERR_NODE_UNKNOWN: return "ERR_NODE_UNKNOWN";
        case ERR::ERR_DR_MAX: return "ERR_DR_MAX";
        default: return "<UNKNOWN ERR CODE>";
    }
}

}  // namespace

std::string ERR::ToString(int code)
{
    return Name(code);
}

}  // namespace OrvaDRCore
