// Playlist category nodes (the personal and shared playlists with their buttons), built in the
// test process (see InProcess.h) over real playlist files and a real library.db.
#include <gtest/gtest.h>

#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/playlists/InProcess.h"

using namespace harmona::test;

namespace {

constexpr int kAllButNewShared = PERM_IPOD | PERM_MEDIA_SERVER;
constexpr int kEverything = PERM_IPOD | PERM_NEW_SHARED_PLAYLIST | PERM_MEDIA_SERVER;

class PlaylistCategories : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }
};

// A button of a playlist category: no parent id, a leaf that is neither dragged nor expanded; the
// "new playlist" button alone takes drops.
void ExpectButton(const Json::Value& node, const std::string& id, const std::string& text,
                  const std::string& icon, bool allowDrop) {
    EXPECT_EQ(node["id"].asString(), id);
    EXPECT_FALSE(node.isMember("pid"));
    EXPECT_EQ(node["text"].asString(), text);
    EXPECT_EQ(node["icon"].asString(), icon);
    EXPECT_TRUE(node["leaf"].asBool());
    EXPECT_EQ(node["allowDrop"].asBool(), allowDrop);
    EXPECT_FALSE(node["allowDrag"].asBool());
    EXPECT_FALSE(node["draggable"].asBool());
    EXPECT_FALSE(node["expanded"].asBool());
}

void ExpectRefreshButton(const Json::Value& node, const std::string& category) {
    ExpectButton(node, "musiclib_music_" + category + "_refresh", "Refresh",
                 "3rdparty/Harmona/images/button/btn_refresh.png", false);
    EXPECT_EQ(node["qtip"].asString(), "Refresh");
}

void ExpectNewButton(const Json::Value& node, const std::string& category) {
    ExpectButton(node, "musiclib_music_" + category + "_new", "New Playlist",
                 "3rdparty/Harmona/images/button/btn_new_playlist.png", true);
}

TEST_F(PlaylistCategories,
       WithoutNewSharedPermissionSharedHasRefreshThenPlaylistsAndPersonalBothButtons) {
    AddUser("admin", kAllButNewShared);
    MakeLibraryDb({}, {{7, "Road"}, {3, "chill"}});
    WritePersonalPlaylistFile("admin", "mine.m3u");
    InProcessHandler request("admin", kAllButNewShared);

    Json::Value shared(Json::arrayValue);
    ASSERT_EQ(request.handler.AddSharedPlaylistCategory(shared), 1);
    ASSERT_EQ(shared.size(), 3u);
    ExpectRefreshButton(shared[0], "shared");
    EXPECT_EQ(Ids(shared), (std::vector<std::string>{"musiclib_music_shared_refresh",
                                                     "musiclib_music_shared/playlist/3",
                                                     "musiclib_music_shared/playlist/7"}));
    EXPECT_EQ(shared[1]["pid"].asString(), "musiclib_music_shared");

    Json::Value personal(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 1);
    ASSERT_EQ(personal.size(), 3u);
    ExpectRefreshButton(personal[0], "personal");
    ExpectNewButton(personal[1], "personal");
    EXPECT_EQ(personal[2]["id"].asString(), "musiclib_music_personal/playlist/mine");
    EXPECT_EQ(personal[2]["pid"].asString(), "musiclib_music_personal");
}

TEST_F(PlaylistCategories, WithNewSharedPermissionSharedHasBothButtons) {
    MakeLibraryDb({}, {{1, "Road"}});
    InProcessHandler request("admin", kEverything);
    Json::Value shared(Json::arrayValue);
    ASSERT_EQ(request.handler.AddSharedPlaylistCategory(shared), 1);
    ASSERT_EQ(shared.size(), 3u);
    ExpectRefreshButton(shared[0], "shared");
    ExpectNewButton(shared[1], "shared");
    EXPECT_EQ(shared[2]["id"].asString(), "musiclib_music_shared/playlist/1");
}

