// Listing of the personal and the shared playlists
// (platform/README.md, "Playlists and smart playlists").
#pragma once

#include <string>
#include <string_view>

#include "platform/playlist/PlaylistFile.h"
#include "platform/playlist/PlaylistRecord.h"

// The personal playlists of the user whose preference directory is `prefDir`: the regular files of
// `<prefDir>/playlists/` whose names end in ".m3u" or ".m3u8" (any letter case), named without that
// ending, in byte order of the names, with ids from 1 in that order. `offset` records are skipped
// and at most `limit` are returned (0: no limit); 0 and 0 give the whole list.
// Returns 0 and sets *head (null for an empty list; a missing preference or playlists directory
// gives an empty list); -1 when the playlists path cannot be read as a directory or the arguments
// are null.
int VANUPersonalPlaylistListAll(const char* prefDir, PLAYLIST_INFO** head, int offset, int limit);

// The shared playlists: the rows of table `playlist` of library.db ordered by name (ASCII letter
// case ignored), then id. `offset` and `limit` as above; `reserved` must be 0.
// Returns 0 and sets *head (a missing database file gives an empty list); -1 when the file is not
// such a database or cannot be read.
int VANUPlaylistListAll(PLAYLIST_INFO** head, int offset, int limit, int reserved);

namespace harmona::playlist {

// The same listing as VANUPlaylistListAll, from the database at `path`.
int ListSharedPlaylists(const char* path, PLAYLIST_INFO** head, int offset, int limit);

// The entries of the personal playlist named `name` (as VANUPersonalPlaylistListAll names it) of
// the user whose preference directory is `prefDir`, read as ReadPlaylistFile reads a file. The
// playlists folder is opened once, never through a symbolic link; the file is found by name among
// its entries (a name from a request never becomes a path: "../x" or "a/b" name no entry) and
// opened relative to the folder. When two files give the same name, the first in byte order of
// the file names is read. `missing`: no such playlist (also when the folder is missing, is a link
// or cannot be read); `unusable`: the entry of that name is not a regular file (a link, a FIFO, a
// folder) or cannot be read; `tooLarge` as for ReadPlaylistFile.
PlaylistFileEntries ReadPersonalPlaylist(const char* prefDir, std::string_view name,
                                         const std::string& baseDir);

}  // namespace harmona::playlist
