#include <orvadrcore/sqlite_command.h>

#include <climits>
#include <locale>
#include <type_traits>

#include "support/fixtures/log_capture.h"

// Conditions have no virtual destructor by contract, so those derived here have none either.
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteCommand;
using OrvaDRCore::SqliteCondition;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteInFamily;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

constexpr const char* NullText = nullptr;

SqliteTableHandler Jobs()
{
    return {"jobs", "id INTEGER, name TEXT"};
}

// A command on the table `jobs`.
template <class Command>
Command OnJobs()
{
    Command command;
    EXPECT_TRUE(command.SetTable(Jobs()));
    return command;
}

// A list with one field.
SqliteValueList Fields(const char* field, const SqliteValue& value)
{
    SqliteValueList list;
    EXPECT_TRUE(list.AddValue(field, value));
    return list;
}

class SqliteCommandTest : public LoggedTest {
  protected:
    SqliteCommandTest() : LoggedTest("sqlite_command.cpp") {}

    void ExpectNoStatement(const SqliteCommand& command, const std::string& message)
    {
        EXPECT_FALSE(command.IsValid());
        EXPECT_EQ(command.GetCommand(), "");
        ExpectLines({Err("GetCommand", message)});
    }

    // The statement, of a command that is valid.
    static std::string Statement(const SqliteCommand& command)
    {
        EXPECT_TRUE(command.IsValid());
        return command.GetCommand();
    }
};

TEST_F(SqliteCommandTest, ATableHandlerHoldsNameAndSchema)
{
    EXPECT_EQ(SqliteTableHandler().GetName(), "");
    EXPECT_EQ(SqliteTableHandler().GetSchema(), "");
    EXPECT_EQ(Jobs().GetName(), "jobs");
    EXPECT_EQ(Jobs().GetSchema(), "id INTEGER, name TEXT");

    const SqliteTableHandler jobs = Jobs();
    SqliteTableHandler copy(jobs);
    EXPECT_EQ(copy.GetName(), "jobs");
    EXPECT_EQ(copy.GetSchema(), "id INTEGER, name TEXT");
    copy = SqliteTableHandler("", "x");
    EXPECT_EQ(copy.GetName(), "");
    EXPECT_EQ(copy.GetSchema(), "x");
}

// How the types appear in the test names.
struct TypeNames {
    template <class T>
    static std::string GetName(int /*index*/)
    {
        if (std::is_same_v<T, InsertCommand>) return "Insert";
        if (std::is_same_v<T, UpdateCommand>) return "Update";
        return "Select";
    }
};

// Tests of all commands.
template <class Command>
class AnyCommandTest : public SqliteCommandTest {
};
using AnyCommands = ::testing::Types<InsertCommand, UpdateCommand, SelectCommand>;
TYPED_TEST_SUITE(AnyCommandTest, AnyCommands, TypeNames);

TYPED_TEST(AnyCommandTest, AnEmptyTableNameIsRefused)
{
    TypeParam command;
    EXPECT_FALSE(command.SetTable(SqliteTableHandler("", "id INTEGER")));
    this->ExpectLines({Err("SetTable", "Invalid table []")});
    EXPECT_EQ(command.GetTable().GetName(), "");
    EXPECT_EQ(command.GetTable().GetSchema(), "");

    EXPECT_TRUE(command.SetTable(Jobs()));
    EXPECT_FALSE(command.SetTable(SqliteTableHandler()));
    this->ExpectLines({Err("SetTable", "Invalid table []")});
    EXPECT_EQ(command.GetTable().GetName(), "jobs");
    EXPECT_EQ(command.GetTable().GetSchema(), "id INTEGER, name TEXT");
}

TYPED_TEST(AnyCommandTest, ATableWithoutASchemaIsAccepted)
{
    TypeParam command = OnJobs<TypeParam>();
    EXPECT_TRUE(command.SetTable(SqliteTableHandler("t", "")));
    EXPECT_EQ(command.GetTable().GetName(), "t");
    EXPECT_EQ(command.GetTable().GetSchema(), "");
}

