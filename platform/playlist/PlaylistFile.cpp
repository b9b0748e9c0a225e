#include "platform/playlist/PlaylistFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>

#include "common/io/FileDescriptor.h"

namespace harmona::playlist {

namespace {

// Reads the whole regular file behind `fd`, or fails when it holds more than `limit` bytes.
bool ReadBounded(int fd, std::size_t limit, std::string* text) {
    char buffer[65536];
    for (;;) {
        const ssize_t n = read(fd, buffer, sizeof buffer);
        if (n < 0) {
            if (errno == EINTR)
                continue;
            return false;
        }
        if (n == 0)
            return true;
        if (text->size() + static_cast<std::size_t>(n) > limit)
            return false;
        text->append(buffer, static_cast<std::size_t>(n));
    }
}

std::string_view WithoutTrailingCr(std::string_view line) {
    if (!line.empty() && line.back() == '\r')
        line.remove_suffix(1);
    return line;
}

}  // namespace

PlaylistFileEntries ReadPlaylistFile(const std::string& path, const std::string& baseDir) {
    return ReadPlaylistFileAt(AT_FDCWD, path.c_str(), baseDir);
}

PlaylistFileEntries ReadPlaylistFileAt(int folderFd, const char* name, const std::string& baseDir) {
    PlaylistFileEntries result;
    // O_NONBLOCK: opening a FIFO planted in the file's place must not wait for a writer.
    io::FileDescriptor fd(openat(folderFd, name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    if (!fd) {
        if (errno == ENOENT || errno == ENOTDIR)
            result.status = PlaylistFileStatus::missing;
        return result;
    }
    struct stat st {};
    if (fstat(fd.Get(), &st) != 0 || !S_ISREG(st.st_mode))
        return result;
    if (static_cast<std::size_t>(st.st_size) > kMaxPlaylistFileBytes) {
        result.status = PlaylistFileStatus::tooLarge;
        return result;
    }
    std::string text;
    if (!ReadBounded(fd.Get(), kMaxPlaylistFileBytes, &text)) {
        result.status = text.size() >= kMaxPlaylistFileBytes ? PlaylistFileStatus::tooLarge
                                                             : PlaylistFileStatus::unusable;
        return result;
    }
    std::string_view rest(text);
    while (!rest.empty()) {
        const std::size_t end = rest.find('\n');
        const std::string_view line = WithoutTrailingCr(rest.substr(0, end));
        rest.remove_prefix(end == std::string_view::npos ? rest.size() : end + 1);
        if (line.empty() || line.front() == '#' || line.find('\0') != std::string_view::npos)
            continue;
        if (result.paths.size() == kMaxPlaylistEntries) {
            result.paths.clear();
            result.status = PlaylistFileStatus::tooLarge;
            return result;
        }
        if (line.front() == '/')
            result.paths.emplace_back(line);
        else
            result.paths.push_back(baseDir + "/" + std::string(line));
    }
    result.status = PlaylistFileStatus::ok;
    return result;
}

}  // namespace harmona::playlist
