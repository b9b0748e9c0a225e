// The refresh action, through the real CGI: the dispatch of each target, its exit status, and the
// error envelope of a failing refresh.
#include <gtest/gtest.h>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/tree/TreeFixture.h"

using namespace harmona::test;
using Strings = std::vector<std::string>;

namespace {

CgiResult Refresh(const std::string& target) {
    return Get(Query({{"action", "refresh"}, {"target", target}}));
}

TEST(RefreshAction, IPodWithNoIPodAttachedIsASuccessWithNullItems) {
    TreeWorld world;
    world.ipod = false;
    TreeFixture fixture(world);
    const CgiResult r = Refresh("ipod");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "{\"items\":null,\"success\":true}\n");
}

TEST(RefreshAction, IPodGivesThePlaylistNodesWithoutTheRefreshButton) {
    TreeFixture fixture(TreeWorld{});
    const CgiResult r = Refresh("ipod");
    EXPECT_EQ(r.json["success"], true);
    EXPECT_EQ(Ids(r.json["items"]), (Strings{"ipod_" + IPodKey(fixture.IPodIds()[0]),
                                             "ipod_" + IPodKey(fixture.IPodIds()[1])}));
    EXPECT_EQ(r.json["items"][0]["text"], "Gym");
    EXPECT_EQ(r.json["items"][0]["pid"], "ipod_root");
}

TEST(RefreshAction, PersonalListsPlainPlaylistsThenSmartOnes) {
    TreeFixture fixture(TreeWorld{});
    const CgiResult r = Refresh("personal");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.json["success"], true);
    EXPECT_EQ(Ids(r.json["items"]),
              (Strings{"musiclib_music_personal/playlist/Morning",
                       "musiclib_music_personal/playlist/Road trip",
                       "musiclib_music_personal/smart/blues", "musiclib_music_personal/smart/Jazz",
                       "musiclib_music_personal/smart/rock"}));
}

TEST(RefreshAction, RefreshSeesAPlaylistAddedSinceTheTreeWasBuilt) {
    TreeWorld world;
    world.personalSmart = {};
    TreeFixture fixture(world);
    EXPECT_EQ(Refresh("personal").json["items"].size(), 2u);
    WritePersonalPlaylistFile(world.user, "Added later.m3u8");
    EXPECT_EQ(Ids(Refresh("personal").json["items"]),
              (Strings{"musiclib_music_personal/playlist/Added later",
                       "musiclib_music_personal/playlist/Morning",
                       "musiclib_music_personal/playlist/Road trip"}));
}

TEST(RefreshAction, SharedListsPlaylistsByNumberThenSmartOnes) {
    TreeFixture fixture(TreeWorld{});
    const CgiResult r = Refresh("shared");
    EXPECT_EQ(Ids(r.json["items"]),
              (Strings{"musiclib_music_shared/playlist/3", "musiclib_music_shared/playlist/7",
                       "musiclib_music_shared/smart/Top rated"}));
    EXPECT_EQ(r.json["items"][0]["text"], "Chill");
}

TEST(RefreshAction, NoPlaylistsAtAllGivesASuccessWithNullItems) {
    InstallTexts();
    AddUser("admin", 8);
    EXPECT_EQ(Refresh("personal").body, "{\"items\":null,\"success\":true}\n");
    EXPECT_EQ(Refresh("shared").body, "{\"items\":null,\"success\":true}\n");
}

// A failing refresh of personal playlists prints the error envelope and no "items".
TEST(RefreshAction, FailingPersonalListingPrintsTheErrorEnvelopeWithoutItems) {
    TreeFixture fixture(WorldWithUnlistablePersonalPlaylists());
    const CgiResult r = Refresh("personal");
    EXPECT_EQ(r.exitStatus, 1);  // refresh returns 1 whatever the builder did
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_FALSE(r.json.isMember("items"));
    EXPECT_EQ(r.json["success"], false);
    EXPECT_EQ(r.json["errinfo"]["sec"], "common");
    EXPECT_EQ(r.json["errinfo"]["key"], "error_system");
}

TEST(RefreshAction, FailingSharedListingPrintsTheErrorEnvelope) {
    TreeFixture fixture(TreeWorld{});
    WriteFile(kLibraryDb, "SQLite format 2\n" + std::string(2000, 'z'));
    const CgiResult r = Refresh("shared");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_FALSE(r.json.isMember("items"));
    EXPECT_EQ(r.json["errinfo"]["key"], "error_system");
}

// The line number of the error reply is a fixed identifier, the same wherever the code moves.
TEST(RefreshAction, FailingListingReportsLine30) {
    TreeFixture fixture(WorldWithUnlistablePersonalPlaylists());
    const CgiResult r = Refresh("personal");
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.json["success"], false);
    EXPECT_EQ(r.json["errinfo"]["line"], 30);
}

TEST(RefreshAction, CapitalisedEmptyAndAbsentTargetsGiveAnEmptyReply) {
    TreeFixture fixture(TreeWorld{});
    for (const char* query :
         {"action=refresh&target=Personal", "action=refresh&target=", "action=refresh",
          "action=refresh&target=IPOD", "action=refresh&target=music_personal"}) {
        const CgiResult r = Get(query);
        EXPECT_EQ(r.exitStatus, 1) << query;
        EXPECT_EQ(r.body, "[]\n") << query;
    }
}

// "refresh" exits with 1 even when the builder reported an error.
TEST(RefreshAction, MediaserverAndIPodTargetsExitWithOneWhateverHappened) {
    InstallTexts();
    AddUser("admin", 9);
    const CgiResult media = Refresh("mediaserver");  // no daemon
    EXPECT_EQ(media.exitStatus, 1);
    EXPECT_EQ(media.body, "{\"items\":null,\"success\":true}\n");
    WriteIPodMountpointFile("/tmp/no-ipod-here\n");
    const CgiResult ipod = Refresh("ipod");
    EXPECT_EQ(ipod.exitStatus, 1);
    EXPECT_EQ(ipod.json["success"], true);
}

}  // namespace
