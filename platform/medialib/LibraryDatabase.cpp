#include "platform/medialib/LibraryDatabase.h"

#include <sys/stat.h>

#include <cerrno>

namespace harmona::medialib {

LibraryOpenResult OpenLibrary(const char* path) {
    LibraryOpenResult result;
    struct stat st {};
    if (stat(path, &st) != 0) {
        result.status =
            errno == ENOENT || errno == ENOTDIR ? LibraryStatus::missing : LibraryStatus::unusable;
        return result;
    }
    if (!S_ISREG(st.st_mode))
        return result;
    result.db = sqlite::Database::OpenReadOnly(path, kLibraryBusyTimeoutMs);
    if (result.db)
        result.status = LibraryStatus::ok;
    return result;
}

}  // namespace harmona::medialib
