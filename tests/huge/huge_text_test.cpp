// Texts of 2 GiB and more, which no JSON value can hold: they are refused as a whole, never cut,
// and nothing throws. Each test makes its text once, shortens it, and frees it at its end.
#include <json/value.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/utils.h>

#include <cstdint>
#include <utility>

#include "base/json_helpers.h"
#include "sqlite/sqlite_internals.h"
#include "support/fixtures/sqlite_fixture.h"
#include "support/fixtures/test_cache.h"

namespace {

using OrvaDRCore::Container;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::Request;
using OrvaDRCore::Response;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteInternals;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

constexpr std::size_t Longest = 2'147'483'642;  // text that a JSON value can hold
constexpr std::size_t TooLong = Longest + 1;
constexpr std::size_t CutToThreeBytes = (std::size_t{1} << 32U) + 3;  // as jsoncpp would cut it
constexpr std::size_t LongestName = (std::size_t{1} << 30U) - 1;

std::string TooLongFor(const std::string& text)
{
    return "text of [" + std::to_string(text.size()) + "] bytes is too long for a value";
}

class HugeTextTest : public SqliteFixture {
  protected:
    static LogLine NoValue(const std::string& text)
    {
        return Err("SqliteValue", TooLongFor(text)).In("sqlite_value.cpp");
    }

