// The library indexer: harmona-index over a share generated with sox and tagged with TagLib.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <utime.h>

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

struct Row {
    long long id = 0;
    std::map<std::string, std::string> columns;  // NULL is "<null>"
};

std::map<std::string, Row> TrackRows(const char* db = kLibraryDb) {
    std::map<std::string, Row> rows;
    sqlite3* handle = nullptr;
    if (sqlite3_open_v2(db, &handle, SQLITE_OPEN_READONLY, nullptr) != SQLITE_OK) {
        sqlite3_close(handle);
        return rows;
    }
    sqlite3_stmt* stmt = nullptr;
    sqlite3_prepare_v2(handle, "SELECT * FROM track", -1, &stmt, nullptr);
    while (stmt != nullptr && sqlite3_step(stmt) == SQLITE_ROW) {
        Row row;
        for (int i = 0; i < sqlite3_column_count(stmt); ++i) {
            const unsigned char* text = sqlite3_column_text(stmt, i);
            row.columns[sqlite3_column_name(stmt, i)] =
                text != nullptr ? reinterpret_cast<const char*>(text) : "<null>";
        }
        row.id = sqlite3_column_int64(stmt, 0);
        rows[row.columns["path"]] = row;
    }
    sqlite3_finalize(stmt);
    sqlite3_close(handle);
    return rows;
}

long long Scalar(const std::string& sql) {
    sqlite3* handle = nullptr;
    sqlite3_open_v2(kLibraryDb, &handle, SQLITE_OPEN_READONLY, nullptr);
    sqlite3_stmt* stmt = nullptr;
    long long value = -1;
    if (sqlite3_prepare_v2(handle, sql.c_str(), -1, &stmt, nullptr) == SQLITE_OK &&
        sqlite3_step(stmt) == SQLITE_ROW)
        value = sqlite3_column_int64(stmt, 0);
    sqlite3_finalize(stmt);
    sqlite3_close(handle);
    return value;
}

std::string SharePath(const std::string& relative) {
    return std::string(kShare) + "/" + relative;
}

void SetMtime(const std::string& path, time_t when) {
    struct utimbuf times {
        when, when
    };
    utime(path.c_str(), &times);
}

TEST(Indexer, IndexesEveryAudioFileOfTheShareWithItsTags) {
    MakeStandardShare();
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("files"), 5);
    EXPECT_EQ(run.counts.at("added"), 5);
    EXPECT_EQ(run.counts.at("tagreads"), 5);
    EXPECT_EQ(run.counts.at("broken"), 0);

    const auto rows = TrackRows();
    ASSERT_EQ(rows.size(), 5u);
    for (const auto& [relative, tags] : StandardShare()) {
        SCOPED_TRACE(relative);
        const auto found = rows.find(SharePath(relative));
        ASSERT_NE(found, rows.end());
        const auto& c = found->second.columns;
        EXPECT_EQ(c.at("title"), tags.title);
        EXPECT_EQ(c.at("artist"), tags.artist);
        EXPECT_EQ(c.at("album"), tags.album.empty() ? "<null>" : tags.album);
        EXPECT_EQ(c.at("album_artist"), tags.albumArtist.empty() ? "<null>" : tags.albumArtist);
        EXPECT_EQ(c.at("genre"), tags.genre);
        EXPECT_EQ(c.at("track_no"), tags.track ? std::to_string(tags.track) : "<null>");
        EXPECT_EQ(c.at("year"), tags.year ? std::to_string(tags.year) : "<null>");
        EXPECT_EQ(c.at("disc_no"), tags.disc ? std::to_string(tags.disc) : "<null>");
        EXPECT_GE(std::stol(c.at("duration_ms")), 250);  // 0.3 s tones
        EXPECT_LE(std::stol(c.at("duration_ms")), 600);  // MP3 frames pad it
        struct stat st {};
        ASSERT_EQ(stat(found->first.c_str(), &st), 0);
        EXPECT_EQ(c.at("mtime"), std::to_string(st.st_mtime));
        EXPECT_NE(c.at("added"), "<null>");
    }
    EXPECT_EQ(Scalar("PRAGMA user_version"), 1);
    EXPECT_EQ(Scalar("SELECT COUNT(*) FROM playlist"), 0);
    EXPECT_EQ(Scalar("SELECT COUNT(*) FROM playlist_entry"), 0);
}

TEST(Indexer, SecondRunOverAnUnchangedShareReadsNoTags) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const auto before = TrackRows();
    const IndexRun again = RunIndexer();
    ASSERT_EQ(again.exitStatus, 0) << again.output;
    EXPECT_EQ(again.counts.at("files"), 5);
    EXPECT_EQ(again.counts.at("tagreads"), 0);
    EXPECT_EQ(again.counts.at("added") + again.counts.at("updated") + again.counts.at("removed"),
              0);
    const auto after = TrackRows();
    ASSERT_EQ(after.size(), before.size());
    for (const auto& [path, row] : before)
        EXPECT_EQ(after.at(path).columns, row.columns) << path;
}

