// The iPod library of the platform (platform/README.md, "iPod").
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "platform/playlist/PlaylistRecord.h"

// Lists the playlists of the attached iPod: the mountpoint file's first line names the folder that
// holds iPod_Control; its database is read with libgpod (loaded on demand, see IPodPluginApi.h).
// In database order, without the master playlist; name = the playlist's name (cut to 254 bytes on a
// UTF-8 boundary), key = its 64-bit id as 16 lowercase hexadecimal digits. Returns 0 with *head
// set (null when there is no playlist; free with VANUPlayListFree), or -1 with *head null when the
// mountpoint file is missing or unusable, the database cannot be read or the reader plugin is
// missing, or the reading took longer than kReadTimeoutMs (one log line naming the mountpoint), or
// the iPod holds more than kMaxIPodPlaylists playlists (one log line).
int VANUIPodPlaylistGetAll(PLAYLIST_INFO** head);

namespace harmona::ipod {

// The database is read in a child process that is killed when it has not answered within this
// time: libgpod's parser can spin for good on a damaged database. A real iPod's database, even of
// tens of thousands of tracks, is read in well under a second.
inline constexpr int kReadTimeoutMs = 5000;

// An iPod with more playlists than this is not listed (no real one has that many).
inline constexpr std::size_t kMaxIPodPlaylists = playlist::kMaxPlaylistRecords;

// The longest first line of the mountpoint file that is accepted (PATH_MAX - 1).
inline constexpr std::size_t kMaxMountpointBytes = 4095;

// Reads the first line of the mountpoint file at `path` (a regular file; at most
// kMaxMountpointBytes bytes before the line end are read, a CR before the LF is dropped). False
// when the file is missing or not a regular file, or the line is empty, too long, holds a NUL byte
// or is not an absolute path.
bool ReadMountpoint(const char* path, std::string& mountpoint);

// The key of a playlist: its id as 16 lowercase hexadecimal digits.
std::string FormatIPodKey(std::uint64_t id);

}  // namespace harmona::ipod
