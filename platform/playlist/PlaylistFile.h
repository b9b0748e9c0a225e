// Reading of a playlist file (M3U or extended M3U, as the users' players and the random playlist
// generator write them): the entries, in order.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "platform/playlist/PlaylistRecord.h"

namespace harmona::playlist {

// A playlist file larger than this is not read: ten thousand entries of long paths fit easily.
inline constexpr std::size_t kMaxPlaylistFileBytes = std::size_t{8} << 20;
// A playlist gives at most this many entries, as a playlist list gives at most this many records.
inline constexpr std::size_t kMaxPlaylistEntries = kMaxPlaylistRecords;

enum class PlaylistFileStatus { ok, missing, unusable, tooLarge };

struct PlaylistFileEntries {
    PlaylistFileStatus status = PlaylistFileStatus::unusable;
    std::vector<std::string> paths;  // absolute paths, in file order
};

// Reads the entries of the playlist file at `path`: the lines that are neither empty nor comments
// ("#..."), a CR before the LF dropped. A relative entry is taken relative to `baseDir` (no
// trailing "/"). Entries holding a NUL byte are left out. The file must be a regular file and is
// never opened through a symbolic link at its last component, nor waited for (a FIFO planted in
// its place is refused). `missing`: no such file; `unusable`: anything else that cannot be read;
// `tooLarge`: more than kMaxPlaylistFileBytes or more than kMaxPlaylistEntries entries.
PlaylistFileEntries ReadPlaylistFile(const std::string& path, const std::string& baseDir);

// The same for the file `name` relative to the open folder `folderFd` (openat; AT_FDCWD for a
// path).
PlaylistFileEntries ReadPlaylistFileAt(int folderFd, const char* name, const std::string& baseDir);

}  // namespace harmona::playlist
