// The search index of library.db as harmona-index keeps it: every added, re-read, removed and
// moved file is found by its words as the track table holds them, and a library of an indexer
// that had no search index gets one on the next run without a tag read.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <utime.h>

#include <cstdio>
#include <string>

#include "tests/harness/PlaylistFixtures.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

// The paths of the tracks whose words begin with every word of `match` (full-text syntax), in
// path order; "<error: ...>" when the query fails.
std::string Found(const std::string& match, const char* table = "track_search") {
    sqlite3* db = nullptr;
    std::string found;
    if (sqlite3_open_v2(kLibraryDb, &db, SQLITE_OPEN_READONLY, nullptr) != SQLITE_OK) {
        sqlite3_close(db);
        return "<error: no library>";
    }
    const std::string sql = std::string("SELECT t.path FROM ") + table +
                            " s JOIN track t ON t.id = s.rowid WHERE " + table +
                            " MATCH ?1 ORDER BY t.path";
    sqlite3_stmt* stmt = nullptr;
    if (sqlite3_prepare_v2(db, sql.c_str(), -1, &stmt, nullptr) != SQLITE_OK) {
        found = std::string("<error: ") + sqlite3_errmsg(db) + ">";
    } else {
        sqlite3_bind_text(stmt, 1, match.c_str(), -1, SQLITE_TRANSIENT);
        while (sqlite3_step(stmt) == SQLITE_ROW) {
            std::string path = reinterpret_cast<const char*>(sqlite3_column_text(stmt, 0));
            found += (found.empty() ? "" : " ") + path.substr(std::string(kShare).size() + 1);
        }
    }
    sqlite3_finalize(stmt);
    sqlite3_close(db);
    return found;
}

// The albums of the search index: "name/album artist=tracks", in name order.
std::string Albums() {
    sqlite3* db = nullptr;
    std::string albums;
    sqlite3_open_v2(kLibraryDb, &db, SQLITE_OPEN_READONLY, nullptr);
    sqlite3_stmt* stmt = nullptr;
    if (sqlite3_prepare_v2(db, "SELECT album, artist, tracks FROM search_album ORDER BY 1, 2", -1,
                           &stmt, nullptr) == SQLITE_OK) {
        while (sqlite3_step(stmt) == SQLITE_ROW)
            albums += std::string(albums.empty() ? "" : " ") +
                      reinterpret_cast<const char*>(sqlite3_column_text(stmt, 0)) + "/" +
                      reinterpret_cast<const char*>(sqlite3_column_text(stmt, 1)) + "=" +
                      std::to_string(sqlite3_column_int64(stmt, 2));
    } else {
        albums = std::string("<error: ") + sqlite3_errmsg(db) + ">";
    }
    sqlite3_finalize(stmt);
    sqlite3_close(db);
    return albums;
}

bool IndexIntact() {
    sqlite3* db = nullptr;
    sqlite3_open(kLibraryDb, &db);
    const bool intact =
        sqlite3_exec(db,
                     "INSERT INTO track_search (track_search) VALUES ('integrity-check');"
                     "INSERT INTO search_album_text (search_album_text) VALUES "
                     "('integrity-check')",
                     nullptr, nullptr, nullptr) == SQLITE_OK;
    sqlite3_close(db);
    return intact;
}

std::string SharePath(const std::string& relative) {
    return std::string(kShare) + "/" + relative;
}

TEST(SearchIndex, EveryIndexedFileIsFoundByTheWordsOfItsTags) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    EXPECT_EQ(Found("\"fir\"*"), "Rock/Alpha & Omega/01 First.flac");
    EXPECT_EQ(Found("\"band\"* \"alp\"*"),
              "Rock/Alpha & Omega/01 First.flac Rock/Alpha & Omega/02 Second.ogg");
    EXPECT_EQ(Found("\"jazz\"*"), "Jazz/Blue/04 Fourth.wav Jazz/Blue/Late/03 Third.mp3");
    EXPECT_EQ(Found("\"zulu\""), "loose.ogg");
    EXPECT_EQ(Albums(), "Alpha & Omega/Band A=2 Blue/Trio=2");
    EXPECT_TRUE(IndexIntact());
}

