// iPod nodes, over real iPod databases written with libgpod. The builders run in the test process,
// where their result and the array they append to can be seen; the root tree and the refresh
// action that show them through a request have tests of their own.
#include <gtest/gtest.h>

#include "tests/devices/DeviceTestSupport.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/Sandbox.h"

using namespace harmona::test;

namespace {

constexpr const char* kRefreshIcon = "3rdparty/Harmona/images/button/btn_refresh.png";
constexpr const char* kPlaylistIcon = "3rdparty/Harmona/images/files_class/icon_genmusic.png";

class IPodNodes : public ::testing::Test {
  protected:
    void SetUp() override { WriteDeviceFixture(); }

    // The children of "ipod_root" as AddIPodChildren builds them.
    Json::Value Children() {
        Json::Value children(Json::arrayValue);
        auto handler = MakeHandler();
        EXPECT_EQ(handler->AddIPodChildren(children), 1);
        return children;
    }

    static void ExpectLeafOnly(const Json::Value& node) {
        EXPECT_FALSE(node["allowDrag"].asBool());
        EXPECT_FALSE(node["allowDrop"].asBool());
        EXPECT_FALSE(node["draggable"].asBool());
        EXPECT_FALSE(node["expanded"].asBool());
        EXPECT_TRUE(node["leaf"].asBool());
    }

    static void ExpectRefreshButton(const Json::Value& node) {
        EXPECT_EQ(Text(node, "id"), "ipod_refresh");
        EXPECT_FALSE(Has(node, "pid")) << "the refresh button's pid is empty, so left out";
        EXPECT_EQ(Text(node, "text"), kRefreshButtonText);
        EXPECT_EQ(Text(node, "qtip"), kRefreshButtonText);
        EXPECT_EQ(Text(node, "icon"), kRefreshIcon);
        ExpectLeafOnly(node);
    }

    static void ExpectPlaylist(const Json::Value& node, std::uint64_t id, const std::string& text) {
        EXPECT_EQ(Text(node, "id"), "ipod_" + IPodKey(id));
        EXPECT_EQ(Text(node, "pid"), "ipod_root");
        EXPECT_EQ(Text(node, "text"), text);
        EXPECT_EQ(Text(node, "qtip"), text);
        EXPECT_EQ(Text(node, "icon"), kPlaylistIcon);
        ExpectLeafOnly(node);
    }
};

TEST_F(IPodNodes, AnIPodWithNoPlaylistsGivesTheRefreshButtonAloneWithAnEmptyPid) {
    AttachIPod({});
    ASSERT_TRUE(Exists(IPodDatabasePath(kDefaultIPodMountpoint)));
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 1u) << children.toStyledString();
    ExpectRefreshButton(children[0]);
}

TEST_F(IPodNodes, TwoPlaylistsComeAfterTheButtonInTheLibrarysOrder) {
    // Not in name order, so that any sorting would show.
    const auto ids = AttachIPod({"Zebra songs", "Abba hits"});
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 3u) << children.toStyledString();
    ExpectRefreshButton(children[0]);
    ExpectPlaylist(children[1], ids[0], "Zebra songs");
    ExpectPlaylist(children[2], ids[1], "Abba hits");
}

TEST_F(IPodNodes, ManyPlaylistsKeepTheDatabaseOrder) {
    std::vector<std::string> names;
    for (int i = 0; i < 60; ++i)
        names.push_back("List " + std::to_string((i * 37) % 60));
    const auto ids = AttachIPod(names);
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), names.size() + 1);
    for (std::size_t i = 0; i < names.size(); ++i)
        ExpectPlaylist(children[static_cast<Json::ArrayIndex>(i + 1)], ids[i], names[i]);
}

TEST_F(IPodNodes, TheKeyIsTheIdInSixteenLowercaseHexDigits) {
    WriteIPodDatabaseWithIds(kDefaultIPodMountpoint,
                             {{"Small id", 0xab}, {"Large id", 0xFEDCBA9876543210ull}});
    WriteIPodMountpointFile(std::string(kDefaultIPodMountpoint) + "\n");
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 3u);
    EXPECT_EQ(Text(children[1], "id"), "ipod_00000000000000ab");
    EXPECT_EQ(Text(children[2], "id"), "ipod_fedcba9876543210");
}

TEST_F(IPodNodes, HtmlSpecialCharactersAreEncodedInTheTextButNotInTheId) {
    const auto ids = AttachIPod({"Rock & <Roll> \"live\" 'n' more"});
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 2u);
    ExpectPlaylist(children[1], ids[0],
                   "Rock &amp; &lt;Roll&gt; &quot;live&quot; &#39;n&#39; more");
    EXPECT_EQ(Text(children[1], "id").find('&'), std::string::npos);
}

TEST_F(IPodNodes, NonAsciiNamesArriveUnchanged) {
    const std::string name = "Grüße aus Köln · 東京の夜 · 🎵";
    const auto ids = AttachIPod({name});
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 2u);
    ExpectPlaylist(children[1], ids[0], name);
}

