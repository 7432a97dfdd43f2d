#include "sqlite/sqlite_shortcuts.h"

namespace OrvaDRCore {

Shortcuts& ShortcutsInUse()
{
    static Shortcuts shortcuts;
    return shortcuts;
}

}  // namespace OrvaDRCore
