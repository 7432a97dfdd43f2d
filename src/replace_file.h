// The replacement of a file by another, whole.
#ifndef ORVADRCORE_SRC_REPLACE_FILE_H
#define ORVADRCORE_SRC_REPLACE_FILE_H

#include <sys/stat.h>

#include <optional>
#include <string>
#include <string_view>

namespace OrvaDRCore {

// Replaces the file `path` by one that holds `text`: a temporary file beside it is written, flushed
// to disk and renamed. Whoever opens `path` sees the old file or the new one, never a part, also
// after a power cut; which of the two it is then is not certain. The new file has the permission
// bits `mode`, if given, otherwise those of the old file, or 0666 less the umask.
//
// On failure the old file is as it was and the temporary file gone. Temporary files are called
// `path` + ".orvadr-tmp0", 1 and so on, for as many writers as there are at once; a name without
// room for that is cut. A writer holds a lock on its own as long as it lives, so that what a killed
// one left is known and removed by the next.
//
// What the file system says of the new file goes into `made`, if given.
bool ReplaceFile(const std::string& path, std::string_view text,
                 std::optional<mode_t> mode = std::nullopt, struct stat* made = nullptr);

}  // namespace OrvaDRCore

#endif
