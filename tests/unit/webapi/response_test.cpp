#include <gtest/gtest.h>
#include <json/value.h>
#include <orvadrcore/response.h>

#include <cstddef>
#include <limits>
#include <map>
#include <memory>
#include <ostream>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "support/fixtures/json_kinds.h"
#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::Response;

// Whether a key exists, and its value.
struct Field {
    bool has = false;
    Json::Value value;

    bool operator==(const Field& other) const { return has == other.has && value == other.value; }
};

// The answers to every question. The defaults are those of an empty reply.
struct Answers {
    bool isValid = false;
    bool isSuccess = false;
    int errCode = -1;
    Json::Value errMsg;
    Json::Value err;
    Field data;
    std::map<std::string, Field> dataFields;
    std::map<std::string, std::string> dataTexts;
    bool isPollFinish = false;
    bool isPollSuccess = false;
    std::string taskId;
    std::map<std::string, Field> fields;
    Field additional;

    Answers()
    {
        for (const char* key : {"finish", "success", "task_id", "additional", "code", ""}) {
            dataFields[key];
            dataTexts[key];
        }
        for (const char* key : {"success", "error", "data", "code", "finish", ""}) fields[key];
    }

    bool operator==(const Answers& other) const
    {
        const auto all = [](const Answers& a) {
            return std::tie(a.isValid, a.isSuccess, a.errCode, a.errMsg, a.err, a.data,
                            a.dataFields, a.dataTexts, a.isPollFinish, a.isPollSuccess, a.taskId,
                            a.fields, a.additional);
        };
        return all(*this) == all(other);
    }
};

std::ostream& operator<<(std::ostream& out, const Field& field)
{
    return out << field.has << ' ' << field.value.toStyledString();
}

std::ostream& operator<<(std::ostream& out, const Answers& answers)
{
    out << "\nisValid " << answers.isValid << "\nisSuccess " << answers.isSuccess << "\nerrCode "
        << answers.errCode << "\nerrMsg " << answers.errMsg.toStyledString() << "err "
        << answers.err.toStyledString() << "data " << answers.data;
    for (const auto& [key, field] : answers.dataFields) out << "data." << key << ' ' << field;
    for (const auto& [key, text] : answers.dataTexts) out << "text." << key << ' ' << text << '\n';
    out << "isPollFinish " << answers.isPollFinish << "\nisPollSuccess " << answers.isPollSuccess
        << "\ntaskId " << answers.taskId << '\n';
    for (const auto& [key, field] : answers.fields) out << key << ' ' << field;
    return out << "additional " << answers.additional;
}

Answers Ask(const Response& response)
{
    Answers answers;
    answers.isValid = response.isValid();
    answers.isSuccess = response.isSuccess();
    answers.errCode = response.getErrCode();
    answers.errMsg = response.getErrMsg();
    answers.err = response.getErr();
    answers.data = {response.hasData(), response.getData()};
    for (auto& [key, field] : answers.dataFields) {
        field = {response.hasDataField(key.c_str()), response.getDataField(key.c_str())};
        answers.dataTexts[key] = response.getDataFieldtoStr(key.c_str());
    }
    answers.isPollFinish = response.isPollFinish();
    answers.isPollSuccess = response.isPollSuccess();
    answers.taskId = response.getTaskId();
    for (auto& [key, field] : answers.fields) {
        field = {response.hasField(key.c_str()), response.getField(key.c_str())};
    }
    answers.additional = {response.hasAdditional(), response.getAdditional()};
    return answers;
}

// A reply, as the value at each of its places; null means that the place is empty. A value for
// `error` or `data` replaces the object with the places below it, a value for `whole` everything.
struct Places {
    using Choice = const JsonKind*;

    Choice whole = nullptr;
    Choice success = nullptr;
    Choice error = nullptr;
    Choice code = nullptr;
    Choice errors = nullptr;
    Choice data = nullptr;
    Choice finish = nullptr;
    Choice dataSuccess = nullptr;
    Choice taskId = nullptr;
    Choice additional = nullptr;

