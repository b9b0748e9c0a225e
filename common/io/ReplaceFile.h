// Replaces a file whole: a reader sees the old text or the new one, never a part, and a crash
// leaves at most a temporary file beside it.
#pragma once

#include <sys/types.h>

#include <string_view>

namespace harmona::io {

enum class ReplaceOutcome {
    ok,
    exists,  // the name was taken and the file had to be new
    failed,  // errno says why
};

struct ReplaceOptions {
    mode_t mode = 0600;      // the new file's mode, whatever the umask
    bool mustBeNew = false;  // fail with `exists` rather than replace a file of that name
};

// Writes `text` to a new file in the folder `dirFd` (its name `temporaryPrefix` and random
// letters, opened exclusively and never through a link), flushes it to disk and renames it over
// `name` in the same folder, then flushes the folder. Both names are taken relative to `dirFd`, so
// nothing lands anywhere else; on a failure the temporary file is removed and errno is the cause.
ReplaceOutcome ReplaceFileAt(int dirFd, const char* name, std::string_view text,
                             std::string_view temporaryPrefix, const ReplaceOptions& options = {});

}  // namespace harmona::io