TYPED_TEST(AnyCommandTest, ItsOwnTableCanBeSetAgain)
{
    TypeParam command = OnJobs<TypeParam>();
    EXPECT_TRUE(command.SetTable(command.GetTable()));
    EXPECT_EQ(command.GetTable().GetName(), "jobs");
    EXPECT_EQ(command.GetTable().GetSchema(), "id INTEGER, name TEXT");
}

// Tests of InsertCommand and UpdateCommand.
template <class Command>
class FieldCommandTest : public SqliteCommandTest {
  protected:
    // The command's fields, as ToStr() shows them.
    static std::string Values(const Command& command)
    {
        const std::string text = command.ToStr();
        return text.substr(text.find("values:"));
    }
};
using FieldCommands = ::testing::Types<InsertCommand, UpdateCommand>;
TYPED_TEST_SUITE(FieldCommandTest, FieldCommands, TypeNames);

TYPED_TEST(FieldCommandTest, FieldsOfEveryTypeAreAdded)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("text", std::string("abc")));
    EXPECT_TRUE(command.AddFieldValue("int", -1));
    EXPECT_TRUE(command.AddFieldValue("unsigned", UINT_MAX));
    EXPECT_TRUE(command.AddFieldValue("true", true));
    EXPECT_TRUE(command.AddFieldValue("false", false));
    EXPECT_EQ(this->Values(command),
              "values:[false=0,int=-1,text='abc',true=1,unsigned=4294967295]");
}

TYPED_TEST(FieldCommandTest, ValuesOfEveryKindAreAdded)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("text", SqliteValue::Text("it's")));
    EXPECT_TRUE(command.AddFieldValue("size", SqliteValue::Integer(5'000'000'000)));
    EXPECT_TRUE(command.AddFieldValue("load", SqliteValue::Real(0.25)));
    EXPECT_TRUE(command.AddFieldValue("key", SqliteValue::Blob("o")));
    EXPECT_TRUE(command.AddFieldValue("note", SqliteValue::Null()));
    EXPECT_TRUE(command.AddFieldValue("plain", SqliteValue(1)));
    EXPECT_TRUE(command.AddFieldValue("plain", SqliteValue("it's")));
    EXPECT_EQ(this->Values(command),
              "values:[key=X'6f',load=0.25,note=NULL,plain='it's',size=5000000000,text='it''s']");
}

TYPED_TEST(FieldCommandTest, AStringLiteralIsAText)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("name", "abc"));
    EXPECT_TRUE(command.AddFieldValue("empty", ""));
    EXPECT_TRUE(command.AddFieldValue("quote", "it's"));  // the contract: not escaped
    EXPECT_EQ(this->Values(command), "values:[empty='',name='abc',quote='it's']");
}

TYPED_TEST(FieldCommandTest, AddingAFieldTwiceKeepsTheSecondValue)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("a", 1));
    EXPECT_TRUE(command.AddFieldValue("a", "two"));
    EXPECT_EQ(this->Values(command), "values:[a='two']");
}

TYPED_TEST(FieldCommandTest, AnEmptyNameOrANullTextIsRefused)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("name", "x"));

    EXPECT_FALSE(command.AddFieldValue("", "abc"));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value['abc']")});
    EXPECT_FALSE(command.AddFieldValue("", std::string("%s%n")));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value['%s%n']")});
    EXPECT_FALSE(command.AddFieldValue("", 1));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value[1]")});
    EXPECT_FALSE(command.AddFieldValue("", 4000000000U));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value[4000000000]")});
    EXPECT_FALSE(command.AddFieldValue("", true));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value[1]")});
    EXPECT_FALSE(command.AddFieldValue("name", NullText));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [name] /value[]")});
    EXPECT_FALSE(command.AddFieldValue("", SqliteValue::Text("it's")));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value['it''s']")});
    EXPECT_FALSE(command.AddFieldValue("name", SqliteValue()));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [name] /value[]")});
    EXPECT_FALSE(command.AddFieldValue("", NullText));
    this->ExpectLines({Err("AddFieldValue", "Bad Field [] /value[]")});

    EXPECT_EQ(this->Values(command), "values:[name='x']");
}

