// Request::FromText.
#include <json/value.h>
#include <orvadrcore/request.h>

#include <string>

#include "support/fixtures/json_kinds.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::Request;

class RequestTextTest : public LoggedTest {
  protected:
    RequestTextTest() : LoggedTest("request.cpp")
    {
        full.setTimeout(7);
        full.setUploadFile({"key.pem", "/tmp/key.pem"});
        full.setEncryptRequired(true);
    }

    // Every part of a request.
    static void ExpectSame(const Request& request, const Request& expected)
    {
        EXPECT_EQ(request.getAPI(), expected.getAPI());
        EXPECT_EQ(request.getMethod(), expected.getMethod());
        EXPECT_EQ(request.getVersion(), expected.getVersion());
        EXPECT_TRUE(Same(request.getParams(), expected.getParams()));
        EXPECT_EQ(request.getTimeout(), expected.getTimeout());
        EXPECT_EQ(request.getUploadFile().name, expected.getUploadFile().name);
        EXPECT_EQ(request.getUploadFile().path, expected.getUploadFile().path);
        EXPECT_EQ(request.isEncryptRequired(), expected.isEncryptRequired());
    }

    void ExpectRefused(const std::string& text)
    {
        SCOPED_TRACE(text.substr(0, 60));
        Request request(full);
        EXPECT_FALSE(Request::FromText(text, request));
        ExpectSame(request, full);
    }

    Request full{"DR.Node", 9, "get", ParseJson(R"({"name":"backup"})")};
};

TEST_F(RequestTextTest, AnObjectBecomesARequest)
{
    Request request;
    EXPECT_TRUE(Request::FromText(R"( {"api":"DR.Node","method":"list","version":2,"limit":20} )"
                                  "\n",
                                  request));
    EXPECT_TRUE(request.isValid());
    EXPECT_EQ(request.toStr(), "DR.Node/list/2");
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"limit":20})")));
}

TEST_F(RequestTextTest, ARequestSurvivesItsJsonForm)
{
    Request request(full);
    EXPECT_TRUE(Request::FromText(full.toJson().toStyledString(), request));
    ExpectSame(request, Request("DR.Node", 9, "get", full.getParams()));
}

TEST_F(RequestTextTest, NothingStaysOfAnEarlierRequest)
{
    for (const char* text : {"{}", R"({"api":"DR.Volume"})", R"({"version":"2","api":3})"}) {
        Request request(full);
        EXPECT_TRUE(Request::FromText(text, request));
        ExpectSame(request, Request(ParseJson(text)));
        EXPECT_FALSE(request.isValid());
    }
}

TEST_F(RequestTextTest, AllOtherTextsAreRefused)
{
    for (const std::string& text : NoJsonTexts()) ExpectRefused(text);
    for (const JsonKind& kind : JsonKinds()) {
        if (!kind.value.isObject()) ExpectRefused(kind.text);
    }
    ExpectRefused(R"([{"api":"DR.Node","method":"list","version":2}])");
    ExpectRefused("/* comment */ {}");
    ExpectRefused(Bytes("{}\0"));
    ExpectRefused(R"({"a":)" + std::string(100'000, '[') + std::string(100'000, ']') + "}");
}

TEST_F(RequestTextTest, OfARepeatedKeyTheLaterValueCounts)
{
    Request request;
    EXPECT_TRUE(Request::FromText(R"({"api":"a","api":"b","x":1,"x":2})", request));
    EXPECT_EQ(request.getAPI(), "b");
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"x":2})")));
}

}  // namespace
