// Values, statements, requests and replies, with every allocation failing once. They make no system
// calls.
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>

#include "base/json_helpers.h"
#include "fault.h"

using OrvaDRCore::InsertCommand;
using OrvaDRCore::Request;
using OrvaDRCore::Response;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteAnd;
using OrvaDRCore::SqliteBeginsWith;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteGreaterEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteNotEqual;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::toString;
using OrvaDRCore::UpdateCommand;

namespace {

const char* const Reply =
    R"({"data":{"finish":true,"task_id":"a task with a long name"},"success":true})";
const char* const Refusal =
    R"({"error":{"code":507,"errors":["no node has a name that long"]},"success":false})";

// Makes a text with a fault, which must give this text or none, and again without.
void ExpectText(const std::string& expected, const std::function<std::string()>& make)
{
    std::string text;
    const Outcome outcome = WithFault([&] {
        text = make();
        return true;
    });
    EXPECT_EQ(text, outcome.succeeded ? expected : "");
    EXPECT_EQ(make(), expected);
}

InsertCommand MakeInsert()
{
    InsertCommand insert;
    insert.SetTable(SqliteTableHandler("a_table_with_a_name", "id INT, name TEXT"));
    insert.AddFieldValue("a_column_with_a_name", "a value that is long enough");
    insert.AddFieldValue("id", 7);
    return insert;
}

}  // namespace

TEST(EnvelopeFaults, Insert)
{
    EveryCallFails("InsertCommand", [] {
        ExpectText(
            "INSERT INTO a_table_with_a_name (a_column_with_a_name,id) "
            "VALUES ('a value that is long enough',7);",
            [] { return MakeInsert().GetCommand(); });
    });
}

TEST(EnvelopeFaults, InsertAsLogText)
{
    EveryCallFails("InsertCommand::ToStr", [] {
        const InsertCommand insert = MakeInsert();
        ExpectText(insert.ToStr(), [&] { return insert.ToStr(); });
    });
}

TEST(EnvelopeFaults, UpdateAsLogText)
{
    EveryCallFails("UpdateCommand::ToStr", [] {
        UpdateCommand update;
        update.SetTable(SqliteTableHandler("a_table_with_a_name", ""));
        update.AddFieldValue("name", "a value that is long enough");
        update.SetCondition("a condition that is long enough");
        ExpectText(update.ToStr(), [&] { return update.ToStr(); });
    });
}

TEST(EnvelopeFaults, SelectAsLogText)
{
    EveryCallFails("SelectCommand::ToStr", [] {
        SelectCommand select;
        select.SetTable(SqliteTableHandler("a_table_with_a_name", ""));
        select.AddField("a_field_with_a_name");
        select.SetCondition("a condition that is long enough");
        ExpectText(select.ToStr(), [&] { return select.ToStr(); });
    });
}

TEST(EnvelopeFaults, UpdateWithConditions)
{
    EveryCallFails("UpdateCommand", [] {
        ExpectText(
            "UPDATE a_table_with_a_name SET name='a value that is long enough' "
            "WHERE (id='7') AND (name IN ( 'one that is long enough','two' ))",
            [] {
                UpdateCommand update;
                update.SetTable(SqliteTableHandler("a_table_with_a_name", "id INT, name TEXT"));
                update.AddFieldValue("name", std::string("a value that is long enough"));
                const SqliteEqual equal("id", SqliteValue("7"));
                const std::vector<SqliteValue> names{"one that is long enough", "two"};
                const SqliteIn in("name", names);
                update.SetCondition(SqliteAnd(equal.GetCondition(), in.GetCondition()));
                return update.GetCommand();
            });
    });
}

TEST(EnvelopeFaults, Select)
{
    EveryCallFails("SelectCommand", [] {
        ExpectText("SELECT a_column_with_a_name,id FROM a_table_with_a_name WHERE id!=7", [] {
            SelectCommand select;
            select.SetTable(SqliteTableHandler("a_table_with_a_name", ""));
            select.AddField("a_column_with_a_name");
            select.AddField("id");
            select.SetCondition(SqliteNotEqual("id", 7));
            return select.GetCommand();
        });
    });
}

