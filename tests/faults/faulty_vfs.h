// SQLite's way to its files, with faults: a file system of SQLite's that passes everything on to the
// system's own, unless Strike() has a fault for it. It is the default one as long as the object
// lives.
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
    sqlite3_vfs vfs;
};

#endif
