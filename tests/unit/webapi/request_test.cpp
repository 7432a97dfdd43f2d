#include <gtest/gtest.h>
#include <json/value.h>
#include <orvadrcore/request.h>

#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/json_kinds.h"
#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::Request;

using namespace std::string_literals;

// What the getters return.
struct Fields {
    std::string api;
    std::string method;
    int version = -1;
    Json::Value params;
};

void ExpectFields(const Request& request, const Fields& expected)
{
    EXPECT_EQ(request.getAPI(), expected.api);
    EXPECT_EQ(request.getMethod(), expected.method);
    EXPECT_EQ(request.getVersion(), expected.version);
    EXPECT_TRUE(Same(request.getParams(), expected.params));
}

// A request with every field set.
Request FullRequest()
{
    Request request("DR.Node", 9, "get", ParseJson(R"({"name":"backup","limit":5})"));
    request.setTimeout(7);
    request.setUploadFile({"key.pem", "/tmp/key.pem"});
    request.setEncryptRequired(true);
    return request;
}

// Every type of value, and null for none.
std::vector<const JsonKind*> Choices()
{
    std::vector<const JsonKind*> choices{nullptr};
    for (const JsonKind& kind : JsonKinds()) choices.push_back(&kind);
    return choices;
}

// Whether addParam() can add to parameters of this type.
bool TakesParams(const JsonKind& kind)
{
    return kind.text == "null" || kind.text.front() == '{';
}

class RequestTest : public LoggedTest {
  protected:
    RequestTest() : LoggedTest("request.cpp") {}
};

// ----------------------------------------------------------------------------------- construction

TEST_F(RequestTest, ANewRequestHasTheDefaultsAndIsNotValid)
{
    const Request request;
    ExpectFields(request, Fields());
    EXPECT_EQ(request.getTimeout(), 300);
    EXPECT_EQ(request.getUploadFile().name, "");
    EXPECT_EQ(request.getUploadFile().path, "");
    EXPECT_FALSE(request.isEncryptRequired());
    EXPECT_FALSE(request.isValid());
    EXPECT_EQ(request.toStr(), "//-1");
}

TEST_F(RequestTest, TheConstructorStoresItsArguments)
{
    for (const JsonKind& kind : JsonKinds()) {
        const Request request("DR.Node", 2, "get", kind.value);
        ExpectFields(request, {"DR.Node", "get", 2, kind.value});
        EXPECT_EQ(request.getTimeout(), 300);
        EXPECT_EQ(request.getUploadFile().name, "");
        EXPECT_EQ(request.getUploadFile().path, "");
        EXPECT_FALSE(request.isEncryptRequired());
        EXPECT_TRUE(request.isValid());
    }
}

TEST_F(RequestTest, ReservedKeysAmongTheParametersAreReplacedInJson)
{
    const Json::Value params = ParseJson(R"({"api":"other","method":1,"version":7,"x":5})");
    const Request request("DR.Node", 2, "get", params);
    ExpectFields(request, {"DR.Node", "get", 2, params});
    EXPECT_TRUE(
        Same(request.toJson(), ParseJson(R"({"api":"DR.Node","method":"get","version":2,"x":5})")));
}

TEST_F(RequestTest, ARequestFromJsonHasDefaultsForMissingKeys)
{
    const Request request(ParseJson(R"({"method":"get","timeout":7,"encryptRequired":true})"));
    ExpectFields(request, {"", "get", -1, ParseJson(R"({"timeout":7,"encryptRequired":true})")});
    EXPECT_EQ(request.getTimeout(), 300);
    EXPECT_FALSE(request.isEncryptRequired());
}

// ------------------------------------------------------------------------------------- setRequest

TEST_F(RequestTest, SetRequestSplitsTheJsonForm)
{
    Request request;
    request.setRequest(ParseJson(R"({"api":"A","method":"m","version":1,"x":5})"));
    ExpectFields(request, {"A", "m", 1, ParseJson(R"({"x":5})")});
    EXPECT_TRUE(request.isValid());
}