TEST_F(PlaylistCategories, UserWithNoPlaylistsAndNoSmartFileGetsExactlyTheTwoPersonalButtons) {
    InProcessHandler request("admin", kEverything);
    Json::Value personal(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 1);
    ASSERT_EQ(personal.size(), 2u);
    ExpectRefreshButton(personal[0], "personal");
    ExpectNewButton(personal[1], "personal");
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(PlaylistCategories, OrdinaryPlaylistsComeBeforeSmartPlaylists) {
    WritePersonalPlaylistFile("admin", "zz.m3u");
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {"aa"});
    MakeLibraryDb({}, {{5, "zz shared"}});
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"aa shared"});
    InProcessHandler request("admin", kEverything);

    Json::Value personal(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 1);
    EXPECT_EQ(Ids(personal),
              (std::vector<std::string>{
                  "musiclib_music_personal_refresh", "musiclib_music_personal_new",
                  "musiclib_music_personal/playlist/zz", "musiclib_music_personal/smart/aa"}));
    Json::Value shared(Json::arrayValue);
    ASSERT_EQ(request.handler.AddSharedPlaylistCategory(shared), 1);
    EXPECT_EQ(Ids(shared),
              (std::vector<std::string>{
                  "musiclib_music_shared_refresh", "musiclib_music_shared_new",
                  "musiclib_music_shared/playlist/5", "musiclib_music_shared/smart/aa shared"}));
}

TEST_F(PlaylistCategories, ButtonTextsFollowTheUserLanguage) {
    AddUser("admin", kEverything, "ger");
    InProcessHandler request("admin", kEverything);
    Json::Value personal(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 1);
    ASSERT_EQ(personal.size(), 2u);
    const Json::Value german = [] {
        HarmonaHandler probe;
        return probe.LoadUITexts();
    }();
    EXPECT_EQ(personal[0]["text"].asString(), german["player"]["refresh_btn_title"].asString());
    EXPECT_EQ(personal[1]["text"].asString(), german["playlist"]["newplaylist"].asString());
    EXPECT_NE(personal[1]["text"].asString(), "New Playlist");
}

TEST_F(PlaylistCategories, UnlistablePersonalPlaylistsGiveErrorLine364AndKeepTheButtons) {
    // The playlists path is a file, so it cannot be read as a directory.
    WriteFile(PersonalPlaylistDir("admin"), "not a folder");
    InProcessHandler request("admin", kEverything);
    Json::Value personal(Json::arrayValue);
    EXPECT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 0);
    ExpectSystemError(personal, 364,
                      {"musiclib_music_personal_refresh", "musiclib_music_personal_new"});
    EXPECT_EQ(LoggedErrors(),
              std::vector<std::string>{"audio:642 Failed to enum user's playlist!"});
}

TEST_F(PlaylistCategories, UnlistableSharedPlaylistsGiveErrorLine399AndKeepTheButtons) {
    WriteFile(kLibraryDb, std::string(4096, 'x'));  // not a database
    InProcessHandler request("admin", kAllButNewShared);
    Json::Value shared(Json::arrayValue);
    EXPECT_EQ(request.handler.AddSharedPlaylistCategory(shared), 0);
    ExpectSystemError(shared, 399, {"musiclib_music_shared_refresh"});
    EXPECT_EQ(LoggedErrors(),
              std::vector<std::string>{"audio:642 Failed to enum user's playlist!"});

    InProcessHandler withNew("admin", kEverything);
    Json::Value sharedWithNew(Json::arrayValue);
    EXPECT_EQ(withNew.handler.AddSharedPlaylistCategory(sharedWithNew), 0);
    ExpectSystemError(sharedWithNew, 399,
                      {"musiclib_music_shared_refresh", "musiclib_music_shared_new"});
}

TEST_F(PlaylistCategories, ErrorEnvelopeSerializesAsTheBrowserSeesIt) {
    WriteFile(PersonalPlaylistDir("admin"), "not a folder");
    InProcessHandler request("admin", kEverything);
    Json::Value personal(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(personal), 0);
    Json::Value parsed;
    ASSERT_TRUE(ParseJson(harmona::cgi::SerializeReply(personal), parsed));
    EXPECT_EQ(parsed["errinfo"], personal["errinfo"]);
    EXPECT_EQ(parsed["items"].size(), 2u);
}

}  // namespace
