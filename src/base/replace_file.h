// The replacement of a file by another, whole.
#ifndef ORVADRCORE_SRC_BASE_REPLACE_FILE_H
#define ORVADRCORE_SRC_BASE_REPLACE_FILE_H

#include <sys/stat.h>

#include <optional>
#include <string>
#include <string_view>

namespace OrvaDRCore {

// Replaces the file `path` by one that holds `text`: a temporary file beside it is written, flushed
// to disk and renamed. Whoever opens `path` sees the old file or the new one, never a part, also
// after a power cut; which of the two it is then is not certain. The new file has the permission
// bits `mode`, if given, otherwise those of the old file, if that is a regular one, otherwise 0666
// less the umask. Any number of processes and threads may replace one file at the same time; the
// last one's stays. No locks are taken: file systems without them serve as well. On failure, told
// by false and errno, the old file is as it was and the temporary file gone.
//
// Temporary files are called `path` + ".orvadr-tmp" + "DOMAIN.PID.START.NUMBER". The domain is made
// of the machine's name and the process-id namespace; the numbers are the writing process's id, its
// start time in clock ticks since boot (0 when /proc does not tell) and a count from 0, so that no
// two writers have a name in common. A file name of more than 199 bytes is shortened.
//
// Before it writes, each writer removes what dead ones have left beside the same path: regular
// files under such names whose process, of its own domain, is gone, is a zombie, or was started at
// another time; where that cannot be told, and in other domains, files that were not modified for an
// hour. A living writer that loses its file to that hour fails with ENOENT. The directory is listed
// for it; one of more than 4000 names to its end only by the first writer of `path` in each second.
//
// What the file system says of the new file goes into `made`, if given.
bool ReplaceFile(const std::string& path, std::string_view text,
                 std::optional<mode_t> mode = std::nullopt, struct stat* made = nullptr);

}  // namespace OrvaDRCore

#endif
