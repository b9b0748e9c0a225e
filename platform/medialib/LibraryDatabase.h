// How every platform call opens library.db: read-only, with a busy timeout so that a running
// indexer never makes a request fail, and only when it is a regular file (a FIFO or device planted
// there could block or feed the reader endlessly).
#pragma once

#include "platform/lib/sqlite/Database.h"

namespace harmona::medialib {

// Opening of library.db as every request does it: read-only, waiting this long for a writer.
inline constexpr int kLibraryBusyTimeoutMs = 3000;

enum class LibraryStatus { ok, missing, unusable };

struct LibraryOpenResult {
    LibraryStatus status = LibraryStatus::unusable;
    sqlite::Database db;  // open when status is ok
};

// Opens the database at `path` read-only. `missing`: no such file; `unusable`: not a regular file,
// or SQLite refused it. (A file that is not a database opens; the first query fails.)
LibraryOpenResult OpenLibrary(const char* path);

}  // namespace harmona::medialib