    bool HasError() const { return error != nullptr || code != nullptr || errors != nullptr; }
    bool HasData() const
    {
        return data != nullptr || finish != nullptr || dataSuccess != nullptr ||
               taskId != nullptr || additional != nullptr;
    }

    Json::Value Error() const
    {
        if (error != nullptr) return error->value;
        return Object({{"code", code}, {"errors", errors}});
    }

    Json::Value Data() const
    {
        if (data != nullptr) return data->value;
        return Object({{"finish", finish},
                       {"success", dataSuccess},
                       {"task_id", taskId},
                       {"additional", additional}});
    }

    Json::Value Reply() const
    {
        if (whole != nullptr) return whole->value;
        Json::Value reply = Object({{"success", success}});
        if (HasError()) reply["error"] = Error();
        if (HasData()) reply["data"] = Data();
        return reply;
    }

    static Field FieldOf(Choice choice)
    {
        return choice != nullptr ? Field{true, choice->value} : Field{};
    }

  private:
    static Json::Value Object(const std::vector<std::pair<const char*, Choice>>& members)
    {
        Json::Value object(Json::objectValue);
        for (const auto& [key, choice] : members) {
            if (choice != nullptr) object[key] = choice->value;
        }
        return object;
    }
};

constexpr const JsonKind* Places::*AllPlaces[] = {
    &Places::whole, &Places::success, &Places::error,       &Places::code,   &Places::errors,
    &Places::data,  &Places::finish,  &Places::dataSuccess, &Places::taskId, &Places::additional,
};

// The answers that the contract requires.
Answers Expected(const Places& places)
{
    Answers answers;
    if (places.whole != nullptr) return answers;

    answers.fields["success"] = Places::FieldOf(places.success);
    if (places.HasError()) answers.fields["error"] = {true, places.Error()};
    if (places.HasData()) answers.fields["data"] = {true, places.Data()};

    answers.isValid = places.success != nullptr;
    answers.isSuccess = answers.isValid && places.success->asBool;
    answers.err = answers.fields["error"].value;
    if (answers.isValid && places.error == nullptr) {
        if (places.code != nullptr) answers.errCode = places.code->asInt.value_or(-1);
        answers.errMsg = Places::FieldOf(places.errors).value;
    }

    if (!answers.isSuccess || !places.HasData()) return answers;
    answers.data = answers.fields["data"];
    if (places.data != nullptr) return answers;
    for (const auto& [key, choice] : {std::pair{"finish", places.finish},
                                      {"success", places.dataSuccess},
                                      {"task_id", places.taskId},
                                      {"additional", places.additional}}) {
        answers.dataFields[key] = Places::FieldOf(choice);
        if (choice != nullptr && IsText(*choice)) answers.dataTexts[key] = choice->asString;
    }
    answers.isPollFinish = places.finish != nullptr && places.finish->asBool;
    answers.isPollSuccess = places.dataSuccess != nullptr && places.dataSuccess->asBool;
    if (places.taskId != nullptr) answers.taskId = places.taskId->asString;
    answers.additional = answers.dataFields["additional"];
    return answers;
}

const JsonKind* Kind(const std::string& text)
{
    for (const JsonKind& kind : JsonKinds()) {
        if (kind.text == text) return &kind;
    }
    throw std::out_of_range(text);
}

// A reply with a value in every place.
Places FullReply(const char* success)
{
    Places places;
    places.success = Kind(success);
    places.code = Kind("-7");
    places.errors = Kind("[1]");
    places.finish = Kind("true");
    places.dataSuccess = Kind("1");
    places.taskId = Kind(R"("text")");
    places.additional = Kind(R"({"member":1})");
    return places;
}

// Every type of value, and null for none.
std::vector<const JsonKind*> Choices()
{
    std::vector<const JsonKind*> choices{nullptr};
    for (const JsonKind& kind : JsonKinds()) choices.push_back(&kind);
    return choices;
}

void ExpectAnswers(const Response& response, const Answers& expected)
{
    Answers answers;
    EXPECT_NO_THROW(answers = Ask(response)) << response.getResp().toStyledString();
    EXPECT_EQ(answers, expected) << response.getResp().toStyledString();
}