TEST_F(IPodNodes, ANameOf300BytesIsCutTo254BytesOnACharacterBoundary) {
    // "x" and 100 three-byte characters: 301 bytes. 254 bytes would split the 85th character, so
    // the name keeps 1 + 84 * 3 = 253 bytes.
    std::string euros;
    for (int i = 0; i < 100; ++i)
        euros += "€";
    const std::string ascii(300, 'a');
    const auto ids = AttachIPod({"x" + euros, ascii});
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 3u);
    const std::string cut = "x" + euros.substr(0, 84 * 3);
    ASSERT_EQ(cut.size(), 253u);
    ExpectPlaylist(children[1], ids[0], cut);
    ExpectPlaylist(children[2], ids[1], std::string(254, 'a'));
}

TEST_F(IPodNodes, TheMasterPlaylistIsNotListed) {
    const auto ids = AttachIPod({"Only list"});
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 2u);
    ExpectPlaylist(children[1], ids[0], "Only list");
    for (const Json::Value& node : children)
        EXPECT_NE(Text(node, "text"), kIPodMasterPlaylistName);
}

TEST_F(IPodNodes, TheRefreshActionForIPodGetsThePlaylistNodesOnly) {
    const auto ids = AttachIPod({"First", "Second"});
    Json::Value items(Json::arrayValue);
    auto handler = MakeHandler();
    EXPECT_EQ(handler->ListIPodPlaylists(items), 2);
    ASSERT_EQ(items.size(), 2u) << items.toStyledString();
    ExpectPlaylist(items[0], ids[0], "First");
    ExpectPlaylist(items[1], ids[1], "Second");
}

TEST_F(IPodNodes, ListingAppendsAfterWhatTheArrayHolds) {
    const auto ids = AttachIPod({"Appended"});
    Json::Value items(Json::arrayValue);
    items.append("earlier");
    auto handler = MakeHandler();
    EXPECT_EQ(handler->ListIPodPlaylists(items), 1);
    ASSERT_EQ(items.size(), 2u);
    EXPECT_EQ(items[0].asString(), "earlier");
    ExpectPlaylist(items[1], ids[0], "Appended");
}

TEST_F(IPodNodes, ListingAnIPodWithNoPlaylistsCountsZero) {
    AttachIPod({});
    Json::Value items(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->ListIPodPlaylists(items), 0);
    EXPECT_EQ(items.size(), 0u);
}

// The failures of the library: no playlist node, no error, the button alone.
class IPodNodeFailures : public IPodNodes {
  protected:
    void ExpectButtonAlone() {
        const Json::Value children = Children();
        ASSERT_EQ(children.size(), 1u) << children.toStyledString();
        ExpectRefreshButton(children[0]);
        Json::Value items(Json::arrayValue);
        EXPECT_EQ(MakeHandler()->ListIPodPlaylists(items), 0);
        EXPECT_EQ(items.size(), 0u);
        EXPECT_TRUE(TakeLogLines(50).empty()) << "a library failure is not logged";
    }
};

TEST_F(IPodNodeFailures, AMissingMountpointFileGivesTheRefreshButtonAlone) {
    WriteIPodDatabase(kDefaultIPodMountpoint, {"Unreachable"});
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, AMissingDatabaseGivesTheRefreshButtonAlone) {
    MakeDirs(std::string(kDefaultIPodMountpoint) + "/iPod_Control/iTunes");
    WriteIPodMountpointFile(std::string(kDefaultIPodMountpoint) + "\n");
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, ACorruptDatabaseGivesTheRefreshButtonAlone) {
    AttachIPod({"Lost"});
    std::string garbage;
    for (int i = 0; i < 4096; ++i)
        garbage += static_cast<char>((i * 131 + 7) & 0xff);
    WriteFile(IPodDatabasePath(kDefaultIPodMountpoint), garbage);
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, ATruncatedDatabaseGivesTheRefreshButtonAlone) {
    AttachIPod({"Half", "Gone"});
    const std::string path = IPodDatabasePath(kDefaultIPodMountpoint);
    const std::string whole = ReadFile(path);
    ASSERT_GT(whole.size(), 64u);
    WriteFile(path, whole.substr(0, 40));
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, AnEmptyDatabaseFileGivesTheRefreshButtonAlone) {
    AttachIPod({"Empty"});
    WriteFile(IPodDatabasePath(kDefaultIPodMountpoint), "");
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, ARelativeMountpointGivesTheRefreshButtonAlone) {
    AttachIPod({"Relative"});
    WriteIPodMountpointFile("tmp/ipod\n");
    ExpectButtonAlone();
}

TEST_F(IPodNodeFailures, AMountpointWithoutAnIPodGivesTheRefreshButtonAlone) {
    MakeDirs("/tmp/not-an-ipod");
    WriteIPodMountpointFile("/tmp/not-an-ipod\n");
    ExpectButtonAlone();
}

}  // namespace