    template <class Command>
    void ExpectRefusedBy(const std::string& text)
    {
        const LogLine refused =
            Err("AddFieldValue", "Bad Field [a] /value[]").In("sqlite_command.cpp");
        Command command;
        EXPECT_FALSE(command.AddFieldValue("a", text));
        ExpectLines({NoValue(text), refused});
        EXPECT_FALSE(command.AddFieldValue("a", text.c_str()));
        ExpectLines({NoValue(text), refused});
        EXPECT_EQ(command.ToStr(), Command().ToStr());
    }
};

TEST_F(HugeTextTest, ATextThatIsTooLongGivesAnInvalidValue)
{
    std::string text(CutToThreeBytes, 'x');
    for (const std::size_t length : {CutToThreeBytes, TooLong}) {
        text.resize(length);
        EXPECT_FALSE(SqliteValue(text).IsValid());
        EXPECT_EQ(SqliteValue(text.c_str()).ToFormatedValue(), "");
        ExpectLines({NoValue(text), NoValue(text)});
    }
    text.resize(Longest);
    const SqliteValue value(text);
    EXPECT_TRUE(value.IsValid());
    EXPECT_EQ(SqliteInternals::BytesOf(value).size(), Longest);
}

TEST_F(HugeTextTest, TextsAndBlobsThatAreTooLongMakeNoValue)
{
    constexpr std::size_t LongestBlob = (Longest - 3) / 2;  // of which the literal fits
    std::string bytes(TooLong, 'x');
    EXPECT_FALSE(SqliteValue::Text(bytes).IsValid());
    EXPECT_FALSE(SqliteValue::Text(bytes.c_str()).IsValid());
    ExpectLines({NoValue(bytes), NoValue(bytes)});
    for (const std::size_t length : {TooLong, LongestBlob + 1}) {
        bytes.resize(length);
        EXPECT_FALSE(SqliteValue::Blob(bytes).IsValid());
        ExpectLines(
            {Err("Blob", "blob of [" + std::to_string(length) + "] bytes is too long for a value")
                 .In("sqlite_value.cpp")});
    }
    bytes.resize(LongestBlob);
    const SqliteValue blob = SqliteValue::Blob(bytes);
    bytes = std::string();
    EXPECT_TRUE(blob.IsValid());
    EXPECT_EQ(blob.ToFormatedValue().size(), 2 * LongestBlob + 3);
}

TEST_F(HugeTextTest, ATextThatIsTooLongIsRefusedByCommandsRecordsAndConditions)
{
    const std::string text(TooLong, 'x');
    ExpectRefusedBy<InsertCommand>(text);
    ExpectRefusedBy<UpdateCommand>(text);

    SqliteValueList list;
    EXPECT_FALSE(list.AddValue("a", text));
    ExpectLines(
        {NoValue(text), Err("AddValue", "Bad Field[a] or value []").In("sqlite_value.cpp")});
    EXPECT_EQ(list.ToStr(), "");

    EXPECT_FALSE(SqliteEqual("a", text).IsValid());
    ExpectLines(
        {NoValue(text), Err("SetValue", "Bad lvalue[a] or rvalue[]").In("sqlite_condition.cpp")});
}

TEST_F(HugeTextTest, AColumnWhoseTextIsTooLongIsLeftOut)
{
    const std::string text(TooLong, 'x');
    SqliteFaults faults;
    faults.columnText = [&text](sqlite3_stmt*, int) {
        return reinterpret_cast<const unsigned char*>(text.c_str());
    };
    ASSERT_TRUE(db.Open());
    SqliteValueList record;
    EXPECT_TRUE(db.SelectByCommand("SELECT 1 AS id, 'x' AS name", record));
    EXPECT_EQ(record.ToStr(), "id:1");
    ExpectLines(
        {NoValue(text), Err("AddValue", "Bad Field[name] or value []").In("sqlite_value.cpp")});
}

TEST_F(HugeTextTest, ATextTooLongForJsonIsNullOrRefused)
{
    std::string text(TooLong, 'x');
    Json::Value value(7);
    EXPECT_FALSE(OrvaDRCore::fromString(value, text));
    EXPECT_EQ(value, Json::Value(7));
    EXPECT_FALSE(Response().setResp(text));
    {
        Request request("A", 1, "m", Json::Value());
        request.setAPI(text);
        EXPECT_EQ(OrvaDRCore::toString(request.toJson()),
                  R"({"api":null,"method":"m","version":1})");
        request.setAPI("A");
        request.setMethod(text);
        EXPECT_EQ(OrvaDRCore::toString(request.toJson()),
                  R"({"api":"A","method":null,"version":1})");
    }
    std::vector<std::string> elements(3, "e");
    elements[1] = std::move(text);
    EXPECT_EQ(OrvaDRCore::toString(Container::ToJsonArray(elements)), R"(["e",null,"e"])");
}

TEST_F(HugeTextTest, ADocumentThatIsTooLongToBeLoadedAgainIsNotCached)
{
    const TestCache cache(dir.Path(), "status", 30, false, 2);
    ASSERT_TRUE(cache.UpdateWithData("old"));
    {
        const Json::Value data(std::string(TooLong / 6 + 1, '\1'));  // each is written as \u0001
        EXPECT_FALSE(cache.UpdateWithData(data));
    }
    ExpectLines(
        {Debug("UpdateWithData", "Failed to write cache to file [" + dir.File("status.cached") +
                                     "] and reach retry limit[2]")
             .In("cache.cpp")});
    EXPECT_TRUE(cache.Load());
    EXPECT_EQ(cache.GetCachedData(), "old");
}

TEST_F(HugeTextTest, ANameTooLongForJsonIsNoParameterAndNoDataField)
{
    std::string name(LongestName + 2, 'k');  // jsoncpp would cut it to "k"
    Request request;
    EXPECT_FALSE(request.addParam(name, 1));
    EXPECT_TRUE(request.getParams().isNull());
    EXPECT_FALSE(Response(R"({"k":1})").hasField(name.c_str()));
    name.resize(LongestName);
    EXPECT_TRUE(request.addParam(name, 1));
    EXPECT_EQ(request.getParams().begin().name().size(), LongestName);
}

TEST_F(HugeTextTest, AStatementThatIsTooLongFailsAndIsOmittedFromTheErrorRecord)
{
    const std::string record = R"({"sqlite_errcode":18,"sqlite_errmsg":"statement too long"})";
    // SQLite crashes on a literal of this size.
    std::string statement = "SELECT '";
    statement.resize(TooLong + 100, 'x');
    ASSERT_TRUE(db.Open());
    EXPECT_FALSE(db.DoExecSqliteCommand(statement));
    ExpectErr(db, 404, record);
    SqliteValueList row;
    EXPECT_FALSE(db.DoSelectSqliteRecord(statement, row));
    ExpectErr(db, 404, record);

    db.SetDBErr("S", 5, statement.c_str());
    ExpectErr(db, 404, R"({"command":"S","sqlite_errcode":5,"sqlite_errmsg":null})");

    statement[10] = '\'';
    statement[11] = '\0';  // where SQLite ends a statement
    EXPECT_TRUE(db.DoExecSqliteCommand(statement));
    EXPECT_TRUE(db.DoSelectSqliteRecord(statement, row));
    ExpectErr(db, 0);
}

}  // namespace
