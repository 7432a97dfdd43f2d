#include <orvadrcore/errors.h>

#include <climits>
#include <iterator>
#include <set>

#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::ERR;

struct NamedCode {
    ERR::Code code;
    int number;
    const char* name;
};

constexpr NamedCode Codes[] = {
    {ERR::ERR_DR_MIN, 400, "ERR_DR_MIN"},
    {ERR::BAD_PARAMETER, 401, "BAD_PARAMETER"},  // the only error without the prefix ERR_
    {ERR::ERR_ALLOCATE_MEMORY, 402, "ERR_ALLOCATE_MEMORY"},
    {ERR::ERR_NULL_POINTER, 403, "ERR_NULL_POINTER"},
    {ERR::ERR_DATABASE_OPERATION, 404, "ERR_DATABASE_OPERATION"},
    {ERR::ERR_FORK_FAILED, 405, "ERR_FORK_FAILED"},
    {ERR::ERR_UNKNOWN, 406, "ERR_UNKNOWN"},
    {ERR::ERR_CONNECTION_FAILED, 500, "ERR_CONNECTION_FAILED"},
    {ERR::ERR_LOGIN_AUTH_INVALID, 501, "ERR_LOGIN_AUTH_INVALID"},
    {ERR::ERR_LOGIN_AUTH_DISABLED, 502, "ERR_LOGIN_AUTH_DISABLED"},
    {ERR::ERR_LOGIN_AUTH_PRIVILEGE, 503, "ERR_LOGIN_AUTH_PRIVILEGE"},
    {ERR::ERR_LOGIN_AUTH_REQUIRED_OTP, 504, "ERR_LOGIN_AUTH_REQUIRED_OTP"},
    {ERR::ERR_LOGIN_AUTH_INVALID_OTP, 505, "ERR_LOGIN_AUTH_INVALID_OTP"},
    {ERR::ERR_INIT_CREDENTIAL, 506, "ERR_INIT_CREDENTIAL"},
    {ERR::ERR_NODE_NOT_EXIST, 507, "ERR_NODE_NOT_EXIST"},
    {ERR::ERR_NODE_EXIST, 508, "ERR_NODE_EXIST"},
    {ERR::ERR_NODE_INVALID_REMOTE_SESSION_CREATE, 509, "ERR_NODE_INVALID_REMOTE_SESSION_CREATE"},
    {ERR::ERR_NODE_CREATE, 510, "ERR_NODE_CREATE"},
    {ERR::ERR_NODE_SESSION_CREATE, 511, "ERR_NODE_SESSION_CREATE"},
    {ERR::ERR_NODE_SESSION_REMOVE, 512, "ERR_NODE_SESSION_REMOVE"},
    {ERR::ERR_NODE_GET, 513, "ERR_NODE_GET"},
    {ERR::ERR_NODE_SET, 514, "ERR_NODE_SET"},
    {ERR::ERR_NODE_LIST, 515, "ERR_NODE_LIST"},
    {ERR::ERR_CRED_NOT_EXIST, 516, "ERR_CRED_NOT_EXIST"},
    {ERR::ERR_INVALID_CONN, 517, "ERR_INVALID_CONN"},
    {ERR::ERR_NOT_SAME_NODE, 518, "ERR_NOT_SAME_NODE"},
    {ERR::ERR_GET_NODE_INFO, 519, "ERR_GET_NODE_INFO"},
    {ERR::ERR_INVALID_SENDER, 520, "ERR_INVALID_SENDER"},
    {ERR::ERR_INVALID_SESSION, 521, "ERR_INVALID_SESSION"},
    {ERR::ERR_NOT_AVALIABLE_CONN, 522, "ERR_NOT_AVALIABLE_CONN"},  // the contract spells it so
    {ERR::ERR_LOGIN_AUTH, 523, "ERR_LOGIN_AUTH"},
    {ERR::ERR_CREDENTIAL_OPERATION, 524, "ERR_CREDENTIAL_OPERATION"},
    {ERR::ERR_NO_PERMISSION, 525, "ERR_NO_PERMISSION"},
    {ERR::ERR_NO_SUCH_API, 526, "ERR_NO_SUCH_API"},
    {ERR::ERR_INVALID_USER, 527, "ERR_INVALID_USER"},
    {ERR::ERR_SESSION_GET, 528, "ERR_SESSION_GET"},
    {ERR::ERR_NODE_UNKNOWN, 599, "ERR_NODE_UNKNOWN"},
    {ERR::ERR_DR_MAX, 673, "ERR_DR_MAX"},
};

// The fixture fails on any log line: ToString() must not log.
class ErrorsTest : public LoggedTest {
  protected:
    ErrorsTest() : LoggedTest("errors.cpp") {}
};

TEST_F(ErrorsTest, EveryCodeHasItsNumber)
{
    ASSERT_EQ(std::size(Codes), 38U);
    for (const NamedCode& row : Codes) EXPECT_EQ(row.code, row.number) << row.name;
}

TEST_F(ErrorsTest, EveryCodeHasTheNameOfItsEnumerator)
{
    for (const NamedCode& row : Codes) EXPECT_EQ(ERR::ToString(row.number), row.name);
}

TEST_F(ErrorsTest, EveryOtherNumberIsUnknown)
{
    std::set<int> unknown{0, -404, INT_MIN, INT_MAX};
    for (int number = 390; number <= 690; ++number) unknown.insert(number);
    for (const NamedCode& row : Codes) unknown.erase(row.number);
    ASSERT_EQ(unknown.size(), 4U + 301U - 38U);

    for (const int number : unknown) {
        EXPECT_EQ(ERR::ToString(number), "<UNKNOWN ERR CODE>") << number;
    }
}

}  // namespace
