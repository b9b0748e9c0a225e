// The media server's ContentDirectory called directly (no network) over a library.db written by
// the real indexer from a generated share, or by hand where a test needs values the indexer
// would never write (an index of an older indexer, hostile bytes).
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <utime.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <deque>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "common/util/Utf8.h"
#include "platform/lib/sqlite/Database.h"
#include "platform/medialib/LibrarySchema.h"
#include "services/harmona-mediad/ContentDirectory.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/DidlDocument.h"
#include "tests/mediad/DirectBrowse.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

using harmona::mediad::BrowseArgs;
using harmona::mediad::BrowseResult;
using harmona::mediad::ContentDirectory;

constexpr const char* kMediaBase = "http://127.0.0.1:50003/media/";

struct HandTrack {
    std::string path, title, artist, album, albumArtist, genre;
    long long year = 0, trackNo = 0, added = 0;
};

// library.db written by hand with the indexer's schema and one update.
void WriteLibrary(const std::vector<HandTrack>& tracks) {
    MakeDirs("/var/packages/Harmona/var");
    unlink(kLibraryDb);
    sqlite::Database db =
        sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, 1000);
    ASSERT_TRUE(db);
    ASSERT_TRUE(medialib::EnsureLibrarySchema(db));
    ASSERT_EQ(db.Execute("BEGIN"), SQLITE_OK);
    sqlite::Statement insert = db.Prepare(
        "INSERT INTO track (path, title, artist, album, album_artist, genre, year, track_no, "
        "added, mtime, size) VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, 0, 1000)");
    ASSERT_TRUE(insert);
    for (const HandTrack& t : tracks) {
        insert.Reset();
        insert.Bind(1, t.path);
        insert.Bind(2, t.title);
        insert.Bind(3, t.artist);
        insert.Bind(4, t.album);
        insert.Bind(5, t.albumArtist);
        insert.Bind(6, t.genre);
        insert.Bind(7, static_cast<int64_t>(t.year));
        insert.Bind(8, static_cast<int64_t>(t.trackNo));
        insert.Bind(9, static_cast<int64_t>(t.added));
        ASSERT_EQ(insert.Step(), SQLITE_DONE) << db.Error();
    }
    ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
    ASSERT_EQ(db.Execute("COMMIT"), SQLITE_OK);
}

void BumpUpdateCount() {
    sqlite::Database db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 1000);
    ASSERT_TRUE(db);
    ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
}

ContentDirectory Directory() {
    return ContentDirectory(kLibraryDb, kShare, kMediaBase);
}

std::vector<DidlObjectRecord> Objects(const BrowseResult& result) {
    const DidlDocument document = ParseDidl(result.didl);
    EXPECT_TRUE(document.parsed) << document.error << "\n" << result.didl.substr(0, 2000);
    EXPECT_EQ(document.objects.size(), result.numberReturned);
    return document.objects;
}

std::vector<std::string> Titles(const std::vector<DidlObjectRecord>& objects) {
    std::vector<std::string> titles;
    for (const DidlObjectRecord& object : objects)
        titles.push_back(object.title);
    return titles;
}

const DidlObjectRecord* FindTitle(const std::vector<DidlObjectRecord>& objects,
                                  const std::string& title) {
    for (const DidlObjectRecord& object : objects) {
        if (object.title == title)
            return &object;
    }
    return nullptr;
}

long long TrackNumberOf(const std::string& id) {
    const std::size_t at = id.rfind("track:");
    return at == std::string::npos ? -1 : std::atoll(id.c_str() + at + 6);
}

// --- DIDL-Lite text ---------------------------------------------------------------------------

TEST(DidlText, NonCharactersControlsAndBrokenBytesNeverReachAReply) {
    const std::string hostile =
        "A\xEF\xBF\xBE"
        "B\xEF\xBF\xBF"
        "C\x01\x1F"
        "D\xEF\xB7\x90"
        "E\xF0\x9F\xBF\xBE"
        "F\xC3"
        "G\xED\xA0\x80"
        "H <&> \"q\"";
    WriteLibrary({{std::string(kShare) + "/x/" + hostile + ".mp3", hostile, hostile, hostile,
                   hostile, hostile, 2000, 1, 1}});
    const ContentDirectory directory = Directory();
    for (const std::string& id :
         {std::string("music_all"), std::string("music_album"), std::string("music_aa"),
          std::string("music_genre"), std::string("music_file")}) {
        const BrowseResult result = Browse(directory, id);
        ASSERT_EQ(result.error, 0) << id;
        EXPECT_TRUE(IsStrictXmlText(result.didl)) << id << ": " << result.didl;
        std::string error;
        EXPECT_TRUE(ParsesStrictlyWithLibxml2(result.didl, &error)) << id << ": " << error;
        const GupnpAvDocument gupnpAv = ParseWithGupnpAv(result.didl);
        EXPECT_TRUE(gupnpAv.parsed) << id;
        EXPECT_EQ(gupnpAv.messages, "") << id;
        EXPECT_EQ(gupnpAv.objects.size(), 1u) << id;
        const std::vector<DidlObjectRecord> objects = Objects(result);
        ASSERT_EQ(objects.size(), 1u) << id;
    }
    const std::vector<DidlObjectRecord> all = Objects(Browse(directory, "music_all"));
    ASSERT_EQ(all.size(), 1u);
    // Non-characters dropped, controls as spaces, broken bytes as U+FFFD, the rest kept.
    EXPECT_EQ(all[0].title, "ABC  DEF\xEF\xBF\xBDG\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBDH <&> \"q\"");
    EXPECT_EQ(all[0].artist, all[0].title);
    EXPECT_EQ(all[0].creator, all[0].title);
}