TEST_F(RequestTest, AVersionThatIsAStringStaysAParameter)
{
    Request request;
    request.setRequest(ParseJson(R"({"api":"A","method":"m","version":"1"})"));
    ExpectFields(request, {"A", "m", -1, ParseJson(R"({"version":"1"})")});
}

TEST_F(RequestTest, AMissingKeyLeavesItsFieldUnchanged)
{
    Request request = FullRequest();
    request.setRequest(ParseJson(R"({"method":"set","version":2})"));
    ExpectFields(request, {"DR.Node", "set", 2, Json::Value(Json::objectValue)});
    request.setRequest(ParseJson(R"({"api":"DR.Plan"})"));
    ExpectFields(request, {"DR.Plan", "set", 2, Json::Value(Json::objectValue)});
}

// Each reserved key has each type, or is missing. The request had other values before.
TEST_F(RequestTest, ReservedKeysMayHoldAnyType)
{
    for (const JsonKind* api : Choices()) {
        for (const JsonKind* method : Choices()) {
            for (const JsonKind* version : Choices()) {
                Json::Value json = ParseJson(R"({"x":[5]})");
                Fields expected{"DR.Node", "get", 9, json};
                const auto put = [&](const char* key, const JsonKind* kind, bool taken) {
                    if (kind == nullptr) return false;
                    json[key] = kind->value;
                    if (!taken) expected.params[key] = kind->value;
                    return taken;
                };
                if (put("api", api, api != nullptr && IsText(*api))) expected.api = api->asString;
                if (put("method", method, method != nullptr && IsText(*method))) {
                    expected.method = method->asString;
                }
                if (put("version", version, version != nullptr && version->asInt)) {
                    expected.version = *version->asInt;
                }
                Json::Value form = expected.params;
                form["api"] = expected.api;
                form["method"] = expected.method;
                form["version"] = expected.version;

                SCOPED_TRACE(::testing::Message() << json.toStyledString());
                Request request = FullRequest();
                EXPECT_NO_THROW(request.setRequest(json));
                ExpectFields(request, expected);
                EXPECT_EQ(request.isValid(), !expected.api.empty() && !expected.method.empty() &&
                                                 expected.version > 0);
                EXPECT_EQ(request.toStr(), expected.api + "/" + expected.method + "/" +
                                               std::to_string(expected.version));
                EXPECT_TRUE(Same(request.toJson(), form));
            }
        }
    }
}

TEST_F(RequestTest, TheVersionIsReadFromEveryNumericType)
{
    const auto versionOf = [](const Json::Value& version) {
        Json::Value json;
        json["version"] = version;
        return Request(json).getVersion();
    };
    EXPECT_EQ(versionOf(Json::Value(5U)), 5);
    EXPECT_EQ(versionOf(Json::Value(Json::Int64{5})), 5);
    EXPECT_EQ(versionOf(Json::Value(3.0)), 3);  // jsoncpp counts it as an integer
    EXPECT_EQ(versionOf(Json::Value(3.5)), -1);
    EXPECT_EQ(versionOf(Json::Value(2147483648U)), -1);
    EXPECT_EQ(versionOf(Json::Value(std::numeric_limits<double>::infinity())), -1);
    EXPECT_EQ(versionOf(Json::Value(std::numeric_limits<double>::quiet_NaN())), -1);
}

TEST_F(RequestTest, KeysThatOnlyResembleReservedOnesAreParameters)
{
    const Json::Value json = ParseJson(R"({"API":"A","Method":"m","version ":1,"api\u0000":"A"})");
    Request request = FullRequest();
    request.setRequest(json);
    ExpectFields(request, {"DR.Node", "get", 9, json});
}

TEST_F(RequestTest, TimeoutUploadFileAndEncryptionAreNeverReadFromJson)
{
    Request request = FullRequest();
    request.setRequest(ParseJson(R"({"timeout":1,"uploadFile":{"name":"x","path":"y"},
                                     "encryptRequired":false})"));
    EXPECT_EQ(request.getTimeout(), 7);
    EXPECT_EQ(request.getUploadFile().name, "key.pem");
    EXPECT_EQ(request.getUploadFile().path, "/tmp/key.pem");
    EXPECT_TRUE(request.isEncryptRequired());
}

