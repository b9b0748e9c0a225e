#include "platform/medialib/LibrarySchema.h"

#include <string>
#include <string_view>
#include <utility>

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

// The search index: the words of every track's title, artist, album and genre (track_search), and
// one row per album as the media server groups them (name and album artist, the track's artist
// when it has none) with the words of both (search_album, search_album_text). Triggers on the
// track table keep all three in step with every insert, change and removal of a track, whoever
// writes it; a move (a new path) changes no word and touches none of them.
constexpr const char* kAlbumArtistOfNew = "COALESCE(NULLIF(new.album_artist, ''), new.artist, '')";
// The lengths of word beginnings that the full-text indexes keep lists for. The page searches
// as the user types, every word a beginning; a beginning of another length is found by merging
// the lists of every word that starts so, which for a word as common as "album" in a large
// library cost 6 ms a query. Up to six characters covers nearly every word being typed, for
// about 40% more index (8.5 MB at 100,000 tracks of the benchmark's words).
constexpr const char* kSearchPrefixes = "1 2 3 4 5 6";
constexpr const char* kSearchSchema = R"SQL(
DROP TRIGGER IF EXISTS track_search_insert;
DROP TRIGGER IF EXISTS track_search_change;
DROP TRIGGER IF EXISTS track_search_delete;
DROP TRIGGER IF EXISTS search_album_insert;
DROP TRIGGER IF EXISTS search_album_delete;
DROP TABLE IF EXISTS track_search;
DROP TABLE IF EXISTS search_album_text;
DROP TABLE IF EXISTS search_album;
CREATE VIRTUAL TABLE track_search USING fts5(
  title, artist, album, genre, content='track', content_rowid='id',
  tokenize='unicode61 remove_diacritics 2', prefix='@PREFIXES@'
);
CREATE TABLE search_album (
  id INTEGER PRIMARY KEY, album TEXT NOT NULL, artist TEXT NOT NULL, tracks INTEGER NOT NULL,
  UNIQUE (album, artist)
);
CREATE INDEX search_album_artist ON search_album(artist);
CREATE VIRTUAL TABLE search_album_text USING fts5(
  album, artist, content='search_album', content_rowid='id',
  tokenize='unicode61 remove_diacritics 2', prefix='@PREFIXES@'
);
INSERT INTO track_search (track_search) VALUES ('rebuild');
INSERT INTO search_album (album, artist, tracks)
  SELECT album, COALESCE(NULLIF(album_artist, ''), artist, ''), COUNT(*) FROM track
  WHERE album <> '' GROUP BY 1, 2;
INSERT INTO search_album_text (search_album_text) VALUES ('rebuild');
CREATE TRIGGER search_album_insert AFTER INSERT ON search_album BEGIN
  INSERT INTO search_album_text (rowid, album, artist) VALUES (new.id, new.album, new.artist);
END;
CREATE TRIGGER search_album_delete AFTER DELETE ON search_album BEGIN
  INSERT INTO search_album_text (search_album_text, rowid, album, artist)
    VALUES ('delete', old.id, old.album, old.artist);
END;
CREATE TRIGGER track_search_insert AFTER INSERT ON track BEGIN
  INSERT INTO track_search (rowid, title, artist, album, genre)
    VALUES (new.id, new.title, new.artist, new.album, new.genre);
  INSERT INTO search_album (album, artist, tracks)
    SELECT new.album, @NEW@, 1 WHERE new.album <> ''
    ON CONFLICT (album, artist) DO UPDATE SET tracks = tracks + 1;
END;
CREATE TRIGGER track_search_change AFTER UPDATE OF id, title, artist, album, album_artist, genre
ON track BEGIN
  INSERT INTO track_search (track_search, rowid, title, artist, album, genre)
    VALUES ('delete', old.id, old.title, old.artist, old.album, old.genre);
  UPDATE search_album SET tracks = tracks - 1 WHERE album = old.album AND artist = @OLD@;
  DELETE FROM search_album WHERE album = old.album AND artist = @OLD@ AND tracks <= 0;
  INSERT INTO track_search (rowid, title, artist, album, genre)
    VALUES (new.id, new.title, new.artist, new.album, new.genre);
  INSERT INTO search_album (album, artist, tracks)
    SELECT new.album, @NEW@, 1 WHERE new.album <> ''
    ON CONFLICT (album, artist) DO UPDATE SET tracks = tracks + 1;