TYPED_TEST(FieldCommandTest, ARecordReplacesTheFields)
{
    TypeParam command;
    EXPECT_TRUE(command.AddFieldValue("a", 1));
    EXPECT_TRUE(command.AddFieldValue("b", 2));
    SqliteValueList record = Fields("b", "x");
    command.SetFieldValues(record);
    EXPECT_TRUE(record.AddValue("c", 3));  // the command has a copy
    EXPECT_EQ(this->Values(command), "values:[b='x']");

    EXPECT_TRUE(command.AddFieldValue("a", true));
    EXPECT_EQ(this->Values(command), "values:[a=1,b='x']");
    command.SetFieldValues(SqliteValueList());
    EXPECT_EQ(this->Values(command), "values:[]");
}

TEST_F(SqliteCommandTest, AnInsertNamesColumnsAndValuesInTheSameOrder)
{
    auto insert = OnJobs<InsertCommand>();
    EXPECT_TRUE(insert.AddFieldValue("name", "x"));
    EXPECT_TRUE(insert.AddFieldValue("id", 1));
    EXPECT_EQ(insert.ToFormatedInsertValues(), "(id,name) VALUES (1,'x')");
    EXPECT_EQ(Statement(insert), "INSERT INTO jobs (id,name) VALUES (1,'x');");

    EXPECT_TRUE(insert.AddFieldValue("Zone", false));
    EXPECT_TRUE(insert.AddFieldValue("note", "it's"));
    EXPECT_TRUE(insert.AddFieldValue("empty", ""));
    EXPECT_EQ(Statement(insert),
              "INSERT INTO jobs (Zone,empty,id,name,note) VALUES (0,'',1,'x','it's');");
}

TEST_F(SqliteCommandTest, AnInsertReplacesWhenItIsToldTo)
{
    auto insert = OnJobs<InsertCommand>();
    insert.SetFieldValues(Fields("id", 1));
    insert.SetReplacable(true);
    EXPECT_EQ(Statement(insert), "INSERT OR REPLACE INTO jobs (id) VALUES (1);");
    insert.SetReplacable(false);
    EXPECT_EQ(Statement(insert), "INSERT INTO jobs (id) VALUES (1);");
}

TEST_F(SqliteCommandTest, AnInsertWithoutTableOrFieldsIsNotValid)
{
    ExpectNoStatement(InsertCommand(), "Bad insert parameter");
    ExpectNoStatement(OnJobs<InsertCommand>(), "Bad insert parameter");
    InsertCommand insert;
    EXPECT_TRUE(insert.AddFieldValue("id", 1));
    ExpectNoStatement(insert, "Bad insert parameter");
    EXPECT_EQ(InsertCommand().ToFormatedInsertValues(), "() VALUES ()");
}

// The contract has a "]" without a "[".
TEST_F(SqliteCommandTest, AnInsertIsDescribedForTheLog)
{
    EXPECT_EQ(InsertCommand().ToStr(), "]values:[]");
    auto insert = OnJobs<InsertCommand>();
    EXPECT_EQ(insert.ToStr(), "jobs]values:[]");
    EXPECT_TRUE(insert.AddFieldValue("name", "x"));
    EXPECT_TRUE(insert.AddFieldValue("id", 1));
    EXPECT_EQ(insert.ToStr(), "jobs]values:[id=1,name='x']");
}

TEST_F(SqliteCommandTest, AnUpdateSetsColumnsInTheOrderOfTheirNames)
{
    auto update = OnJobs<UpdateCommand>();
    EXPECT_TRUE(update.AddFieldValue("tries", 3));
    EXPECT_TRUE(update.AddFieldValue("state", "done"));
    EXPECT_TRUE(update.SetCondition("id=7"));
    EXPECT_EQ(Statement(update), "UPDATE jobs SET state='done',tries=3 WHERE id=7");

    EXPECT_TRUE(update.AddFieldValue("note", "it's"));
    EXPECT_TRUE(update.SetCondition(" id  =  7 ;"));  // written as it is
    EXPECT_EQ(Statement(update),
              "UPDATE jobs SET note='it's',state='done',tries=3 WHERE  id  =  7 ;");
}

