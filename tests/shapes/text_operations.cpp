#include "operations.h"

namespace Shapes {

namespace {

using OrvaDRCore::SqliteValueList;
using std::string;

Operation Exec(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string text = AnyWrite(draw);
    const bool isOneAttempt = draw.shape.OneIn(5);
    return {NameOf(db) + (isOneAttempt ? "DoExecSqliteCommand: " : "Exec: ") + text,
            [=](Side& side) {
                side.Note("answer", isOneAttempt ? side.Db(db).DoExecSqliteCommand(text)
                                                 : side.Db(db).Exec(text));
            }};
}

Operation SelectOne(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string text = draw.shape.OneIn(6) ? AnyWrite(draw) : AnyQuery(draw);
    const bool isOneAttempt = draw.shape.OneIn(5);
    return {NameOf(db) + (isOneAttempt ? "DoSelectSqliteRecord: " : "SelectByCommand, one row: ") +
                text,
            [=](Side& side) {
                SqliteValueList record;
                side.Note("answer", isOneAttempt ? side.Db(db).DoSelectSqliteRecord(text, record)
                                                 : side.Db(db).SelectByCommand(text, record));
                side.Note("record", record.ToStr());
            }};
}

Operation SelectMany(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string text = draw.shape.OneIn(6) ? AnyWrite(draw) : AnyQuery(draw);
    const bool isOneAttempt = draw.shape.OneIn(5);
    return {NameOf(db) + (isOneAttempt ? "DoSelectSqliteRecords: " : "SelectByCommand: ") + text,
            [=](Side& side) {
                std::vector<SqliteValueList> records;
                side.Note("answer", isOneAttempt ? side.Db(db).DoSelectSqliteRecords(text, records)
                                                 : side.Db(db).SelectByCommand(text, records));
                for (const SqliteValueList& record : records) side.Note("record", record.ToStr());
            }};
}

Operation SelectRowByRow(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string text = draw.shape.OneIn(6) ? AnyWrite(draw) : AnyQuery(draw);
    return SelectWithCallback(draw, NameOf(db) + "SelectEachByCommand: " + text,
                              [db, text](Side& side, const TakeRow& take) {
                                  return side.Db(db).SelectEachByCommand(text, take);
                              });
}

}  // namespace

Operation AnyOrderedOperation(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string condition = CommonCondition(draw, "a");
    if (draw.shape.OneIn(2)) {
        const string text = "DELETE FROM v WHERE " + condition;
        return {NameOf(db) + "Exec: " + text,
                [=](Side& side) { side.Note("answer", side.Db(db).Exec(text)); }};
    }
    const string text = "SELECT b,id FROM t WHERE " + condition;
    return {NameOf(db) + "SelectByCommand: " + text, [=](Side& side) {
                std::vector<SqliteValueList> records;
                side.Note("answer", side.Db(db).SelectByCommand(text, records));
                for (const SqliteValueList& record : records) side.Note("record", record.ToStr());
            }};
}

Operation AnyTextOperation(Draw& draw)
{
    switch (draw.shape.Below(5)) {
        case 0: return SelectOne(draw);
        case 1: return SelectMany(draw);
        case 2: return SelectRowByRow(draw);
        default: return Exec(draw);
    }
}

}  // namespace Shapes
