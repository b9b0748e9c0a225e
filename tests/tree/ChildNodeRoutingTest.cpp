// Child node routing by the node id's family, through the real CGI against a scripted
// ContentDirectory.
#include <gtest/gtest.h>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/ScriptedHttpServer.h"

using namespace harmona::test;

namespace {

class ChildNodeRouting : public ::testing::Test {
  protected:
    void SetUp() override {
        AddUser("admin", 1 | 4 | 8 | 16);
        WriteFile(std::string(kTextsDir) + "enu/strings", "[common]\nclass_music_all=All\n");
        // Every browsed object has one child, titled after the object, so that the reply shows
        // which object id reached the music library builder.
        server.SetResponder([](const RecordedRequest& r) {
            return Reply(BrowseResponseBody(
                DidlLite({{true, "child-of-" + r.objectId, r.objectId, "in " + r.objectId}}), 1,
                1));
        });
        ASSERT_TRUE(server.Start());
    }

    CgiResult Node(const std::string& node) {
        return Get(Query({{"action", "gettreenode"}, {"node", node}}));
    }

    // The object id that the builder browsed for `node`, checked in the reply and at the server.
    void ExpectBrowsed(const std::string& node, const std::string& objectId) {
        const CgiResult r = Node(node);
        ASSERT_TRUE(r.exited) << node;
        EXPECT_EQ(r.exitStatus, 1) << node;
        ASSERT_TRUE(r.jsonOk) << r.body;
        ASSERT_EQ(r.json.size(), 1u) << r.body;
        EXPECT_EQ(r.json[0]["id"].asString(), "musiclib_child-of-" + objectId);
        EXPECT_EQ(r.json[0]["pid"].asString(), "musiclib_" + objectId);
        const std::vector<RecordedRequest> requests = server.Requests();
        ASSERT_EQ(requests.size(), 1u);
        EXPECT_EQ(requests[0].objectId, objectId);
        EXPECT_EQ(requests[0].browseFlag, "BrowseDirectChildren");
    }

    ScriptedHttpServer server;
};

TEST_F(ChildNodeRouting, Musiclib4HandsObjectId4ToTheMusicLibraryBuilder) {
    ExpectBrowsed("musiclib_4", "4");
}

TEST_F(ChildNodeRouting, MusiclibMusicPersonalHandsMusicPersonalToTheBuilder) {
    ExpectBrowsed("musiclib_music_personal", "music_personal");
}

TEST_F(ChildNodeRouting, MusiclibraryXHandsXToTheBuilder) {
    ExpectBrowsed("musiclibrary_x", "x");
}

TEST_F(ChildNodeRouting, OnlyTheFirstUnderscoreSplitsTheId) {
    ExpectBrowsed("musiclib_a_b__c_", "a_b__c_");
}

TEST_F(ChildNodeRouting, IpodRootAndInetradioRootGiveResultOneWithAnEmptyReply) {
    for (const char* node : {"ipod_root", "inetradio_root", "mediaserver_x", "MUSICLIB_4", "x_y"}) {
        const CgiResult r = Node(node);
        ASSERT_TRUE(r.exited) << node;
        EXPECT_EQ(r.exitStatus, 1) << node;
        EXPECT_EQ(r.Header("Content-Type"), "text/plain; charset=\"UTF-8\"") << node;
        EXPECT_EQ(r.body, "[]\n") << node;
    }
    EXPECT_TRUE(server.Requests().empty());
}

TEST_F(ChildNodeRouting, MalformedIdsGiveResultZeroAnEmptyReplyAndNoBuilderCall) {
    for (const char* node : {"musiclib_", "musiclib", "", "_", "ipod_", "noseparator"}) {
        const CgiResult r = Node(node);
        ASSERT_TRUE(r.exited) << node;
        EXPECT_EQ(r.exitStatus, 0) << node;
        EXPECT_EQ(r.body, "[]\n") << node;
    }
    EXPECT_TRUE(server.Requests().empty());
}

TEST_F(ChildNodeRouting, FailingMusicLibraryBuilderPrintsTheEmptyReplyWithoutErrorEnvelope) {
    server.Stop();  // connection refused
    const CgiResult r = Node("musiclib_music_album");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "[]\n");
}

TEST_F(ChildNodeRouting, GettreenodeWithoutNodePrintsNothing) {
    ASSERT_NO_FATAL_FAILURE(ExpectNoReply(Get("action=gettreenode")));
    EXPECT_TRUE(server.Requests().empty());
}

}  // namespace
