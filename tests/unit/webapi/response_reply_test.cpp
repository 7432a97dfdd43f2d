// Response::Success, Failure and toLine: replies that a handler makes.
#include <json/value.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/response.h>

#include <string>

#include "support/fixtures/json_kinds.h"
#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::ERR;
using OrvaDRCore::Response;

class ResponseReplyTest : public LoggedTest {
  protected:
    ResponseReplyTest() : LoggedTest("response.cpp") {}
};

TEST_F(ResponseReplyTest, ASuccessGivesOutItsData)
{
    for (const JsonKind& kind : JsonKinds()) {
        const Response response(Response::Success(kind.value));
        EXPECT_TRUE(response.isSuccess()) << kind.text;
        EXPECT_EQ(response.hasData(), kind.text != "null") << kind.text;
        EXPECT_TRUE(Same(response.getData(), kind.value)) << kind.text;
        EXPECT_EQ(response.getErrCode(), -1) << kind.text;
        EXPECT_FALSE(response.hasField("error")) << kind.text;
    }
}

TEST_F(ResponseReplyTest, AFailureGivesOutItsCodeAndErrors)
{
    for (const JsonKind& kind : JsonKinds()) {
        const Response response(Response::Failure(ERR::ERR_NODE_NOT_EXIST, kind.value));
        EXPECT_TRUE(response.isValid()) << kind.text;
        EXPECT_FALSE(response.isSuccess()) << kind.text;
        EXPECT_EQ(response.getErrCode(), 507) << kind.text;
        EXPECT_TRUE(Same(response.getErrMsg(), kind.value)) << kind.text;
        EXPECT_FALSE(response.hasField("data")) << kind.text;
    }
    EXPECT_EQ(Response(Response::Failure(-5)).getErrCode(), -5);
}

TEST_F(ResponseReplyTest, NullDataAndErrorsAreLeftOut)
{
    EXPECT_EQ(Response(Response::Success()).toLine(), R"({"success":true})");
    EXPECT_EQ(Response(Response::Failure(507)).toLine(),
              R"({"error":{"code":507},"success":false})");
}

TEST_F(ResponseReplyTest, ALiteralIsAText)
{
    EXPECT_EQ(Response(Response::Success("done")).toLine(), R"({"data":"done","success":true})");
    EXPECT_EQ(Response(Response::Failure(401, "no name")).toLine(),
              R"({"error":{"code":401,"errors":"no name"},"success":false})");
}

TEST_F(ResponseReplyTest, AReplyOfEveryKindSurvivesItsLine)
{
    for (const JsonKind& kind : JsonKinds()) {
        const std::string line = Response(kind.value).toLine();
        EXPECT_EQ(line.find('\n'), std::string::npos) << kind.text;
        EXPECT_TRUE(Same(Response(line).getResp(), kind.value)) << kind.text;
    }
    EXPECT_EQ(Response().toLine(), "null");
    EXPECT_EQ(Response("no JSON").toLine(), "null");
}

TEST_F(ResponseReplyTest, ALineHasNoLineEndsAndNoEscapedBytes)
{
    EXPECT_EQ(Response(Response::Success("a\r\nb\xc3\xa4\xff")).toLine(),
              "{\"data\":\"a\\r\\nb\xc3\xa4\xff\",\"success\":true}");
}

TEST_F(ResponseReplyTest, ADeepReplyIsWrittenButNotReadBack)
{
    const Response deep(Response::Success(Nested(1000)));
    EXPECT_FALSE(Response(deep.toLine()).isValid());
    EXPECT_TRUE(Response(Response(Response::Success(Nested(999))).toLine()).isValid());
}

}  // namespace