TEST_F(SqliteCommandTest, AnIncompleteUpdateIsNotValid)
{
    for (const bool table : {false, true}) {
        for (const bool condition : {false, true}) {
            for (const bool fields : {false, true}) {
                UpdateCommand update = table ? OnJobs<UpdateCommand>() : UpdateCommand();
                EXPECT_EQ(update.SetCondition(condition ? "id=7" : ""), condition);
                update.SetFieldValues(fields ? Fields("id", 1) : SqliteValueList());
                if (table && condition && fields) {
                    EXPECT_EQ(Statement(update), "UPDATE jobs SET id=1 WHERE id=7");
                } else {
                    ExpectNoStatement(update, "Bad update command");
                }
            }
        }
    }
}

TEST_F(SqliteCommandTest, AnUpdateIsDescribedForTheLog)
{
    EXPECT_EQ(UpdateCommand().ToStr(), "]condition:[]/values:[]");
    auto update = OnJobs<UpdateCommand>();
    EXPECT_TRUE(update.AddFieldValue("tries", 3));
    EXPECT_TRUE(update.AddFieldValue("state", "done"));
    EXPECT_TRUE(update.SetCondition("id=7"));
    EXPECT_EQ(update.ToStr(), "jobs]condition:[id=7]/values:[state='done',tries=3]");
}

// The contract has two blanks before the star.
TEST_F(SqliteCommandTest, ASelectOfAllColumnsHasAStar)
{
    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs");
    EXPECT_TRUE(select.SetCondition("state='done'"));
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs WHERE state='done'");
}

TEST_F(SqliteCommandTest, ASelectKeepsTheOrderOfItsColumns)
{
    auto select = OnJobs<SelectCommand>();
    for (const char* field : {"id", "name", "id", "CAST(size AS TEXT) AS size"}) {
        EXPECT_TRUE(select.AddField(field));
    }
    EXPECT_EQ(Statement(select), "SELECT id,name,id,CAST(size AS TEXT) AS size FROM jobs");
    EXPECT_TRUE(select.SetCondition("state='done'"));
    EXPECT_EQ(Statement(select),
              "SELECT id,name,id,CAST(size AS TEXT) AS size FROM jobs WHERE state='done'");
}

TEST_F(SqliteCommandTest, SelectAllAndAddFieldReplaceEachOther)
{
    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    EXPECT_TRUE(select.AddField("name"));
    EXPECT_EQ(Statement(select), "SELECT name FROM jobs");
    EXPECT_TRUE(select.AddField("id"));
    select.SelectAll();
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs");
    EXPECT_TRUE(select.AddField("id"));
    EXPECT_EQ(Statement(select), "SELECT id FROM jobs");
}

// The contract has no log line here.
TEST_F(SqliteCommandTest, AnEmptyColumnIsRefusedSilently)
{
    auto select = OnJobs<SelectCommand>();
    EXPECT_FALSE(select.AddField(""));
    ExpectLines({});
    ExpectNoStatement(select, "Bad select command");

    select.SelectAll();
    EXPECT_FALSE(select.AddField(""));
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs");
    EXPECT_TRUE(select.AddField("id"));
    EXPECT_FALSE(select.AddField(""));
    EXPECT_EQ(Statement(select), "SELECT id FROM jobs");
}

TEST_F(SqliteCommandTest, ASelectWithoutTableOrColumnsIsNotValid)
{
    ExpectNoStatement(SelectCommand(), "Bad select command");
    auto select = OnJobs<SelectCommand>();
    ExpectNoStatement(select, "Bad select command");
    EXPECT_TRUE(select.SetCondition("id=7"));
    ExpectNoStatement(select, "Bad select command");

    SelectCommand withoutTable;
    EXPECT_TRUE(withoutTable.AddField("id"));
    ExpectNoStatement(withoutTable, "Bad select command");
    withoutTable.SelectAll();
    ExpectNoStatement(withoutTable, "Bad select command");
}

