// The music library subtree, through the real CGI against a scripted ContentDirectory on
// 127.0.0.1:50003 (and the builder in-process where only that can reach a case).
#include <gtest/gtest.h>
#include <stdlib.h>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/ScriptedHttpServer.h"
#include "tests/library/LibraryFixture.h"

using namespace harmona::test;

namespace {

class MusicLibrary : public ::testing::Test {
  protected:
    void SetUp() override { LibraryFixture(); }
    ScriptedHttpServer server;
};

void ExpectLeafNode(const Json::Value& node, const std::string& id, const std::string& pid,
                    const std::string& text, const std::string& icon) {
    EXPECT_EQ(node["id"].asString(), id);
    EXPECT_EQ(node["pid"].asString(), pid) << id;
    EXPECT_EQ(node["text"].asString(), text) << id;
    EXPECT_EQ(node["qtip"].asString(), text) << id;
    EXPECT_EQ(node["icon"].asString(), icon) << id;
    EXPECT_TRUE(node["leaf"].asBool()) << id;
    EXPECT_FALSE(node["allowDrag"].asBool()) << id;
    EXPECT_FALSE(node["allowDrop"].asBool()) << id;
    EXPECT_FALSE(node["draggable"].asBool()) << id;
    EXPECT_FALSE(node["expanded"].asBool()) << id;
    EXPECT_FALSE(node.isMember("iconCls")) << id;
    EXPECT_EQ(node.size(), 10u) << id;
}

TEST_F(MusicLibrary, RootYieldsTheSevenCategoriesInTableOrderWithoutAServerRequest) {
    ASSERT_TRUE(server.Start());
    // The child node routing hands the object id "root" to the builder for "musiclib_root".
    const CgiResult r = GetTreeNode("musiclib_root");
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 7u) << r.body;
    const char* rows[7][3] = {
        {"musiclib_music_all", "All Music", "icon_genmusic.png"},
        {"musiclib_music_file", "Folders &amp; Files", "icon_gencategory.png"},
        {"musiclib_music_album", "Albums", "icon_class_album.png"},
        {"musiclib_music_aa", "Album Artists", "icon_class_artist.png"},
        {"musiclib_music_genre", "Genres", "icon_class_genre.png"},
        {"musiclib_random", "Random 100", "icon_class_random100.png"},
        {"musiclib_music_latestalbum", "Recently Added", "icon_class_latestalbum.png"},
    };
    for (Json::ArrayIndex i = 0; i < 7; ++i)
        ExpectLeafNode(r.json[i], rows[i][0], "musiclib", rows[i][1],
                       std::string("3rdparty/Harmona/images/files_class/") + rows[i][2]);
    EXPECT_TRUE(server.Requests().empty());
}

TEST_F(MusicLibrary, MissingTextKeyLeavesTheCategoryTextEmpty) {
    WriteFile(std::string(kTextsDir) + "enu/strings", "[common]\nclass_music_album=Albums\n");
    const CgiResult r = GetTreeNode("musiclib_root");
    ASSERT_TRUE(r.jsonOk);
    ASSERT_EQ(r.json.size(), 7u);
    EXPECT_EQ(r.json[0]["text"].asString(), "");
    EXPECT_EQ(r.json[2]["text"].asString(), "Albums");
}

TEST_F(MusicLibrary, CategoryNodeIdReachesTheServerAsObjectIdAndBecomesTheParentId) {
    ContentTree tree;
    tree.AddContainer("music_album", "album$1", "First Album");
    tree.AddContainer("music_album", "album$2", "Second Album");
    tree.AddItem("music_album", "track$9", "A track");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_album");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 3u);
    const char* icon = "3rdparty/Harmona/images/files_class/icon_container.png";
    ExpectLeafNode(r.json[0], "musiclib_album$1", "musiclib_music_album", "First Album", icon);
    ExpectLeafNode(r.json[1], "musiclib_album$2", "musiclib_music_album", "Second Album", icon);
    ExpectLeafNode(r.json[2], "musiclib_track$9", "musiclib_music_album", "A track", icon);

    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_TRUE(requests[0].isBrowse);
    EXPECT_EQ(requests[0].objectId, "music_album");
    EXPECT_EQ(requests[0].browseFlag, "BrowseDirectChildren");
    EXPECT_EQ(requests[0].startingIndex, 0);
    EXPECT_EQ(requests[0].requestedCount, 0);
    EXPECT_EQ(requests[0].filter, "*");
    EXPECT_EQ(requests[0].target, "/ContentDirectory/control");
    EXPECT_EQ(requests[0].Header("SOAPACTION"),
              "\"urn:schemas-upnp-org:service:ContentDirectory:1#Browse\"");
}

