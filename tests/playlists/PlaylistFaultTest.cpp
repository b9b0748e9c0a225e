// Playlist categories, listing and the refresh action over scripted platform answers
// (ScriptedPlaylistPlatform.cpp): a failing smart playlist listing, which the real one never
// reports, and a personal playlist name that holds "/", which no file name can.
#include <gtest/gtest.h>

#include "tests/harness/Fixtures.h"
#include "tests/playlists/InProcess.h"
#include "tests/playlists/ScriptedPlaylistPlatform.h"

using namespace harmona::test;

namespace {

class PlaylistCategoryFaults : public PlaylistBuilderTest {
  protected:
    void SetUp() override {
        PlaylistBuilderTest::SetUp();
        Scripted() = ScriptedPlatform();
    }
};

TEST_F(PlaylistCategoryFaults,
       FailedPersonalSmartListingGivesErrorLine369AfterTheOrdinaryPlaylists) {
    Scripted().personal.records = {{1, "mine"}};
    Scripted().smartResult = 0;
    EXPECT_EQ(request.handler.AddPersonalPlaylistCategory(children), 0);
    ExpectSystemError(children, 369,
                      {"musiclib_music_personal_refresh", "musiclib_music_personal_new",
                       "musiclib_music_personal/playlist/mine"});
    EXPECT_EQ(Scripted().smartCategories, std::vector<std::string>{"music_personal"});
    EXPECT_EQ(Scripted().personalPrefDir, "/usr/vanu/etc/preference/admin");
}

TEST_F(PlaylistCategoryFaults, FailedSharedSmartListingGivesErrorLine404AfterTheOrdinaryPlaylists) {
    Scripted().shared.records = {{3, "ours"}};
    Scripted().smartResult = 0;
    EXPECT_EQ(request.handler.AddSharedPlaylistCategory(children), 0);
    ExpectSystemError(children, 404,
                      {"musiclib_music_shared_refresh", "musiclib_music_shared_new",
                       "musiclib_music_shared/playlist/3"});
    EXPECT_EQ(Scripted().smartCategories, std::vector<std::string>{"music_shared"});
}

TEST_F(PlaylistCategoryFaults, FailedOrdinaryListingSkipsTheSmartListing) {
    Scripted().personal.result = -1;
    Scripted().shared.result = -5;
    EXPECT_EQ(request.handler.AddPersonalPlaylistCategory(children), 0);
    EXPECT_EQ(children["errinfo"]["line"].asInt(), 364);
    Json::Value shared(Json::arrayValue);
    EXPECT_EQ(request.handler.AddSharedPlaylistCategory(shared), 0);
    EXPECT_EQ(shared["errinfo"]["line"].asInt(), 399);
    EXPECT_TRUE(Scripted().smartCategories.empty());
}

// The refresh action over a failing smart listing: the ordinary playlists it listed are dropped.
TEST_F(PlaylistCategoryFaults,
       RefreshWithPlainPlaylistsListedButSmartOnesFailingGivesAnErrorWithoutItems) {
    Scripted().personal.records = {{1, "Road trip"}};
    Scripted().smartResult = 0;
    ::testing::internal::CaptureStdout();
    request.handler.RefreshNode("personal");
    const std::string output = ::testing::internal::GetCapturedStdout();
    Json::Value reply;
    ASSERT_TRUE(ParseJson(output.substr(output.find("\r\n\r\n") + 4), reply)) << output;
    EXPECT_FALSE(reply.isMember("items"));
    EXPECT_EQ(reply["success"], false);
    EXPECT_EQ(reply["errinfo"]["key"], "error_system");
    EXPECT_EQ(output.find("Road trip"), std::string::npos);  // nodes already listed are dropped
    EXPECT_EQ(Scripted().smartCategories, std::vector<std::string>{"music_personal"});
}

using PlaylistListingFaults = PlaylistCategoryFaults;

TEST_F(PlaylistListingFaults, PersonalNameWithSlashGivesAnIdOfMoreThanThreePartsUnescaped) {
    Scripted().personal.records = {{1, "rock/80s/live"}};
    ASSERT_EQ(request.handler.ListPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    const std::string id = children[0]["id"].asString();
    EXPECT_EQ(id, "musiclib_music_personal/playlist/rock/80s/live");
    EXPECT_EQ(std::count(id.begin(), id.end(), '/'), 4);
    EXPECT_EQ(children[0]["text"].asString(), "rock/80s/live");
}

TEST_F(PlaylistListingFaults, PositiveListingResultIsSuccessNegativeIsFailure) {
    Scripted().shared = {2, {{0, "zero"}}};
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(Ids(children), std::vector<std::string>{"musiclib_music_shared/playlist/0"});
    Scripted().shared.result = -1;
    EXPECT_EQ(request.handler.ListPlaylists(children, "music_shared"), 0);
    EXPECT_EQ(children.size(), 1u);
    EXPECT_EQ(LoggedErrors(),
              std::vector<std::string>{"audio:642 Failed to enum user's playlist!"});
}

}  // namespace
