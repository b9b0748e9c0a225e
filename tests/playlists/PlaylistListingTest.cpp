// Ordinary playlist listing, built in the test process (see InProcess.h) over real playlist files
// and a real library.db.
#include <gtest/gtest.h>

#include "common/util/Utf8.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/playlists/InProcess.h"

using namespace harmona::test;

namespace {

constexpr const char* kFailureLog = "audio:642 Failed to enum user's playlist!";
constexpr const char* kPlaylistIcon = "3rdparty/Harmona/images/files_class/icon_playlist.png";

class PlaylistListing : public PlaylistBuilderTest {};

TEST_F(PlaylistListing, CategoryDifferingOnlyInLetterCaseIsUnknownLogsAndFails) {
    WritePersonalPlaylistFile("admin", "mine.m3u");
    MakeLibraryDb({}, {{1, "shared"}});
    for (const char* category :
         {"MUSIC_PERSONAL", "Music_Personal", "music_Shared", "", "personal"}) {
        EXPECT_EQ(request.handler.ListPlaylists(children, category), 0) << category;
        EXPECT_EQ(children, Json::Value(Json::arrayValue)) << category;
        EXPECT_EQ(LoggedErrors(), std::vector<std::string>{kFailureLog}) << category;
    }
}

TEST_F(PlaylistListing, PersonalNodesCarryNameIdParentIconAndLeafFlagOnly) {
    WritePersonalPlaylistFile("admin", "Road Trip & <Co>.m3u");
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    ExpectPlaylistNode(children[0], "musiclib_music_personal/playlist/Road Trip & <Co>",
                       "musiclib_music_personal", "Road Trip &amp; &lt;Co&gt;", kPlaylistIcon);
    EXPECT_EQ(children[0]["qtip"].asString(), "Road Trip &amp; &lt;Co&gt;");
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(PlaylistListing, SharedNodesAreAddressedByNumberInTheLibrarysOrder) {
    MakeLibraryDb({}, {{12, "beta"}, {4, "Alpha"}, {9, "alpha"}, {30, "Gamma"}});
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(Ids(children),
              (std::vector<std::string>{
                  "musiclib_music_shared/playlist/4", "musiclib_music_shared/playlist/9",
                  "musiclib_music_shared/playlist/12", "musiclib_music_shared/playlist/30"}));
    EXPECT_EQ(Texts(children), (std::vector<std::string>{"Alpha", "alpha", "beta", "Gamma"}));
    EXPECT_EQ(children[0]["pid"].asString(), "musiclib_music_shared");
    EXPECT_EQ(children[0]["icon"].asString(), kPlaylistIcon);
}

TEST_F(PlaylistListing, SharedPlaylistWithIdZeroGivesDecimalZero) {
    MakeLibraryDb({}, {{0, "zero"}, {4294967295, "largest"}});
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(Ids(children), (std::vector<std::string>{"musiclib_music_shared/playlist/4294967295",
                                                       "musiclib_music_shared/playlist/0"}));
}

TEST_F(PlaylistListing, TwoPersonalPlaylistsWithTheSameNameGiveTwoNodesWithTheSameId) {
    // "a.m3u" and "a.M3U8" are two files that both name the playlist "a".
    WritePersonalPlaylistFile("admin", "a.m3u");
    WritePersonalPlaylistFile("admin", "a.M3U8");
    WritePersonalPlaylistFile("admin", "b.m3u8");
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    EXPECT_EQ(Ids(children), (std::vector<std::string>{"musiclib_music_personal/playlist/a",
                                                       "musiclib_music_personal/playlist/a",
                                                       "musiclib_music_personal/playlist/b"}));
}

TEST_F(PlaylistListing, LongestPossibleNameIsWholeInIdAndText) {
    // A record's name holds at most 254 bytes (platform/README.md, "Playlists and smart
    // playlists"), so a playlist id is at most 33 + 254 bytes and can never reach the 4095-byte
    // cut; the longest file name gives the longest name, whole.
    const std::string name(251, 'n');
    WritePersonalPlaylistFile("admin", name + ".m3u");
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(children[0]["id"].asString(), "musiclib_music_personal/playlist/" + name);
    EXPECT_EQ(children[0]["text"].asString(), name);
}

TEST_F(PlaylistListing, OverlongSharedNameIsCutOnACharacterBoundaryByThePlatform) {
    std::string name;
    for (int i = 0; i < 200; ++i)
        name += "\xC3\xA9";  // é, 2 bytes each: 400 bytes
    MakeLibraryDb({}, {{1, name}});
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(children[0]["text"].asString(), name.substr(0, 254));
    EXPECT_EQ(children[0]["id"].asString(), "musiclib_music_shared/playlist/1");
}

TEST_F(PlaylistListing, EmptyListsAreSuccessesWithNothingAppended) {
    children.append("kept");
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);  // no folder at all
    MakeDirs(PersonalPlaylistDir("admin"));
    WritePersonalPlaylistFile("admin", "notes.txt");
    MakeDirs(PersonalPlaylistDir("admin") + "/folder.m3u");
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);  // no database file
    MakeLibraryDb({GeneratedTrack(1)}, {});
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);  // no playlist row
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(children[0].asString(), "kept");
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(PlaylistListing, NodesAreAppendedAfterWhatTheArrayHolds) {
    children.append("first");
    WritePersonalPlaylistFile("admin", "x.m3u");
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 2u);
    EXPECT_EQ(children[0].asString(), "first");
    EXPECT_EQ(children[1]["text"].asString(), "x");
}

TEST_F(PlaylistListing, LibraryThatIsNotADatabaseFailsWithTheLogLine) {
    WriteFile(kLibraryDb, "SQLite format 2, or rather not at all\n" + std::string(2000, '\0'));
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 0);
    EXPECT_EQ(children, Json::Value(Json::arrayValue));
    const std::vector<LogLine> lines = TakeLogLines(100);
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(lines[0].message, kFailureLog);
    EXPECT_EQ(lines[0].priority & 7, LOG_ERR);
}

TEST_F(PlaylistListing, UnreadablePlaylistsFolderFailsWithTheLogLine) {
    WriteFile(PersonalPlaylistDir("admin"), "a file where the folder should be");
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_personal"), 0);
    EXPECT_EQ(LoggedErrors(), std::vector<std::string>{kFailureLog});
}

TEST_F(PlaylistListing, DatabaseLockedByAWriterForASecondStillGivesTheList) {
    MakeLibraryDb({}, {{1, "one"}, {2, "two"}});
    DatabaseWriterLock writer(kLibraryDb, 1000);
    ASSERT_TRUE(writer.Locked());
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(Texts(children), (std::vector<std::string>{"one", "two"}));
}

TEST_F(PlaylistListing, FileNameThatIsNotUtf8GivesAValidUtf8Reply) {
    WritePersonalPlaylistFile("admin", "bad\xFF\xFEname.m3u");
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    const std::string reply = harmona::cgi::SerializeReply(children);
    EXPECT_TRUE(harmona::util::IsValidUtf8(reply));
    Json::Value parsed;
    ASSERT_TRUE(ParseJson(reply, parsed)) << reply;
    const std::string text = parsed[0]["text"].asString();
    EXPECT_EQ(text, "bad\xEF\xBF\xBD\xEF\xBF\xBDname");  // each bad byte is U+FFFD
    EXPECT_EQ(parsed[0]["id"].asString(), "musiclib_music_personal/playlist/" + text);
}

}  // namespace
