// The music library subtree with a broken or hostile media server: every fault ends the request
// quickly with the empty reply and exit status 0, never a crash or a hang (the browse library's
// limits: platform/README.md, "Local media server and browse library").
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#include "tests/harness/ScriptedHttpServer.h"
#include "tests/library/LibraryFixture.h"

using namespace harmona::test;

namespace {

class MusicLibraryBrowseFaults : public ::testing::Test {
  protected:
    void SetUp() override { LibraryFixture(); }

    // Runs the CGI for a browse and checks the failure reply of the child node routing (empty,
    // exit 0).
    CgiResult ExpectFailedBrowse(int timeoutMs = 30000) {
        CgiRequest request;
        request.queryString = Query({{"action", "gettreenode"}, {"node", "musiclib_music_all"}});
        request.timeoutMs = timeoutMs;
        const CgiResult r = RunCgi(request);
        EXPECT_TRUE(r.exited) << "signal " << r.signal << " timedOut " << r.timedOut << r.errors;
        EXPECT_EQ(r.exitStatus, 0);
        EXPECT_EQ(r.body, "[]\n");
        return r;
    }

    ScriptedHttpServer server;
};

// A well-formed browse reply of one container of "music_all", with HTTP status `status`: the good
// beginning of the replies that fail later, or for their status alone.
ScriptedReply OneContainerReply(int status = 200) {
    return Reply(BrowseResponseBody(DidlLite({{true, "1", "music_all", "One"}}), 1, 1), status);
}

// The largest resident set of any child reaped so far (the CGI), in KiB.
long ChildrenPeakKiB() {
    rusage usage{};
    getrusage(RUSAGE_CHILDREN, &usage);
    return usage.ru_maxrss;
}

TEST_F(MusicLibraryBrowseFaults, ConnectionRefused) {
    const CgiResult r = ExpectFailedBrowse();
    EXPECT_LT(r.wallMs, 5000);
}

TEST_F(MusicLibraryBrowseFaults, ServerThatNeverAcceptsFailsAfterTheConnectLimit) {
    // A listener whose accept queue is full: further SYNs are dropped, so connect never completes.
    const int listener = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(50003);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    ASSERT_EQ(bind(listener, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listener, 0), 0);
    std::vector<int> fillers;
    for (int i = 0; i < 4; ++i) {
        const int s = socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK, 0);
        connect(s, reinterpret_cast<sockaddr*>(&address), sizeof(address));
        fillers.push_back(s);
    }
    usleep(100 * 1000);
    const CgiResult r = ExpectFailedBrowse();
    EXPECT_GE(r.wallMs, 1800);
    EXPECT_LT(r.wallMs, 6000);
    for (int s : fillers)
        close(s);
    close(listener);
}

TEST_F(MusicLibraryBrowseFaults, Http500WithAValidBrowseBodyFails) {
    server.Enqueue(OneContainerReply(500));
    ASSERT_TRUE(server.Start());
    ExpectFailedBrowse();
    EXPECT_EQ(server.Requests().size(), 1u);
}

TEST_F(MusicLibraryBrowseFaults, SoapFaultWithStatus200Fails) {
    server.Enqueue(Reply(SoapFaultBody(701, "No such object")));
    ASSERT_TRUE(server.Start());
    ExpectFailedBrowse();
}

TEST_F(MusicLibraryBrowseFaults, MalformedXmlFails) {
    for (const std::string& body :
         {std::string(
              "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\"><s:Body><u:Brow"),
          std::string("this is not xml"), std::string(""),
          // A valid envelope whose Result is not DIDL-Lite XML.
          BrowseResponseBody(
              "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\"><item", 1, 1)}) {
        ScriptedHttpServer one;
        one.Enqueue(Reply(body));
        ASSERT_TRUE(one.Start());
        ExpectFailedBrowse();
        EXPECT_EQ(one.Requests().size(), 1u);
    }
}

