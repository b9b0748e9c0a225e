#include "platform/playlist/PlaylistList.h"

#include <dirent.h>
#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string>
#include <string_view>
#include <vector>

#include "common/io/DirectoryReader.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibraryDatabase.h"
#include "platform/paths/PlatformPaths.h"

namespace harmona::playlist {
namespace {

bool EndsWithIgnoringCase(std::string_view name, std::string_view ending) {
    return name.size() >= ending.size() && strncasecmp(name.data() + name.size() - ending.size(),
                                                       ending.data(), ending.size()) == 0;
}

// The playlist name of a directory entry, or false when the entry is not a playlist file name.
bool PlaylistNameOf(std::string_view fileName, std::string& name) {
    for (std::string_view ending : {std::string_view(".m3u"), std::string_view(".m3u8")}) {
        if (EndsWithIgnoringCase(fileName, ending)) {
            name.assign(fileName.substr(0, fileName.size() - ending.size()));
            return true;
        }
    }
    return false;
}

// A regular file, or a symbolic link to one (what a user sees as a file).
bool IsRegularFile(int dirFd, const dirent& entry) {
    if (entry.d_type == DT_REG)
        return true;
    if (entry.d_type != DT_LNK && entry.d_type != DT_UNKNOWN)
        return false;
    struct stat st {};
    return fstatat(dirFd, entry.d_name, &st, 0) == 0 && S_ISREG(st.st_mode);
}

// Keeps the records [offset, offset + limit) of `count` (limit 0: all); returns [first, last).
std::pair<std::size_t, std::size_t> Window(std::size_t count, int offset, int limit) {
    const std::size_t first = offset > 0 ? std::min(count, static_cast<std::size_t>(offset)) : 0;
    std::size_t last = count;
    if (limit > 0)
        last = std::min(count, first + static_cast<std::size_t>(limit));
    return {first, last};
}

}  // namespace

int ListSharedPlaylists(const char* path, PLAYLIST_INFO** head, int offset, int limit) {
    *head = nullptr;
    medialib::LibraryOpenResult opened = medialib::OpenLibrary(path);
    if (opened.status == medialib::LibraryStatus::missing)
        return 0;
    if (opened.status != medialib::LibraryStatus::ok)
        return -1;

    sqlite::Statement select = opened.db.Prepare(
        "SELECT id, name FROM playlist ORDER BY name COLLATE NOCASE, id LIMIT ?1 OFFSET ?2");
    if (!select)
        return -1;
    select.Bind(1, limit > 0 ? static_cast<std::int64_t>(limit) : -1);
    select.Bind(2, offset > 0 ? static_cast<std::int64_t>(offset) : 0);

    PlaylistListBuilder list;
    int code;
    while ((code = select.Step()) == SQLITE_ROW) {
        // Nothing in the file is trusted: an id that the schema's CHECK would refuse is left out.
        const std::int64_t id = select.ColumnInt64(0);
        if (select.ColumnType(0) != SQLITE_INTEGER || id < 0 || id > 0xFFFFFFFFll)
            continue;
        if (!list.Append(static_cast<std::uint32_t>(id), select.ColumnText(1), {})) {
            if (list.Full())
                LogListTooLong(std::string("shared playlists in ") + path, kMaxPlaylistRecords);
            return -1;
        }
    }
    if (code != SQLITE_DONE)
        return -1;
    *head = list.Release();
    return 0;
}

PlaylistFileEntries ReadPersonalPlaylist(const char* prefDir, std::string_view name,
                                         const std::string& baseDir) {
    PlaylistFileEntries result;
    result.status = PlaylistFileStatus::missing;
    if (prefDir == nullptr || name.empty())
        return result;
    const std::string folder = std::string(prefDir) + paths::kPlaylistsFolder;
    io::DirectoryReader dir(
        io::FileDescriptor(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC)));
    if (!dir)
        return result;
    std::string fileName;
    std::string entryName;
    while (const dirent* entry = dir.Next()) {
        if (PlaylistNameOf(entry->d_name, entryName) && entryName == name &&
            (fileName.empty() || std::string_view(entry->d_name) < fileName))
            fileName = entry->d_name;
    }
    if (fileName.empty())
        return result;
    return ReadPlaylistFileAt(dir.Fd(), fileName.c_str(), baseDir);
}

}  // namespace harmona::playlist

using namespace harmona::playlist;

int VANUPersonalPlaylistListAll(const char* prefDir, PLAYLIST_INFO** head, int offset, int limit) {
    if (head == nullptr)
        return -1;
    *head = nullptr;
    if (prefDir == nullptr)
        return -1;

    // Only a real folder is listed: a symbolic link in its place could show another user's
    // playlist names (O_NOFOLLOW refuses it with ELOOP, like any folder that cannot be read).
    const std::string folder = std::string(prefDir) + harmona::paths::kPlaylistsFolder;
    harmona::io::FileDescriptor folderFd(
        open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!folderFd)
        return errno == ENOENT ? 0 : -1;
    harmona::io::DirectoryReader dir(std::move(folderFd));
    if (!dir)
        return -1;

    std::vector<std::string> names;
    std::string name;
    bool tooMany = false;
    while (const dirent* entry = dir.Next()) {
        if (PlaylistNameOf(entry->d_name, name) && IsRegularFile(dir.Fd(), *entry)) {
            // Counted while the folder is read: a folder of millions of files costs no memory.
            if (names.size() == kMaxPlaylistRecords) {
                tooMany = true;
                break;
            }
            names.push_back(name);
        }
    }
    const bool readFailed = !tooMany && errno != 0;
    dir.Reset();
    if (tooMany) {
        LogListTooLong("playlists in " + folder, kMaxPlaylistRecords);
        return -1;
    }
    if (readFailed)
        return -1;

    // Byte order (std::string compares as unsigned bytes); ids follow that order.
    std::sort(names.begin(), names.end());
    const auto [first, last] = Window(names.size(), offset, limit);
    PlaylistListBuilder list;
    for (std::size_t i = first; i < last; ++i) {
        if (!list.Append(static_cast<std::uint32_t>(i + 1), names[i], {}))
            return -1;
    }
    *head = list.Release();
    return 0;
}

int VANUPlaylistListAll(PLAYLIST_INFO** head, int offset, int limit, int reserved) {
    if (head == nullptr)
        return -1;
    return ListSharedPlaylists(harmona::paths::kLibraryDb, head, offset, limit);
}
