// The ways in which statements run faster than as the texts that they are.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_SHORTCUTS_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_SHORTCUTS_H

namespace OrvaDRCore {

// None of them changes what a caller can observe, except the time. A test switches them off, runs
// the same operations with and without them, and compares.
struct Shortcuts {
    bool shapes = true;   // statements are prepared once per shape; their literals are bound
    bool inserts = true;  // an InsertCommand's values are bound without making its text
    bool lookups = true;  // a table that was found is not looked for again, and the lock is kept
};

// Those in use in this process. Only tests change them, before other threads run.
Shortcuts& ShortcutsInUse();

}  // namespace OrvaDRCore

#endif