TEST_F(SqliteCommandTest, ASelectIsDescribedForTheLog)
{
    EXPECT_EQ(SelectCommand().ToStr(), "]condition:[]/fields:[]");
    auto select = OnJobs<SelectCommand>();
    EXPECT_TRUE(select.AddField("id"));
    EXPECT_TRUE(select.AddField("name"));
    EXPECT_EQ(select.ToStr(), "jobs]condition:[]/fields:[id, name]");
    select.SelectAll();
    EXPECT_TRUE(select.SetCondition("state='done'"));
    EXPECT_EQ(select.ToStr(), "jobs]condition:[state='done']/fields:[all]");
    EXPECT_TRUE(select.AddField("id"));
    EXPECT_EQ(select.ToStr(), "jobs]condition:[state='done']/fields:[id]");
}

// Tests of UpdateCommand and SelectCommand.
template <class Command>
class ConditionCommandTest : public SqliteCommandTest {
  protected:
    // The command's condition, as ToStr() shows it.
    static std::string Condition(const Command& command)
    {
        const std::string text = command.ToStr();
        return text.substr(0, text.find('/'));
    }
};
using ConditionCommands = ::testing::Types<UpdateCommand, SelectCommand>;
TYPED_TEST_SUITE(ConditionCommandTest, ConditionCommands, TypeNames);

TYPED_TEST(ConditionCommandTest, AConditionIsATextOrAnObject)
{
    TypeParam command;
    EXPECT_TRUE(command.SetCondition("id=7"));
    EXPECT_EQ(this->Condition(command), "]condition:[id=7]");
    EXPECT_TRUE(command.SetCondition(std::string("id=8")));
    EXPECT_EQ(this->Condition(command), "]condition:[id=8]");
    EXPECT_TRUE(command.SetCondition(SqliteEqual("id", 9)));
    EXPECT_EQ(this->Condition(command), "]condition:[id=9]");
    EXPECT_TRUE(command.SetCondition(SqliteIn("id", std::vector<SqliteValue>{1, 2})));
    EXPECT_EQ(this->Condition(command), "]condition:[id IN ( 1,2 )]");
    EXPECT_TRUE(command.SetCondition(SqliteCondition("x > 5")));
    EXPECT_EQ(this->Condition(command), "]condition:[x > 5]");
}

TYPED_TEST(ConditionCommandTest, AnInvalidConditionIsRefused)
{
    TypeParam command;
    EXPECT_FALSE(command.SetCondition(SqliteCondition()));
    this->ExpectLines({Err("SetCondition", "Invalid condition")});
    EXPECT_EQ(this->Condition(command), "]condition:[]");

    EXPECT_TRUE(command.SetCondition("id=7"));
    EXPECT_FALSE(command.SetCondition(SqliteEqual()));
    this->ExpectLines({Err("SetCondition", "Invalid condition")});
    EXPECT_FALSE(command.SetCondition(SqliteInFamily("in")));
    this->ExpectLines({Err("SetCondition", "Invalid condition")});
    EXPECT_EQ(this->Condition(command), "]condition:[id=7]");
}

// A caller's own condition, which decides by itself whether it is valid.
// NOLINTNEXTLINE(cppcoreguidelines-virtual-class-destructor)
class AnyCondition final : public SqliteCondition {
  public:
    AnyCondition(const std::string& text, bool answer) : SqliteCondition(text), valid_(answer) {}
    bool IsValid() const override { return valid_; }

  private:
    bool valid_;
};

TYPED_TEST(ConditionCommandTest, ACallersConditionDecidesWhetherItIsValid)
{
    TypeParam command;
    EXPECT_TRUE(command.SetCondition(AnyCondition("id=7", true)));
    EXPECT_FALSE(command.SetCondition(AnyCondition("id=8", false)));
    this->ExpectLines({Err("SetCondition", "Invalid condition")});
    EXPECT_EQ(this->Condition(command), "]condition:[id=7]");
}