TEST(Indexer, ChangedFilesAreReReadAndMissingFilesRemoved) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const auto before = TrackRows();
    const std::string changed = SharePath("Jazz/Blue/04 Fourth.wav");
    Tags tags = StandardShare().at("Jazz/Blue/04 Fourth.wav");
    tags.title = "Fourth, remastered";
    WriteTags(changed, tags);
    SetMtime(changed, 1000000000);  // a different mtime for certain, whatever the clock says
    ASSERT_EQ(unlink(SharePath("loose.ogg").c_str()), 0);
    MakeAudioFile(SharePath("New/05 Fifth.flac"),
                  {"Fifth", "Newcomer", "Debut", "", "Pop", 0, 5, 0});

    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("added"), 1);
    EXPECT_EQ(run.counts.at("updated"), 1);
    EXPECT_EQ(run.counts.at("removed"), 1);
    EXPECT_EQ(run.counts.at("tagreads"), 2);
    const auto after = TrackRows();
    EXPECT_EQ(after.size(), 5u);
    EXPECT_EQ(after.count(SharePath("loose.ogg")), 0u);
    ASSERT_EQ(after.count(changed), 1u);
    EXPECT_EQ(after.at(changed).columns.at("title"), "Fourth, remastered");
    EXPECT_EQ(after.at(changed).columns.at("mtime"), "1000000000");
    // The row keeps its id and the time it was first seen.
    EXPECT_EQ(after.at(changed).id, before.at(changed).id);
    EXPECT_EQ(after.at(changed).columns.at("added"), before.at(changed).columns.at("added"));
    EXPECT_EQ(after.at(SharePath("New/05 Fifth.flac")).columns.at("title"), "Fifth");
}

TEST(Indexer, BrokenTagsAreIndexedByFileNameWithOneLogLineEach) {
    MakeStandardShare();
    WriteFile(SharePath("Broken/Not Really.flac"), "this is no FLAC stream at all");
    WriteFile(SharePath("Broken/Also Bad.ogg"), std::string(300, 'x'));
    TakeLogLines();
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("broken"), 2);
    const auto rows = TrackRows();
    EXPECT_EQ(rows.at(SharePath("Broken/Not Really.flac")).columns.at("title"), "Not Really");
    EXPECT_EQ(rows.at(SharePath("Broken/Also Bad.ogg")).columns.at("title"), "Also Bad");
    int brokenLines = 0;
    for (const LogLine& line : TakeLogLines(200)) {
        if (line.message.find("unreadable tags") != std::string::npos)
            ++brokenLines;
    }
    EXPECT_EQ(brokenLines, 2);
}

TEST(Indexer, PlaylistRowsAreNeverTouched) {
    MakeStandardShare();
    // An existing database made by the playlist platform's fixture writer, with shared playlists
    // and a track the share no longer has.
    MakeLibraryDb({{7, SharePath("gone.mp3"), "Gone", "Nobody", 1000}},
                  {{1, "Party"}, {4294967295LL, "Last"}});
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("removed"), 1);
    EXPECT_EQ(run.counts.at("added"), 5);
    EXPECT_EQ(Scalar("SELECT COUNT(*) FROM playlist"), 2);
    EXPECT_EQ(Scalar("SELECT COUNT(*) FROM playlist WHERE id = 4294967295 AND name = 'Last'"), 1);
    EXPECT_EQ(TrackRows().size(), 5u);
}

TEST(Indexer, OnlySupportedRegularFilesAreIndexedAndLinksAreNotFollowed) {
    MakeStandardShare();
    MakeDirs("/volume1/elsewhere");
    MakeAudioFile("/volume1/elsewhere/outside.mp3", {"Outside", "", "", "", "", 0, 0, 0});
    ASSERT_EQ(symlink("/volume1/elsewhere/outside.mp3", SharePath("link.mp3").c_str()), 0);
    ASSERT_EQ(symlink("/volume1/elsewhere", SharePath("linkdir").c_str()), 0);
    WriteFile(SharePath("cover.jpg"), "jpeg");
    WriteFile(SharePath("Song.MP3.part"), "partial");
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("files"), 5);
    for (const auto& [path, row] : TrackRows())
        EXPECT_EQ(path.compare(0, std::string(kShare).size() + 1, std::string(kShare) + "/"), 0)
            << path;
}

