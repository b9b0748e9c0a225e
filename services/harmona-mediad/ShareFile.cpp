#include "services/harmona-mediad/ShareFile.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <vector>

namespace harmona::mediad {
namespace {

// Split at "/", refusing empty, "." and ".." components: the index never stores such paths, so
// one in a request for a file means a forged or corrupt row.
bool SplitComponents(const std::string& relative, std::vector<std::string>* parts) {
    std::size_t start = 0;
    while (start <= relative.size()) {
        const std::size_t slash = relative.find('/', start);
        const std::size_t end = slash == std::string::npos ? relative.size() : slash;
        const std::string part = relative.substr(start, end - start);
        if (part.empty() || part == "." || part == "..")
            return false;
        parts->push_back(part);
        if (slash == std::string::npos)
            break;
        start = slash + 1;
    }
    return !parts->empty();
}

// Regular files only; O_NONBLOCK kept off the returned descriptor (it was there only so that
// opening a FIFO planted in the share cannot block the server).
int KeepRegularFile(int fd) {
    struct stat st {};
    if (fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) {
        close(fd);
        errno = EACCES;
        return -1;
    }
    const int flags = fcntl(fd, F_GETFL);
    if (flags >= 0)
        fcntl(fd, F_SETFL, flags & ~O_NONBLOCK);
    return fd;
}

constexpr int kFileFlags = O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK;

int OpenWithOpenat2(int directoryFd, const std::string& relative) {
    open_how how{};
    how.flags = kFileFlags;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
    return static_cast<int>(syscall(SYS_openat2, directoryFd, relative.c_str(), &how, sizeof how));
}

int OpenByWalking(int directoryFd, const std::vector<std::string>& parts) {
    int current = fcntl(directoryFd, F_DUPFD_CLOEXEC, 0);
    for (std::size_t i = 0; current >= 0 && i + 1 < parts.size(); ++i) {
        const int next =
            openat(current, parts[i].c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
        const int saved = errno;
        close(current);
        errno = saved;
        current = next;
    }
    if (current < 0)
        return -1;
    const int fd = openat(current, parts.back().c_str(), kFileFlags | O_NOFOLLOW);
    const int saved = errno;
    close(current);
    errno = saved;
    return fd;
}

}  // namespace

int OpenBeneath(int directoryFd, const std::string& relative, bool allowOpenat2) {
    std::vector<std::string> parts;
    if (!SplitComponents(relative, &parts)) {
        errno = EINVAL;
        return -1;
    }
    int fd = -1;
    if (allowOpenat2) {
        fd = OpenWithOpenat2(directoryFd, relative);
        if (fd < 0 && errno != ENOSYS)
            return -1;
    }
    if (fd < 0)
        fd = OpenByWalking(directoryFd, parts);
    return fd < 0 ? -1 : KeepRegularFile(fd);
}

int OpenBeneathShare(const std::string& sharePath, const std::string& relative) {
    const int share = open(sharePath.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (share < 0)
        return -1;
    const int fd = OpenBeneath(share, relative);
    const int saved = errno;
    close(share);
    errno = saved;
    return fd;
}

std::string PathBelowShare(const std::string& sharePath, const std::string& path) {
    std::string share = sharePath;
    while (share.size() > 1 && share.back() == '/')
        share.pop_back();
    if (path.size() <= share.size() + 1 || path.compare(0, share.size(), share) != 0 ||
        path[share.size()] != '/')
        return "";
    return path.substr(share.size() + 1);
}

}  // namespace harmona::mediad