TEST(DidlText, AUFFFETitleWrittenIntoTheFileParsesAfterIndexing) {
    MakeAudioFile(std::string(kShare) + "/odd.flac",
                  {"Odd\xEF\xBF\xBE title\xEF\xBF\xBF", "Artist\xEF\xBF\xBE", "Album", "", "Pop"});
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const BrowseResult result = Browse(Directory(), "music_all");
    EXPECT_TRUE(IsStrictXmlText(result.didl)) << result.didl;
    std::string error;
    EXPECT_TRUE(ParsesStrictlyWithLibxml2(result.didl, &error)) << error;
    const std::vector<DidlObjectRecord> objects = Objects(result);
    ASSERT_EQ(objects.size(), 1u);
    EXPECT_EQ(objects[0].title.rfind("Odd", 0), 0u) << objects[0].title;
}

// --- Bounded tag values -------------------------------------------------------------------------

TEST(TagValues, FiveMegabyteTitlesAreCutOnACharacterBoundaryWhenIndexed) {
    // "x" then two-byte characters: byte 1024 falls inside a character, so the cut must step back.
    std::string huge = "x";
    while (huge.size() < 5 * 1024 * 1024)
        huge += "\xC3\xA9";
    for (int i = 0; i < 3; ++i)
        MakeAudioFile(std::string(kShare) + "/big" + std::to_string(i) + ".flac",
                      {huge, huge, huge, "", "Pop"});
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    sqlite::Database db = sqlite::Database::OpenReadOnly(kLibraryDb, 1000);
    sqlite::Statement rows = db.Prepare("SELECT title, artist, album FROM track");
    int count = 0;
    while (rows.Step() == SQLITE_ROW) {
        ++count;
        for (int column = 0; column < 3; ++column) {
            const std::string value(rows.ColumnText(column));
            EXPECT_EQ(value.size(), 1023u);
            EXPECT_TRUE(util::IsValidUtf8(value));
            EXPECT_EQ(huge.compare(0, value.size(), value), 0);
        }
    }
    EXPECT_EQ(count, 3);
    const BrowseResult all = Browse(Directory(), "music_all");
    EXPECT_EQ(all.numberReturned, 3u);
    EXPECT_LT(all.didl.size(), 16u * 1024) << "three tracks, each value at most 1 KiB";
}

TEST(TagValues, OversizedValuesOfAnOlderIndexAreCutInReplies) {
    const std::string huge(5 * 1024 * 1024, 'T');
    WriteLibrary({{std::string(kShare) + "/a.mp3", huge, huge, huge, huge, huge, 0, 0, 0},
                  {std::string(kShare) + "/b.mp3", huge, huge, huge, huge, huge, 0, 0, 0}});
    const ContentDirectory directory = Directory();
    for (const char* id : {"music_all", "music_album", "music_aa", "music_genre"}) {
        const BrowseResult result = Browse(directory, id);
        EXPECT_LT(result.didl.size(), 16u * 1024) << id;
        for (const DidlObjectRecord& object : Objects(result))
            EXPECT_EQ(object.title, std::string(1024, 'T')) << id;
    }
}

// --- One parent per object ------------------------------------------------------------------

