// Fixture writers for the playlists: a real library.db made with SQLite, personal playlist files,
// smart playlist files, a writer that holds the database locked, and a reader of the extended M3U
// files that the random playlist generator writes. For the playlist tests and for any test of the
// whole tree (root tree, refresh) that needs playlists.
#pragma once

#include <cstdint>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace harmona::test {

inline constexpr const char* kLibraryDb = "/var/packages/Harmona/var/library.db";
inline constexpr const char* kSharedSmartPlaylistFile = "/var/packages/Harmona/etc/smart.playlist";

struct TrackRow {
    std::int64_t id = 0;
    std::string path;
    std::string title;
    std::string artist;
    std::int64_t durationMs = -1;  // below 0: stored as NULL
};

struct SharedPlaylistRow {
    std::int64_t id = 0;
    std::string name;
};

// Creates (or replaces) the database at `path` with the music library's schema (user_version 1;
// platform/README.md, "Music library database and random-100 playlist") and the given rows, in one
// transaction.
void MakeLibraryDb(const std::vector<TrackRow>& tracks,
                   const std::vector<SharedPlaylistRow>& playlists = {},
                   const std::string& path = kLibraryDb);

// The track of number n (from 1) of a generated library: id n, path
// "/volume1/music/Artist <n % 97>/Track <n>.mp3", title "Title <n>", artist "Artist <n % 97>",
// duration (n % 600 + 1) seconds.
TrackRow GeneratedTrack(std::int64_t n);

// A library of `count` generated tracks with ids first, first + step, first + 2 step, ... (dense
// when step is 1), plus the given shared playlists. Fast enough for a million tracks.
void MakeGeneratedLibrary(std::int64_t count, const std::vector<SharedPlaylistRow>& playlists = {},
                          std::int64_t first = 1, std::int64_t step = 1,
                          const std::string& path = kLibraryDb);

// "/usr/vanu/etc/preference/<user>" and its playlists folder.
std::string PreferenceDir(const std::string& user);
std::string PersonalPlaylistDir(const std::string& user);
// Writes one file into the user's playlists folder (file name as given, ending included).
void WritePersonalPlaylistFile(const std::string& user, const std::string& fileName,
                               const std::string& content = "#EXTM3U\n");
// The user's smart playlist file, <preference dir>/playlists/smart.playlist.
std::string UserSmartPlaylistFile(const std::string& user);
// Writes a smart playlist file with one section per name, in the given order, each with a rule.
void WriteSmartPlaylistFile(const std::string& path, const std::vector<std::string>& names);

// Holds an exclusive transaction on a database for a while from another thread (a writer such as
// the indexer). The constructor returns once the lock is held.
class DatabaseWriterLock {
  public:
    DatabaseWriterLock(const std::string& path, int holdMs);
    ~DatabaseWriterLock();  // waits for the writer to commit
    DatabaseWriterLock(const DatabaseWriterLock&) = delete;
    DatabaseWriterLock& operator=(const DatabaseWriterLock&) = delete;
    bool Locked() const { return locked_; }

  private:
    std::thread writer_;
    bool locked_ = false;
};

// One entry of an extended M3U file.
struct M3uEntry {
    std::string extinf;  // the text after "#EXTINF:"
    std::string path;
};
struct M3uFile {
    bool valid = false;  // "#EXTM3U" first, then #EXTINF/path pairs, every line ended by "\n"
    std::vector<M3uEntry> entries;
};
M3uFile ParseExtendedM3u(const std::string& text);

}  // namespace harmona::test
