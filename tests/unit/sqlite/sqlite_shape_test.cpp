// Which statements have a shape, and which run as they stand.
#include "sqlite/sqlite_shape.h"

#include <gtest/gtest.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>

#include <memory>

#include "sqlite/sqlite_statement.h"

namespace {

using OrvaDRCore::Shape;

// The shape and its literals: "DELETE FROM t WHERE a=? <5>". Empty without one.
std::string ShapeOf(const std::string& statement)
{
    Shape shape;
    if (!OrvaDRCore::ReadShape(statement, shape)) return {};
    std::string text = shape.text;
    for (const Shape::Literal& literal : shape.literals) {
        const std::int64_t* const number = std::get_if<std::int64_t>(&literal);
        text += number != nullptr ? " <" + std::to_string(*number) + ">"
                                  : " <'" + std::string(std::get<std::string_view>(literal)) + "'>";
    }
    return text;
}

std::string ShapeOfCondition(const std::string& condition)
{
    const std::string begin = "DELETE FROM t WHERE ";
    const std::string text = ShapeOf(begin + condition);
    return text.empty() ? "" : text.substr(begin.size());
}

struct Case {
    std::string statement;
    std::string shape;
};

struct Refused {
    const char* why;
    std::string text;
};

void ExpectShapes(const std::vector<Case>& cases, std::string (*shapeOf)(const std::string&))
{
    for (const auto& [statement, shape] : cases) EXPECT_EQ(shapeOf(statement), shape) << statement;
}

void ExpectNone(const std::vector<Refused>& cases, std::string (*shapeOf)(const std::string&))
{
    for (const auto& [why, text] : cases) EXPECT_EQ(shapeOf(text), "") << why << ": " << text;
}

std::string Repeat(const std::string& text, int count)
{
    std::string repeated;
    while (count-- > 0) repeated += text;
    return repeated;
}

TEST(SqliteShapeTest, StatementsOfTheBuildersHaveAShape)
{
    using namespace OrvaDRCore;
    const SqliteTableHandler jobs("jobs", "");
    const std::vector<SqliteValue> numbers = {2};
    const std::vector<SqliteValue> names = {"x"};
    InsertCommand insert;
    insert.SetTable(jobs);
    insert.AddFieldValue("id", 7);
    insert.AddFieldValue("name", "x");
    insert.AddFieldValue("new", true);
    insert.AddFieldValue("size", SqliteValue::Null());
    UpdateCommand update;
    update.SetTable(jobs);
    update.AddFieldValue("name", "y");
    update.SetCondition(
        SqliteAnd(SqliteEqual("id", 7).GetCondition(), SqliteIn("size", numbers).GetCondition()));
    SelectCommand all;
    all.SetTable(jobs);
    all.SelectAll();
    all.SetCondition(SqliteNotIn("name", names));
    SelectCommand some;
    some.SetTable(jobs);
    some.AddField("id");
    some.AddField("name");
    some.SetCondition(SqliteOr(SqliteGreaterEqual("size", 5).GetCondition(),
                               SqliteEqual("size", SqliteValue::Null()).GetCondition()));
    ExpectShapes(
        {{insert.GetCommand(),
          "INSERT INTO jobs (id,name,new,size) VALUES (?,?,?,NULL) <7> <'x'> <1>"},
         {update.GetCommand(),
          "UPDATE jobs SET name=? WHERE (id=?) AND (size IN ( ? )) <'y'> <7> <2>"},
         {all.GetCommand(), "SELECT  * FROM jobs WHERE name NOT IN ( ? ) <'x'>"},
         {some.GetCommand(), "SELECT id,name FROM jobs WHERE (size>=?) OR (size IS NULL) <5>"}},
        ShapeOf);
    insert.SetReplacable(true);
    EXPECT_EQ(ShapeOf(insert.GetCommand()).substr(0, 27), "INSERT OR REPLACE INTO jobs");
}

TEST(SqliteShapeTest, StatementsByHandMayHaveMoreBlanks)
{
    ExpectShapes({{"INSERT  INTO t ( a , b )  VALUES ( 5 , 'x' ) ;",
                   "INSERT  INTO t ( a , b )  VALUES ( ? , ? )  <5> <'x'>"},
                  {"INSERT INTO t(a) VALUES(5)", "INSERT INTO t(a) VALUES(?) <5>"},
                  {"UPDATE t SET a = 5 , b = NULL WHERE c = 6",
                   "UPDATE t SET a = ? , b = NULL WHERE c = ? <5> <6>"},
                  {"SELECT a , b FROM t WHERE a = 5", "SELECT a , b FROM t WHERE a = ? <5>"},
                  {"DELETE FROM t WHERE a = 5 ;", "DELETE FROM t WHERE a = ?  <5>"}},
                 ShapeOf);
}

TEST(SqliteShapeTest, ConditionsAreTermsWithAndOrAndParentheses)
{
    ExpectShapes(
        {{"a=5", "a=? <5>"},
         {"a==5", "a==? <5>"},
         {"a!=5", "a!=? <5>"},
         {"a<>5", "a<>? <5>"},
         {"a<5", "a<? <5>"},
         {"a<=5", "a<=? <5>"},
         {"a>5", "a>? <5>"},
         {"a>=5", "a>=? <5>"},
         {"a=-5", "a=? <-5>"},
         {"a=''", "a=? <''>"},
         {"a='--/*?;'", "a=? <'--/*?;'>"},
         {"a='\"\xff'", "a=? <'\"\xff'>"},
         {"a=5 AND b=6 OR c=7", "a=? AND b=? OR c=? <5> <6> <7>"},
         {"a=5 AND(b=6)", "a=? AND(b=?) <5> <6>"},
         {"((a=5) OR (b='x')) AND (c IS NOT NULL)",
          "((a=?) OR (b=?)) AND (c IS NOT NULL) <5> <'x'>"},
         {"a IN (5)", "a IN (?) <5>"},
         {"a NOT IN ( 'x' )", "a NOT IN ( ? ) <'x'>"},
         {"a=5 AND b='5'", "a=? AND b=? <5> <'5'>"},
         {"a=5 AND a=7", "a=? AND a=? <5> <7>"},
         {"a=5 OR a>7 OR ab=9 OR a IS NULL", "a=? OR a>? OR ab=? OR a IS NULL <5> <7> <9>"},
         {"a=9007199254740992", "a=? <9007199254740992>"}},
        ShapeOfCondition);
}

TEST(SqliteShapeTest, LiteralsThatThePlannerTreatsApartStay)
{
    ExpectShapes({{"a=1 AND b=5", "a=1 AND b=? <5>"},
                  {"a=0 AND b=5", "a=0 AND b=? <5>"},
                  {"a=-1 OR a<-1 OR b=5", "a=-1 OR a<-1 OR b=? <5>"},
                  {"a=1", ""},
                  {"a IN (1)", ""},
                  {"a IN (1) AND b=5", ""}},
                 ShapeOfCondition);
}

TEST(SqliteShapeTest, IntegersOfAnInsertMayHaveEighteenDigits)
{
    ExpectShapes({{"INSERT INTO t (a) VALUES (999999999999999999)",
                   "INSERT INTO t (a) VALUES (?) <999999999999999999>"},
                  {"INSERT INTO t (a) VALUES (-999999999999999999)",
                   "INSERT INTO t (a) VALUES (?) <-999999999999999999>"},
                  {"INSERT INTO t (a) VALUES (1000000000000000000)", ""},
                  {"INSERT INTO t (a,b) VALUES (7,7)", "INSERT INTO t (a,b) VALUES (?,?) <7> <7>"}},
                 ShapeOf);
}

TEST(SqliteShapeTest, OtherStatementsHaveNoShape)
{
    ExpectNone({{"empty", ""},
                {"no literal", "SELECT a FROM t"},
                {"no literal but NULL", "INSERT INTO t (a) VALUES (NULL)"},
                {"a transaction", "BEGIN"},
                {"a word that only begins so", "SELECTED a FROM t WHERE a=5"},
                {"lower case", "select a from t where a=5"},
                {"a blank before", " SELECT a FROM t WHERE a=5"},
                {"a line break", "SELECT a\nFROM t WHERE a=5"},
                {"two statements", "DELETE FROM t WHERE a=5;DELETE FROM u"},
                {"something after the end", "DELETE FROM t WHERE a=5; "},
                {"two ends", "DELETE FROM t WHERE a=5;;"},
                {"INSERT without names", "INSERT INTO t VALUES (5)"},
                {"INSERT of two rows", "INSERT INTO t (a) VALUES (5),(6)"},
                {"INSERT OR IGNORE", "INSERT OR IGNORE INTO t (a) VALUES (5)"},
                {"INSERT without an end", "INSERT INTO t (a) VALUES (5"},
                {"INSERT of nothing", "INSERT INTO t () VALUES ()"},
                {"an expression", "INSERT INTO t (a) VALUES (5+1)"},
                {"a function", "INSERT INTO t (a) VALUES (abs(5))"},
                {"RETURNING", "INSERT INTO t (a) VALUES (5) RETURNING a"},
                {"UPDATE without a condition", "UPDATE t SET a=5"},
                {"UPDATE OR IGNORE", "UPDATE OR IGNORE t SET a=5 WHERE b=6"},
                {"UPDATE with an expression", "UPDATE t SET a=a+5 WHERE b=6"},
                {"SELECT of an expression", "SELECT count(*) FROM t WHERE a=5"},
                {"SELECT with AS", "SELECT a AS b FROM t WHERE a=5"},
                {"DISTINCT", "SELECT DISTINCT a FROM t WHERE a=5"},
                {"ORDER BY", "SELECT a FROM t WHERE a=5 ORDER BY a"},
                {"GROUP BY", "SELECT a FROM t WHERE a=5 GROUP BY a"},
                {"LIMIT", "SELECT a FROM t WHERE a=5 LIMIT 7"},
                {"two tables", "SELECT a FROM t,u WHERE a=5"},
                {"a table of another database", "SELECT a FROM main.t WHERE a=5"},
                {"a table with quotes", "SELECT a FROM \"t\" WHERE a=5"},
                {"a table that begins with a digit", "SELECT a FROM 1t WHERE a=5"},
                {"a schema table", "DELETE FROM sqlite_master WHERE rowid=5"},
                {"a schema table in upper case", "DELETE FROM SQLITE_SCHEMA WHERE rowid=5"},
                {"a pragma", "SELECT name FROM pragma_table_info WHERE arg='t'"}},
               ShapeOf);
}

TEST(SqliteShapeTest, OtherConditionsHaveNoShape)
{
    ExpectNone({{"nothing", ""},
                {"a parameter of the caller", "a=?"},
                {"a parameter beside a literal", "a=5 AND b=?"},
                {"a named parameter", "a=:a AND b=5"},
                {"a comment", "a=5 --"},
                {"a comment in the middle", "a=/**/5"},
                {"a quote in a text", "a='it''s'"},
                {"a text without an end", "a='x"},
                {"a text with a zero byte", std::string("a='x\0y'", 7)},
                {"a zero byte after the condition", std::string("a=5\0", 4)},
                {"a text in double quotes", "a=\"x\""},
                {"a blob", "a=x'41'"},
                {"a word right after a number", "a=5AND b=6"},
                {"a word right after a text", "a='x'AND b=6"},
                {"a real number", "a=5.0"},
                {"a real number with an exponent", "a=5e3"},
                {"a hexadecimal number", "a=0x5"},
                {"a number with a plus sign", "a=+5"},
                {"a minus sign apart", "a=- 5"},
                {"two minus signs", "a=--5"},
                {"a minus sign alone", "a=-"},
                {"a number that a double rounds", "a=9007199254740993"},
                {"a negative number that a double rounds", "a=-9007199254740993"},
                {"NULL", "a=NULL"},
                {"a name", "a=b"},
                {"a number on the left", "5=a"},
                {"an unknown operator", "a!5"},
                {"another unknown operator", "a=>5"},
                {"an expression", "a=5+6"},
                {"a name with quotes", "\"a\"=5"},
                {"a name with a table", "t.a=5"},
                {"a function", "abs(a)=5"},
                {"NOT before a term", "NOT a=5"},
                {"LIKE", "a LIKE 'x%'"},
                {"BETWEEN", "a BETWEEN 5 AND 6"},
                {"IS with a value", "a IS 5"},
                {"a collation", "a='x' COLLATE NOCASE"},
                {"an empty list", "a IN ()"},
                {"NULL in a list", "a IN (5,NULL)"},
                {"a select in a list", "a IN (SELECT 5)"},
                {"a list without an end", "a IN (5"},
                {"NOT without IN", "a NOT 5"},
                {"a parenthesis too few", "(a=5"},
                {"a parenthesis too many", "a=5)"},
                {"AND without a term", "a=5 AND"},
                {"an unknown word between terms", "a=5 XOR b=6"},
                {"a value alone", "5"},
                {"a name alone", "a"},
                {"the same number twice", "a=5 OR a<5"},
                {"the same number written in two ways", "a=5 OR a<05"},
                {"the same text twice", "a='x' OR b='x'"},
                {"two numbers in a list", "a IN (5,7)"},
                {"two texts in a list", "a NOT IN ('x','y')"},
                {"one of two numbers", "a=5 OR a=7"},
                {"one of two numbers, written in other ways", "(a==5) OR b=6 OR (A IN (7))"},
                {"one of two numbers of which one stays", "a=1 OR a=7"}},
               ShapeOfCondition);
}

TEST(SqliteShapeTest, LongStatementsHaveNoShape)
{
    const auto insert = [](int values) {
        return "INSERT INTO t (a" + Repeat(",a", values - 1) + ") VALUES (5" +
               Repeat(",5", values - 1) + ")";
    };
    EXPECT_NE(ShapeOf(insert(256)), "");
    EXPECT_EQ(ShapeOf(insert(257)), "");

    EXPECT_NE(ShapeOfCondition("a=5" + Repeat(" AND b=1", 15)), "");
    EXPECT_EQ(ShapeOfCondition("a=5" + Repeat(" AND b=1", 16)), "");
    EXPECT_NE(ShapeOfCondition(Repeat("(", 40) + "a=5" + Repeat(")", 40)), "");
    EXPECT_EQ(ShapeOfCondition(Repeat("(", 41) + "a=5" + Repeat(")", 41)), "");

    const std::string text = "DELETE FROM t WHERE a='";
    EXPECT_NE(ShapeOf(text + std::string(65'536 - text.size() - 1, 'x') + "'"), "");
    EXPECT_EQ(ShapeOf(text + std::string(65'536 - text.size(), 'x') + "'"), "");
}

TEST(SqliteShapeTest, TheLiteralsOfASetMayRepeatInTheCondition)
{
    EXPECT_EQ(ShapeOf("UPDATE t SET a=5,b=5 WHERE a=5"),
              "UPDATE t SET a=?,b=? WHERE a=? <5> <5> <5>");
}

// ---------------------------------------------------------------------------------------- binding

TEST(SqliteShapeTest, BoundLiteralsHaveTheTypesThatTheyHadInTheText)
{
    sqlite3* handle = nullptr;
    ASSERT_EQ(sqlite3_open(":memory:", &handle), SQLITE_OK);
    const std::unique_ptr<sqlite3, int (*)(sqlite3*)> closed(handle, sqlite3_close);
    sqlite3_stmt* made = nullptr;
    const char* const sql = "SELECT typeof(?1)||typeof(?2)||typeof(?3), ?1, ?2";
    ASSERT_EQ(sqlite3_prepare_v2(handle, sql, -1, &made, nullptr), SQLITE_OK);
    const OrvaDRCore::Statement statement(made);
    const std::string text = "UPDATE t SET a=-7,b='it' WHERE c=''";
    Shape shape;
    ASSERT_TRUE(OrvaDRCore::ReadShape(text, shape));
    EXPECT_EQ(OrvaDRCore::BindLiterals(made, shape, SQLITE_STATIC), SQLITE_OK);
    ASSERT_EQ(sqlite3_step(made), SQLITE_ROW);
    EXPECT_STREQ(reinterpret_cast<const char*>(sqlite3_column_text(made, 0)), "integertexttext");
    EXPECT_EQ(sqlite3_column_int64(made, 1), -7);
    EXPECT_STREQ(reinterpret_cast<const char*>(sqlite3_column_text(made, 2)), "it");
    EXPECT_EQ(OrvaDRCore::BindLiterals(made, shape, SQLITE_STATIC), SQLITE_MISUSE);  // it runs
}

}  // namespace
