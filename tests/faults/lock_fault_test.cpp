// FileLock, with every call failing once.
#include <orvadrcore/file_lock.h>

#include "fault.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

using OrvaDRCore::FileLock;

namespace {

// A lock file that an ordinary user can open more than once.
struct Place {
    Place() { WriteFile(file, ""); }

    TempDir dir;
    std::string name = dir.Path() + "/a lock with a name that is long enough";
    std::string file = PlaceOfLock(FileLock::getLockFilePath(name));
};

}  // namespace

TEST(LockFaults, Lock)
{
    for (const unsigned int retries : {0U, 1U}) {
        EveryCallFails("FileLock::lock, retries " + std::to_string(retries), [retries] {
            const Place place;
            FileLock lock(place.name);
            const Outcome outcome =
                WithFault([&] { return lock.lock(LOCK_EX | LOCK_NB, retries); });
            EXPECT_EQ(IsLocked(place.file), outcome.succeeded);
            EXPECT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
            EXPECT_TRUE(IsLocked(place.file));
        });
    }
}

TEST(LockFaults, LockThatIsHeld)
{
    EveryCallFails("FileLock::lock of a lock that is held", [] {
        const Place place;
        FileLock lock(place.name);
        ASSERT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
        WithFault([&] { return lock.lock(LOCK_SH | LOCK_NB, 0); });
        EXPECT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
        EXPECT_TRUE(IsLocked(place.file));
    });
}

TEST(LockFaults, TryLock)
{
    EveryCallFails("FileLock::tryLock", [] {
        const Place place;
        FileLock lock(place.name);
        WithFault([&] { return lock.tryLock(LOCK_EX | LOCK_NB); });
        EXPECT_TRUE(lock.tryLock(LOCK_EX | LOCK_NB));
        EXPECT_FALSE(IsLocked(place.file));
    });
}

TEST(LockFaults, Unlock)
{
    EveryCallFails("FileLock::unlock", [] {
        const Place place;
        FileLock lock(place.name);
        ASSERT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
        const Outcome outcome = WithFault([&] {
            lock.unlock();
            return true;
        });
        EXPECT_EQ(IsLocked(place.file), outcome.lines == 1);
        lock.unlock();
        EXPECT_FALSE(IsLocked(place.file));
    });
}

TEST(LockFaults, ConstructorAndDestructor)
{
    EveryCallFails("FileLock's life", [] {
        const Place place;
        WithFault([&] {
            FileLock lock(place.name);
            return lock.setLockFile(place.name + "2") && lock.setLockFile(place.name) &&
                   lock.checkLockDir() && lock.openLockedFile();
        });
        EXPECT_TRUE(FileLock(place.name).lock(LOCK_EX | LOCK_NB, 0));
        EXPECT_FALSE(IsLocked(place.file));
    });
}
