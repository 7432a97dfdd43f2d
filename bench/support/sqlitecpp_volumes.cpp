#if BENCH_HAS_SQLITECPP

#include <SQLiteCpp/Database.h>
#include <SQLiteCpp/Statement.h>
#include <SQLiteCpp/Transaction.h>

#include "support/volumes.h"

namespace Bench {

namespace {

// As its documentation recommends: prepares the statement once and resets it.
class Writer : public VolumeWriter {
  public:
    explicit Writer(const std::string& path)
        : db_(path, SQLite::OPEN_READWRITE | SQLite::OPEN_CREATE),
          created_(
              db_.exec(std::string("CREATE TABLE IF NOT EXISTS volumes (") + VolumesSchema + ")"))
    {
    }

    void Insert(const std::vector<Volume>& volumes) override
    {
        SQLite::Transaction transaction(db_);
        for (const Volume& volume : volumes) {
            insert_.reset();
            insert_.bindNoCopy(1, volume.name);
            insert_.bind(2, volume.bytes);
            insert_.bind(3, volume.load);
            insert_.bindNoCopy(4, volume.key.data(), static_cast<int>(volume.key.size()));
            if (volume.note) {
                insert_.bindNoCopy(5, *volume.note);
            } else {
                insert_.bind(5);  // NULL
            }
            insert_.exec();
        }
        transaction.commit();
    }

  private:
    SQLite::Database db_;
    int created_;  // declared before the statement, which needs the table
    SQLite::Statement insert_{db_, InsertVolume};
};

}  // namespace

std::unique_ptr<VolumeWriter> MakeSqliteCppWriter(const std::string& path)
{
    return std::make_unique<Writer>(path);
}

}  // namespace Bench

#endif