void ExpectNull(const Response& response)
{
    EXPECT_TRUE(response.getResp().isNull()) << response.getResp().toStyledString();
    ExpectAnswers(response, Answers());
}

class ResponseTest : public LoggedTest {
  protected:
    ResponseTest() : LoggedTest("response.cpp") {}
};

const char* const GoodReply =
    R"({"success":true,"data":{"task_id":"t1","finish":false,"list":[1,2]},"error":{"code":3}})";

// ------------------------------------------------------------------------- every kind, everywhere

TEST_F(ResponseTest, EveryQuestionIsAnsweredForAnyTypeInAnyPlace)
{
    for (const Places& base : {FullReply("true"), FullReply("false"), Places()}) {
        for (const auto place : AllPlaces) {
            for (const JsonKind* choice : Choices()) {
                Places places = base;
                places.*place = choice;
                ExpectAnswers(Response(places.Reply()), Expected(places));
            }
        }
    }
}

TEST_F(ResponseTest, AnyTwoPlacesMayHoldAnyTwoTypes)
{
    constexpr std::size_t Count = sizeof AllPlaces / sizeof *AllPlaces;
    for (std::size_t first = 1; first < Count; ++first) {  // from 1: `whole` has no second place
        for (std::size_t second = first + 1; second < Count; ++second) {
            for (const JsonKind* one : Choices()) {
                for (const JsonKind* other : Choices()) {
                    Places places = FullReply("true");
                    places.*AllPlaces[first] = one;
                    places.*AllPlaces[second] = other;
                    ExpectAnswers(Response(places.Reply()), Expected(places));
                }
            }
        }
    }
}

TEST_F(ResponseTest, EveryWayToSetAReplyGivesTheSameAnswers)
{
    for (const auto place : AllPlaces) {
        for (const JsonKind* choice : Choices()) {
            Places places = FullReply("true");
            places.*place = choice;
            const Answers expected = Expected(places);
            const Json::Value reply = places.Reply();
            const std::string text = reply.toStyledString();

            ExpectAnswers(Response(text), expected);
            ExpectAnswers(Response(text.c_str()), expected);
            Response response{std::string(GoodReply)};
            EXPECT_TRUE(response.setResp(text));
            ExpectAnswers(response, expected);
            response = Response(GoodReply);
            EXPECT_TRUE(response.setResp(text.c_str()));
            ExpectAnswers(response, expected);
            response = Response(GoodReply);
            response.setResp(reply);
            ExpectAnswers(response, expected);
            EXPECT_TRUE(Same(response.getResp(), reply));
        }
    }
}

// ------------------------------------------------------------------- success, error and its places

TEST_F(ResponseTest, ANewResponseIsNull)
{
    ExpectNull(Response());
}

TEST_F(ResponseTest, AFailedReplyHasACodeAndNoData)
{
    const Response response(R"({"success":false,"error":{"code":105,"errors":["a",{"b":1}]}})");
    EXPECT_TRUE(response.isValid());
    EXPECT_FALSE(response.isSuccess());
    EXPECT_EQ(response.getErrCode(), 105);
    EXPECT_TRUE(Same(response.getErrMsg(), ParseJson(R"(["a",{"b":1}])")));
    EXPECT_TRUE(Same(response.getErr(), ParseJson(R"({"code":105,"errors":["a",{"b":1}]})")));
    EXPECT_FALSE(response.hasData());
}

TEST_F(ResponseTest, ArraysAndObjectsWithoutSuccessAreNotValid)
{
    for (const char* text : {R"([{"success":true,"error":{"code":1}}])", R"(["success"])",
                             R"({"error":{"code":1,"errors":[]},"data":{"task_id":"t1"}})",
                             R"({"Success":true,"error":{"code":1}})",
                             R"({"success\u0000":true,"error":{"code":1}})"}) {
        const Response response(text);
        EXPECT_FALSE(response.isValid()) << text;
        EXPECT_FALSE(response.isSuccess()) << text;
        EXPECT_EQ(response.getErrCode(), -1) << text;
        EXPECT_TRUE(response.getErrMsg().isNull()) << text;
        EXPECT_FALSE(response.hasData()) << text;
    }
}

