#include "services/harmona-mediad/ShareFile.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <utility>
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
io::FileDescriptor KeepRegularFile(io::FileDescriptor fd) {
    struct stat st {};
    if (fstat(fd.Get(), &st) != 0 || !S_ISREG(st.st_mode)) {
        errno = EACCES;
        return {};
    }
    const int flags = fcntl(fd.Get(), F_GETFL);
    if (flags >= 0)
        fcntl(fd.Get(), F_SETFL, flags & ~O_NONBLOCK);
    return fd;
}

// Closes `fd` without changing errno, which tells the caller why an open failed.
void CloseKeepingErrno(io::FileDescriptor& fd) {
    const int saved = errno;
    fd.Reset();
    errno = saved;
}

constexpr int kFileFlags = O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK;

io::FileDescriptor OpenWithOpenat2(int directoryFd, const std::string& relative) {
    open_how how{};
    how.flags = kFileFlags;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
    return io::FileDescriptor(
        static_cast<int>(syscall(SYS_openat2, directoryFd, relative.c_str(), &how, sizeof how)));
}

io::FileDescriptor OpenByWalking(int directoryFd, const std::vector<std::string>& parts) {
    io::FileDescriptor current(fcntl(directoryFd, F_DUPFD_CLOEXEC, 0));
    for (std::size_t i = 0; current && i + 1 < parts.size(); ++i) {
        io::FileDescriptor next(
            openat(current.Get(), parts[i].c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
        CloseKeepingErrno(current);
        current = std::move(next);
    }
    if (!current)
        return {};
    io::FileDescriptor fd(openat(current.Get(), parts.back().c_str(), kFileFlags | O_NOFOLLOW));
    CloseKeepingErrno(current);
    return fd;
}

}  // namespace

io::FileDescriptor OpenBeneath(int directoryFd, const std::string& relative, bool allowOpenat2) {
    std::vector<std::string> parts;
    if (!SplitComponents(relative, &parts)) {
        errno = EINVAL;
        return {};
    }
    io::FileDescriptor fd;
    if (allowOpenat2) {
        fd = OpenWithOpenat2(directoryFd, relative);
        if (!fd && errno != ENOSYS)
            return {};
    }
    if (!fd)
        fd = OpenByWalking(directoryFd, parts);
    return fd ? KeepRegularFile(std::move(fd)) : io::FileDescriptor();
}

io::FileDescriptor OpenBeneathShare(const std::string& sharePath, const std::string& relative) {
    io::FileDescriptor share(open(sharePath.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!share)
        return {};
    io::FileDescriptor fd = OpenBeneath(share.Get(), relative);
    CloseKeepingErrno(share);
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
