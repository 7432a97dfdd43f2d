// A table with columns of every kind, and writers of it in other libraries.
#ifndef ORVADRCORE_BENCH_SUPPORT_VOLUMES_H
#define ORVADRCORE_BENCH_SUPPORT_VOLUMES_H

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace Bench {

inline constexpr const char* VolumesTable = "volumes";
inline constexpr const char* VolumesSchema =
    "id INTEGER PRIMARY KEY, name TEXT, bytes INTEGER, load REAL, key BLOB, note TEXT";
inline constexpr const char* InsertVolume =
    "INSERT INTO volumes (name,bytes,load,key,note) VALUES (?,?,?,?,?)";

struct Volume {
    std::string name;
    std::int64_t bytes = 0;
    double load = 0;
    std::string key;                  // any bytes
    std::optional<std::string> note;  // or NULL
};

// Inserts volumes in one transaction. SQLite assigns their ids.
class VolumeWriter {
  public:
    VolumeWriter() = default;
    VolumeWriter(const VolumeWriter&) = delete;
    VolumeWriter& operator=(const VolumeWriter&) = delete;
    virtual ~VolumeWriter() = default;
    virtual void Insert(const std::vector<Volume>& volumes) = 0;
};

// Each library has its own source: see engines.h.
std::unique_ptr<VolumeWriter> MakeSqliteCppWriter(const std::string& path);
std::unique_ptr<VolumeWriter> MakeSociWriter(const std::string& path);

}  // namespace Bench

#endif
