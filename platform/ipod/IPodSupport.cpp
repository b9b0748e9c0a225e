#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "platform/ipod/IPodPlaylist.h"

namespace harmona::ipod {

namespace {

// Reads up to `size` bytes (fewer at the end of the file); -1 on a read error.
ssize_t ReadUpTo(int fd, char* buffer, std::size_t size) {
    std::size_t total = 0;
    while (total < size) {
        const ssize_t n = read(fd, buffer + total, size - total);
        if (n < 0 && errno == EINTR)
            continue;
        if (n < 0)
            return -1;
        if (n == 0)
            break;
        total += static_cast<std::size_t>(n);
    }
    return static_cast<ssize_t>(total);
}

}  // namespace

bool ReadMountpoint(const char* path, std::string& mountpoint) {
    mountpoint.clear();
    // O_NONBLOCK: a FIFO planted at the path must not make the request wait; only a regular file
    // is read.
    const harmona::io::FileDescriptor file(
        open(path, O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    if (file.Get() < 0)
        return false;
    struct stat status {};
    if (fstat(file.Get(), &status) != 0 || !S_ISREG(status.st_mode))
        return false;

    // Room for the longest line and its CR LF end: a buffer filled without a LF holds a line that
    // is too long.
    char buffer[kMaxMountpointBytes + 2];
    const ssize_t length = ReadUpTo(file.Get(), buffer, sizeof(buffer));
    if (length <= 0)
        return false;
    const char* end = static_cast<const char*>(std::memchr(buffer, '\n', length));
    if (end == nullptr && static_cast<std::size_t>(length) == sizeof(buffer))
        return false;
    std::size_t lineLength =
        end != nullptr ? static_cast<std::size_t>(end - buffer) : static_cast<std::size_t>(length);
    if (lineLength > 0 && buffer[lineLength - 1] == '\r')
        --lineLength;
    if (lineLength > kMaxMountpointBytes)
        return false;
    if (lineLength == 0 || buffer[0] != '/' || std::memchr(buffer, '\0', lineLength) != nullptr)
        return false;
    mountpoint.assign(buffer, lineLength);
    return true;
}

std::string FormatIPodKey(std::uint64_t id) {
    char key[17];
    std::snprintf(key, sizeof(key), "%016" PRIx64, id);
    return key;
}

}  // namespace harmona::ipod