TEST_F(ResponseTest, AnInvalidReplyStillGivesItsError)
{
    const Response response(R"({"error":{"code":1,"errors":"e"}})");
    EXPECT_TRUE(Same(response.getErr(), ParseJson(R"({"code":1,"errors":"e"})")));
}

TEST_F(ResponseTest, ErrorsOfASuccessfulReplyAreReadToo)
{
    const Response response(R"({"success":true,"error":{"code":105,"errors":"e"}})");
    EXPECT_TRUE(response.isSuccess());
    EXPECT_EQ(response.getErrCode(), 105);
    EXPECT_TRUE(Same(response.getErrMsg(), Json::Value("e")));
}

TEST_F(ResponseTest, OnlyA32BitIntegerIsACode)
{
    struct Row {
        const char* code;
        int answer;
    };
    for (const Row& row : {
             Row{"0", 0},
             Row{"105", 105},
             Row{"-1", -1},
             Row{"-105", -105},
             Row{"2147483647", 2147483647},
             Row{"-2147483648", -2147483647 - 1},
             Row{"2147483648", -1},
             Row{"-2147483649", -1},
             Row{"18446744073709551615", -1},
             Row{"3.0", 3},  // jsoncpp counts it as an integer
             Row{"1e2", 100},
             Row{"3.5", -1},
             Row{"1e300", -1},
             Row{R"("105")", -1},
             Row{"true", -1},
             Row{"null", -1},
             Row{"[105]", -1},
             Row{R"({"code":105})", -1},
         }) {
        const std::string error = R"({"code":)" + std::string(row.code) + "}";
        const Response response(R"({"success":false,"error":)" + error + "}");
        EXPECT_EQ(response.getErrCode(), row.answer) << row.code;
    }
}

TEST_F(ResponseTest, TheCodeIsReadFromEveryNumericType)
{
    const auto codeOf = [](const Json::Value& code) {
        Json::Value reply;
        reply["success"] = false;
        reply["error"]["code"] = code;
        return Response(reply).getErrCode();
    };
    EXPECT_EQ(codeOf(Json::Value(5U)), 5);
    EXPECT_EQ(codeOf(Json::Value(Json::Int64{-5})), -5);
    EXPECT_EQ(codeOf(Json::Value(2147483648U)), -1);
    EXPECT_EQ(codeOf(Json::Value(std::numeric_limits<double>::infinity())), -1);
    EXPECT_EQ(codeOf(Json::Value(std::numeric_limits<double>::quiet_NaN())), -1);
}

TEST_F(ResponseTest, ErrorsAreReturnedAsCopies)
{
    Response response(R"({"success":false,"error":{"errors":["a"]}})");
    Json::Value errors = response.getErrMsg();
    Json::Value error = response.getErr();
    errors.append("b");
    error["code"] = 1;
    EXPECT_TRUE(Same(response.getErrMsg(), ParseJson(R"(["a"])")));
    EXPECT_TRUE(Same(response.getErr(), ParseJson(R"({"errors":["a"]})")));
    response.setResp("null");
    EXPECT_TRUE(Same(errors, ParseJson(R"(["a","b"])")));
}

// -------------------------------------------------------------------------------- data and fields

TEST_F(ResponseTest, AFailedReplyGivesOutNoData)
{
    const Response response(
        R"({"success":false,"data":{"finish":true,"success":true,"task_id":"t1","additional":1}})");
    EXPECT_FALSE(response.hasData());
    EXPECT_TRUE(response.getData().isNull());
    EXPECT_FALSE(response.hasDataField("task_id"));
    EXPECT_EQ(response.getDataFieldtoStr("task_id"), "");
    EXPECT_EQ(response.getTaskId(), "");
    EXPECT_FALSE(response.isPollFinish());
    EXPECT_FALSE(response.isPollSuccess());
    EXPECT_FALSE(response.hasAdditional());
    EXPECT_TRUE(response.hasField("data"));  // asks the reply, not its data
}

