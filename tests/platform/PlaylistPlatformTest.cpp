// The platform's playlist calls (platform/README.md, "Music library database and random-100
// playlist" and "Playlists and smart playlists") over real files and real SQLite
// databases: personal and shared playlist lists, the smart playlist enumerator, the random
// playlist generator.
#include <dirent.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <map>
#include <set>

#include "platform/lib/sqlite/Database.h"
#include "platform/playlist/AudioFile.h"
#include "platform/playlist/PlaylistList.h"
#include "platform/playlist/VanuAudioUtils.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona::test;

namespace {

struct Listed {
    int result = 0;
    std::vector<std::pair<std::uint32_t, std::string>> records;
};

Listed Collect(int result, PLAYLIST_INFO* head) {
    Listed listed;
    listed.result = result;
    for (const PLAYLIST_INFO* r = head; r != nullptr; r = r->pNext)
        listed.records.emplace_back(r->id, r->szName);
    VANUPlayListFree(head);
    return listed;
}

Listed Personal(const std::string& user, int offset = 0, int limit = 0) {
    PLAYLIST_INFO* head = reinterpret_cast<PLAYLIST_INFO*>(0x1);  // must be overwritten
    const int result =
        VANUPersonalPlaylistListAll(PreferenceDir(user).c_str(), &head, offset, limit);
    return Collect(result, head);
}

Listed Shared(int offset = 0, int limit = 0) {
    PLAYLIST_INFO* head = reinterpret_cast<PLAYLIST_INFO*>(0x1);
    const int result = VANUPlaylistListAll(&head, offset, limit, 0);
    return Collect(result, head);
}

using Records = std::vector<std::pair<std::uint32_t, std::string>>;

TEST(PersonalPlaylistList, PlaylistFilesInByteOrderWithIdsFromOne) {
    for (const char* name : {"b.m3u", "B.M3U8", "a.m3u8", "\xC3\xA4lter.m3u", "Zed.M3u",
                             "x.m3u.bak", "notes.txt", "m3u", "dotless_m3u", "smart.playlist"})
        WritePersonalPlaylistFile("alice", name);
    const Listed listed = Personal("alice");
    EXPECT_EQ(listed.result, 0);
    EXPECT_EQ(listed.records,
              (Records{{1, "B"}, {2, "Zed"}, {3, "a"}, {4, "b"}, {5, "\xC3\xA4lter"}}));
}

TEST(PersonalPlaylistList, OnlyRegularFilesCount) {
    WritePersonalPlaylistFile("alice", "real.m3u");
    MakeDirs(PersonalPlaylistDir("alice") + "/folder.m3u");
    ASSERT_EQ(symlink("real.m3u", (PersonalPlaylistDir("alice") + "/linked.m3u").c_str()), 0);
    ASSERT_EQ(symlink("gone.m3u", (PersonalPlaylistDir("alice") + "/dangling.m3u").c_str()), 0);
    ASSERT_EQ(mkfifo((PersonalPlaylistDir("alice") + "/pipe.m3u").c_str(), 0644), 0);
    EXPECT_EQ(Personal("alice").records, (Records{{1, "linked"}, {2, "real"}}));
}

TEST(PersonalPlaylistList, MissingFoldersGiveAnEmptyListAndUnreadableOnesMinusOne) {
    Listed listed = Personal("nobody");  // no preference folder at all
    EXPECT_EQ(listed.result, 0);
    EXPECT_TRUE(listed.records.empty());
    MakeDirs(PreferenceDir("nobody"));  // no playlists folder
    listed = Personal("nobody");
    EXPECT_EQ(listed.result, 0);
    EXPECT_TRUE(listed.records.empty());

    WriteFile(PersonalPlaylistDir("filed"), "a file");
    EXPECT_EQ(Personal("filed").result, -1);

    PLAYLIST_INFO* head = nullptr;
    EXPECT_EQ(VANUPersonalPlaylistListAll(nullptr, &head, 0, 0), -1);
    EXPECT_EQ(VANUPersonalPlaylistListAll("/usr/vanu", nullptr, 0, 0), -1);
}

TEST(PersonalPlaylistList, OffsetAndLimitSelectAWindowKeepingIds) {
    for (const char* name : {"a.m3u", "b.m3u", "c.m3u", "d.m3u"})
        WritePersonalPlaylistFile("alice", name);
    EXPECT_EQ(Personal("alice", 1, 2).records, (Records{{2, "b"}, {3, "c"}}));
    EXPECT_EQ(Personal("alice", 3, 0).records, (Records{{4, "d"}}));
    EXPECT_TRUE(Personal("alice", 9, 0).records.empty());
}

TEST(SharedPlaylistList, RowsOrderedByNameIgnoringAsciiCaseThenId) {
    MakeLibraryDb({},
                  {{5, "b"}, {2, "B"}, {9, "a"}, {1, "\xC3\x89t\xC3\xA9"}, {3, "_x"}, {4, "A"}});
    const Listed listed = Shared();
    EXPECT_EQ(listed.result, 0);
    EXPECT_EQ(
        listed.records,
        (Records{{3, "_x"}, {4, "A"}, {9, "a"}, {2, "B"}, {5, "b"}, {1, "\xC3\x89t\xC3\xA9"}}));
    EXPECT_EQ(Shared(2, 2).records, (Records{{9, "a"}, {2, "B"}}));
}

TEST(SharedPlaylistList, MissingDatabaseIsEmptyAndAnythingElseUnusableIsMinusOne) {
    Listed listed = Shared();
    EXPECT_EQ(listed.result, 0);
    EXPECT_TRUE(listed.records.empty());

    WriteFile(kLibraryDb, "");  // an empty file is an empty database: no playlist table
    EXPECT_EQ(Shared().result, -1);
    WriteFile(kLibraryDb, std::string(3000, 'q'));
    EXPECT_EQ(Shared().result, -1);
    unlink(kLibraryDb);
    MakeDirs(kLibraryDb);
    EXPECT_EQ(Shared().result, -1);
    rmdir(kLibraryDb);
    ASSERT_EQ(mkfifo(kLibraryDb, 0644), 0);
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(Shared().result, -1);  // refused without opening it, so it cannot block
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
}

TEST(SharedPlaylistList, RowsThatBreakTheSchemaAreLeftOut) {
    MakeDirs("/var/packages/Harmona/var");
    harmona::sqlite::Database db = harmona::sqlite::Database::Open(
        kLibraryDb, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 1000);
    ASSERT_TRUE(db);
    ASSERT_EQ(db.Execute("CREATE TABLE playlist (id, name);"
                         "INSERT INTO playlist VALUES (-1, 'negative'), (4294967296, 'too big'),"
                         "('7', 'text id'), (2.5, 'real id'), (8, NULL), (9, 'fine');"),
              SQLITE_OK);
    EXPECT_EQ(Shared().records, (Records{{8, ""}, {9, "fine"}}));
}

TEST(SharedPlaylistList, WriterHoldingTheDatabaseForASecondDelaysButDoesNotFail) {
    MakeLibraryDb({}, {{1, "one"}});
    DatabaseWriterLock writer(kLibraryDb, 1000);
    ASSERT_TRUE(writer.Locked());
    const auto start = std::chrono::steady_clock::now();
    const Listed listed = Shared();
    EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(500));
    EXPECT_EQ(listed.result, 0);
    EXPECT_EQ(listed.records, (Records{{1, "one"}}));
}

