#include "LibrarySchema.h"

namespace harmona::medialib {
using sqlite::Database;
using sqlite::Statement;
namespace {

constexpr const char* kSchema = R"SQL(
CREATE TABLE IF NOT EXISTS track (
  id INTEGER PRIMARY KEY, path TEXT NOT NULL UNIQUE,
  title TEXT, artist TEXT, album TEXT, album_artist TEXT, genre TEXT,
  year INTEGER, track_no INTEGER, disc_no INTEGER, duration_ms INTEGER,
  mtime INTEGER, added INTEGER
);
CREATE TABLE IF NOT EXISTS playlist (
  id INTEGER PRIMARY KEY CHECK (id BETWEEN 0 AND 4294967295), name TEXT NOT NULL
);
CREATE TABLE IF NOT EXISTS playlist_entry (
  playlist_id INTEGER NOT NULL REFERENCES playlist(id) ON DELETE CASCADE,
  position INTEGER NOT NULL, path TEXT NOT NULL, PRIMARY KEY (playlist_id, position)
);
CREATE INDEX IF NOT EXISTS track_title ON track(title COLLATE NOCASE, id);
CREATE INDEX IF NOT EXISTS track_album ON track(album, album_artist);
CREATE INDEX IF NOT EXISTS track_genre ON track(genre);
PRAGMA user_version = 1;
)SQL";

int UserVersion(Database& db) {
    Statement stmt = db.Prepare("PRAGMA user_version");
    if (!stmt || stmt.Step() != SQLITE_ROW)
        return -1;
    return static_cast<int>(stmt.ColumnInt64(0));
}

}  // namespace

bool EnsureLibrarySchema(Database& db) {
    const int version = UserVersion(db);
    if (version != 0 && version != kLibrarySchemaVersion)
        return false;
    if (!(db.Execute("BEGIN IMMEDIATE") == SQLITE_OK))
        return false;
    if (!(db.Execute(kSchema) == SQLITE_OK)) {
        (db.Execute("ROLLBACK") == SQLITE_OK);
        return false;
    }
    return (db.Execute("COMMIT") == SQLITE_OK);
}

}  // namespace harmona::medialib
