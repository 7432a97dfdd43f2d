#include <orvadrcore/sqlite_value.h>

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "show.h"

namespace {

using OrvaDRCore::SqliteRecord;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

class Node : public SqliteRecord {
  public:
    SqliteValueList BuildRecord(const std::vector<std::string>& fields) const override
    {
        SqliteValueList record;
        for (const std::string& field : fields) record.AddValue(field, "of the node");
        return record;
    }
    std::vector<std::string> GetRecordFields() const override { return {"id", "name"}; }
};

template <class T>
T Read(const SqliteValue& value)
{
    T out{};
    Show{"  read", value.GetValue(out), out};
    return out;
}

template <class T>
void ReadField(const SqliteValueList& record, const std::string& field)
{
    T out{};
    const bool isRead = record.GetValue(field, out);
    Show{"  field " + field, isRead, out};
}

template <class Value>
void ShowConstructors()
{
    const Value number(-1);
    const Value natural(4000000000U);
    const Value truth(true);
    const Value text(std::string("it's"));
    const Value pointer("it's");
    Value moved(Value("moved"));
    Value source("source");
    const Value taken(std::move(source));
    for (const SqliteValue* value :
         {static_cast<const SqliteValue*>(&number), static_cast<const SqliteValue*>(&natural),
          static_cast<const SqliteValue*>(&truth), static_cast<const SqliteValue*>(&text),
          static_cast<const SqliteValue*>(&pointer), static_cast<const SqliteValue*>(&moved),
          static_cast<const SqliteValue*>(&taken)}) {
        Show{"value", value->IsValid(), value->IsNull(), value->ToFormatedValue()};
    }
    SqliteValue assigned(0);
    assigned = number;
    Show{"assigned", assigned.ToFormatedValue(), SqliteValue().IsValid()};
}

void ShowMakers()
{
    const std::string bytes("a'\0b", 4);
    for (const SqliteValue& value :
         {SqliteValue::Text(bytes), SqliteValue::Text("it's"),
          SqliteValue::Integer(-9000000000000000000), SqliteValue::Real(0.1),
          SqliteValue::Blob(bytes), SqliteValue::Null()}) {
        Show{"maker", value.IsValid(), value.IsNull(), value.ToFormatedValue()};
    }
    Show{"escaped", SqliteValue::EscapeText("it's")};
    Read<std::string>("text");
    Read<int>(-7);
    Read<unsigned int>(7U);
    Read<std::int64_t>(SqliteValue::Integer(1LL << 40));
    Read<double>(SqliteValue::Real(0.5));
    Read<bool>(true);
}

template <class Record>
void ShowRecord()
{
    Record record;
    const SqliteValue name("n1");
    Show{"added", record.AddValue("name", name), record.AddValue("id", SqliteValue(3)),
         record.AddValue("", name)};
    record.AddValue("big", SqliteValue::Integer(5000000000));
    record.AddValue("real", SqliteValue::Real(2.5));
    record.AddValue("on", true);
    ReadField<std::string>(record, "name");
    ReadField<int>(record, "id");
    ReadField<unsigned int>(record, "id");
    ReadField<std::int64_t>(record, "big");
    ReadField<double>(record, "real");
    ReadField<bool>(record, "on");
    Show{"record",
         record.HasField("id"),
         record.HasField("none"),
         record.GetValues().size(),
         record.GetValue("none").IsValid(),
         record.GetValue("id").ToFormatedValue()};

    Record copy(record);
    Record other;
    other.AddValue("added", 1);
    copy += other;
    other = copy;
    Record moved(std::move(copy));
    copy = std::move(other);
    Show{"copied", record.ToStr()};
    Show{"moved", moved.ToStr()};
    Show{"assigned", copy.ToStr()};
}

}  // namespace

void CallValues()
{
    ShowConstructors<SqliteValue>();
    ShowConstructors<Derived<SqliteValue>>();
    ShowMakers();
    ShowRecord<SqliteValueList>();
    ShowRecord<Derived<SqliteValueList>>();
    const std::unique_ptr<SqliteValueList> owned = std::make_unique<SqliteValueList>();
    const std::unique_ptr<SqliteRecord> node = std::make_unique<Node>();
    Show{"program's record", node->SqliteRecord::LoadRecord(*owned),
         node->ToSqliteRecord().ToStr()};
}
