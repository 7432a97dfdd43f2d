#if BENCH_HAS_SOCI

// Its header includes SQLite's inside a namespace, so nothing here may include sqlite3.h.
#include <soci/soci.h>
#include <soci/sqlite3/soci-sqlite3.h>

#include "support/volumes.h"

namespace Bench {

namespace {

// As its documentation recommends: prepares the statement once, with bound variables.
class Writer : public VolumeWriter {
  public:
    explicit Writer(const std::string& path)
        : session_(soci::sqlite3, "db=" + path), created_(Create())
    {
    }

    void Insert(const std::vector<Volume>& volumes) override
    {
        soci::transaction transaction(session_);
        for (const Volume& volume : volumes) {
            bound_ = volume;
            bytes_ = volume.bytes;
            key_.write(0, volume.key.data(), volume.key.size());  // all have the same length
            note_ = volume.note.value_or("");
            hasNote_ = volume.note ? soci::i_ok : soci::i_null;
            insert_.execute(true);
        }
        transaction.commit();
    }

  private:
    bool Create()
    {
        session_ << std::string("CREATE TABLE IF NOT EXISTS volumes (") + VolumesSchema + ")";
        return true;
    }

    soci::session session_;
    bool created_;  // declared before the statement, which needs the table
    Volume bound_;
    long long bytes_ = 0;
    soci::blob key_{session_};
    std::string note_;
    soci::indicator hasNote_ = soci::i_ok;
    soci::statement insert_ = (session_.prepare << "INSERT INTO volumes (name,bytes,load,key,note) "
                                                   "VALUES (:name,:bytes,:load,:key,:note)",
                               soci::use(bound_.name), soci::use(bytes_), soci::use(bound_.load),
                               soci::use(key_), soci::use(note_, hasNote_));
};

}  // namespace

std::unique_ptr<VolumeWriter> MakeSociWriter(const std::string& path)
{
    return std::make_unique<Writer>(path);
}

}  // namespace Bench

#endif
