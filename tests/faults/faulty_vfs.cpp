#include "faulty_vfs.h"

#include "fault.h"

namespace {

sqlite3_vfs* theirs = nullptr;

// SQLite's view of a file. The real file follows it in the same memory.
struct File {
    sqlite3_file base;
    alignas(sqlite3_int64) char real[1];  // as SQLite aligns it
};

sqlite3_file* RealOf(sqlite3_file* file)
{
    return reinterpret_cast<sqlite3_file*>(reinterpret_cast<File*>(file)->real);
}

// Fails with a fault's error, or calls the real file.
template <class... Parameters, class... Arguments>
int Answer(Call call, int (*sqlite3_io_methods::*method)(sqlite3_file*, Parameters...),
           sqlite3_file* file, Arguments... arguments)
{
    const int error = Strike(call);
    sqlite3_file* real = RealOf(file);
    return error != 0 ? error : (real->pMethods->*method)(real, arguments...);
}

int Close(sqlite3_file* file)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xClose(real);
}

int Read(sqlite3_file* file, void* buffer, int size, sqlite3_int64 offset)
{
    return Answer(Call::DbRead, &sqlite3_io_methods::xRead, file, buffer, size, offset);
}

// A failed write has written a part.
int Write(sqlite3_file* file, const void* buffer, int size, sqlite3_int64 offset)
{
    const int error = Strike(Call::DbWrite);
    sqlite3_file* real = RealOf(file);
    const int result = real->pMethods->xWrite(real, buffer, error != 0 ? size / 2 : size, offset);
    return error != 0 ? error : result;
}

int Truncate(sqlite3_file* file, sqlite3_int64 size)
{
    return Answer(Call::DbTruncate, &sqlite3_io_methods::xTruncate, file, size);
}

// Syncs nothing: no trial is about power cuts, and disks are slow.
int Sync(sqlite3_file* /*file*/, int /*flags*/)
{
    return Strike(Call::DbSync);
}

int FileSize(sqlite3_file* file, sqlite3_int64* size)
{
    return Answer(Call::DbFileSize, &sqlite3_io_methods::xFileSize, file, size);
}

int Lock(sqlite3_file* file, int lock)
{
    return Answer(Call::DbLock, &sqlite3_io_methods::xLock, file, lock);
}

int Unlock(sqlite3_file* file, int lock)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xUnlock(real, lock);
}

int CheckReservedLock(sqlite3_file* file, int* result)
{
    return Answer(Call::DbCheckLock, &sqlite3_io_methods::xCheckReservedLock, file, result);
}

int FileControl(sqlite3_file* file, int operation, void* argument)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xFileControl(real, operation, argument);
}

int SectorSize(sqlite3_file* file)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xSectorSize(real);
}

int DeviceCharacteristics(sqlite3_file* file)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xDeviceCharacteristics(real);
}

int ShmMap(sqlite3_file* file, int page, int pageSize, int extend, void volatile** memory)
{
    return Answer(Call::DbSharedMemory, &sqlite3_io_methods::xShmMap, file, page, pageSize, extend,
                  memory);
}

// Only taking a lock can fail, not releasing it.
int ShmLock(sqlite3_file* file, int offset, int count, int flags)
{
    const int error = (flags & SQLITE_SHM_LOCK) != 0 ? Strike(Call::DbSharedLock) : 0;
    sqlite3_file* real = RealOf(file);
    return error != 0 ? error : real->pMethods->xShmLock(real, offset, count, flags);
}

void ShmBarrier(sqlite3_file* file)
{
    sqlite3_file* real = RealOf(file);
    real->pMethods->xShmBarrier(real);
}

int ShmUnmap(sqlite3_file* file, int deleteFlag)
{
    sqlite3_file* real = RealOf(file);
    return real->pMethods->xShmUnmap(real, deleteFlag);
}

constexpr sqlite3_io_methods Methods{2,
                                     Close,
                                     Read,
                                     Write,
                                     Truncate,
                                     Sync,
                                     FileSize,
                                     Lock,
                                     Unlock,
                                     CheckReservedLock,
                                     FileControl,
                                     SectorSize,
                                     DeviceCharacteristics,
                                     ShmMap,
                                     ShmLock,
                                     ShmBarrier,
                                     ShmUnmap,
                                     nullptr,
                                     nullptr};

int Open(sqlite3_vfs* /*vfs*/, const char* name, sqlite3_file* file, int flags, int* outFlags)
{
    file->pMethods = nullptr;
    int result = Strike(Call::DbOpen);
    if (result == SQLITE_OK) result = theirs->xOpen(theirs, name, RealOf(file), flags, outFlags);
    if (result == SQLITE_OK) file->pMethods = &Methods;
    return result;
}

int Delete(sqlite3_vfs* /*vfs*/, const char* name, int syncDir)
{
    const int error = Strike(Call::DbDelete);
    return error != 0 ? error : theirs->xDelete(theirs, name, syncDir);
}

int Access(sqlite3_vfs* /*vfs*/, const char* name, int flags, int* result)
{
    const int error = Strike(Call::DbAccess);
    return error != 0 ? error : theirs->xAccess(theirs, name, flags, result);
}

}  // namespace

FaultyVfs::FaultyVfs()
{
    theirs = sqlite3_vfs_find("unix");
    vfs_ = *theirs;
    vfs_.zName = "faulty";
    vfs_.szOsFile += static_cast<int>(sizeof(File));
    vfs_.xOpen = Open;
    vfs_.xDelete = Delete;
    vfs_.xAccess = Access;
    sqlite3_vfs_register(&vfs_, 1);
}

FaultyVfs::~FaultyVfs()
{
    sqlite3_vfs_unregister(&vfs_);
}