// Walks the whole tree from "0" with both browse flags: every object is listed under exactly one
// container, which is the parent its own metadata names; reference items point at the track's
// own object; each container's childCount is what browsing it returns.
void CheckEveryObjectHasOneParent(const ContentDirectory& directory) {
    const std::vector<DidlObjectRecord> root = Objects(Browse(directory, "0", true));
    ASSERT_EQ(root.size(), 1u);
    EXPECT_EQ(root[0].parentId, "-1");
    std::set<std::string> listed;
    std::deque<DidlObjectRecord> containers = {root[0]};
    std::size_t items = 0;
    while (!containers.empty()) {
        const DidlObjectRecord container = containers.front();
        containers.pop_front();
        const BrowseResult children = Browse(directory, container.id);
        ASSERT_EQ(children.error, 0) << container.id;
        EXPECT_EQ(static_cast<long>(children.totalMatches), container.childCount) << container.id;
        // GUPnP-AV's parser, as a GUPnP control point reads the reply, sees the same objects.
        const GupnpAvDocument gupnpAv = ParseWithGupnpAv(children.didl);
        EXPECT_TRUE(gupnpAv.parsed && gupnpAv.messages.empty()) << gupnpAv.messages;
        const std::vector<DidlObjectRecord> byPugixml = Objects(children);
        ASSERT_EQ(gupnpAv.objects.size(), byPugixml.size()) << container.id;
        for (std::size_t i = 0; i < byPugixml.size(); ++i) {
            EXPECT_EQ(gupnpAv.objects[i].id, byPugixml[i].id);
            EXPECT_EQ(gupnpAv.objects[i].parentId, byPugixml[i].parentId);
            EXPECT_EQ(gupnpAv.objects[i].refId, byPugixml[i].refId);
            EXPECT_EQ(gupnpAv.objects[i].title, byPugixml[i].title);
        }
        for (const DidlObjectRecord& child : Objects(children)) {
            EXPECT_EQ(child.parentId, container.id) << child.id;
            EXPECT_TRUE(listed.insert(child.id).second) << child.id << " is listed twice";
            const std::vector<DidlObjectRecord> meta = Objects(Browse(directory, child.id, true));
            ASSERT_EQ(meta.size(), 1u) << child.id;
            EXPECT_EQ(meta[0].id, child.id);
            EXPECT_EQ(meta[0].parentId, container.id) << child.id;
            EXPECT_EQ(meta[0].refId, child.refId) << child.id;
            EXPECT_EQ(meta[0].title, child.title) << child.id;
            EXPECT_EQ(meta[0].childCount, child.childCount) << child.id;
            if (child.container) {
                containers.push_back(child);
                continue;
            }
            ++items;
            EXPECT_EQ(Browse(directory, child.id).error, harmona::mediad::kErrorNoSuchContainer);
            if (container.id == "music_all") {
                EXPECT_EQ(child.refId, "") << child.id;
                EXPECT_EQ(child.id.rfind("track:", 0), 0u) << child.id;
                continue;
            }
            EXPECT_EQ(child.refId, "track:" + std::to_string(TrackNumberOf(child.id)));
            const std::vector<DidlObjectRecord> original =
                Objects(Browse(directory, child.refId, true));
            ASSERT_EQ(original.size(), 1u) << child.refId;
            EXPECT_EQ(original[0].parentId, "music_all");
            EXPECT_EQ(original[0].title, child.title);
            EXPECT_EQ(original[0].res, child.res);
        }
    }
    EXPECT_GT(items, 0u);
}

TEST(OneParent, EveryObjectOfTheIndexedShareNamesTheContainerItIsListedIn) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    CheckEveryObjectHasOneParent(Directory());
}

TEST(OneParent, TrackIdsOfOneContainerAreUnknownInAnother) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const ContentDirectory directory = Directory();
    const std::vector<DidlObjectRecord> genres = Objects(Browse(directory, "music_genre"));
    const DidlObjectRecord* pop = FindTitle(genres, "Pop");
    ASSERT_NE(pop, nullptr);
    const std::vector<DidlObjectRecord> popTracks = Objects(Browse(directory, pop->id));
    ASSERT_EQ(popTracks.size(), 1u);
    const long long track = TrackNumberOf(popTracks[0].id);
    const DidlObjectRecord* rock = FindTitle(genres, "Rock");
    ASSERT_NE(rock, nullptr);
    EXPECT_EQ(Browse(directory, rock->id + "/track:" + std::to_string(track), true).error,
              harmona::mediad::kErrorNoSuchObject);
    EXPECT_EQ(Browse(directory, "music_all/track:" + std::to_string(track), true).error,
              harmona::mediad::kErrorNoSuchObject);
    EXPECT_EQ(Browse(directory, "0/track:" + std::to_string(track), true).error,
              harmona::mediad::kErrorNoSuchObject);
}

TEST(OneParent, PathsOutsideTheShareShowInNoFolderButEverywhereElse) {
    const std::string share = kShare;
    WriteLibrary({{share + "/Good/ok.mp3", "Inside", "A", "X", "", "Pop", 0, 1, 1},
                  {share + "/../etc/passwd.mp3", "Dots", "A", "X", "", "Pop", 0, 2, 2},
                  {share + "//Double/slash.mp3", "Double", "A", "X", "", "Pop", 0, 3, 3},
                  {"/elsewhere/outside.mp3", "Outside", "A", "X", "", "Pop", 0, 4, 4},
                  {share + "music/prefix.mp3", "Prefix", "A", "X", "", "Pop", 0, 5, 5}});
    const ContentDirectory directory = Directory();
    EXPECT_EQ(Titles(Objects(Browse(directory, "music_file"))), std::vector<std::string>{"Good"});
    EXPECT_EQ(Objects(Browse(directory, "music_all")).size(), 5u);
    const std::vector<DidlObjectRecord> albums = Objects(Browse(directory, "music_album"));
    ASSERT_EQ(albums.size(), 1u);
    EXPECT_EQ(albums[0].childCount, 5);
    CheckEveryObjectHasOneParent(directory);
}

// --- Random 100 -------------------------------------------------------------------------------

