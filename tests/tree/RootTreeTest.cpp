// The root tree, through the real CGI over real fixtures for every child builder.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/tree/TreeFixture.h"

using namespace harmona::test;
using Strings = std::vector<std::string>;

namespace {

const std::string kRootQuery = "action=gettreenode&node=audiotree_root";
const Strings kAllCategories = {"musiclib_root", "musiclib_music_personal", "musiclib_music_shared",
                                "ipod_root",     "inetradio_root",          "mediaserver_root"};

CgiResult RootTreeFor(const TreeWorld& world) {
    TreeFixture fixture(world);
    return Get(kRootQuery, world.user);
}

const Json::Value& Category(const CgiResult& r, const std::string& id) {
    for (const Json::Value& node : r.json) {
        if (node["id"] == id)
            return node;
    }
    static const Json::Value none;
    return none;
}

TEST(RootTree, ServiceStoppedGivesNoLibraryCategories) {
    TreeWorld world;
    world.serviceRunning = false;
    const CgiResult r = RootTreeFor(world);
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(Ids(r.json), (Strings{"ipod_root", "inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, NoServicePidFileGivesNoLibraryCategories) {
    TreeWorld world;
    world.permission = 8;
    TreeFixture fixture(world);
    unlink("/run/vanu/service/3.pid");
    const CgiResult r = Get(kRootQuery);
    EXPECT_EQ(Ids(r.json), (Strings{"inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, NoAudioShareGivesNoLibraryCategories) {
    TreeWorld world;
    world.share = false;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Ids(r.json), (Strings{"ipod_root", "inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, AudioSharePathFromAudioConfCounts) {
    TreeWorld world;
    world.share = false;
    TreeFixture fixture(world);
    MakeDirs("/volume1/elsewhere");
    WriteFile(kAudioConf, "audio_share_path=/volume1/elsewhere\n");
    EXPECT_EQ(Ids(Get(kRootQuery).json), kAllCategories);
    WriteFile(kAudioConf, "audio_share_path=/volume1/missing\n");
    MakeDirs("/volume1/music");  // the default no longer counts once the key names another folder
    EXPECT_EQ(Ids(Get(kRootQuery).json),
              (Strings{"ipod_root", "inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, PermissionEightOnlyNoIPodLibraryOn) {
    TreeWorld world;
    world.permission = 8;
    world.ipod = false;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Ids(r.json),
              (Strings{"musiclib_root", "musiclib_music_personal", "musiclib_music_shared",
                       "inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, IPodPathThatIsARegularFileShowsNoIPod) {
    TreeWorld world;
    world.permission = 1;
    world.ipod = false;
    TreeFixture fixture(world);
    WriteFile("/usr/vanu/etc/audio/ipod", "not a folder");
    EXPECT_EQ(Ids(Get(kRootQuery).json), (Strings{"musiclib_root", "musiclib_music_personal",
                                                  "musiclib_music_shared", "inetradio_root"}));
}

TEST(RootTree, IPodDirectoryWithoutPermissionBitShowsNoIPod) {
    TreeWorld world;
    world.permission = 4 | 8;
    EXPECT_EQ(Ids(RootTreeFor(world).json),
              (Strings{"musiclib_root", "musiclib_music_personal", "musiclib_music_shared",
                       "inetradio_root", "mediaserver_root"}));
}

TEST(RootTree, RadioCategoryIsPresentWhateverTheBits) {
    for (int permission : {1, 4, 8, 13, 16, 2, -1, 0x40000000}) {
        TreeWorld world;
        world.permission = permission;
        world.serviceRunning = permission % 2 == 0;
        const CgiResult r = RootTreeFor(world);
        const Strings ids = Ids(r.json);
        EXPECT_NE(std::find(ids.begin(), ids.end(), "inetradio_root"), ids.end()) << permission;
        ResetSandbox();
    }
}

TEST(RootTree, OnlyMusicLibraryAndRadioAreExpandedAndAllHideTheirIcon) {
    const CgiResult r = RootTreeFor(TreeWorld());
    ASSERT_EQ(Ids(r.json), kAllCategories);
    for (const Json::Value& node : r.json) {
        const std::string id = node["id"].asString();
        EXPECT_EQ(node["expanded"].asBool(), id == "musiclib_root" || id == "inetradio_root") << id;
        EXPECT_EQ(node["iconCls"], "x-tree-hide-icon") << id;
        EXPECT_EQ(node["icon"], "3rdparty/Harmona/images/s.gif") << id;
        EXPECT_FALSE(node.isMember("pid")) << id;
        for (const char* flag : {"allowDrag", "allowDrop", "draggable", "leaf"})
            EXPECT_EQ(node[flag], false) << id;
        EXPECT_TRUE(node["children"].isArray()) << id;
    }
}

TEST(RootTree, WholeTreeForEveryPermission) {
    TreeFixture fixture(TreeWorld{});
    const CgiResult r = Get(kRootQuery);
    ASSERT_EQ(r.exitStatus, 1);
    ASSERT_EQ(Ids(r.json), kAllCategories);
    EXPECT_EQ(Category(r, "musiclib_root")["text"], "Library");
    EXPECT_EQ(Ids(Category(r, "musiclib_root")["children"]),
              (Strings{"musiclib_music_all", "musiclib_music_file", "musiclib_music_album",
                       "musiclib_music_aa", "musiclib_music_genre", "musiclib_random",
                       "musiclib_music_latestalbum"}));
    EXPECT_EQ(Ids(Category(r, "musiclib_music_personal")["children"]),
              (Strings{"musiclib_music_personal_refresh", "musiclib_music_personal_new",
                       "musiclib_music_personal/playlist/Morning",
                       "musiclib_music_personal/playlist/Road trip",
                       "musiclib_music_personal/smart/blues", "musiclib_music_personal/smart/Jazz",
                       "musiclib_music_personal/smart/rock"}));
    EXPECT_EQ(Ids(Category(r, "musiclib_music_shared")["children"]),
              (Strings{"musiclib_music_shared_refresh", "musiclib_music_shared_new",
                       "musiclib_music_shared/playlist/3", "musiclib_music_shared/playlist/7",
                       "musiclib_music_shared/smart/Top rated"}));
    EXPECT_EQ(Ids(Category(r, "ipod_root")["children"]),
              (Strings{"ipod_refresh", "ipod_" + IPodKey(fixture.IPodIds()[0]),
                       "ipod_" + IPodKey(fixture.IPodIds()[1])}));
    EXPECT_EQ(Ids(Category(r, "inetradio_root")["children"]),
              (Strings{"inetradio_new", "inetradio_sc", "inetradio_rio", "inetradio_userdefined",
                       "inetradio_favorite"}));
    EXPECT_EQ(Ids(Category(r, "mediaserver_root")["children"]),
              (Strings{"mediaserver_refresh", "mediaserver_http://10.0.0.1:8200/ctl/1",
                       "mediaserver_http://10.0.0.2:8200/ctl/2",
                       "mediaserver_http://10.0.0.3:8200/ctl/3"}));
    // Commands 14 and 16 once each: three servers fit one page.
    EXPECT_EQ(fixture.Daemon()->Commands(), (std::vector<std::int32_t>{14, 16}));
}

TEST(RootTree, PermissionOneShowsIPodButNoMediaServerAndNoSharedNewButton) {
    TreeWorld world;
    world.permission = 1;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Ids(r.json), (Strings{"musiclib_root", "musiclib_music_personal",
                                    "musiclib_music_shared", "ipod_root", "inetradio_root"}));
    EXPECT_EQ(Ids(Category(r, "musiclib_music_shared")["children"])[1],
              "musiclib_music_shared/playlist/3");
}

TEST(RootTree, PermissionFourAddsOnlyTheSharedNewButton) {
    TreeWorld world;
    world.permission = 4;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Ids(r.json), (Strings{"musiclib_root", "musiclib_music_personal",
                                    "musiclib_music_shared", "inetradio_root"}));
    EXPECT_EQ(Ids(Category(r, "musiclib_music_shared")["children"])[1],
              "musiclib_music_shared_new");
}

TEST(RootTree, NoOptionalBitsWithServiceStoppedGivesRadioAlone) {
    TreeWorld world;
    world.permission = 16;
    world.serviceRunning = false;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(Ids(r.json), (Strings{"inetradio_root"}));
}

TEST(RootTree, DaemonDownLeavesTheScanButtonAlone) {
    TreeWorld world;
    world.daemon = false;
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(Ids(Category(r, "mediaserver_root")["children"]), (Strings{"mediaserver_refresh"}));
}

TEST(RootTree, TextsInTheUsersLanguage) {
    TreeWorld world;
    world.language = "ger";
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Category(r, "musiclib_root")["text"], "Mediathek");
    EXPECT_EQ(Category(r, "inetradio_root")["text"], "Internetradio");
    EXPECT_EQ(Category(r, "mediaserver_root")["text"], "Medienserver");
}

TEST(RootTree, FailingPersonalPlaylistsEndTheTreeWithTheErrorPair) {
    // A playlists path that cannot be read as a folder: the personal playlist listing fails.
    TreeFixture fixture(WorldWithUnlistablePersonalPlaylists());
    const CgiResult r = Get(kRootQuery);
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.json["success"], false);
    EXPECT_EQ(r.json["errinfo"]["sec"], "common");
    EXPECT_EQ(r.json["errinfo"]["key"], "error_system");
    EXPECT_EQ(Ids(r.json["items"]), (Strings{"musiclib_root"}));
    EXPECT_EQ(r.LogMessages(), (Strings{"audio:642 Failed to enum user's playlist!"}));
}

// The line number of the error reply is a fixed identifier, the same wherever the code moves.
TEST(RootTree, FailingCategoryReportsLine106) {
    TreeFixture fixture(WorldWithUnlistablePersonalPlaylists());
    const CgiResult r = Get(kRootQuery);
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_EQ(r.json["success"], false);
    EXPECT_EQ(r.json["errinfo"]["line"], 106);
}

TEST(RootTree, SharedLibraryThatIsNotADatabaseEndsTheTree) {
    TreeFixture fixture(TreeWorld{});
    WriteFile(kLibraryDb, std::string(4096, 'x'));
    const CgiResult r = Get(kRootQuery);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.json["errinfo"]["key"], "error_system");
    EXPECT_EQ(Ids(r.json["items"]), (Strings{"musiclib_root", "musiclib_music_personal"}));
}

TEST(RootTree, TextsAreLoadedEvenWhenOnlyRadioIsShown) {
    TreeWorld world;
    world.permission = 16;
    world.serviceRunning = false;
    world.language = "jpn";
    const CgiResult r = RootTreeFor(world);
    EXPECT_EQ(Category(r, "inetradio_root")["text"], "インターネットラジオ");
}

}  // namespace