TEST(SearchIndex, ReReadRemovedAndAddedFilesAreFollowed) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const std::string changed = SharePath("Jazz/Blue/04 Fourth.wav");
    Tags tags = StandardShare().at("Jazz/Blue/04 Fourth.wav");
    tags.title = "Quartet";
    tags.album = "Green";
    WriteTags(changed, tags);
    struct utimbuf times {
        1000000000, 1000000000
    };
    utime(changed.c_str(), &times);
    ASSERT_EQ(std::remove(SharePath("loose.ogg").c_str()), 0);
    MakeAudioFile(SharePath("New/05 Fifth.flac"),
                  {"Fifth", "Newcomer", "Debut", "", "Pop", 0, 5, 0});

    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    ASSERT_EQ(run.counts.at("updated"), 1) << run.output;
    EXPECT_EQ(Found("\"fourth\"*"), "");
    EXPECT_EQ(Found("\"quar\"*"), "Jazz/Blue/04 Fourth.wav");
    EXPECT_EQ(Found("\"zulu\"*"), "");
    EXPECT_EQ(Found("\"newc\"*"), "New/05 Fifth.flac");
    EXPECT_EQ(Albums(), "Alpha & Omega/Band A=2 Blue/Trio=1 Debut/Newcomer=1 Green/Trio=1");
    EXPECT_TRUE(IndexIntact());
}

TEST(SearchIndex, MovedFilesAreFoundAtTheirNewPlaces) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    ASSERT_EQ(std::rename(SharePath("Jazz/Blue").c_str(), SharePath("Jazz/Blue Note").c_str()), 0);
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    ASSERT_EQ(run.counts.at("moved"), 2) << run.output;
    EXPECT_EQ(Found("\"trio\"*"), "Jazz/Blue Note/04 Fourth.wav Jazz/Blue Note/Late/03 Third.mp3");
    EXPECT_EQ(Albums(), "Alpha & Omega/Band A=2 Blue/Trio=2");
    EXPECT_TRUE(IndexIntact());
}

TEST(SearchIndex, ALibraryWithoutASearchIndexGetsOneWithoutATagRead) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(kLibraryDb, &db), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(db,
                           "DROP TRIGGER track_search_insert; DROP TRIGGER track_search_change; "
                           "DROP TRIGGER track_search_delete; DROP TABLE track_search; "
                           "DROP TABLE search_album_text; DROP TABLE search_album",
                           nullptr, nullptr, nullptr),
              SQLITE_OK)
        << sqlite3_errmsg(db);
    sqlite3_close(db);
    EXPECT_NE(Found("\"trio\"*").find("<error"), std::string::npos);

    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("tagreads"), 0);
    EXPECT_EQ(Found("\"trio\"*"), "Jazz/Blue/04 Fourth.wav Jazz/Blue/Late/03 Third.mp3");
    EXPECT_EQ(Albums(), "Alpha & Omega/Band A=2 Blue/Trio=2");
    EXPECT_TRUE(IndexIntact());
}

// The lengths of word beginnings that full-text table `name` keeps ("" when it has none).
std::string Prefixes(const char* name) {
    sqlite3* db = nullptr;
    std::string sql;
    sqlite3_open_v2(kLibraryDb, &db, SQLITE_OPEN_READONLY, nullptr);
    sqlite3_stmt* stmt = nullptr;
    if (sqlite3_prepare_v2(db, "SELECT sql FROM sqlite_master WHERE name = ?1", -1, &stmt,
                           nullptr) == SQLITE_OK) {
        sqlite3_bind_text(stmt, 1, name, -1, SQLITE_TRANSIENT);
        if (sqlite3_step(stmt) == SQLITE_ROW)
            sql = reinterpret_cast<const char*>(sqlite3_column_text(stmt, 0));
    }
    sqlite3_finalize(stmt);
    sqlite3_close(db);
    const std::size_t at = sql.find("prefix='");
    return at == std::string::npos ? "" : sql.substr(at + 8, sql.find('\'', at + 8) - at - 8);
}

TEST(SearchIndex, AnIndexOfShorterWordBeginningsIsMadeAgainWithoutATagRead) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    EXPECT_EQ(Prefixes("track_search"), "1 2 3 4 5 6");
    EXPECT_EQ(Prefixes("search_album_text"), "1 2 3 4 5 6");
    // The track index as an older indexer made it: beginnings of up to three characters.
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(kLibraryDb, &db), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(db,
                           "DROP TABLE track_search; CREATE VIRTUAL TABLE track_search USING "
                           "fts5(title, artist, album, genre, content='track', "
                           "content_rowid='id', tokenize='unicode61 remove_diacritics 2', "
                           "prefix='1 2 3'); INSERT INTO track_search (track_search) "
                           "VALUES ('rebuild')",
                           nullptr, nullptr, nullptr),
              SQLITE_OK)
        << sqlite3_errmsg(db);
    sqlite3_close(db);
    ASSERT_EQ(Prefixes("track_search"), "1 2 3");

    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("tagreads"), 0);
    EXPECT_EQ(Prefixes("track_search"), "1 2 3 4 5 6");
    EXPECT_EQ(Found("\"trio\"*"), "Jazz/Blue/04 Fourth.wav Jazz/Blue/Late/03 Third.mp3");
    EXPECT_EQ(Albums(), "Alpha & Omega/Band A=2 Blue/Trio=2");
    EXPECT_TRUE(IndexIntact());
}

}  // namespace
}  // namespace harmona::test::mediad