TEST(EnvelopeFaults, SelectWithGroupsOrderAndLimit)
{
    EveryCallFails("SelectCommand::OrderBy", [] {
        ExpectText(
            "SELECT id FROM a_table_with_a_name WHERE (name LIKE '50\\%%' ESCAPE '\\') AND (id>=7) "
            "GROUP BY a_column_with_a_name,id ORDER BY a_column_with_a_name,id DESC LIMIT 20 "
            "OFFSET 5",
            [] {
                SelectCommand select;
                select.SetTable(SqliteTableHandler("a_table_with_a_name", ""));
                select.AddField("id");
                const SqliteBeginsWith begins("name", "50%");
                const SqliteGreaterEqual large("id", 7);
                select.SetCondition(SqliteAnd(begins.GetCondition(), large.GetCondition()));
                for (const char* key : {"a_column_with_a_name", "id"}) select.GroupBy(key);
                select.OrderBy("a_column_with_a_name");
                select.OrderBy("id", SqliteOrder::Descending);
                select.Limit(20, 5);
                return select.GetCommand();
            });
    });
}

TEST(EnvelopeFaults, Records)
{
    EveryCallFails("SqliteValueList", [] {
        ExpectText("another:7, name:'a value that''s long enough'", [] {
            SqliteValueList record;
            record.AddValue("name", SqliteValue::EscapeText("a value that's long enough"));
            SqliteValueList other;
            other.AddValue("another", 7);
            record += other;
            return record.ToStr();
        });
    });
}

namespace {

// Fields in an order in which most of them are sorted later.
SqliteValueList MakeRecord(int fields)
{
    SqliteValueList record;
    for (int number = 500; number > 500 - fields; --number) {
        record.AddValue("a field with a number, which is " + std::to_string(number), number);
    }
    return record;
}

}  // namespace

// With room for another field, without, and with so many unsorted fields that they are sorted first.
TEST(EnvelopeFaults, AFieldIsAddedOrTheRecordIsTheOldOne)
{
    const std::string text = "a value that is long enough";
    EveryCallFails("SqliteValueList::AddValue", [&] {
        for (const int fields : {5, 8, 64, 67}) {
            for (const char* field : {"a field in front of all others", "the field after them"}) {
                SqliteValueList record = MakeRecord(fields);
                SqliteValue value(text);
                const Outcome outcome =
                    WithFault([&] { return record.AddValue(field, std::move(value)); });
                EXPECT_EQ(record.HasField(field), outcome.succeeded);
                // NOLINTNEXTLINE(bugprone-use-after-move): a failure does not take the value
                EXPECT_EQ(value.IsValid(), !outcome.succeeded);
                EXPECT_TRUE(record.AddValue(field, text));
                SqliteValueList expected = MakeRecord(fields);
                expected.AddValue(field, text);
                EXPECT_EQ(record.ToStr(), expected.ToStr());
            }
        }
    });
}

TEST(EnvelopeFaults, ARecordIsSortedOrItsFieldsAreKept)
{
    const std::string sorted = MakeRecord(200).ToStr();
    EveryCallFails("SqliteValueList::GetValues", [&] {
        const SqliteValueList record = MakeRecord(200);
        const Outcome outcome = WithFault([&] { return record.GetValues().size() == 200; });
        EXPECT_TRUE(outcome.succeeded || outcome.threw);
        EXPECT_EQ(record.ToStr(), sorted);
    });
}

TEST(EnvelopeFaults, RecordsAreAssignedAsAWhole)
{
    EveryCallFails("SqliteValueList::operator=", [] {
        const SqliteValueList other = MakeRecord(200);
        SqliteValueList record;
        record.AddValue("old", "a value that is long enough");
        const Outcome outcome = WithFault([&] {
            record = other;
            return true;
        });
        EXPECT_EQ(record.HasField("old"), !outcome.succeeded);
        EXPECT_EQ(record.GetValues().size(), outcome.succeeded ? 200U : 1U);
    });
}