std::vector<HandTrack> ManyTracks(int count) {
    std::vector<HandTrack> tracks;
    for (int i = 1; i <= count; ++i) {
        const std::string n = std::to_string(i);
        tracks.push_back(
            {std::string(kShare) + "/Artist " + std::to_string(i % 7) + "/" + n + ".mp3",
             "Title " + n, "Artist " + std::to_string(i % 7), "Album " + std::to_string(i % 13), "",
             "Genre " + std::to_string(i % 5), 1950 + i % 60, i % 20 + 1, i});
    }
    return tracks;
}

std::vector<std::string> PagedIds(const ContentDirectory& directory, const std::string& id,
                                  uint32_t pageSize, const std::string& sort = "") {
    std::vector<std::string> ids;
    for (uint32_t start = 0;; start += pageSize) {
        const BrowseResult page = Browse(directory, id, false, start, pageSize, sort);
        EXPECT_EQ(page.error, 0);
        for (const DidlObjectRecord& object : Objects(page))
            ids.push_back(object.id);
        if (page.numberReturned < pageSize || start + pageSize >= page.totalMatches)
            break;
    }
    return ids;
}

// --- Paging ---------------------------------------------------------------------------------

TEST(Paging, AReplyEndsNearItsByteBudgetAndTheNextPagesBringTheRest) {
    // 20,000 tracks with 1 KiB titles: more DIDL-Lite than one reply may hold.
    std::vector<HandTrack> tracks = ManyTracks(20000);
    for (HandTrack& track : tracks)
        track.title += " " + std::string(1000, 'x');
    WriteLibrary(tracks);
    const ContentDirectory directory = Directory();
    const BrowseResult first = Browse(directory, "music_all");
    ASSERT_EQ(first.error, 0);
    EXPECT_EQ(first.totalMatches, 20000u);
    EXPECT_LT(first.numberReturned, 20000u);
    EXPECT_GT(first.numberReturned, 0u);
    EXPECT_LT(first.didl.size(), harmona::mediad::kMaxResultBytes + 4096);
    EXPECT_EQ(Objects(first).size(), first.numberReturned);
    // A client that pages on from NumberReturned gets every track once, in order.
    std::set<std::string> ids;
    uint32_t start = 0;
    int pages = 0;
    while (start < first.totalMatches && pages < 100) {
        const BrowseResult page = Browse(directory, "music_all", false, start, 0);
        ASSERT_EQ(page.error, 0);
        ASSERT_GT(page.numberReturned, 0u);
        for (const DidlObjectRecord& object : Objects(page))
            EXPECT_TRUE(ids.insert(object.id).second) << object.id;
        start += page.numberReturned;
        ++pages;
    }
    EXPECT_EQ(ids.size(), 20000u);
    EXPECT_GE(pages, 2);
}

TEST(Paging, AReplyHoldsAtMostItsObjectCountAndNeverPassesItsByteBudget) {
    // Small objects (a title and a res): 12,000 of them stay within the byte budget.
    std::vector<HandTrack> tracks = ManyTracks(12000);
    for (HandTrack& track : tracks) {
        track.artist.clear();
        track.album.clear();
        track.genre.clear();
        track.year = 0;
        track.trackNo = 0;
    }
    WriteLibrary(tracks);
    const ContentDirectory directory = Directory();
    const BrowseResult whole = Browse(directory, "music_all");
    ASSERT_EQ(whole.error, 0);
    EXPECT_EQ(whole.totalMatches, 12000u);
    EXPECT_EQ(whole.numberReturned, harmona::mediad::kMaxResultObjects);
    EXPECT_EQ(Objects(whole).size(), harmona::mediad::kMaxResultObjects);
    EXPECT_LE(whole.didl.size(), harmona::mediad::kMaxResultBytes);
    // A count asked for past the cut is cut the same way; the rest comes on the next page.
    const BrowseResult asked = Browse(directory, "music_all", false, 0, 11000);
    EXPECT_EQ(asked.numberReturned, harmona::mediad::kMaxResultObjects);
    const BrowseResult rest = Browse(directory, "music_all", false, asked.numberReturned, 0);
    EXPECT_EQ(rest.numberReturned, 12000u - harmona::mediad::kMaxResultObjects);
    EXPECT_EQ(Objects(rest).size(), rest.numberReturned);
}

TEST(Paging, ObjectsOfLongTitlesFillAReplyUpToItsByteBudgetAndNoFurther) {
    std::vector<HandTrack> tracks = ManyTracks(6000);
    for (HandTrack& track : tracks)
        track.title += " " + std::string(2000, 'y');
    WriteLibrary(tracks);
    const ContentDirectory directory = Directory();
    const BrowseResult first = Browse(directory, "music_all");
    ASSERT_EQ(first.error, 0);
    EXPECT_LE(first.didl.size(), harmona::mediad::kMaxResultBytes);
    // Nearly full: less than one more object would have fitted.
    EXPECT_GT(first.didl.size() + 2 * 2100, harmona::mediad::kMaxResultBytes);
    EXPECT_LT(first.numberReturned, 6000u);
    EXPECT_EQ(Objects(first).size(), first.numberReturned);
}