TEST(SmartPlaylistEnumeration, EveryNonEmptySectionNameInFileOrderWithDuplicates) {
    WriteFile("/tmp/smart",
              "\xEF\xBB\xBF[zeta]\r\nrule=1\r\n\r\n[]\n# [comment]\n[Alpha]\n[zeta]\n"
              "key=[not a section]\n  [ spaced ]  \n[last]");
    int total = -1;
    EXPECT_EQ(VanuAudioUtils::SmartPLSEnum(0, 0, total, "/tmp/smart"),
              (std::vector<std::string>{"zeta", "Alpha", "zeta", " spaced ", "last"}));
    EXPECT_EQ(total, 5);
    EXPECT_EQ(VanuAudioUtils::SmartPLSEnum(1, 2, total, "/tmp/smart"),
              (std::vector<std::string>{"Alpha", "zeta"}));
    EXPECT_EQ(total, 5);
}

TEST(SmartPlaylistEnumeration, NullPathReadsTheSharedFileMissingOrUnreadableGiveNothing) {
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"shared one", "shared two"});
    int total = 0;
    EXPECT_EQ(VanuAudioUtils::SmartPLSEnum(0, 0, total, nullptr),
              (std::vector<std::string>{"shared one", "shared two"}));
    EXPECT_EQ(total, 2);
    EXPECT_TRUE(VanuAudioUtils::SmartPLSEnum(0, 0, total, "/tmp/none").empty());
    EXPECT_EQ(total, 0);
    MakeDirs("/tmp/folder");
    EXPECT_TRUE(VanuAudioUtils::SmartPLSEnum(0, 0, total, "/tmp/folder").empty());
    ASSERT_EQ(mkfifo("/tmp/fifo", 0644), 0);
    EXPECT_TRUE(VanuAudioUtils::SmartPLSEnum(0, 0, total, "/tmp/fifo").empty());
}

// Draws with harmona::playlist::CreateRandomPlaylist over the database at `db`.
M3uFile Draw(int count, const char* out = "/tmp/random.m3u") {
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, out, count), 1);
    return ParseExtendedM3u(ReadFile(out));
}

std::set<std::string> DistinctPaths(const M3uFile& file) {
    std::set<std::string> paths;
    for (const M3uEntry& e : file.entries)
        paths.insert(e.path);
    return paths;
}

TEST(RandomPlaylistFile, DenseLargeLibraryIsSampledByRowid) {
    MakeGeneratedLibrary(20000);  // an id range too wide to read whole
    const M3uFile file = Draw(100);
    ASSERT_TRUE(file.valid);
    EXPECT_EQ(file.entries.size(), 100u);
    EXPECT_EQ(DistinctPaths(file).size(), 100u);
}

