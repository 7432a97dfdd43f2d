#include <utility>

#include "operations.h"

namespace Shapes {

namespace {

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): its commands
using std::string;

// A program's own subclass, with its own text or with the text of its base.
template <class Command>
class Own : public Command {
  public:
    Own(const Command& base, string text) : Command(base), text_(std::move(text)) {}
    string GetCommand() const override { return text_.empty() ? Command::GetCommand() : text_; }

  private:
    string text_;
};

string TextOf(const SqliteCommand& command)
{
    const bool hasSchema = !command.GetTable().GetSchema().empty();
    return command.GetCommand() + (hasSchema ? " [with a schema]" : "");
}

void NoteRecords(Side& side, const std::vector<SqliteValueList>& records)
{
    for (const SqliteValueList& record : records) side.Note("record", record.ToStr());
}

Operation Insert(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const InsertCommand insert = AnyInsert(draw, AnyTable(draw));
    if (!draw.IsOdd(8)) {
        return {NameOf(db) + "InsertRecord: " + TextOf(insert), [db, insert](Side& side) {
                    side.Note("answer", side.Db(db).InsertRecord(insert));
                }};
    }
    const Own<InsertCommand> own(insert, draw.shape.OneIn(2) ? AnyWrite(draw) : "");
    return {NameOf(db) + "InsertRecord of a subclass: " + TextOf(own),
            [db, own](Side& side) { side.Note("answer", side.Db(db).InsertRecord(own)); }};
}

Operation Update(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const UpdateCommand update = AnyUpdate(draw, AnyTable(draw));
    return {NameOf(db) + "UpdateRecord: " + TextOf(update),
            [db, update](Side& side) { side.Note("answer", side.Db(db).UpdateRecord(update)); }};
}

Operation Delete(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const Table& table = AnyTable(draw);
    const SqliteTableHandler handler = AnyHandler(draw, table);
    const string condition = draw.IsOdd(12) ? "" : AnyCondition(draw, table);
    const string text = "DELETE FROM " + handler.GetName() + " WHERE " + condition +
                        (handler.GetSchema().empty() ? "" : " [with a schema]");
    switch (draw.IsOdd(6) ? draw.shape.Below(2) : 2) {
        case 0:
            return {NameOf(db) + "DeleteAllRecords: " + handler.GetName(),
                    [db, handler](Side& side) {
                        side.Note("answer", side.Db(db).DeleteAllRecords(handler));
                    }};
        case 1:
            return {NameOf(db) + "DoDelete: " + text, [=](Side& side) {
                        side.Note("answer", side.Db(db).DoDelete(handler, condition));
                    }};
        default:
            return {NameOf(db) + "DeleteRecord: " + text, [=](Side& side) {
                        side.Note("answer", side.Db(db).DeleteRecord(condition, handler));
                    }};
    }
}

Operation InsertMany(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const Table& table = AnyTable(draw);
    const SqliteTableHandler handler = AnyHandler(draw, table);
    const bool isReplacing = draw.shape.OneIn(3);
    std::vector<SqliteValueList> records;
    const SqliteValueList first = AnyRecord(draw, table);
    for (std::size_t count = draw.value.Below(5); count > 0; --count)
        records.push_back(draw.value.OneIn(3) ? AnyRecord(draw, table) : first);
    string text = NameOf(db) + "InsertRecords into " + handler.GetName();
    for (const SqliteValueList& record : records) text += " (" + record.ToStr() + ")";
    return {text, [=](Side& side) {
                side.Note("answer", side.Db(db).InsertRecords(handler, records, isReplacing));
            }};
}

Operation SelectMany(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const SelectCommand select = AnySelect(draw, AnyTable(draw));
    return {NameOf(db) + "SelectRecords: " + TextOf(select), [db, select](Side& side) {
                std::vector<SqliteValueList> records;
                side.Note("answer", side.Db(db).SelectRecords(select, records));
                NoteRecords(side, records);
            }};
}

Operation SelectOne(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const SelectCommand select = AnySelect(draw, AnyTable(draw));
    const bool asksWhetherFound = draw.shape.OneIn(2);
    return {NameOf(db) + "SelectRecord: " + TextOf(select), [=](Side& side) {
                SqliteValueList record;
                record.AddValue("old", 1);
                bool found = false;
                side.Note("answer", asksWhetherFound
                                        ? side.Db(db).SelectRecord(select, record, found)
                                        : side.Db(db).SelectRecord(select, record));
                side.Note("found", found);
                side.Note("record", record.ToStr());
            }};
}

Operation SelectRowByRow(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const SelectCommand select = AnySelect(draw, AnyTable(draw));
    return SelectWithCallback(draw, NameOf(db) + "SelectEach: " + TextOf(select),
                              [db, select](Side& side, const TakeRow& take) {
                                  return side.Db(db).SelectEach(select, take);
                              });
}

// What the callback does at one of the rows.
struct InCallback {
    std::size_t row;
    Operation operation;
    bool throws;
};

struct Thrown {};

string Render(const SqliteRow& row)
{
    string text;
    for (std::size_t column = 0; column < row.GetColumnCount(); ++column) {
        const string name = row.GetColumnName(column);
        string value;
        double number = 0;
        text += name + (row.IsNull(name) ? "?" : "=");
        if (row.GetValue(column, value)) {
            text += "'" + value + "', ";
        } else if (row.GetValue(column, number)) {
            text += std::to_string(number) + ", ";
        }
    }
    return text;
}

InCallback AnyInCallback(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    InCallback inside{1 + draw.shape.Below(3), {}, false};
    ++draw.depth;
    switch (draw.shape.Below(draw.depth < 3 ? 10 : 1)) {
        case 1:
        case 2:
        case 3: inside.operation = AnyRecordOperation(draw); break;
        case 4: inside.operation = AnyTextOperation(draw); break;
        case 5:
            inside.operation = {NameOf(db) + "Close", [db](Side& side) {
                                    side.DropTransaction(db);
                                    side.Db(db).Close();
                                }};
            break;
        case 6: inside.throws = true; break;
        case 7: {
            const string statement = AnyNeighbourStatement(draw);
            inside.operation = {"neighbour: " + statement, [statement](Side& side) {
                                    side.Note("neighbour", side.RunAsNeighbour(false, statement));
                                }};
            break;
        }
        default: break;
    }
    --draw.depth;
    return inside;
}

}  // namespace