TEST_F(RequestTest, AValueOfAnyTypeIsKeptAsTheParameters)
{
    for (const JsonKind& kind : JsonKinds()) {
        SCOPED_TRACE(kind.text);
        Request request = FullRequest();
        EXPECT_NO_THROW(request.setRequest(kind.value));
        ExpectFields(request, {"DR.Node", "get", 9, kind.value});
        EXPECT_NO_THROW(ExpectFields(Request(kind.value), {"", "", -1, kind.value}));
    }
}

TEST_F(RequestTest, ItsOwnParametersCanBecomeTheRequest)
{
    Request request(ParseJson(R"({"inner":{"api":"A","method":"m","version":1,"x":5}})"));
    request.setRequest(request.getParams()["inner"]);
    ExpectFields(request, {"A", "m", 1, ParseJson(R"({"x":5})")});
    request.setRequest(request.getParams());
    ExpectFields(request, {"A", "m", 1, ParseJson(R"({"x":5})")});
}

// ---------------------------------------------------------------------------------------- setters

TEST_F(RequestTest, SettersStoreWhatTheyAreGiven)
{
    for (const int number :
         {0, -1, 1, 300, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()}) {
        Request request;
        request.setVersion(number);
        request.setTimeout(number);
        EXPECT_EQ(request.getVersion(), number);
        EXPECT_EQ(request.getTimeout(), number);
    }
    for (const std::string& text : {"DR.Node"s, ""s, "a/b c"s, "a\0b\xff"s}) {
        Request request = FullRequest();
        request.setAPI(text);
        request.setMethod(text + "m");
        request.setUploadFile({text + "n", text + "p"});
        EXPECT_EQ(request.getAPI(), text);
        EXPECT_EQ(request.getMethod(), text + "m");
        EXPECT_EQ(request.getUploadFile().name, text + "n");
        EXPECT_EQ(request.getUploadFile().path, text + "p");
    }
}

TEST_F(RequestTest, SettingEncryptionAlwaysAnswersTrue)
{
    Request request;
    EXPECT_TRUE(request.setEncryptRequired(true));
    EXPECT_TRUE(request.isEncryptRequired());
    EXPECT_TRUE(request.setEncryptRequired(false));
    EXPECT_FALSE(request.isEncryptRequired());
}

TEST_F(RequestTest, ItsOwnFieldsCanBeSetAgain)
{
    Request request = FullRequest();
    request.setAPI(request.getAPI());
    request.setMethod(request.getMethod());
    request.setUploadFile(request.getUploadFile());
    EXPECT_EQ(request.toStr(), "DR.Node/get/9");
    EXPECT_EQ(request.getUploadFile().path, "/tmp/key.pem");
    const Request& same = request;
    request = same;
    ExpectFields(request, {"DR.Node", "get", 9, FullRequest().getParams()});
}

TEST_F(RequestTest, ClearRestoresTheDefaultsButKeepsEncryption)
{
    for (const bool encrypted : {true, false}) {
        Request request = FullRequest();
        request.setEncryptRequired(encrypted);
        request.clear();
        ExpectFields(request, {"", "", -1, Json::Value(Json::objectValue)});
        EXPECT_EQ(request.getTimeout(), 300);
        EXPECT_EQ(request.getUploadFile().name, "");
        EXPECT_EQ(request.getUploadFile().path, "");
        EXPECT_EQ(request.isEncryptRequired(), encrypted);  // the contract keeps it
    }
}

TEST_F(RequestTest, ClearEmptiesObjectsAndArraysAndMakesEverythingElseNull)
{
    for (const JsonKind& kind : JsonKinds()) {
        Json::Value expected;
        if (kind.value.isArray()) expected = Json::Value(Json::arrayValue);
        if (kind.value.isObject()) expected = Json::Value(Json::objectValue);
        Request request("DR.Node", 1, "get", kind.value);
        EXPECT_NO_THROW(request.clear()) << kind.text;
        EXPECT_TRUE(Same(request.getParams(), expected)) << kind.text;
    }
}