TEST(RandomContainer, PagesOfOneListingShowEveryDrawnTrackOnceInOneOrder) {
    WriteLibrary(ManyTracks(300));
    const ContentDirectory directory = Directory();
    const BrowseResult whole = Browse(directory, "random");
    EXPECT_EQ(whole.totalMatches, 100u);
    std::vector<std::string> wholeIds;
    for (const DidlObjectRecord& object : Objects(whole))
        wholeIds.push_back(object.id);
    for (const uint32_t pageSize : {1u, 7u, 50u}) {
        const std::vector<std::string> paged = PagedIds(directory, "random", pageSize);
        EXPECT_EQ(paged, wholeIds) << "pages of " << pageSize;
    }
    EXPECT_EQ(std::set<std::string>(wholeIds.begin(), wholeIds.end()).size(), 100u);
    // A second directory over the same library (a restarted server) draws the same tracks.
    const std::vector<std::string> again = PagedIds(Directory(), "random", 100);
    EXPECT_EQ(again, wholeIds);

    // A library change draws anew.
    BumpUpdateCount();
    EXPECT_NE(PagedIds(directory, "random", 100), wholeIds);
}

TEST(RandomContainer, ASmallLibraryIsDrawnWhole) {
    WriteLibrary(ManyTracks(5));
    const BrowseResult random = Browse(Directory(), "random");
    EXPECT_EQ(random.totalMatches, 5u);
    std::vector<long long> drawn;
    for (const DidlObjectRecord& object : Objects(random))
        drawn.push_back(TrackNumberOf(object.id));
    std::sort(drawn.begin(), drawn.end());
    EXPECT_EQ(drawn, (std::vector<long long>{1, 2, 3, 4, 5}));
}

// --- Sort criteria ------------------------------------------------------------------------------

std::vector<HandTrack> SortLibrary() {
    const std::string s = std::string(kShare) + "/";
    return {
        {s + "1.mp3", "Charlie", "Zed", "Beta", "Zed", "Rock", 1990, 2, 1},
        {s + "2.mp3", "alpha", "Amy", "Beta", "Zed", "Rock", 2005, 1, 2},
        {s + "3.mp3", "Bravo", "Moe", "Alpha", "Various", "Jazz", 1970, 3, 3},
        {s + "4.mp3", "Delta", "Amy", "Alpha", "Various", "Jazz", 2000, 1, 4},
        {s + "5.mp3", "echo", "", "", "", "", 0, 0, 5},
    };
}

std::vector<std::string> SortedTitles(const ContentDirectory& directory, const std::string& id,
                                      const std::string& sort) {
    const BrowseResult result = Browse(directory, id, false, 0, 0, sort);
    EXPECT_EQ(result.error, 0) << sort;
    return Titles(Objects(result));
}

TEST(SortCriteria, EveryCapabilityAndCompositesOrderTracks) {
    WriteLibrary(SortLibrary());
    const ContentDirectory directory = Directory();
    using Titles = std::vector<std::string>;
    EXPECT_EQ(SortedTitles(directory, "music_all", "+upnp:album,+upnp:originalTrackNumber"),
              (Titles{"echo", "Delta", "Bravo", "alpha", "Charlie"}));
    EXPECT_EQ(SortedTitles(directory, "music_all", "-upnp:artist,+dc:title"),
              (Titles{"Charlie", "Bravo", "alpha", "Delta", "echo"}));
    EXPECT_EQ(SortedTitles(directory, "music_all", "+dc:date"),
              (Titles{"echo", "Bravo", "Charlie", "Delta", "alpha"}));
    EXPECT_EQ(SortedTitles(directory, "music_all", "-upnp:originalTrackNumber, -dc:title"),
              (Titles{"Bravo", "Charlie", "Delta", "alpha", "echo"}));
    EXPECT_EQ(SortedTitles(directory, "music_all", "dc:title"),
              (Titles{"alpha", "Bravo", "Charlie", "Delta", "echo"}));
    EXPECT_EQ(SortedTitles(directory, "music_all", ""),
              (Titles{"alpha", "Bravo", "Charlie", "Delta", "echo"}));
}

TEST(SortCriteria, AlbumsSortByTheirArtistAndDate) {
    WriteLibrary(SortLibrary());
    const ContentDirectory directory = Directory();
    using Titles = std::vector<std::string>;
    EXPECT_EQ(SortedTitles(directory, "music_album", ""), (Titles{"Alpha", "Beta"}));
    EXPECT_EQ(SortedTitles(directory, "music_album", "-upnp:artist"), (Titles{"Beta", "Alpha"}));
    EXPECT_EQ(SortedTitles(directory, "music_album", "+dc:date"), (Titles{"Alpha", "Beta"}));
    EXPECT_EQ(SortedTitles(directory, "music_album", "-dc:date"), (Titles{"Beta", "Alpha"}));
    EXPECT_EQ(SortedTitles(directory, "music_album", "-upnp:album"), (Titles{"Beta", "Alpha"}));
}