END;
CREATE TRIGGER track_search_delete AFTER DELETE ON track BEGIN
  INSERT INTO track_search (track_search, rowid, title, artist, album, genre)
    VALUES ('delete', old.id, old.title, old.artist, old.album, old.genre);
  UPDATE search_album SET tracks = tracks - 1 WHERE album = old.album AND artist = @OLD@;
  DELETE FROM search_album WHERE album = old.album AND artist = @OLD@ AND tracks <= 0;
END;
)SQL";

std::string SearchSchema() {
    std::string sql = kSearchSchema;
    const std::string albumArtistOfNew = kAlbumArtistOfNew;
    std::string albumArtistOfOld = albumArtistOfNew;
    for (std::size_t at = 0; (at = albumArtistOfOld.find("new.", at)) != std::string::npos;)
        albumArtistOfOld.replace(at, 4, "old.");
    for (const auto& [mark, text] : {std::pair<std::string, std::string>{"@NEW@", albumArtistOfNew},
                                     {"@OLD@", albumArtistOfOld},
                                     {"@PREFIXES@", kSearchPrefixes}}) {
        for (std::size_t at = 0; (at = sql.find(mark, at)) != std::string::npos; at += text.size())
            sql.replace(at, mark.size(), text);
    }
    return sql;
}

bool HasSchemaObject(Database& db, const char* type, const char* name) {
    Statement stmt = db.Prepare("SELECT 1 FROM sqlite_master WHERE type = ?1 AND name = ?2");
    return stmt && stmt.Bind(1, std::string_view(type)) == SQLITE_OK &&
           stmt.Bind(2, std::string_view(name)) == SQLITE_OK && stmt.Step() == SQLITE_ROW;
}

// Whether full-text table `name` keeps the beginnings of words of kSearchPrefixes' lengths.
bool HasSearchPrefixes(Database& db, const char* name) {
    Statement stmt = db.Prepare("SELECT sql FROM sqlite_master WHERE type = 'table' AND name = ?1");
    if (!stmt || stmt.Bind(1, std::string_view(name)) != SQLITE_OK || stmt.Step() != SQLITE_ROW)
        return false;
    const std::string wanted = std::string("prefix='") + kSearchPrefixes + "'";
    return stmt.ColumnText(0).find(wanted) != std::string_view::npos;
}

// The search index is made (and filled from the track table) when one of its parts is missing:
// a library of an indexer that had none gets it once, without reading a tag, and an index left
// without its triggers (the track table made anew by hand) is made again rather than trusted.
// An index of other word beginnings (an older indexer's) is made again the same way.
bool EnsureSearchIndex(Database& db) {
    if (!HasSearchPrefixes(db, "track_search") || !HasSearchPrefixes(db, "search_album_text"))
        return db.Execute(SearchSchema().c_str()) == SQLITE_OK;
    for (const auto& [type, name] : {std::pair<const char*, const char*>{"table", "track_search"},
                                     {"table", "search_album"},
                                     {"table", "search_album_text"},
                                     {"index", "search_album_artist"},
                                     {"trigger", "track_search_insert"},
                                     {"trigger", "track_search_change"},
                                     {"trigger", "track_search_delete"},
                                     {"trigger", "search_album_insert"},
                                     {"trigger", "search_album_delete"}}) {
        if (!HasSchemaObject(db, type, name))
            return db.Execute(SearchSchema().c_str()) == SQLITE_OK;
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
    if (!(db.Execute(kSchema) == SQLITE_OK) || !AddLaterColumns(db) || !EnsureSearchIndex(db)) {
        db.Execute("ROLLBACK");
        return false;
    }
    return (db.Execute("COMMIT") == SQLITE_OK);
}

}  // namespace harmona::medialib