TEST_F(RequestTest, CopiesAreIndependent)
{
    Request source = FullRequest();
    Request copy(source);
    Request assigned;
    assigned = source;
    source.clear();
    source.setEncryptRequired(false);
    for (const Request* request : {&copy, &assigned}) {
        ExpectFields(*request, {"DR.Node", "get", 9, FullRequest().getParams()});
        EXPECT_EQ(request->getTimeout(), 7);
        EXPECT_EQ(request->getUploadFile().name, "key.pem");
        EXPECT_TRUE(request->isEncryptRequired());
    }
    EXPECT_TRUE(copy.addParam("x", 1));
    EXPECT_FALSE(assigned.getParams().isMember("x"));
}

// --------------------------------------------------------------------------------------- addParam

TEST_F(RequestTest, EveryKeyButTheReservedOnesIsValid)
{
    for (const std::string& key : {"api"s, "method"s, "version"s}) {
        EXPECT_FALSE(Request::isValidKey(key)) << key;
        EXPECT_TRUE(Request::isValidKey(key + "s")) << key;
        EXPECT_TRUE(Request::isValidKey(" " + key)) << key;
        EXPECT_TRUE(Request::isValidKey(key + '\0')) << key;
        EXPECT_TRUE(Request::isValidKey(key.substr(1))) << key;
    }
    for (const std::string& key : {""s, "API"s, "Method"s, "VERSION"s, "params"s, "\0"s, "\xff"s}) {
        EXPECT_TRUE(Request::isValidKey(key)) << key;
    }
}

TEST_F(RequestTest, AParameterOfAnyTypeIsAddedOrReplaced)
{
    for (const JsonKind& kind : JsonKinds()) {
        Request request;
        EXPECT_TRUE(request.addParam("x", kind.value)) << kind.text;
        Json::Value expected;
        expected["x"] = kind.value;
        EXPECT_TRUE(Same(request.getParams(), expected)) << kind.text;
        EXPECT_TRUE(request.addParam("x", "later")) << kind.text;
        EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"x":"later"})"))) << kind.text;
    }
}

TEST_F(RequestTest, AParameterMayHaveAnyOtherName)
{
    Request request;
    EXPECT_TRUE(request.addParam("", 1));
    EXPECT_TRUE(request.addParam("api\0"s, 2));
    EXPECT_TRUE(request.addParam("Version", 3));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"":1,"api\u0000":2,"Version":3})")));
}

TEST_F(RequestTest, AReservedKeyIsRefusedAndNothingChanges)
{
    for (const char* key : {"api", "method", "version"}) {
        for (const JsonKind& kind : JsonKinds()) {
            Request request("DR.Node", 2, "get", kind.value);
            EXPECT_FALSE(request.addParam(key, "text")) << kind.text;
            EXPECT_FALSE(request.addParam(key, 1)) << kind.text;
            ExpectFields(request, {"DR.Node", "get", 2, kind.value});
        }
    }
}

TEST_F(RequestTest, AReservedKeyKeptFromJsonCannotBeReplaced)
{
    Request request(ParseJson(R"({"version":"1"})"));
    EXPECT_FALSE(request.addParam("version", 2));
    EXPECT_TRUE(request.addParam(ParseJson(R"({"version":2})")));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"version":"1"})")));
}

TEST_F(RequestTest, ParametersThatAreNeitherNullNorAnObjectRefuseNewOnes)
{
    for (const JsonKind& kind : JsonKinds()) {
        SCOPED_TRACE(kind.text);
        const bool takes = TakesParams(kind);
        Request request("DR.Node", 2, "get", kind.value);
        bool added = !takes;
        EXPECT_NO_THROW(added = request.addParam("x", 1));
        EXPECT_EQ(added, takes);
        added = !takes;
        EXPECT_NO_THROW(added = request.addParam(ParseJson(R"({"y":2})")));
        EXPECT_EQ(added, takes);

        Json::Value expected = kind.value;
        if (takes) {
            expected["x"] = 1;
            expected["y"] = 2;
        }
        EXPECT_TRUE(Same(request.getParams(), expected));
    }
}