TEST(SortCriteria, PropertiesOutsideTheCapabilitiesAreRefusedWith709) {
    WriteLibrary(SortLibrary());
    const ContentDirectory directory = Directory();
    for (const char* sort : {"+upnp:genre", "+dc:title,-upnp:class", "+", "dc:titles", "+@id"}) {
        EXPECT_EQ(Browse(directory, "music_all", false, 0, 0, sort).error,
                  harmona::mediad::kErrorUnsupportedSort)
            << sort;
    }
}

TEST(SortCriteria, ASortedListingIsTheSameOnEveryPage) {
    WriteLibrary(ManyTracks(120));
    const ContentDirectory directory = Directory();
    for (const char* sort : {"+upnp:artist", "-dc:date,+upnp:album", "+upnp:originalTrackNumber"}) {
        const BrowseResult whole = Browse(directory, "music_all", false, 0, 0, sort);
        std::vector<std::string> wholeIds;
        for (const DidlObjectRecord& object : Objects(whole))
            wholeIds.push_back(object.id);
        EXPECT_EQ(PagedIds(directory, "music_all", 9, sort), wholeIds) << sort;
    }
}

// --- res, DLNA fields and metadata -----------------------------------------------------------

TEST(TrackResources, ResCarriesSizeAndTheDlnaFieldsTheFileServerSends) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const ContentDirectory directory = Directory();
    const std::vector<DidlObjectRecord> all = Objects(Browse(directory, "music_all"));
    ASSERT_EQ(all.size(), 5u);
    for (const DidlObjectRecord& item : all) {
        harmona::mediad::TrackFile file;
        ASSERT_TRUE(directory.LookUpTrack(TrackNumberOf(item.id), &file)) << item.id;
        struct stat st {};
        ASSERT_EQ(stat(file.path.c_str(), &st), 0) << file.path;
        EXPECT_EQ(item.size, std::to_string(st.st_size)) << item.id;
        EXPECT_EQ(file.size, st.st_size);
        EXPECT_EQ(item.protocolInfo, "http-get:*:" + file.mimeType + ":" + file.contentFeatures);
        EXPECT_NE(file.contentFeatures.find("DLNA.ORG_OP=01"), std::string::npos);
        EXPECT_NE(file.contentFeatures.find("DLNA.ORG_FLAGS="), std::string::npos);
        const bool mp3 =
            file.path.size() > 4 && file.path.compare(file.path.size() - 4, 4, ".mp3") == 0;
        EXPECT_EQ(file.contentFeatures.rfind("DLNA.ORG_PN=MP3;", 0) == 0, mp3) << file.path;
        EXPECT_EQ(item.res.rfind(kMediaBase, 0), 0u) << item.res;
    }
}

TEST(TrackResources, EachRequestMayNameItsOwnMediaBase) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    BrowseArgs args;
    args.objectId = "music_all";
    args.mediaBaseUrl = "http://192.0.2.1:50003/media/";
    for (const DidlObjectRecord& item : Objects(Directory().Browse(args)))
        EXPECT_EQ(item.res.rfind("http://192.0.2.1:50003/media/", 0), 0u) << item.res;
}

TEST(TrackMetadata, DateCreatorTrackNumberAndTheFoldersCoverArt) {
    MakeStandardShare();
    const std::string cover = std::string(kShare) + "/Rock/Alpha & Omega/Cover.JPG";
    WriteFile(cover, "\xFF\xD8\xFF\xE0 not a real picture");
    WriteFile(std::string(kShare) + "/Rock/Alpha & Omega/back.jpg", "other picture");
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const ContentDirectory directory = Directory();
    const std::vector<DidlObjectRecord> all = Objects(Browse(directory, "music_all"));
    const DidlObjectRecord* first = FindTitle(all, "First <Song> & \"more\"");
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->date, "2001-01-01");
    EXPECT_EQ(first->creator, "Band A");
    EXPECT_EQ(first->artist, "Band A");
    EXPECT_EQ(first->album, "Alpha & Omega");
    EXPECT_EQ(first->genre, "Rock");
    EXPECT_EQ(first->trackNumber, "1");
    const long long id = TrackNumberOf(first->id);
    EXPECT_EQ(first->albumArtUri, std::string(kMediaBase) + "art/" + std::to_string(id) + ".jpg");
    std::string art;
    ASSERT_TRUE(directory.LookUpArtFile(id, &art));
    EXPECT_EQ(art, cover);

    const DidlObjectRecord* zulu = FindTitle(all, "Zulu");
    ASSERT_NE(zulu, nullptr);
    EXPECT_EQ(zulu->albumArtUri, "");
    EXPECT_EQ(zulu->date, "");
    EXPECT_FALSE(directory.LookUpArtFile(TrackNumberOf(zulu->id), &art));

    const std::vector<DidlObjectRecord> albums = Objects(Browse(directory, "music_album"));
    const DidlObjectRecord* alpha = FindTitle(albums, "Alpha & Omega");
    ASSERT_NE(alpha, nullptr);
    EXPECT_EQ(alpha->albumArtUri.rfind(std::string(kMediaBase) + "art/", 0), 0u);
    EXPECT_EQ(alpha->date, "2001-01-01");
    EXPECT_EQ(alpha->artist, "Band A");
}

