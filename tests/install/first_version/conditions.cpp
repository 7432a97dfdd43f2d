#include <orvadrcore/sqlite_condition.h>

#include <vector>

#include "show.h"

namespace {

using OrvaDRCore::SqliteCondition;
using OrvaDRCore::SqliteInFamily;
using OrvaDRCore::SqliteValue;

// Through the virtual table.
void ShowCondition(const std::string& name, const SqliteCondition& condition)
{
    Show{name, condition.IsValid(), condition.GetCondition()};
}

template <class Condition, class Operand>
void ShowConstructors(const std::string& name, const std::string& left, const Operand& right)
{
    ShowCondition(name, Condition());
    ShowCondition(name, Condition(left, right));
    Condition condition;
    Show{name, condition.SetValue(left, right), condition.IsValid(), condition.GetCondition()};
}

template <class Condition, class Operand>
void ShowClass(const std::string& name, const std::string& left, const Operand& right)
{
    ShowConstructors<Condition>(name, left, right);
    ShowConstructors<Derived<Condition>>(name, left, right);
}

template <class Family>
void ShowFamily()
{
    const std::vector<SqliteValue> values{1, "two"};
    ShowCondition("family", Family("NOT IN"));
    ShowCondition("family", Family("IN", "id", values));
    ShowCondition("family", Family("IN", "id", std::string("SELECT 1")));
    ShowCondition("family", Family("unknown"));
}

}  // namespace

void CallConditions()
{
    const std::vector<SqliteValue> list{1, "two", SqliteValue::Text("it's")};
    const SqliteValue value(3);
    const std::string text("50%");
    ShowCondition("condition", SqliteCondition());
    ShowCondition("condition", SqliteCondition("a=b"));
    ShowCondition("condition", Derived<SqliteCondition>("a=b"));
    Show{"condition", SqliteCondition("a=b").IsValid()};
    ShowClass<OrvaDRCore::SqliteEqual>("equal", "id", value);
    ShowClass<OrvaDRCore::SqliteNotEqual>("not equal", "id", value);
    ShowClass<OrvaDRCore::SqliteLess>("less", "id", value);
    ShowClass<OrvaDRCore::SqliteLessEqual>("less or equal", "id", value);
    ShowClass<OrvaDRCore::SqliteGreater>("greater", "id", value);
    ShowClass<OrvaDRCore::SqliteGreaterEqual>("greater or equal", "id", value);
    ShowClass<OrvaDRCore::SqliteContains>("contains", "name", text);
    ShowClass<OrvaDRCore::SqliteBeginsWith>("begins with", "name", text);
    ShowClass<OrvaDRCore::SqliteAnd>("and", "a=1", std::string("b=2"));
    ShowClass<OrvaDRCore::SqliteOr>("or", "a=1", std::string("b=2"));
    ShowFamily<SqliteInFamily>();
    ShowFamily<Derived<SqliteInFamily>>();
    ShowClass<OrvaDRCore::SqliteIn>("in", "id", list);
    ShowClass<OrvaDRCore::SqliteIn>("in", "id", std::string("SELECT 1"));
    ShowClass<OrvaDRCore::SqliteNotIn>("not in", "id", list);
    ShowClass<OrvaDRCore::SqliteNotIn>("not in", "id", std::string("SELECT 1"));
}