// By contract only a select logs an empty text.
TEST_F(SqliteCommandTest, AnUpdateRefusesAnEmptyConditionSilently)
{
    auto update = OnJobs<UpdateCommand>();
    update.SetFieldValues(Fields("a", 1));
    EXPECT_FALSE(update.SetCondition(""));
    EXPECT_FALSE(update.SetCondition(SqliteIn()));  // valid, but without a text
    ExpectLines({});
    ExpectNoStatement(update, "Bad update command");

    EXPECT_TRUE(update.SetCondition("id=7"));
    EXPECT_FALSE(update.SetCondition(""));
    EXPECT_FALSE(update.SetCondition(SqliteIn()));
    EXPECT_EQ(Statement(update), "UPDATE jobs SET a=1 WHERE id=7");
}

TEST_F(SqliteCommandTest, ASelectRefusesAnEmptyConditionAndLogsIt)
{
    const LogLine line = Err("SetCondition", "Empty condition");
    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    EXPECT_FALSE(select.SetCondition(""));
    ExpectLines({line});
    EXPECT_FALSE(select.SetCondition(SqliteIn()));  // valid, but without a text
    ExpectLines({line});
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs");

    EXPECT_TRUE(select.SetCondition("id=7"));
    EXPECT_FALSE(select.SetCondition(""));
    EXPECT_FALSE(select.SetCondition(SqliteIn()));
    ExpectLines({line, line});
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs WHERE id=7");
}

TEST_F(SqliteCommandTest, ACopyIsIndependent)
{
    auto insert = OnJobs<InsertCommand>();
    insert.SetFieldValues(Fields("a", 1));
    InsertCommand otherInsert(insert);
    EXPECT_TRUE(otherInsert.AddFieldValue("b", 2));
    otherInsert.SetReplacable(true);
    EXPECT_EQ(Statement(otherInsert), "INSERT OR REPLACE INTO jobs (a,b) VALUES (1,2);");
    EXPECT_EQ(Statement(insert), "INSERT INTO jobs (a) VALUES (1);");

    auto update = OnJobs<UpdateCommand>();
    EXPECT_TRUE(update.SetCondition("id=7"));
    update.SetFieldValues(Fields("a", 1));
    UpdateCommand otherUpdate;
    otherUpdate = update;
    EXPECT_TRUE(otherUpdate.SetCondition("id=8"));
    EXPECT_EQ(Statement(otherUpdate), "UPDATE jobs SET a=1 WHERE id=8");
    EXPECT_EQ(Statement(update), "UPDATE jobs SET a=1 WHERE id=7");

    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    SelectCommand otherSelect(select);
    EXPECT_TRUE(otherSelect.AddField("id"));
    EXPECT_EQ(Statement(otherSelect), "SELECT id FROM jobs");
    EXPECT_EQ(Statement(select), "SELECT  * FROM jobs");
}

// A command that is valid or not as the test wants, with parameters of its own.
template <class Command>
class Decided : public Command {
  public:
    Decided(const Command& command, bool answer) : Command(command), valid_(answer) {}
    bool IsValid() const override { return valid_; }
    void DumpParam(std::stringstream& out) const override { out << "own parameters"; }

  private:
    bool valid_;
};

TEST_F(SqliteCommandTest, ASubclassDecidesWhetherItIsValid)
{
    EXPECT_EQ(Statement(Decided(OnJobs<InsertCommand>(), true)), "INSERT INTO jobs () VALUES ();");
    EXPECT_EQ(Statement(Decided(OnJobs<SelectCommand>(), true)), "SELECT FROM jobs");
    auto update = OnJobs<UpdateCommand>();
    EXPECT_TRUE(update.AddFieldValue("a", 1));
    EXPECT_EQ(Statement(Decided(update, true)), "UPDATE jobs SET a=1");

    auto insert = OnJobs<InsertCommand>();
    EXPECT_TRUE(insert.AddFieldValue("a", 1));
    ExpectNoStatement(Decided(insert, false), "Bad insert parameter");
    EXPECT_TRUE(update.SetCondition("a=2"));
    ExpectNoStatement(Decided(update, false), "Bad update command");
    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    ExpectNoStatement(Decided(select, false), "Bad select command");
}

