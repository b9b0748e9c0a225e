#include "tests/harness/PlaylistFixtures.h"

#include <unistd.h>

#include <future>
#include <stdexcept>

#include "platform/lib/sqlite/Database.h"
#include "tests/harness/Fixtures.h"

namespace harmona::test {
namespace {

constexpr const char* kSchema = R"sql(
PRAGMA user_version = 1;
CREATE TABLE track (
  id INTEGER PRIMARY KEY, path TEXT NOT NULL UNIQUE,
  title TEXT, artist TEXT, album TEXT, album_artist TEXT, genre TEXT,
  year INTEGER, track_no INTEGER, disc_no INTEGER, duration_ms INTEGER,
  mtime INTEGER, added INTEGER
);
CREATE TABLE playlist (id INTEGER PRIMARY KEY CHECK (id BETWEEN 0 AND 4294967295), name TEXT NOT NULL);
CREATE TABLE playlist_entry (
  playlist_id INTEGER NOT NULL REFERENCES playlist(id) ON DELETE CASCADE,
  position INTEGER NOT NULL, path TEXT NOT NULL, PRIMARY KEY (playlist_id, position)
);
)sql";

void Check(sqlite::Database& db, int code, const char* what) {
    if (code != SQLITE_OK && code != SQLITE_DONE)
        throw std::runtime_error(std::string(what) + ": " + db.Error() + " (" +
                                 sqlite3_errmsg(db.Get()) + ")");
}

template <typename Rows, typename Bind>
void InsertAll(sqlite::Database& db, const char* sql, const Rows& rows, Bind bind) {
    sqlite::Statement insert = db.Prepare(sql);
    if (!insert)
        throw std::runtime_error("prepare: " + db.Error());
    for (const auto& row : rows) {
        insert.Reset();
        bind(insert, row);
        Check(db, insert.Step(), sql);
    }
}

void BindTrack(sqlite::Statement& insert, const TrackRow& track) {
    insert.Bind(1, track.id);
    insert.Bind(2, track.path);
    insert.Bind(3, track.title);
    insert.Bind(4, track.artist);
    if (track.durationMs >= 0)
        insert.Bind(5, track.durationMs);
    else
        insert.BindNull(5);
}

constexpr const char* kInsertTrack =
    "INSERT INTO track (id, path, title, artist, duration_ms, added) VALUES (?1, ?2, ?3, ?4, ?5, "
    "0)";

sqlite::Database CreateDatabase(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash != std::string::npos && slash > 0)
        MakeDirs(path.substr(0, slash));
    unlink(path.c_str());
    sqlite::Database db =
        sqlite::Database::Open(path.c_str(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 5000);
    if (!db)
        throw std::runtime_error("cannot create " + path + ": " + db.Error());
    Check(db, db.Execute(kSchema), "schema");
    return db;
}

void InsertPlaylists(sqlite::Database& db, const std::vector<SharedPlaylistRow>& playlists) {
    InsertAll(db, "INSERT INTO playlist (id, name) VALUES (?1, ?2)", playlists,
              [](sqlite::Statement& insert, const SharedPlaylistRow& row) {
                  insert.Bind(1, row.id);
                  insert.Bind(2, row.name);
              });
}

}  // namespace

void MakeLibraryDb(const std::vector<TrackRow>& tracks,
                   const std::vector<SharedPlaylistRow>& playlists, const std::string& path) {
    sqlite::Database db = CreateDatabase(path);
    Check(db, db.Execute("BEGIN"), "begin");
    InsertAll(db, kInsertTrack, tracks, BindTrack);
    InsertPlaylists(db, playlists);
    Check(db, db.Execute("COMMIT"), "commit");
}

TrackRow GeneratedTrack(std::int64_t n) {
    TrackRow track;
    track.id = n;
    const std::string artist = "Artist " + std::to_string(n % 97);
    track.path = "/volume1/music/" + artist + "/Track " + std::to_string(n) + ".mp3";
    track.title = "Title " + std::to_string(n);
    track.artist = artist;
    track.durationMs = (n % 600 + 1) * 1000;
    return track;
}

void MakeGeneratedLibrary(std::int64_t count, const std::vector<SharedPlaylistRow>& playlists,
                          std::int64_t first, std::int64_t step, const std::string& path) {
    sqlite::Database db = CreateDatabase(path);
    Check(db, db.Execute("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF; BEGIN"), "begin");
    sqlite::Statement insert = db.Prepare(kInsertTrack);
    for (std::int64_t i = 0; i < count; ++i) {
        TrackRow track = GeneratedTrack(first + i * step);
        insert.Reset();
        BindTrack(insert, track);
        Check(db, insert.Step(), "insert track");
    }
    InsertPlaylists(db, playlists);
    Check(db, db.Execute("COMMIT"), "commit");
}

std::string PreferenceDir(const std::string& user) {
    return kPreferenceRoot + user;
}

std::string PersonalPlaylistDir(const std::string& user) {
    return PreferenceDir(user) + "/playlists";
}

void WritePersonalPlaylistFile(const std::string& user, const std::string& fileName,
                               const std::string& content) {
    WriteFile(PersonalPlaylistDir(user) + "/" + fileName, content);
}

std::string UserSmartPlaylistFile(const std::string& user) {
    return PersonalPlaylistDir(user) + "/smart.playlist";
}

void WriteSmartPlaylistFile(const std::string& path, const std::vector<std::string>& names) {
    std::string text = "# smart playlists\n";
    for (const std::string& name : names)
        text += "[" + name + "]\nrule0=\"genre contains rock\"\n\n";
    WriteFile(path, text);
}

DatabaseWriterLock::DatabaseWriterLock(const std::string& path, int holdMs) {
    std::promise<bool> lockTaken;
    std::future<bool> taken = lockTaken.get_future();
    writer_ = std::thread([path, holdMs, promise = std::move(lockTaken)]() mutable {
        sqlite::Database db = sqlite::Database::Open(path.c_str(), SQLITE_OPEN_READWRITE, 5000);
        // Outside WAL mode an exclusive transaction keeps every reader out until it ends.
        const bool locked = db && db.Execute("BEGIN EXCLUSIVE") == SQLITE_OK;
        promise.set_value(locked);
        if (!locked)
            return;
        usleep(static_cast<useconds_t>(holdMs) * 1000);
        db.Execute("COMMIT");
    });
    locked_ = taken.get();
}

DatabaseWriterLock::~DatabaseWriterLock() {
    if (writer_.joinable())
        writer_.join();
}

M3uFile ParseExtendedM3u(const std::string& text) {
    M3uFile file;
    const std::string header = "#EXTM3U\n";
    if (text.empty() || text.compare(0, header.size(), header) != 0 || text.back() != '\n')
        return file;
    std::size_t at = header.size();
    while (at < text.size()) {
        const std::size_t infEnd = text.find('\n', at);
        const std::size_t pathEnd =
            infEnd == std::string::npos ? infEnd : text.find('\n', infEnd + 1);
        if (pathEnd == std::string::npos || text.compare(at, 8, "#EXTINF:") != 0)
            return file;
        M3uEntry entry;
        entry.extinf = text.substr(at + 8, infEnd - at - 8);
        entry.path = text.substr(infEnd + 1, pathEnd - infEnd - 1);
        if (entry.path.empty() || entry.path[0] == '#')
            return file;
        file.entries.push_back(std::move(entry));
        at = pathEnd + 1;
    }
    file.valid = true;
    return file;
}

}  // namespace harmona::test