Operation SelectWithCallback(Draw& draw, const string& text, const StartSelect& start)
{
    constexpr std::size_t Many = 1000;
    const std::size_t stopAt = draw.shape.OneIn(3) ? 1 + draw.shape.Below(4) : Many;
    const InCallback inside = AnyInCallback(draw);
    string whole = text;
    if (inside.throws) whole += " { throws }";
    if (inside.operation.run) whole += " { " + inside.operation.text + " }";
    return {whole, [=](Side& side) {
                std::size_t rows = 0;
                const TakeRow take = [&](const SqliteRow& row) {
                    side.Note("row", Render(row));
                    if (++rows == inside.row && inside.throws) throw Thrown();
                    if (rows == inside.row && inside.operation.run) inside.operation.run(side);
                    return rows != stopAt;
                };
                try {
                    side.Note("answer", start(side, take));
                } catch (const Thrown&) {
                    side.Note("answer", "thrown");
                }
            }};
}

Operation AnyRecordOperation(Draw& draw)
{
    const bool isInCallback = draw.depth > 0;
    switch (isInCallback && !draw.shape.OneIn(4) ? 6 + draw.shape.Below(4) : draw.shape.Below(10)) {
        case 0:
        case 1: return Insert(draw);
        case 2:
        case 3: return Update(draw);
        case 4: return Delete(draw);
        case 5: return InsertMany(draw);
        case 6: return SelectOne(draw);
        case 7: return SelectRowByRow(draw);
        default: return SelectMany(draw);
    }
}

}  // namespace Shapes