TYPED_TEST(AnyCommandTest, ASubclassDescribesItsOwnParameters)
{
    EXPECT_EQ(Decided(OnJobs<TypeParam>(), false).ToStr(), "jobs]own parameters");
    EXPECT_EQ(Decided(TypeParam(), false).ToStr(), "]own parameters");
}

// A command that writes a text into its description, which may be null.
template <class Command>
class Careless : public Command {
  public:
    Careless(const Command& command, const char* text) : Command(command), comment_(text) {}
    void DumpParam(std::stringstream& out) const noexcept override
    {
        Command::DumpParam(out);
        out << "/comment:[" << comment_ << "]";
        Command::DumpParam(out);
    }

  private:
    const char* comment_;
};

TYPED_TEST(AnyCommandTest, ANullTextWrittenByASubclassOnlyTruncatesTheDescription)
{
    const TypeParam command = OnJobs<TypeParam>();
    const std::string plain = command.ToStr();
    EXPECT_EQ(Careless<TypeParam>(command, "x").ToStr(),
              plain + "/comment:[x]" + plain.substr(plain.find(']') + 1));
    EXPECT_EQ(Careless<TypeParam>(command, NullText).ToStr().rfind(plain + "/comment:[", 0), 0U);
}

// While it lives, the program's locale groups digits by three.
class GroupedDigits {
  public:
    GroupedDigits() : before_(std::locale::global({std::locale::classic(), new Grouping}))
    {
        std::ostringstream out;
        out << 1234567;
        EXPECT_EQ(out.str(), "1.234.567");
    }
    GroupedDigits(const GroupedDigits&) = delete;
    GroupedDigits& operator=(const GroupedDigits&) = delete;
    ~GroupedDigits() { std::locale::global(before_); }

  private:
    class Grouping : public std::numpunct<char> {
        char do_thousands_sep() const override { return '.'; }
        std::string do_grouping() const override { return "\3"; }
        std::string do_truename() const override { return "wahr"; }
    };

    std::locale before_;
};

TEST_F(SqliteCommandTest, NumbersAreWrittenPlainlyUnderEveryLocale)
{
    const GroupedDigits grouped;
    EXPECT_EQ(SqliteValue(-1234567).ToFormatedValue(), "-1234567");
    EXPECT_EQ(SqliteValue(4000000000U).ToFormatedValue(), "4000000000");
    EXPECT_EQ(SqliteValue(true).ToFormatedValue(), "1");
    int number = 0;
    EXPECT_FALSE(SqliteValue(4000000000U).GetValue(number));
    ExpectLines({Warn("GetValue<int>", "[4000000000] is not int").In("sqlite_value.cpp")});

    SqliteValueList record = Fields("a", 1234567);
    EXPECT_TRUE(record.AddValue("b", true));
    EXPECT_EQ(record.ToStr(), "a:1234567, b:1");

    auto insert = OnJobs<InsertCommand>();
    insert.SetFieldValues(record);
    EXPECT_EQ(Statement(insert), "INSERT INTO jobs (a,b) VALUES (1234567,1);");
    EXPECT_EQ(insert.ToStr(), "jobs]values:[a=1234567,b=1]");

    auto update = OnJobs<UpdateCommand>();
    update.SetFieldValues(record);
    EXPECT_TRUE(update.SetCondition(SqliteEqual("id", 7654321)));
    EXPECT_EQ(Statement(update), "UPDATE jobs SET a=1234567,b=1 WHERE id=7654321");
    EXPECT_EQ(update.ToStr(), "jobs]condition:[id=7654321]/values:[a=1234567,b=1]");

    auto select = OnJobs<SelectCommand>();
    select.SelectAll();
    EXPECT_TRUE(select.SetCondition(SqliteIn("id", std::vector<SqliteValue>{1234567, UINT_MAX})));
    EXPECT_EQ(select.ToStr(), "jobs]condition:[id IN ( 1234567,4294967295 )]/fields:[all]");
}

}  // namespace
