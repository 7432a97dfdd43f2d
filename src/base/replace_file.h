// Replaces a file as a whole.
#ifndef ORVADRCORE_SRC_BASE_REPLACE_FILE_H
#define ORVADRCORE_SRC_BASE_REPLACE_FILE_H

#include <sys/stat.h>

#include <optional>
#include <string>
#include <string_view>

namespace OrvaDRCore {

// Replaces the file `path` by one that holds `text`: writes a temporary file beside it, flushes it to
// disk and renames it. Whoever opens `path` sees the old file or the new one, never a part, even
// after a power cut (either of the two then). The new file gets the permission bits `mode`, or else
// those of the old file if that is a regular one, or else 0666 less the umask. Any number of
// processes and threads may replace a file at the same time; the last one wins. No lock is taken, so
// that it works on file systems without locks. False with errno set on failure: the old file is as
// it was, and the temporary file is gone. `made`, if given, gets the status of the new file.
//
// A temporary file is called `path` + ".orvadr-tmp" + "DOMAIN.PID.START.NUMBER", so that no two
// writers use the same name. The domain is made from the machine's name and the process-id
// namespace. The numbers are the writer's process id, its start time in clock ticks since boot (0
// without /proc) and a count from 0. A file name of more than 199 bytes is shortened.
//
// Each writer first removes what dead writers of the same path have left: regular files under such
// names whose process, of the same domain, is gone, is a zombie, or was started at another time. If
// that is unknown, or the domain is another, the file must not have been modified for an hour; a
// living writer that loses its file by this fails with ENOENT. Of a directory of more than 4000
// names only the first writer of `path` in each second lists more than 4000.
bool ReplaceFile(const std::string& path, std::string_view text,
                 std::optional<mode_t> mode = std::nullopt, struct stat* made = nullptr);

}  // namespace OrvaDRCore

#endif