// A share writer swaps files of the share for links to a file only root may read, and back, over
// and over while the indexer (root) runs: the linked file's tags never reach the library.
TEST(Indexer, FilesSwappedForLinksDuringAPassNeverBringTheLinkedFilesTags) {
    constexpr int kFiles = 40;
    MakeDirs(SharePath("swap"));
    MakeDirs("/volume1/private");
    MakeAudioFile("/volume1/private/secret.mp3", {"SECRET TITLE", "Root", "", "", "", 0, 0, 0});
    chmod("/volume1/private/secret.mp3", 0600);
    std::vector<std::string> paths;
    for (int i = 0; i < kFiles; ++i) {
        const std::string path = SharePath("swap/" + std::to_string(i) + ".mp3");
        MakeAudioFile(path, {"Share " + std::to_string(i), "Writer", "", "", "", 0, 0, 0});
        // A hidden hard link keeps the real file for the swaps back (the walk skips it).
        ASSERT_EQ(link(path.c_str(), (path + ".keep").insert(path.rfind('/') + 1, ".").c_str()), 0);
        paths.push_back(path);
    }
    std::atomic<bool> stop{false};
    std::atomic<long> swaps{0};
    std::thread swapper([&] {
        while (!stop) {
            for (const std::string& path : paths) {
                const std::string folder = path.substr(0, path.rfind('/') + 1);
                const std::string name = path.substr(path.rfind('/') + 1);
                const std::string tmpLink = folder + ".l" + name;
                const std::string tmpReal = folder + ".r" + name;
                unlink(tmpLink.c_str());
                unlink(tmpReal.c_str());
                if (symlink("/volume1/private/secret.mp3", tmpLink.c_str()) == 0)
                    rename(tmpLink.c_str(), path.c_str());
                if (link((folder + "." + name + ".keep").c_str(), tmpReal.c_str()) == 0)
                    rename(tmpReal.c_str(), path.c_str());
                ++swaps;
            }
        }
    });
    // Passes over a fresh library (every file read) for at most 20 s.
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    int passes = 0;
    long shareTitles = 0;
    std::vector<std::string> leaked;
    while (passes < 30 && std::chrono::steady_clock::now() < deadline) {
        for (const char* suffix : {"", "-wal", "-shm"})
            unlink((std::string(kLibraryDb) + suffix).c_str());
        const IndexRun run = RunIndexer();
        ++passes;
        TakeLogLines();  // the log socket holds only so many lines
        ASSERT_EQ(run.exitStatus, 0) << run.output;
        for (const auto& [path, row] : TrackRows()) {
            const std::string& title = row.columns.at("title");
            if (title == "SECRET TITLE" || row.columns.at("artist") == "Root")
                leaked.push_back(path);
            shareTitles += title.rfind("Share ", 0) == 0 ? 1 : 0;
        }
    }
    stop = true;
    swapper.join();
    EXPECT_GT(swaps.load(), kFiles);
    EXPECT_GT(shareTitles, 0) << "no file was ever indexed with its own tags";
    EXPECT_TRUE(leaked.empty()) << leaked.size() << " row(s) carry the linked file's tags in "
                                << passes << " passes, first " << leaked.front();
}

TEST(Indexer, RenamedFilesAndFoldersKeepTheirTrackIds) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const auto before = TrackRows();
    ASSERT_EQ(before.size(), 5u);
    ASSERT_EQ(rename(SharePath("loose.ogg").c_str(), SharePath("Loose One.ogg").c_str()), 0);
    ASSERT_EQ(rename(SharePath("Jazz/Blue").c_str(), SharePath("Jazz/Blue Note").c_str()), 0);
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("added"), 0) << run.output;
    EXPECT_EQ(run.counts.at("removed"), 0) << run.output;
    EXPECT_EQ(run.counts.at("moved"), 3) << run.output;
    EXPECT_EQ(run.counts.at("tagreads"), 0) << run.output;
    const auto after = TrackRows();
    ASSERT_EQ(after.size(), 5u);
    const std::pair<const char*, const char*> moves[] = {
        {"loose.ogg", "Loose One.ogg"},
        {"Jazz/Blue/Late/03 Third.mp3", "Jazz/Blue Note/Late/03 Third.mp3"},
        {"Jazz/Blue/04 Fourth.wav", "Jazz/Blue Note/04 Fourth.wav"},
        {"Rock/Alpha & Omega/01 First.flac", "Rock/Alpha & Omega/01 First.flac"}};
    for (const auto& [from, to] : moves) {
        SCOPED_TRACE(to);
        ASSERT_TRUE(after.count(SharePath(to)));
        EXPECT_EQ(after.at(SharePath(to)).id, before.at(SharePath(from)).id);
        EXPECT_EQ(after.at(SharePath(to)).columns.at("title"),
                  before.at(SharePath(from)).columns.at("title"));
    }
}