TEST(EnvelopeFaults, ValuesOfEveryKind)
{
    EveryCallFails("SqliteValue::Text", [] {
        ExpectText(
            "a:'it''s long enough', b:CAST(X'6100' AS TEXT), c:X'61207465', d:5000000000, "
            "e:0.61225628777280094, f:NULL",
            [] {
                SqliteValueList record;
                record.AddValue("a", SqliteValue::Text("it's long enough"));
                record.AddValue("b", SqliteValue::Text(std::string("a\0", 2)));
                record.AddValue("c", SqliteValue::Blob("a te"));
                record.AddValue("d", SqliteValue::Integer(5'000'000'000));
                record.AddValue("e", SqliteValue::Real(0.612256287772801));
                record.AddValue("f", SqliteValue::Null());
                return record.ToStr();
            });
    });
}

TEST(EnvelopeFaults, RequestToJson)
{
    EveryCallFails("Request", [] {
        ExpectText(
            R"({"api":"an API with a long name","method":"get","n":"a long, long value","version":1})",
            [] {
                Request request("an API with a long name", 1, "get", Json::Value());
                if (!request.addParam("n", "a long, long value")) return std::string();
                return toString(Request(request.toJson()).toJson());
            });
    });
}

TEST(EnvelopeFaults, ParsedReply)
{
    EveryCallFails("Response::setResp", [] {
        const std::string text = Reply;
        Response response(Refusal);
        const Outcome outcome = WithFault([&] { return response.setResp(text); });
        // After a text that does not parse there is no reply, not even the one before.
        EXPECT_EQ(toString(response.getResp()), outcome.succeeded ? Reply : "null");
        EXPECT_TRUE(response.setResp(Reply));
        EXPECT_EQ(toString(response.getResp()), Reply);
    });
}

TEST(EnvelopeFaults, CopiedReply)
{
    EveryCallFails("Response's copy", [] {
        const Response reply(Reply);
        ExpectText(Reply, [&] { return toString(Response(reply).getResp()); });
    });
}

TEST(EnvelopeFaults, GettersOfAReply)
{
    EveryCallFails("Response's answers", [] {
        const Response reply(Reply);
        const Response refusal(Refusal);
        ExpectText("a task with a long name", [&] { return reply.getTaskId(); });
        ExpectText(R"(["no node has a name that long"])",
                   [&] { return toString(refusal.getErrMsg()); });
        EXPECT_TRUE(reply.isPollFinish());
        EXPECT_EQ(refusal.getErrCode(), 507);
    });
}

TEST(EnvelopeFaults, RequestFromText)
{
    EveryCallFails("Request::FromText", [] {
        const std::string old = R"({"api":"an API with a long name","method":"get","version":1})";
        const std::string text = R"({"api":"another API of some length","name":"x","version":2})";
        Request request{Json::Value()};
        EXPECT_TRUE(Request::FromText(old, request));
        request.setEncryptRequired(true);
        const Outcome outcome = WithFault([&] { return Request::FromText(text, request); });
        EXPECT_EQ(request.toStr(), outcome.succeeded ? "another API of some length//2"
                                                     : "an API with a long name/get/1");
        EXPECT_EQ(request.isEncryptRequired(), !outcome.succeeded);
        EXPECT_TRUE(Request::FromText(text, request));
        EXPECT_EQ(request.getParams()["name"].asString(), "x");
    });
}

TEST(EnvelopeFaults, NewReplies)
{
    EveryCallFails("Response::Success and Failure", [] {
        const Json::Value data(R"(a text with a "name" of its own)");
        ExpectText(R"({"data":"a text with a \"name\" of its own","success":true})",
                   [&] { return Response(Response::Success(data)).toLine(); });
        ExpectText(
            R"({"error":{"code":507,"errors":"a text with a \"name\" of its own"},"success":false})",
            [&] { return Response(Response::Failure(507, data)).toLine(); });
    });
}