TEST_F(MusicLibraryBrowseFaults, ConnectionClosedWithoutReplyFails) {
    ScriptedReply reply;
    reply.closeWithoutReply = true;
    server.Enqueue(reply);
    ASSERT_TRUE(server.Start());
    ExpectFailedBrowse();
}

TEST_F(MusicLibraryBrowseFaults, ReplyThatNeverEndsIsCutAtTheWholeReplyLimit) {
    // Headers at once, then one byte a second forever: only the 20-second whole-reply limit ends
    // it.
    ScriptedReply reply = OneContainerReply();
    reply.dribbleBytes = 1;
    reply.dribbleIntervalMs = 1000;
    reply.neverEnd = true;
    server.Enqueue(reply);
    ASSERT_TRUE(server.Start());
    const CgiResult r = ExpectFailedBrowse(/*timeoutMs=*/40000);
    EXPECT_FALSE(r.timedOut);
    EXPECT_GE(r.wallMs, 19500);
    EXPECT_LE(r.wallMs, 25000);
}

TEST_F(MusicLibraryBrowseFaults, OversizedReplyIsRefusedAndTheTransferAborted) {
    // A valid beginning, then 80 MiB of padding announced by Content-Length.
    ScriptedReply reply = OneContainerReply();
    reply.paddingBytes = 80u * 1024 * 1024;
    server.Enqueue(reply);
    ASSERT_TRUE(server.Start());
    ExpectFailedBrowse();
    server.Stop();
    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_TRUE(requests[0].clientClosedEarly);
    // Aborted soon after 64 MiB, not read to the end.
    EXPECT_LT(requests[0].bytesSent, 72u * 1024 * 1024);
    EXPECT_LT(ChildrenPeakKiB(), 400 * 1024);
}

TEST_F(MusicLibraryBrowseFaults, ReplyJustUnderTheLimitIsAccepted) {
    // 60 MiB of trailing white space after the envelope: well-formed, under 64 MiB.
    ScriptedReply reply = OneContainerReply();
    reply.paddingBytes = 60u * 1024 * 1024;
    server.Enqueue(reply);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk) << r.body.substr(0, 200);
    EXPECT_EQ(r.json.size(), 1u);
}

std::string Bomb() {
    std::string dtd = "<!DOCTYPE s:Envelope [<!ENTITY l0 \"lollollollollollollollollollol\">";
    for (int level = 1; level <= 12; ++level) {
        dtd += "<!ENTITY l" + std::to_string(level) + " \"";
        for (int i = 0; i < 10; ++i)
            dtd += "&l" + std::to_string(level - 1) + ";";
        dtd += "\">";
    }
    return dtd + "]>";
}

TEST_F(MusicLibraryBrowseFaults, EntityExpansionBombIsHarmless) {
    // The bomb twice: in the SOAP envelope's DTD, and inside the DIDL-Lite document of Result.
    const std::string didl = "<?xml version=\"1.0\"?>" + Bomb() +
                             "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
                             "xmlns:dc=\"http://purl.org/dc/elements/1.1/\"><container id=\"b\">"
                             "<dc:title>&l12;</dc:title></container></DIDL-Lite>";
    std::string body = BrowseResponseBody(didl, 1, 1);
    body.insert(body.find("<s:Envelope"), Bomb());
    body.replace(body.find("<UpdateID>1"), 11, "<UpdateID>&l12;");
    server.Enqueue(Reply(body));
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    ASSERT_TRUE(r.exited) << r.signal;
    EXPECT_FALSE(r.timedOut);
    EXPECT_LT(r.wallMs, 5000);
    // Refused, or harmless: nothing expanded.
    EXPECT_EQ(r.body.find("lollol"), std::string::npos);
    EXPECT_LT(r.body.size(), 4096u);
    EXPECT_LT(ChildrenPeakKiB(), 200 * 1024);
    if (r.exitStatus == 1) {
        ASSERT_TRUE(r.jsonOk);
        ASSERT_EQ(r.json.size(), 1u);
        EXPECT_EQ(r.json[0]["id"].asString(), "musiclib_b");
    }
}