TEST(Indexer, TheShareOfAudioConfIsScanned) {
    MakeAudioFile("/volume1/other/a.flac", {"Other A", "", "", "", "", 0, 0, 0});
    WriteFile(kAudioConf, "audio_share_path=/volume1/other\n");
    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    const auto rows = TrackRows();
    ASSERT_EQ(rows.size(), 1u);
    EXPECT_EQ(rows.begin()->first, "/volume1/other/a.flac");
}

TEST(Indexer, AMissingShareFailsAndLeavesTheLibraryAsItWas) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    WriteFile(kAudioConf, "audio_share_path=/volume1/unmounted\n");
    const IndexRun run = RunIndexer();
    EXPECT_EQ(run.exitStatus, 1);
    EXPECT_EQ(TrackRows().size(), 5u);
}

TEST(Indexer, RecordsEachFilesSizeAndTheBestCoverImageOfItsFolder) {
    MakeStandardShare();
    WriteFile(SharePath("Rock/Alpha & Omega/folder.png"), "png");
    WriteFile(SharePath("Rock/Alpha & Omega/COVER.jpg"), "jpeg");
    WriteFile(SharePath("Rock/Alpha & Omega/booklet.jpg"), "not a cover name");
    WriteFile(SharePath("Jazz/Blue/front.jpeg"), "jpeg");
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const auto rows = TrackRows();
    for (const auto& [path, row] : rows) {
        struct stat st {};
        ASSERT_EQ(stat(path.c_str(), &st), 0);
        EXPECT_EQ(row.columns.at("size"), std::to_string(st.st_size)) << path;
    }
    EXPECT_EQ(rows.at(SharePath("Rock/Alpha & Omega/01 First.flac")).columns.at("art_path"),
              SharePath("Rock/Alpha & Omega/COVER.jpg"));
    EXPECT_EQ(rows.at(SharePath("Jazz/Blue/04 Fourth.wav")).columns.at("art_path"),
              SharePath("Jazz/Blue/front.jpeg"));
    // A cover belongs to its own folder only.
    EXPECT_EQ(rows.at(SharePath("Jazz/Blue/Late/03 Third.mp3")).columns.at("art_path"), "<null>");
    EXPECT_EQ(rows.at(SharePath("loose.ogg")).columns.at("art_path"), "<null>");
}

TEST(Indexer, TheUpdateCountMovesOnlyWithARunThatChangedTheLibrary) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    EXPECT_EQ(Scalar("SELECT MAX(id) FROM library_update"), 1);
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    EXPECT_EQ(Scalar("SELECT MAX(id) FROM library_update"), 1);
    // A new cover image is a change without a tag read.
    WriteFile(SharePath("Jazz/Blue/cover.jpg"), "jpeg");
    const IndexRun cover = RunIndexer();
    ASSERT_EQ(cover.exitStatus, 0);
    EXPECT_EQ(cover.counts.at("tagreads"), 0);
    EXPECT_EQ(Scalar("SELECT MAX(id) FROM library_update"), 2);
    ASSERT_EQ(unlink(SharePath("loose.ogg").c_str()), 0);
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    EXPECT_EQ(Scalar("SELECT MAX(id) FROM library_update"), 3);
    EXPECT_EQ(Scalar("SELECT COUNT(*) FROM library_update"), 1);
}

TEST(Indexer, AnIndexOfAnOlderIndexerGetsTheNewColumnsWithoutATagRead) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const auto before = TrackRows();
    // The same rows in the first release's schema: no size, no art_path, no update count.
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(kLibraryDb, &db), SQLITE_OK);
    const char* downgrade =
        "CREATE TABLE old_track (id INTEGER PRIMARY KEY, path TEXT NOT NULL UNIQUE, title TEXT, "
        "artist TEXT, album TEXT, album_artist TEXT, genre TEXT, year INTEGER, track_no "
        "INTEGER, disc_no INTEGER, duration_ms INTEGER, mtime INTEGER, added INTEGER); "
        "INSERT INTO old_track SELECT id, path, title, artist, album, album_artist, genre, year, "
        "track_no, disc_no, duration_ms, mtime, added FROM track; DROP TABLE track; "
        "DROP TABLE library_update; ALTER TABLE old_track RENAME TO track;";
    ASSERT_EQ(sqlite3_exec(db, downgrade, nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(db);
    sqlite3_close(db);

    const IndexRun run = RunIndexer();
    ASSERT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_EQ(run.counts.at("tagreads"), 0);
    const auto after = TrackRows();
    ASSERT_EQ(after.size(), before.size());
    for (const auto& [path, row] : before) {
        EXPECT_EQ(after.at(path).columns.at("size"), row.columns.at("size")) << path;
        EXPECT_EQ(after.at(path).columns.at("title"), row.columns.at("title")) << path;
        EXPECT_EQ(after.at(path).id, row.id) << path;
    }
    EXPECT_GE(Scalar("SELECT MAX(id) FROM library_update"), 1);
}

}  // namespace
}  // namespace harmona::test::mediad
