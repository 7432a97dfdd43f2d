// An SQLite file system (VFS) with faults: it passes everything on to SQLite's own, unless Strike()
// has a fault for it. It is SQLite's default while the object lives.
#ifndef ORVADRCORE_TESTS_FAULTY_VFS_H
#define ORVADRCORE_TESTS_FAULTY_VFS_H

#include <sqlite3.h>

class FaultyVfs {
  public:
    FaultyVfs();
    FaultyVfs(const FaultyVfs&) = delete;
    FaultyVfs& operator=(const FaultyVfs&) = delete;
    ~FaultyVfs();

  private:
    sqlite3_vfs vfs_;
};

#endif