TEST_F(ResponseTest, PollResultsComeFromTheData)
{
    EXPECT_FALSE(Response(R"({"success":true,"data":{}})").isPollSuccess());
    EXPECT_FALSE(Response(R"({"success":true,"data":{"success":false}})").isPollSuccess());
    EXPECT_TRUE(Response(R"({"success":true,"data":{"success":true}})").isPollSuccess());
    EXPECT_TRUE(Response(R"({"success":true,"data":{"finish":true}})").isPollFinish());
    EXPECT_FALSE(Response(R"({"success":true,"finish":true,"data":{}})").isPollFinish());
}

TEST_F(ResponseTest, ANumericTaskIdIsConvertedButANumericFieldIsNot)
{
    const Response response(R"({"success":true,"data":{"task_id":42}})");
    EXPECT_TRUE(response.hasDataField("task_id"));
    EXPECT_EQ(response.getTaskId(), "42");
    EXPECT_EQ(response.getDataFieldtoStr("task_id"), "");
}

TEST_F(ResponseTest, StringsAreReturnedByteForByte)
{
    const Response response("{\"success\":true,\"data\":{\"task_id\":\"a\\u0000b\xff\xe2\x82\"}}");
    const std::string expected("a\0b\xff\xe2\x82", 6);
    EXPECT_EQ(response.getTaskId(), expected);
    EXPECT_EQ(response.getDataFieldtoStr("task_id"), expected);
}

TEST_F(ResponseTest, ANullMemberExists)
{
    const Response response(R"({"success":true,"data":{"additional":null},"other":null})");
    EXPECT_TRUE(response.hasField("other"));
    EXPECT_TRUE(response.hasDataField("additional"));
    EXPECT_TRUE(response.hasAdditional());
    EXPECT_EQ(&response.getField("other"), &response.getResp()["other"]);
    EXPECT_EQ(&response.getAdditional(), &response.getResp()["data"]["additional"]);

    const Response withoutData(R"({"success":true,"data":null})");
    EXPECT_TRUE(withoutData.hasData());
    EXPECT_EQ(&withoutData.getData(), &withoutData.getResp()["data"]);
}

TEST_F(ResponseTest, EveryKeyCanBeAskedFor)
{
    const Response response(R"({"success":true,"":"e","data":{"":"x","\u00e4 b":"y","0":"z"}})");
    EXPECT_EQ(response.getField("").asString(), "e");
    EXPECT_EQ(response.getDataFieldtoStr(""), "x");
    EXPECT_EQ(response.getDataFieldtoStr("\xc3\xa4 b"), "y");
    EXPECT_EQ(response.getDataFieldtoStr("0"), "z");
    EXPECT_FALSE(response.hasDataField("1"));
}

TEST_F(ResponseTest, ANullKeyIsMissing)
{
    for (const char* data : {"{}", R"({"":1})", "null", "[1]", R"("text")"}) {
        const Response response(R"({"success":true,"":1,"data":)" + std::string(data) + "}");
        EXPECT_FALSE(response.hasDataField(nullptr)) << data;
        EXPECT_FALSE(response.hasField(nullptr)) << data;
        EXPECT_EQ(&response.getDataField(nullptr), &response.getField("absent")) << data;
        EXPECT_EQ(&response.getField(nullptr), &response.getField("absent")) << data;
        EXPECT_EQ(response.getDataFieldtoStr(nullptr), "") << data;
    }
    for (const JsonKind& kind : JsonKinds()) {
        const Response response(kind.value);
        EXPECT_FALSE(response.hasField(nullptr)) << kind.text;
        EXPECT_FALSE(response.hasDataField(nullptr)) << kind.text;
        EXPECT_TRUE(response.getField(nullptr).isNull()) << kind.text;
        EXPECT_TRUE(response.getDataField(nullptr).isNull()) << kind.text;
        EXPECT_EQ(response.getDataFieldtoStr(nullptr), "") << kind.text;
    }
}

