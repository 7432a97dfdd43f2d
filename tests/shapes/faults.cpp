#include "faults.h"

#include "support/fakes/real_function.h"

namespace Shapes {

namespace {

constexpr std::size_t CallsPerFault = 1000;

const unsigned char* RealColumnText(sqlite3_stmt* statement, int column)
{
    return RealFunction<decltype(sqlite3_column_text)>("sqlite3_column_text")(statement, column);
}

// Reads one row of the file and stays there, until the connection is closed.
void KeepLock(sqlite3* handle)
{
    sqlite3_stmt* statement = nullptr;
    if (RealPrepare(handle, "SELECT 1 FROM sqlite_master", &statement) == SQLITE_OK)
        RealStep(statement);
}

}  // namespace

PlantedFault::PlantedFault(Fault fault) : fault_(fault)
{
    if (fault_ == Fault::None) return;
    if (fault_ != Fault::WrongText) {
        faults_.step = [this](sqlite3_stmt* statement) { return Step(statement); };
        return;
    }
    faults_.columnText = [this](sqlite3_stmt* statement, int column) {
        static const unsigned char other[] = "other";
        return IsDue() ? other : RealColumnText(statement, column);
    };
}

bool PlantedFault::IsDue()
{
    return isActive_ && ++calls_ % CallsPerFault == 0;
}

int PlantedFault::Step(sqlite3_stmt* statement)
{
    const bool isDue = IsDue();
    if (isDue && fault_ == Fault::FailedAttempt) return SQLITE_BUSY;
    if (isDue && fault_ == Fault::KeptLock) KeepLock(sqlite3_db_handle(statement));
    const bool writes = sqlite3_stmt_readonly(statement) == 0;
    if (isDue && fault_ == Fault::LostWrite && writes) return SQLITE_DONE;
    const int code = RealStep(statement);
    if (isDue && fault_ == Fault::LostRow && code == SQLITE_ROW) return RealStep(statement);
    return code;
}

}  // namespace Shapes
