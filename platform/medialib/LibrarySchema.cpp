#include "platform/medialib/LibrarySchema.h"

namespace harmona::medialib {
using sqlite::Database;
using sqlite::Statement;
namespace {

constexpr const char* kSchema = R"SQL(
CREATE TABLE IF NOT EXISTS track (
  id INTEGER PRIMARY KEY, path TEXT NOT NULL UNIQUE,
  title TEXT, artist TEXT, album TEXT, album_artist TEXT, genre TEXT,
  year INTEGER, track_no INTEGER, disc_no INTEGER, duration_ms INTEGER,
  mtime INTEGER, added INTEGER, size INTEGER, art_path TEXT
);
CREATE TABLE IF NOT EXISTS library_update (id INTEGER NOT NULL);
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

// Columns added to the track table after its first release: old databases get them empty, and
// the indexer fills them on its next pass without reading a tag.
constexpr const char* kLaterTrackColumns[][2] = {{"size", "INTEGER"}, {"art_path", "TEXT"}};

bool HasColumn(Database& db, const char* table, const char* column) {
    Statement stmt = db.Prepare(std::string("PRAGMA table_info(") + table + ")");
    while (stmt && stmt.Step() == SQLITE_ROW) {
        if (stmt.ColumnText(1) == column)
            return true;
    }
    return false;
}

bool AddLaterColumns(Database& db) {
    for (const auto& [name, type] : kLaterTrackColumns) {
        if (HasColumn(db, "track", name))
            continue;
        const std::string sql = std::string("ALTER TABLE track ADD COLUMN ") + name + " " + type;
        if (db.Execute(sql.c_str()) != SQLITE_OK)
            return false;
    }
    return true;
}

int UserVersion(Database& db) {
    Statement stmt = db.Prepare("PRAGMA user_version");
    if (!stmt || stmt.Step() != SQLITE_ROW)
        return -1;
    return static_cast<int>(stmt.ColumnInt64(0));
}

}  // namespace

int64_t LibraryUpdateCount(Database& db) {
    Statement stmt = db.Prepare("SELECT MAX(id) FROM library_update");
    if (!stmt || stmt.Step() != SQLITE_ROW || stmt.ColumnType(0) == SQLITE_NULL)
        return -1;
    return stmt.ColumnInt64(0);
}

bool BumpLibraryUpdateCount(Database& db) {
    return db.Execute(
               "INSERT INTO library_update (id) SELECT COALESCE(MAX(id), 0) + 1 FROM "
               "library_update; DELETE FROM library_update WHERE id < (SELECT MAX(id) "
               "FROM library_update)") == SQLITE_OK;
}

bool EnsureLibrarySchema(Database& db) {
    const int version = UserVersion(db);
    if (version != 0 && version != kLibrarySchemaVersion)
        return false;
    if (!(db.Execute("BEGIN IMMEDIATE") == SQLITE_OK))
        return false;
    if (!(db.Execute(kSchema) == SQLITE_OK) || !AddLaterColumns(db)) {
        db.Execute("ROLLBACK");
        return false;
    }
    return (db.Execute("COMMIT") == SQLITE_OK);
}

}  // namespace harmona::medialib