TEST_F(ResponseTest, MissingMembersGiveTheSameNullOnEveryCall)
{
    for (const char* text : {"null", "[]", "{}", R"({"success":false,"data":{"additional":1}})",
                             R"({"success":true})"}) {
        Response response(text);
        const Json::Value& null = response.getField("absent");
        EXPECT_TRUE(null.isNull()) << text;
        for (int call = 0; call < 2; ++call) {
            EXPECT_EQ(&response.getField("absent"), &null) << text;
            EXPECT_EQ(&response.getField("other"), &null) << text;
            EXPECT_EQ(&response.getData(), &null) << text;
            EXPECT_EQ(&response.getDataField("additional"), &null) << text;
            EXPECT_EQ(&response.getAdditional(), &null) << text;
        }
        response.setResp(GoodReply);
        EXPECT_EQ(&response.getDataField("absent"), &null) << text;
        EXPECT_EQ(&response.getAdditional(), &null) << text;
        EXPECT_TRUE(null.isNull()) << text;
    }
}

TEST_F(ResponseTest, ReferencesPointIntoTheReplyAndStayValid)
{
    const Response response(
        R"({"success":true,"data":{"additional":{"a":1},"finish":true},"error":{"code":1}})");
    const Json::Value& data = response.getData();
    const Json::Value& additional = response.getAdditional();
    const Json::Value& error = response.getField("error");
    // Neither questions nor copies change a response.
    EXPECT_EQ(Ask(response), Ask(Response(response)));
    EXPECT_EQ(&data, &response.getData());
    EXPECT_EQ(&data, &response.getResp()["data"]);
    EXPECT_EQ(&additional, &data["additional"]);
    EXPECT_EQ(&additional, &response.getDataField("additional"));
    EXPECT_EQ(&error, &response.getResp()["error"]);
    EXPECT_TRUE(Same(additional, ParseJson(R"({"a":1})")));
}

// ------------------------------------------------------------------------------------------ texts

TEST_F(ResponseTest, ATextThatDoesNotParseLeavesANullReply)
{
    for (const std::string& text : NoJsonTexts()) {
        ExpectNull(Response(text));
        for (const char* earlier : {"null", GoodReply, "[1]"}) {
            Response response(earlier);
            EXPECT_FALSE(response.setResp(text)) << text;
            ExpectNull(response);
        }
    }
}

TEST_F(ResponseTest, ATruncatedReplyIsNull)
{
    const std::string text = GoodReply;
    Response response;
    for (std::size_t length = 0; length < text.size(); ++length) {
        ASSERT_TRUE(response.setResp(text));
        EXPECT_FALSE(response.setResp(text.substr(0, length))) << length;
        ExpectNull(response);
        ASSERT_TRUE(response.setResp(text.c_str()));
        EXPECT_FALSE(response.setResp(text.substr(0, length).c_str())) << length;
        ExpectNull(response);
    }
}

TEST_F(ResponseTest, AReplyWithTrailingTextIsNull)
{
    for (const char* tail : {" x", "}", ",", " {}", "\"", " null", "\n[", "/"}) {
        Response response(GoodReply);
        EXPECT_FALSE(response.setResp(GoodReply + std::string(tail))) << tail;
        ExpectNull(response);
    }
    Response response(GoodReply);
    EXPECT_FALSE(response.setResp(std::string(GoodReply) + '\0'));
    ExpectNull(response);
}

TEST_F(ResponseTest, NestingBeyondTheReadersLimitGivesANullReply)
{
    for (const std::size_t depth : {std::size_t{1001}, std::size_t{100000}}) {
        const std::string deep = std::string(depth, '[') + std::string(depth, ']');
        Response response(GoodReply);
        EXPECT_FALSE(response.setResp(R"({"success":true,"data":)" + deep + "}"));
        ExpectNull(response);
        ExpectNull(Response(deep));
    }
}