TEST_F(RequestTest, AnObjectsMembersAreMergedExceptReservedKeys)
{
    Request request(ParseJson(R"({"a":1,"k":0})"));
    EXPECT_TRUE(request.addParam(ParseJson(R"({"api":"z","k":1})")));
    ExpectFields(request, {"", "", -1, ParseJson(R"({"a":1,"k":1})")});
    EXPECT_TRUE(request.addParam(ParseJson(
        R"({"":[],"a":{"b":null},"method":"m","version":1,"API":"A","version\u0000":2})")));
    ExpectFields(
        request,
        {"", "", -1, ParseJson(R"({"":[],"a":{"b":null},"API":"A","k":1,"version\u0000":2})")});
}

TEST_F(RequestTest, AnObjectWithOnlyReservedKeysAddsNothing)
{
    Request request;
    EXPECT_TRUE(request.addParam(ParseJson(R"({"api":"z","method":"m","version":1})")));
    ExpectFields(request, Fields());
}

TEST_F(RequestTest, ElementsOfAnArrayAreMergedUnderTheirIndex)
{
    Request request(ParseJson(R"({"0":"earlier","x":5})"));
    EXPECT_TRUE(request.addParam(ParseJson(R"(["a",[1],{"api":"z"}])")));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"0":"a","1":[1],"2":{"api":"z"},"x":5})")));
}

TEST_F(RequestTest, ValuesWithoutMembersAddNothing)
{
    for (const JsonKind& kind : JsonKinds()) {
        if (kind.value.isObject() || kind.value.isArray()) continue;
        Request request(ParseJson(R"({"x":5})"));
        bool added = false;
        EXPECT_NO_THROW(added = request.addParam(kind.value)) << kind.text;
        EXPECT_TRUE(added) << kind.text;
        EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"x":5})"))) << kind.text;
    }
}

// The added value is part of the parameters, which change during the call.
TEST_F(RequestTest, ItsOwnParametersCanBeAdded)
{
    Request request(ParseJson(R"({"a":1})"));
    EXPECT_TRUE(request.addParam("x", request.getParams()));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"a":1,"x":{"a":1}})")));
    EXPECT_TRUE(request.addParam("x", request.getParams()["x"]["a"]));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"a":1,"x":1})")));
    EXPECT_TRUE(request.addParam("a", request.getParams()["a"]));
    EXPECT_TRUE(request.addParam(request.getParams()));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"a":1,"x":1})")));
}

TEST_F(RequestTest, AMergedMemberMayReplaceItself)
{
    Request request(ParseJson(R"({"sub":{"a":1,"sub":{"sub":2},"z":3}})"));
    EXPECT_TRUE(request.addParam(request.getParams()["sub"]));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"a":1,"sub":{"sub":2},"z":3})")));
    EXPECT_TRUE(request.addParam(request.getParams()["sub"]));
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"a":1,"sub":2,"z":3})")));

    Request list(ParseJson(R"({"0":[["x"],1]})"));
    EXPECT_TRUE(list.addParam(list.getParams()["0"]));
    EXPECT_TRUE(Same(list.getParams(), ParseJson(R"({"0":["x"],"1":1})")));
}

TEST_F(RequestTest, ItsOwnPartsCanBeSetAgain)
{
    Request request(ParseJson(R"({"api":"An.Api.With.A.Long.Name","method":"get","version":2,)"
                              R"("a":{"api":"Another.Api.With.A.Long.Name","b":[1,2]}})"));
    request.setAPI(request.getAPI());
    request.setMethod(request.getAPI());
    request.setUploadFile({"a name that is long enough", "a path that is long enough"});
    request.setUploadFile(request.getUploadFile());
    request.setRequest(request.getParams());
    EXPECT_EQ(request.toStr(), "An.Api.With.A.Long.Name/An.Api.With.A.Long.Name/2");
    EXPECT_EQ(request.getUploadFile().path, "a path that is long enough");
    request.setRequest(request.getParams()["a"]);
    EXPECT_EQ(request.getAPI(), "Another.Api.With.A.Long.Name");
    EXPECT_TRUE(Same(request.getParams(), ParseJson(R"({"b":[1,2]})")));
    Request& same = request;
    request = same;
    EXPECT_EQ(request.getAPI(), "Another.Api.With.A.Long.Name");
}