TEST_F(MusicLibraryBrowseFaults, ExternalEntityIsNeverFetched) {
    WriteFile("/tmp/secret", "TOPSECRET");
    const std::string didl =
        "<?xml version=\"1.0\"?><!DOCTYPE d [<!ENTITY x SYSTEM \"file:///tmp/secret\">]>"
        "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
        "xmlns:dc=\"http://purl.org/dc/elements/1.1/\"><container id=\"s\"><dc:title>&x;</dc:title>"
        "</container></DIDL-Lite>";
    server.Enqueue(Reply(BrowseResponseBody(didl, 1, 1)));
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.body.find("TOPSECRET"), std::string::npos);
}

TEST_F(MusicLibraryBrowseFaults, ServerCappingPagesAt50StillYieldsEveryChild) {
    ContentTree tree;
    tree.AddManyItems("music_all", 237, "track-");
    server.ServeTree(tree, /*pageCap=*/50);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk);
    ASSERT_EQ(r.json.size(), 237u);
    for (Json::ArrayIndex i = 0; i < 237; ++i) {
        EXPECT_EQ(r.json[i]["id"].asString(), "musiclib_track-" + std::to_string(i));
        EXPECT_EQ(r.json[i]["text"].asString(), "Track " + std::to_string(i));
    }
    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 5u);
    for (std::size_t i = 0; i < requests.size(); ++i) {
        EXPECT_EQ(requests[i].objectId, "music_all");
        EXPECT_EQ(requests[i].browseFlag, "BrowseDirectChildren");
        EXPECT_EQ(requests[i].startingIndex, static_cast<long>(50 * i));
        EXPECT_EQ(requests[i].requestedCount, 0);
    }
}

TEST_F(MusicLibraryBrowseFaults, FailureOnALaterPageFailsTheWholeBrowse) {
    ContentTree tree;
    tree.AddManyItems("music_all", 120, "t");
    const ScriptedReply firstPage = tree.Answer(
        [] {
            RecordedRequest r;
            r.isBrowse = true;
            r.objectId = "music_all";
            r.browseFlag = "BrowseDirectChildren";
            r.startingIndex = 0;
            r.requestedCount = 0;
            return r;
        }(),
        50);
    server.Enqueue(firstPage);
    server.Enqueue(Reply("broken", 500));
    ASSERT_TRUE(server.Start());
    ExpectFailedBrowse();
    EXPECT_EQ(server.Requests().size(), 2u);
}

TEST_F(MusicLibraryBrowseFaults, ObjectIdWithMarkupQuotesAndNonAsciiArrivesIntact) {
    const std::string objectId = "a&b<c>\"d'e \xC3\xA9\xE2\x82\xAC\xF0\x9F\x8E\xB5 &amp; ]]>";
    ContentTree tree;
    tree.AddContainer("0", objectId, "Strange");
    tree.AddItem(objectId, "child", "Child");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_" + objectId);
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json.size(), 1u);
    EXPECT_EQ(r.json[0]["pid"].asString(), "musiclib_" + objectId);
    ASSERT_EQ(server.Requests().size(), 1u);
    EXPECT_EQ(server.Requests()[0].objectId, objectId);
}

TEST_F(MusicLibraryBrowseFaults, DribbledReplyWithinTheLimitIsReadWhole) {
    ContentTree tree;
    tree.AddManyItems("music_all", 20, "d");
    RecordedRequest request;
    request.isBrowse = true;
    request.objectId = "music_all";
    request.browseFlag = "BrowseDirectChildren";
    ScriptedReply reply = tree.Answer(request);
    reply.delayMs = 300;
    reply.dribbleBytes = 512;
    reply.dribbleIntervalMs = 20;
    server.Enqueue(reply);
    ASSERT_TRUE(server.Start());
    const CgiResult r = GetTreeNode("musiclib_music_all");
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk);
    EXPECT_EQ(r.json.size(), 20u);
}

}  // namespace