TEST_F(ResponseTest, ANullPointerIsATextThatDoesNotParse)
{
    const char* const null = nullptr;
    ExpectNull(Response(null));
    Response response(GoodReply);
    EXPECT_FALSE(response.setResp(null));
    ExpectNull(response);
}

TEST_F(ResponseTest, AJsonStringIsNotParsed)
{
    const Response response{Json::Value(GoodReply)};
    EXPECT_TRUE(Same(response.getResp(), Json::Value(GoodReply)));
    EXPECT_FALSE(response.isValid());
}

TEST_F(ResponseTest, APartOfTheReplyCanBecomeTheReply)
{
    Response response(R"({"success":true,"data":{"success":true,"data":"{\"success\":1}"}})");
    response.setResp(response.getData());
    EXPECT_TRUE(
        Same(response.getResp(), ParseJson(R"({"success":true,"data":"{\"success\":1}"})")));
    EXPECT_TRUE(response.setResp(response.getData().asCString()));
    EXPECT_TRUE(Same(response.getResp(), ParseJson(R"({"success":1})")));
    response.setResp(response.getResp());
    EXPECT_TRUE(Same(response.getResp(), ParseJson(R"({"success":1})")));
}

TEST_F(ResponseTest, ClearEmptiesObjectsAndArraysAndMakesEverythingElseNull)
{
    for (const JsonKind& kind : JsonKinds()) {
        Response response(kind.value);
        EXPECT_NO_THROW(response.clear()) << kind.text;
        Json::Value expected;
        if (kind.value.isArray()) expected = Json::Value(Json::arrayValue);
        if (kind.value.isObject()) expected = Json::Value(Json::objectValue);
        EXPECT_TRUE(Same(response.getResp(), expected)) << kind.text;
        ExpectAnswers(response, Answers());
    }
    Response response(GoodReply);
    response.clear();
    EXPECT_TRUE(Same(response.getResp(), Json::Value(Json::objectValue)));
    ExpectAnswers(response, Answers());
}

// ----------------------------------------------------------------------------------------- copies

TEST_F(ResponseTest, ACopyAnswersLikeItsSourceAndOutlivesIt)
{
    for (const JsonKind* choice : Choices()) {
        Places places = FullReply("true");
        places.taskId = choice;
        auto source = std::make_unique<Response>(places.Reply());
        const Response copy(*source);
        Response assigned(GoodReply);
        assigned = *source;
        source.reset();
        ExpectAnswers(copy, Expected(places));
        ExpectAnswers(assigned, Expected(places));
    }
}

TEST_F(ResponseTest, CopiesAreIndependent)
{
    const Answers answers = Ask(Response(GoodReply));
    Response source(GoodReply);
    Response copy(source);
    Response assigned;
    assigned = source;
    EXPECT_NE(&copy.getData(), &source.getData());
    EXPECT_NE(&assigned.getData(), &source.getData());
    EXPECT_NE(&copy.getField("absent"), &source.getField("absent"));

    source.clear();
    ExpectAnswers(copy, answers);
    ExpectAnswers(assigned, answers);
    copy.setResp("[");
    ExpectNull(copy);
    ExpectAnswers(assigned, answers);
}

TEST_F(ResponseTest, AResponseCanBeAssignedToItself)
{
    Response response(GoodReply);
    const Response& same = response;
    response = same;
    ExpectAnswers(response, Ask(Response(GoodReply)));
}

TEST_F(ResponseTest, ItsOwnPartsCanBecomeTheReply)
{
    Response response(R"({"success":true,"data":{"success":true,"data":{"task_id":"t"}}})");
    response.setResp(response.getField("success"));
    EXPECT_FALSE(response.isValid());
    ASSERT_TRUE(response.setResp(
        R"({"success":true,"data":{"success":true,"data":{"text":"{\"success\":true}"}}})"));
    response.setResp(response.getData());
    EXPECT_EQ(response.getDataFieldtoStr("text"), R"({"success":true})");
    EXPECT_TRUE(response.setResp(response.getDataField("text").asCString()));
    EXPECT_TRUE(response.isSuccess());
    EXPECT_FALSE(response.hasData());
}

}  // namespace