TEST_F(MusicLibrary, ItemIdIsTakenUnchangedWhateverItsCharacters) {
    const std::string strange = "a&b<c>\"d'e f/%20\xC3\xA9\xE2\x9C\x93$_x";
    ContentTree tree;
    tree.AddContainer("music_all", strange, "Strange");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 1u);
    EXPECT_EQ(r.json[0]["id"].asString(), "musiclib_" + strange);
}

TEST_F(MusicLibrary, ParseWithoutResultYieldsOneNestedEmptyArray) {
    server.Enqueue(Reply(BrowseResponseBody("", 0, 0, /*withResult=*/false)));
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_genre");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "[[]]\n");
}

TEST_F(MusicLibrary, EmptyResultElementAlsoYieldsTheNestedEmptyArray) {
    server.Enqueue(Reply(BrowseResponseBody("", 0, 0, /*withResult=*/true)));
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_genre");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "[[]]\n");
}

TEST_F(MusicLibrary, EmptyItemListYieldsNoNodesAndResultOne) {
    ContentTree tree;
    tree.AddContainer("0", "random", "Random");  // "random" exists and is empty
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_random");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "[]\n");
    ASSERT_EQ(server.Requests().size(), 1u);
    EXPECT_EQ(server.Requests()[0].objectId, "random");
}

TEST_F(MusicLibrary, FailedParseYieldsNoNodesAndResultZero) {
    ContentTree tree;  // every object unknown: UPnP error 701 with HTTP 500
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_nothing");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "[]\n");
    EXPECT_EQ(server.Requests().size(), 1u);
}

TEST_F(MusicLibrary, FailedPrepareYieldsNoNodesAndResultZero) {
    // The child node routing never passes an empty object id; the builder itself is called here.
    setenv("REMOTE_USER", "admin", 1);
    ASSERT_TRUE(server.Start());
    HarmonaHandler handler;
    Json::Value children;
    EXPECT_EQ(handler.GetMusicLibraryNodes(children, ""), 0);
    EXPECT_TRUE(children.isNull());
    EXPECT_TRUE(server.Requests().empty());
}

TEST_F(MusicLibrary, BuilderAppendsToTheCallersArray) {
    setenv("REMOTE_USER", "admin", 1);
    ContentTree tree;
    tree.AddContainer("music_aa", "aa1", "Artist One");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    HarmonaHandler handler;
    Json::Value children(Json::arrayValue);
    children.append("earlier");
    EXPECT_EQ(handler.GetMusicLibraryNodes(children, "music_aa"), 1);
    ASSERT_EQ(children.size(), 2u);
    EXPECT_EQ(children[0].asString(), "earlier");
    EXPECT_EQ(children[1]["id"].asString(), "musiclib_aa1");
    EXPECT_EQ(children[1]["pid"].asString(), "musiclib_music_aa");
}

TEST_F(MusicLibrary, TitlesAreHtmlEncodedInTextAndQtip) {
    ContentTree tree;
    tree.AddContainer("music_all", "1", "Rock & Roll <Live> \"Best\" 'of'");
    tree.AddContainer("music_all", "2", "");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 2u);
    const std::string encoded = "Rock &amp; Roll &lt;Live&gt; &quot;Best&quot; &#39;of&#39;";
    EXPECT_EQ(r.json[0]["text"].asString(), encoded);
    EXPECT_EQ(r.json[0]["qtip"].asString(), encoded);
    // An empty title is used as it is.
    EXPECT_EQ(r.json[1]["text"].asString(), "");
    EXPECT_EQ(r.json[1]["id"].asString(), "musiclib_2");
}

TEST_F(MusicLibrary, ItemsKeepTheServersOrder) {
    ContentTree tree;
    for (const char* title : {"Zeta", "alpha", "Mu", "beta"})
        tree.AddItem("music_file", std::string("id-") + title, title);
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_file");
    ASSERT_TRUE(r.jsonOk);
    ASSERT_EQ(r.json.size(), 4u);
    EXPECT_EQ(r.json[0]["text"].asString(), "Zeta");
    EXPECT_EQ(r.json[1]["text"].asString(), "alpha");
    EXPECT_EQ(r.json[2]["text"].asString(), "Mu");
    EXPECT_EQ(r.json[3]["text"].asString(), "beta");
}

}  // namespace