// ------------------------------------------------------------------------- validity, JSON and text

TEST_F(RequestTest, ApiMethodAndAVersionAboveZeroMakeARequestValid)
{
    struct Row {
        const char* api;
        const char* method;
        int version;
        bool valid;
    };
    for (const Row& row : {
             Row{"A", "m", 1, true},
             Row{"A", "m", std::numeric_limits<int>::max(), true},
             Row{" ", " ", 1, true},
             Row{"A", "m", 0, false},
             Row{"A", "m", -1, false},
             Row{"A", "m", std::numeric_limits<int>::min(), false},
             Row{"", "m", 1, false},
             Row{"A", "", 1, false},
             Row{"", "", -1, false},
         }) {
        const Request request(row.api, row.version, row.method, Json::Value());
        EXPECT_EQ(request.isValid(), row.valid) << request.toStr();
    }
}

TEST_F(RequestTest, TheTextIsApiMethodAndVersion)
{
    const Json::Value params = ParseJson(R"({"x":5})");
    EXPECT_EQ(Request("X.Task", 2, "get", params).toStr(), "X.Task/get/2");
    EXPECT_EQ(Request("X.Task", -1, "get", params).toStr(), "X.Task/get/-1");
    EXPECT_EQ(Request("", 0, "", params).toStr(), "//0");
    EXPECT_EQ(Request("A/B", 2147483647, "a\0b"s, params).toStr(), "A/B/a\0b/2147483647"s);
    EXPECT_EQ(Request("A", -2147483647 - 1, "m", params).toStr(), "A/m/-2147483648");
}

TEST_F(RequestTest, TheJsonFormIsAnObjectWhateverTheParametersAre)
{
    for (const JsonKind& kind : JsonKinds()) {
        const Request request("DR.Node", 2, "get", kind.value);
        Json::Value expected(Json::objectValue);
        if (TakesParams(kind)) expected = kind.value;
        expected["api"] = "DR.Node";
        expected["method"] = "get";
        expected["version"] = 2;
        Json::Value json;
        EXPECT_NO_THROW(json = request.toJson()) << kind.text;
        EXPECT_TRUE(Same(json, expected)) << kind.text;
        EXPECT_TRUE(Same(request.getParams(), kind.value)) << kind.text;
    }
}

TEST_F(RequestTest, TheJsonFormHoldsOnlyParametersAndReservedKeys)
{
    EXPECT_TRUE(
        Same(FullRequest().toJson(), ParseJson(R"({"api":"DR.Node","method":"get","version":9,
                                   "name":"backup","limit":5})")));
    EXPECT_TRUE(Same(Request().toJson(), ParseJson(R"({"api":"","method":"","version":-1})")));
}

TEST_F(RequestTest, ARequestCanBeRebuiltFromItsJsonForm)
{
    for (const JsonKind& kind : JsonKinds()) {
        Json::Value params;
        params["x"] = kind.value;
        const Request request("DR.Node", 2, "get", params);
        ExpectFields(Request(request.toJson()), {"DR.Node", "get", 2, params});
    }
    const Request empty("DR.Node", 2, "get", Json::Value(Json::objectValue));
    ExpectFields(Request(empty.toJson()), {"DR.Node", "get", 2, Json::Value(Json::objectValue)});
    // Null parameters come back as an empty object, because their JSON form is the same.
    const Request null("DR.Node", 2, "get", Json::Value());
    ExpectFields(Request(null.toJson()), {"DR.Node", "get", 2, Json::Value(Json::objectValue)});
}

TEST_F(RequestTest, AnInvalidRequestCanBeRebuiltToo)
{
    ExpectFields(Request(Request().toJson()), {"", "", -1, Json::Value(Json::objectValue)});
}

}  // namespace