TEST(RandomPlaylistFile, VerySparseIdsFallBackToAScan) {
    MakeGeneratedLibrary(500, {}, 1, 1000003);  // ids 1, 1000004, ...: one in a million hits
    const M3uFile file = Draw(100);
    ASSERT_TRUE(file.valid);
    EXPECT_EQ(DistinctPaths(file).size(), 100u);

    MakeGeneratedLibrary(40, {}, -5000000000000ll, 250000000000ll);  // fewer than asked, sparse
    const M3uFile all = Draw(100);
    EXPECT_EQ(DistinctPaths(all).size(), 40u);
}

TEST(RandomPlaylistFile, WidestRowidRangeDoesNotOverflow) {
    MakeLibraryDb(
        {{INT64_MIN, "/m/low.mp3", "t", "a", 1000}, {INT64_MAX, "/m/high.mp3", "t", "a", 1000}});
    EXPECT_EQ(DistinctPaths(Draw(100)), (std::set<std::string>{"/m/low.mp3", "/m/high.mp3"}));
}

// Each track of a library of `tracks` (ids spaced by `step`) should be drawn about equally often.
void ExpectEvenDraws(std::int64_t tracks, std::int64_t step, int count, int rounds) {
    MakeGeneratedLibrary(tracks, {}, 1, step);
    std::int64_t lowHalf = 0;
    std::int64_t drawn = 0;
    for (int i = 0; i < rounds; ++i) {
        for (const M3uEntry& e : Draw(count).entries) {
            const std::int64_t n = std::stoll(e.path.substr(e.path.rfind("/Track ") + 7));
            lowHalf += n <= 1 + (tracks / 2) * step ? 1 : 0;
            ++drawn;
        }
    }
    ASSERT_EQ(drawn, static_cast<std::int64_t>(count) * rounds);
    // Binomial(drawn, 1/2) stays within 5 standard deviations but for one time in millions.
    const double sigma = std::sqrt(drawn * 0.25);
    EXPECT_NEAR(static_cast<double>(lowHalf), drawn / 2.0, 5 * sigma);
}

TEST(RandomPlaylistFile, RowidSamplingIsEvenOverTheTable) {
    ExpectEvenDraws(5000, 2, 20, 150);  // span 10000: the rowid sampler
}

TEST(RandomPlaylistFile, ScanSamplingIsEvenOverTheTable) {
    ExpectEvenDraws(1000, 1, 20, 150);  // small span: the whole range is read
}

TEST(RandomPlaylistFile, TextsCannotBreakTheFileAndUnwritablePathsAreLeftOut) {
    MakeLibraryDb({{1, "/m/one.mp3", "line\nbreak", "tab\there\r", 61499},
                   {2, "/m/two\n#EXTINF:0,injected\n/etc/passwd", "t", "a", 1000},
                   {3, "/m/three.mp3", "", "", -1}});
    const M3uFile file = Draw(100);
    ASSERT_TRUE(file.valid);
    std::map<std::string, std::string> extinfByPath;
    for (const M3uEntry& e : file.entries)
        extinfByPath[e.path] = e.extinf;
    EXPECT_EQ(extinfByPath,
              (std::map<std::string, std::string>{{"/m/one.mp3", "61,tab here  - line break"},
                                                  {"/m/three.mp3", "-1, - "}}));
}

TEST(RandomPlaylistFile, FailsWithoutTracksOrWithoutAFolderToWriteTo) {
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/r", 100), 0);  // missing
    MakeLibraryDb({});
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/r", 100), 0);  // empty
    MakeLibraryDb({{1, "/m/a.mp3", "t", "a", 1000}});
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/r", 0), 0);
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/no/folder/r", 1), 0);
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/", 1), 0);
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, nullptr, 1), 0);
    EXPECT_FALSE(Exists("/tmp/r"));
    EXPECT_EQ(harmona::playlist::CreateRandomPlaylist(kLibraryDb, "/tmp/r", 1), 1);
    EXPECT_EQ(ReadFile("/tmp/r"), "#EXTM3U\n#EXTINF:1,a - t\n/m/a.mp3\n");
}

TEST(RandomPlaylistFile, WritesOnlyInTheFolderOfThePath) {
    MakeLibraryDb({{1, "/m/a.mp3", "t", "a", 1000}});
    MakeDirs("/tmp/sub");
    MakeDirs("/run/other");
    ASSERT_EQ(symlink("/run/other", "/tmp/sub/link"), 0);
    ASSERT_EQ(AudioFile::PlaylistRandomCreate("/tmp/sub/==DynaRandom100==.u", 1), 1);
    std::vector<std::string> names;
    DIR* dir = opendir("/tmp/sub");
    while (dirent* entry = readdir(dir))
        names.emplace_back(entry->d_name);
    closedir(dir);
    std::sort(names.begin(), names.end());
    EXPECT_EQ(names, (std::vector<std::string>{".", "..", "==DynaRandom100==.u", "link"}));
    DIR* other = opendir("/run/other");
    int entries = 0;
    while (readdir(other) != nullptr)
        ++entries;
    closedir(other);
    EXPECT_EQ(entries, 2);
}

}  // namespace
