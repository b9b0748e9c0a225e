// The random playlist generator of the platform's audio file library
// (platform/README.md, "Music library database and random-100 playlist").
#pragma once

class AudioFile {
  public:
    // Picks min(count, number of tracks) distinct tracks of library.db uniformly at random and
    // writes them to `path` as an extended M3U file ("#EXTM3U", then per track
    // "#EXTINF:<seconds>,<artist> - <title>" and the track's path, each line ended by a newline).
    // The file is written as a new file next to `path` (created exclusively, mode 0600) and renamed
    // over `path`: a reader never sees half a playlist, and a symbolic link planted at `path` is
    // replaced, never followed. Nothing is ever written outside the folder of `path`.
    // Returns 1 on success; 0 when the database is missing or unreadable, holds no track, count is
    // below 1, or the file cannot be written.
    static int PlaylistRandomCreate(const char* path, int count);
};

namespace harmona::playlist {

// The same, drawing from the database at `databasePath`.
int CreateRandomPlaylist(const char* databasePath, const char* path, int count);

}  // namespace harmona::playlist