// Numbers past 32 bits (an id, a size of 6 GB, a track number and a duration as an older or
// foreign indexer may have written them) reach every reply as library.db has them, beside a
// track of ordinary numbers and one whose size is not known.
TEST(TrackMetadata, NumbersPastThirtyTwoBitsReachRepliesAsIndexed) {
    WriteLibrary({{std::string(kShare) + "/Band/Big/big.flac", "Big", "Band", "Big", "Band", "Rock",
                   2001, 3000000000LL, 1},
                  {std::string(kShare) + "/Band/Big/small.mp3", "Small", "Band", "Big", "Band",
                   "Rock", 1999, 2, 2},
                  {std::string(kShare) + "/Band/Big/unknown.mp3", "Unknown", "Band", "Big", "Band",
                   "Rock", 1998, 3, 3}});
    {
        sqlite::Database db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 1000);
        ASSERT_TRUE(db);
        ASSERT_EQ(db.Execute("UPDATE track SET id = 5000000000, size = 6000000000, duration_ms = "
                             "3000000000 WHERE title = 'Big'"),
                  SQLITE_OK);
        ASSERT_EQ(db.Execute("UPDATE track SET size = 4294967294, duration_ms = 61000 WHERE "
                             "title = 'Small'"),
                  SQLITE_OK);
        ASSERT_EQ(db.Execute("UPDATE track SET size = NULL WHERE title = 'Unknown'"), SQLITE_OK);
        ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
    }
    const ContentDirectory directory = Directory();
    const std::vector<DidlObjectRecord> all = Objects(Browse(directory, "music_all"));
    ASSERT_EQ(all.size(), 3u);
    const DidlObjectRecord* big = FindTitle(all, "Big");
    ASSERT_NE(big, nullptr);
    EXPECT_EQ(big->id, "track:5000000000");
    EXPECT_EQ(big->trackNumber, "3000000000");
    EXPECT_EQ(big->size, "6000000000");
    EXPECT_EQ(big->duration, "833:20:00.000");
    EXPECT_EQ(big->res, std::string(kMediaBase) + "5000000000.flac");
    EXPECT_EQ(big->album, "Big");
    EXPECT_EQ(big->genre, "Rock");
    EXPECT_EQ(big->date, "2001-01-01");
    const DidlObjectRecord* small = FindTitle(all, "Small");
    ASSERT_NE(small, nullptr);
    EXPECT_EQ(small->size, "4294967294");
    EXPECT_EQ(small->duration, "0:01:01.000");
    EXPECT_EQ(small->trackNumber, "2");
    const DidlObjectRecord* unknown = FindTitle(all, "Unknown");
    ASSERT_NE(unknown, nullptr);
    EXPECT_EQ(unknown->size, "");

    const std::vector<DidlObjectRecord> meta = Objects(Browse(directory, "track:5000000000", true));
    ASSERT_EQ(meta.size(), 1u);
    EXPECT_EQ(meta[0].size, "6000000000");
    // In its album, under its artist and among the latest albums, by the number sorted among
    // the others.
    for (const std::string& category :
         {std::string("music_album"), std::string("music_aa"), std::string("music_latestalbum")}) {
        std::vector<DidlObjectRecord> level = Objects(Browse(directory, category));
        ASSERT_EQ(level.size(), 1u) << category;
        if (category == "music_aa") {
            level = Objects(Browse(directory, level[0].id));
            ASSERT_EQ(level.size(), 1u);
        }
        const std::vector<DidlObjectRecord> tracks = Objects(Browse(directory, level[0].id));
        EXPECT_EQ(Titles(tracks), (std::vector<std::string>{"Small", "Unknown", "Big"}))
            << category;
        const BrowseResult item = Browse(directory, level[0].id + "/track:5000000000", true);
        ASSERT_EQ(item.error, 0) << category;
        EXPECT_EQ(Objects(item)[0].trackNumber, "3000000000");
    }
}

// --- Update ids -------------------------------------------------------------------------------

TEST(UpdateIds, OnlyAnIndexerPassThatChangedSomethingMovesTheSystemUpdateId) {
    MakeStandardShare();
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const ContentDirectory directory = Directory();
    const uint32_t first = directory.SystemUpdateId();
    EXPECT_EQ(Browse(directory, "0", true).updateId, first);
    EXPECT_EQ(directory.ContainerUpdateIds(), "");

    const IndexRun unchanged = RunIndexer();
    ASSERT_EQ(unchanged.exitStatus, 0);
    EXPECT_EQ(unchanged.counts.at("tagreads"), 0);
    EXPECT_EQ(directory.SystemUpdateId(), first);

    const std::string second = std::string(kShare) + "/Rock/Alpha & Omega/02 Second.ogg";
    WriteTags(second,
              {"Second, renamed", "Band A feat. X", "Alpha & Omega", "Band A", "Rock", 2001, 2, 1});
    struct utimbuf later {
        time(nullptr) + 10, time(nullptr) + 10
    };
    utime(second.c_str(), &later);
    ASSERT_EQ(RunIndexer().exitStatus, 0);
    const uint32_t after = directory.SystemUpdateId();
    EXPECT_GT(after, first);
    const std::string changed = directory.ContainerUpdateIds();
    EXPECT_NE(changed.find("music_all," + std::to_string(after)), std::string::npos) << changed;
    EXPECT_NE(changed.find("album:Band%20A/Alpha%20%26%20Omega," + std::to_string(after)),
              std::string::npos)
        << changed;
    EXPECT_EQ(changed.find("genre:Jazz,"), std::string::npos) << changed;
    EXPECT_NE(FindTitle(Objects(Browse(directory, "music_all")), "Second, renamed"), nullptr);
}

TEST(UpdateIds, ContainerUpdateIdsNameAtMostAHundredContainersHigherOnesFirst) {
    WriteLibrary(ManyTracks(300));
    const ContentDirectory directory = Directory();
    directory.SystemUpdateId();
    // Every title changes: every container that lists tracks changes.
    sqlite::Database db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 1000);
    ASSERT_EQ(db.Execute("UPDATE track SET title = title || ' (live)'"), SQLITE_OK);
    ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
    const uint32_t updateId = directory.SystemUpdateId();
    const std::string changed = directory.ContainerUpdateIds();
    std::vector<std::string> fields;
    std::size_t start = 0;
    while (start <= changed.size()) {
        const std::size_t comma = std::min(changed.find(',', start), changed.size());
        fields.push_back(changed.substr(start, comma - start));
        start = comma + 1;
    }
    ASSERT_EQ(fields.size() % 2, 0u) << changed;
    EXPECT_EQ(fields.size() / 2, harmona::mediad::kMaxContainerUpdates);
    // The root's own children (the categories, their counts) did not change; theirs did.
    EXPECT_EQ(fields[0], "music_all");
    EXPECT_EQ(fields[2], "random");
    for (std::size_t i = 0; i < fields.size(); i += 2)
        EXPECT_NE(fields[i], "0");
    for (std::size_t i = 1; i < fields.size(); i += 2)
        EXPECT_EQ(fields[i], std::to_string(updateId));
}

TEST(UpdateIds, BrowsesDuringLibraryChangesAnswerFromOneWholeStateEach) {
    WriteLibrary(ManyTracks(2000));
    const ContentDirectory directory = Directory();
    std::atomic<bool> done{false};
    std::atomic<int> answers{0};
    std::vector<std::thread> readers;
    for (int i = 0; i < 3; ++i) {
        readers.emplace_back([&] {
            while (!done) {
                const BrowseResult all = Browse(directory, "music_all", false, 0, 10);
                // One state: 2,000 tracks before, 2,001 to 2,005 after each insert below.
                const bool whole = all.error == 0 && all.numberReturned == 10 &&
                                   all.totalMatches >= 2000 && all.totalMatches <= 2005 &&
                                   ParseDidl(all.didl).objects.size() == 10;
                EXPECT_TRUE(whole) << all.error << " " << all.totalMatches;
                ++answers;
            }
        });
    }
    for (int change = 1; change <= 5; ++change) {
        sqlite::Database db = sqlite::Database::Open(kLibraryDb, SQLITE_OPEN_READWRITE, 5000);
        ASSERT_TRUE(db);
        ASSERT_EQ(db.Execute(("BEGIN IMMEDIATE; INSERT INTO track (path, title) VALUES ('" +
                              std::string(kShare) + "/new" + std::to_string(change) +
                              ".mp3', 'New " + std::to_string(change) + "');")
                                 .c_str()),
                  SQLITE_OK);
        ASSERT_TRUE(medialib::BumpLibraryUpdateCount(db));
        ASSERT_EQ(db.Execute("COMMIT"), SQLITE_OK);
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    done = true;
    for (std::thread& reader : readers)
        reader.join();
    EXPECT_GT(answers.load(), 0);
    EXPECT_EQ(Browse(directory, "music_all").totalMatches, 2005u);
}

TEST(UpdateIds, AMissingDatabaseIsAnEmptyLibraryAndAnUnreadableOneAnError) {
    const ContentDirectory directory = Directory();
    const BrowseResult root = Browse(directory, "0");
    ASSERT_EQ(root.error, 0);
    for (const DidlObjectRecord& category : Objects(root))
        EXPECT_EQ(category.childCount, 0) << category.id;
    MakeDirs("/var/packages/Harmona/var");
    WriteFile(kLibraryDb, std::string(4096, 'x'));
    EXPECT_EQ(Browse(directory, "0").error, harmona::mediad::kErrorActionFailed);
}

}  // namespace
}  // namespace harmona::test::mediad
