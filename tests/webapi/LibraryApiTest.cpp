// webapi/library.cgi run as the web server runs it: container listings browsed on a scripted
// ContentDirectory at 127.0.0.1:50003, playlists from real files and a real library.db, and the
// error replies.
#include <gtest/gtest.h>

#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "src/webapi/Failure.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Network.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/ScriptedDaemon.h"
#include "tests/harness/ScriptedHttpServer.h"

using namespace harmona::test;

namespace {

CgiResult Api(const std::vector<std::pair<std::string, std::string>>& params,
              const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query(params);
    request.remoteUser = user;
    return RunCgi(request);
}

CgiResult ListNode(const std::string& node) {
    return Api({{"action", "list"}, {"node", node}});
}

std::vector<std::string> StreamsOf(const Json::Value& reply) {
    std::vector<std::string> streams;
    for (const Json::Value& track : reply["tracks"])
        streams.push_back(track["stream"].asString());
    return streams;
}

// No reply may carry a path of the server's files.
void ExpectNoServerPath(const CgiResult& r) {
    EXPECT_EQ(r.body.find("/volume1"), std::string::npos) << r.body;
    EXPECT_EQ(r.body.find("/usr/vanu"), std::string::npos) << r.body;
    EXPECT_EQ(r.body.find("/tmp"), std::string::npos) << r.body;
}

class LibraryApi : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }
    ScriptedHttpServer server;
};

TEST_F(LibraryApi, ContainerListsItsSubContainersAndItsTracksWithMetadataAndStreamIds) {
    MakeGeneratedLibrary(20);
    ContentTree tree;
    tree.AddContainer("music_album", "album:A/First", "First Album");
    tree.AddItem("music_album", "7", "ignored: the library's title counts");
    tree.AddItem("music_album", "3", "x");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());

    const CgiResult r = ListNode("musiclib_music_album");
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_TRUE(r.json["success"].asBool());
    ASSERT_EQ(r.json["containers"].size(), 1u);
    EXPECT_EQ(r.json["containers"][0]["node"].asString(), "musiclib_album:A/First");
    EXPECT_EQ(r.json["containers"][0]["title"].asString(), "First Album");
    ASSERT_EQ(r.json["tracks"].size(), 2u);
    const Json::Value& first = r.json["tracks"][0];
    EXPECT_EQ(first["stream"].asString(), "7.mp3");
    EXPECT_EQ(first["title"].asString(), "Title 7");
    EXPECT_EQ(first["artist"].asString(), "Artist 7");
    EXPECT_EQ(first["duration"].asInt(), 8);  // (7 % 600 + 1) seconds
    EXPECT_EQ(r.json["tracks"][1]["stream"].asString(), "3.mp3");
    EXPECT_EQ(r.json["missing"].asInt(), 0);
    EXPECT_NE(r.Header("Content-Type").find("application/json"), std::string::npos);
    ExpectNoServerPath(r);
    ASSERT_EQ(server.Requests().size(), 1u);
    EXPECT_NE(server.Requests()[0].body.find("<ObjectID>music_album</ObjectID>"),
              std::string::npos);
}

TEST_F(LibraryApi, ItemsThatAreNotTracksOfTheLibraryAreCountedNotListed) {
    MakeGeneratedLibrary(5);
    ContentTree tree;
    tree.AddItem("music_all", "2", "in the library");
    // The server names itself by its network address.
    tree.Add(DidlItem("music_all", "track:4", "track:4", "http://192.0.2.1:50003/media/4.mp3"));
    tree.AddItem("music_all", "99", "not in the library");
    tree.Add(DidlItem("music_all", "x", "x", "http://192.0.2.1:50003/elsewhere/1.mp3"));
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = ListNode("musiclib_music_all");
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(StreamsOf(r.json), (std::vector<std::string>{"2.mp3", "4.mp3"}));
    EXPECT_EQ(r.json["missing"].asInt(), 2);
}

TEST_F(LibraryApi, ATenThousandTrackContainerComesWhole) {
    MakeGeneratedLibrary(10000);
    ContentTree tree;
    for (int n = 1; n <= 10000; ++n)
        tree.AddItem("music_all", std::to_string(n), "t");
    server.ServeTree(tree, 5000);
    ASSERT_TRUE(server.Start());
    const CgiResult r = ListNode("musiclib_music_all");
    ASSERT_TRUE(r.jsonOk) << r.body.substr(0, 300);
    ASSERT_EQ(r.json["tracks"].size(), 10000u);
    EXPECT_EQ(r.json["tracks"][9999]["stream"].asString(), "10000.mp3");
}

TEST_F(LibraryApi, PersonalPlaylistGivesItsTracksInFileOrder) {
    MakeGeneratedLibrary(10);
    WritePersonalPlaylistFile("admin", "Road Trip.M3U8",
                              "#EXTM3U\r\n#EXTINF:8,Artist 7 - Title 7\r\n" +
                                  GeneratedTrack(7).path + "\r\n" + GeneratedTrack(2).path +
                                  "\n/volume1/music/not indexed.mp3\n" + GeneratedTrack(9).path);
    const CgiResult r = ListNode("musiclib_music_personal/playlist/Road Trip");
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(StreamsOf(r.json), (std::vector<std::string>{"7.mp3", "2.mp3", "9.mp3"}));
    EXPECT_EQ(r.json["missing"].asInt(), 1);
    ExpectNoServerPath(r);
}

TEST_F(LibraryApi, PersonalPlaylistNamesNeverLeaveThePlaylistsFolder) {
    MakeGeneratedLibrary(3);
    WriteFile("/usr/vanu/etc/preference/admin/outside.m3u", GeneratedTrack(1).path + "\n");
    WriteFile("/usr/vanu/etc/preference/other/playlists/Theirs.m3u", GeneratedTrack(1).path + "\n");
    for (const char* name : {"../outside", "../../other/playlists/Theirs", "", "Absent"}) {
        const CgiResult r = ListNode(std::string("musiclib_music_personal/playlist/") + name);
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << name << r.output;
        EXPECT_EQ(r.exitStatus, 0) << name;
        ASSERT_TRUE(r.jsonOk) << r.body;
        EXPECT_FALSE(r.json["success"].asBool());
        EXPECT_EQ(r.json["tracks"].size(), 0u);
    }
}

TEST_F(LibraryApi, RelativePlaylistEntriesAreTakenFromTheAudioShare) {
    MakeGeneratedLibrary(3);
    WritePersonalPlaylistFile("admin", "Relative.m3u",
                              "Artist 2/Track 2.mp3\n../music/Artist 1/Track 1.mp3\n");
    const CgiResult r = ListNode("musiclib_music_personal/playlist/Relative");
    ASSERT_TRUE(r.jsonOk) << r.body;
    // Only the exact stored path counts: "../" is not resolved into another library path.
    EXPECT_EQ(StreamsOf(r.json), std::vector<std::string>{"2.mp3"});
    EXPECT_EQ(r.json["missing"].asInt(), 1);
}

TEST_F(LibraryApi, APlaylistFileThatIsALinkAFifoOrTooLargeIsRefusedWithoutWaiting) {
    MakeGeneratedLibrary(3);
    const std::string folder = PersonalPlaylistDir("admin");
    WriteFile("/volume1/elsewhere.m3u", GeneratedTrack(1).path + "\n");
    MakeDirs(folder);
    ASSERT_EQ(symlink("/volume1/elsewhere.m3u", (folder + "/Linked.m3u").c_str()), 0);
    ASSERT_EQ(mkfifo((folder + "/Fifo.m3u").c_str(), 0644), 0);
    WriteLargeFile(folder + "/Huge.m3u", "#EXTM3U\n", '#', std::size_t{9} << 20, "\n");
    std::string many;
    for (int n = 0; n <= 10000; ++n)
        many += GeneratedTrack(1).path + "\n";
    WriteFile(folder + "/Many.m3u", many);
    const std::pair<const char*, const char*> cases[] = {
        {"Linked", "404"}, {"Fifo", "404"}, {"Huge", "413"}, {"Many", "413"}};
    for (const auto& [name, status] : cases) {
        const CgiResult r = ListNode(std::string("musiclib_music_personal/playlist/") + name);
        EXPECT_FALSE(r.timedOut) << name;
        EXPECT_NE(r.Header("Status").find(status), std::string::npos) << name << r.output;
        ASSERT_TRUE(r.jsonOk) << name << r.body;
        EXPECT_FALSE(r.json["success"].asBool()) << name;
    }
}

TEST_F(LibraryApi, SharedPlaylistGivesItsEntriesByPosition) {
    MakeGeneratedLibrary(10, {{42, "Party"}});
    const std::string script = "sqlite3 " + std::string(kLibraryDb) +
                               " \"INSERT INTO playlist_entry VALUES (42, 2, '" +
                               GeneratedTrack(4).path + "'), (42, 1, '" + GeneratedTrack(6).path +
                               "'), (42, 3, '/elsewhere/x.mp3');\"";
    ASSERT_EQ(std::system(script.c_str()), 0);
    const CgiResult r = ListNode("musiclib_music_shared/playlist/42");
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(StreamsOf(r.json), (std::vector<std::string>{"6.mp3", "4.mp3"}));
    EXPECT_EQ(r.json["missing"].asInt(), 1);
    ExpectNoServerPath(r);

    const CgiResult unknown = ListNode("musiclib_music_shared/playlist/43");
    EXPECT_NE(unknown.Header("Status").find("404"), std::string::npos) << unknown.output;
}

TEST_F(LibraryApi, RandomNodeListsTheFileThatNewRandom100Drew) {
    MakeGeneratedLibrary(300);
    CgiRequest draw;
    draw.queryString = "action=rerandom100";
    ASSERT_EQ(RunCgi(draw).exitStatus, 1);  // the tree CGI draws the user's playlist
    const M3uFile drawn = ParseExtendedM3u(ReadFile("/tmp/==DynaRandom100==.admin"));
    ASSERT_TRUE(drawn.valid);
    ASSERT_EQ(drawn.entries.size(), 100u);

    const CgiResult r = ListNode("musiclib_random");
    ASSERT_TRUE(r.jsonOk) << r.body;
    ASSERT_EQ(r.json["tracks"].size(), 100u);
    for (Json::ArrayIndex i = 0; i < 100; ++i) {
        const std::string& path = drawn.entries[i].path;
        const std::string number = path.substr(path.rfind("Track ") + 6);
        EXPECT_EQ(r.json["tracks"][i]["stream"].asString(), number) << i;
    }
    ExpectNoServerPath(r);
}

TEST_F(LibraryApi, RandomNodeIsEmptyBeforeTheFirstDraw) {
    MakeGeneratedLibrary(3);
    const CgiResult r = ListNode("musiclib_random");
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_TRUE(r.json["success"].asBool());
    EXPECT_EQ(r.json["tracks"].size(), 0u);
}

// A media server on the network, as the audio daemon lists it, answering at 198.51.100.2:50004 on
// a link of the test's own namespace.
constexpr const char* kNetworkServerAddress = "198.51.100.2";
constexpr const char* kNetworkServerUrl = "http://198.51.100.2:50004/ctl";
std::vector<MediaServer> ServersAt(const std::string& controlUrl, const std::string& ip) {
    MediaServer server;
    server.controlUrl = controlUrl;
    server.friendlyName = "Shelf";
    server.ip = ip;
    return {server};
}
std::vector<MediaServer> NetworkServers() {
    return ServersAt(kNetworkServerUrl, kNetworkServerAddress);
}

TEST_F(LibraryApi, AListedMediaServerShowsItsTopContainersBrowsedOnThatServer) {
    ScriptedDaemon daemon(ServeMediaServers(NetworkServers()));
    ASSERT_TRUE(VethPair("lan0", "198.51.100.1", "lan1", kNetworkServerAddress));
    ScriptedHttpServer network(50004, kNetworkServerAddress);
    ContentTree tree;
    tree.AddContainer("0", "64", "Music");
    tree.AddContainer("0", "1", "Video");
    tree.AddItem("0", "9", "A loose item");
    tree.AddContainer("64", "640", "Albums");
    network.ServeTree(tree);
    ASSERT_TRUE(network.Start());
    const std::string node = std::string("mediaserver_") + kNetworkServerUrl;

    const CgiResult top = ListNode(node);
    ASSERT_TRUE(top.jsonOk) << top.output;
    EXPECT_TRUE(top.json["success"].asBool());
    ASSERT_EQ(top.json["containers"].size(), 2u);
    EXPECT_EQ(top.json["containers"][0]["node"].asString(), node);
    EXPECT_EQ(top.json["containers"][0]["object"].asString(), "64");
    EXPECT_EQ(top.json["containers"][0]["title"].asString(), "Music");
    EXPECT_EQ(top.json["containers"][1]["title"].asString(), "Video");
    EXPECT_EQ(top.json["tracks"].size(), 0u);
    EXPECT_EQ(top.json["missing"].asInt(), 1);

    const CgiResult inner = Api({{"action", "list"}, {"node", node}, {"object", "64"}});
    ASSERT_TRUE(inner.jsonOk) << inner.output;
    ASSERT_EQ(inner.json["containers"].size(), 1u);
    EXPECT_EQ(inner.json["containers"][0]["title"].asString(), "Albums");
    ASSERT_EQ(network.Requests().size(), 2u);
    EXPECT_NE(network.Requests()[0].body.find("<ObjectID>0</ObjectID>"), std::string::npos);
}

TEST_F(LibraryApi, AMediaServerThatTheDaemonDoesNotListIsNeverContacted) {
    ScriptedDaemon daemon(ServeMediaServers(NetworkServers()));
    ScriptedHttpServer elsewhere(50005);
    ASSERT_TRUE(elsewhere.Start());
    for (const char* node :
         {"mediaserver_http://127.0.0.1:50005/ctl", "mediaserver_root", "mediaserver_refresh"}) {
        const CgiResult r = ListNode(node);
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << node << r.output;
    }
    EXPECT_TRUE(elsewhere.Requests().empty());
}

TEST_F(LibraryApi, AListedMediaServerOnThisMachineIsNeverContacted) {
    // A description may name a loopback control URL; whoever listed it, the CGI does not post
    // there.
    const std::string loopbackUrl = "http://127.0.0.1:50004/ctl";
    ScriptedDaemon daemon(ServeMediaServers(ServersAt(loopbackUrl, "127.0.0.1")));
    ScriptedHttpServer local(50004);
    ASSERT_TRUE(local.Start());
    const CgiResult r = ListNode("mediaserver_" + loopbackUrl);
    EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << r.output;
    EXPECT_TRUE(local.Requests().empty());
}

TEST_F(LibraryApi, ListedMediaServersOnLinkLocalUnspecifiedOrNamedHostsGive404) {
    for (const char* url :
         {"http://169.254.10.20:50004/ctl", "http://0.0.0.0:50004/ctl", "http://[::1]:50004/ctl",
          "http://[fe80::1]:50004/ctl", "http://[::]:50004/ctl", "http://localhost:50004/ctl",
          "http://127.1:50004/ctl", "http://[::ffff:127.0.0.1]:50004/ctl"}) {
        ScriptedDaemon daemon(ServeMediaServers(ServersAt(url, "127.0.0.1")));
        const CgiResult r = ListNode(std::string("mediaserver_") + url);
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << url << r.output;
    }
}

TEST_F(LibraryApi, MediaServersNeedTheMediaServerPermission) {
    AddUser("admin", 1 | 4 | 16);
    ScriptedDaemon daemon(ServeMediaServers(NetworkServers()));
    const CgiResult r = ListNode(std::string("mediaserver_") + kNetworkServerUrl);
    EXPECT_NE(r.Header("Status").find("403"), std::string::npos) << r.output;
    EXPECT_TRUE(daemon.Requests().empty());
}

TEST_F(LibraryApi, KnownStreamIdGivesItsTrackAndAnUnknownOneGives404) {
    MakeGeneratedLibrary(5);
    const CgiResult known = Api({{"action", "track"}, {"stream", "4.mp3"}});
    ASSERT_TRUE(known.jsonOk) << known.body;
    EXPECT_EQ(known.json["track"]["title"].asString(), "Title 4");
    ExpectNoServerPath(known);
    for (const char* stream : {"6.mp3", "4.flac", "4", "../4.mp3", "4.mp3/..", "-1.mp3", ""}) {
        const CgiResult r = Api({{"action", "track"}, {"stream", stream}});
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << stream << r.output;
        ASSERT_TRUE(r.jsonOk) << r.body;
        EXPECT_FALSE(r.json["success"].asBool());
        EXPECT_EQ(r.json["errinfo"]["line"].asInt(), 104);
        EXPECT_EQ(r.json["message"].asString(), "Could not get the entry.");
    }
}

TEST_F(LibraryApi, ErrorTextsComeInTheUsersLanguage) {
    AddUser("admin", 255, "ger");
    const CgiResult r = ListNode("mediaserver_unknown");
    EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["message"].asString(), "Der Eintrag konnte nicht abgerufen werden.");
}

TEST_F(LibraryApi, AnUnreachableMediaServerGivesBadGatewayWithTheSystemErrorText) {
    MakeGeneratedLibrary(1);
    const CgiResult r = ListNode("musiclib_music_all");  // nothing listens on 50003
    EXPECT_NE(r.Header("Status").find("502"), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["errinfo"]["key"].asString(), "error_system");
    EXPECT_FALSE(r.json["message"].asString().empty());
}

TEST_F(LibraryApi, WithoutALibraryIndexTheListIsRefusedAsUnavailable) {
    WritePersonalPlaylistFile("admin", "A.m3u", "/volume1/music/a.mp3\n");
    const CgiResult r = ListNode("musiclib_music_personal/playlist/A");
    EXPECT_NE(r.Header("Status").find("503"), std::string::npos) << r.output;
}

TEST_F(LibraryApi, ACallerWithoutALoginGets401AndNoBody) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = "action=list&node=musiclib_random";
    request.hasRemoteUser = false;
    const CgiResult r = RunCgi(request);
    EXPECT_NE(r.Header("Status").find("401"), std::string::npos) << r.output;
    EXPECT_TRUE(r.body.empty()) << r.body;
}

TEST_F(LibraryApi, ARequestFromAnotherSiteGets401) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = "action=list&node=musiclib_random";
    request.extraEnv["HTTP_SEC_FETCH_SITE"] = "cross-site";
    const CgiResult r = RunCgi(request);
    EXPECT_NE(r.Header("Status").find("401"), std::string::npos) << r.output;
    EXPECT_TRUE(r.body.empty()) << r.body;
}

TEST_F(LibraryApi, AUserWithoutAudioPermissionGets403) {
    AddUser("admin", 0);
    const CgiResult r = ListNode("musiclib_random");
    EXPECT_NE(r.Header("Status").find("403"), std::string::npos) << r.output;
    EXPECT_EQ(r.exitStatus, 0);
}

TEST_F(LibraryApi, UnknownActionsAndNodesGetClearErrors) {
    const CgiResult noAction = Api({});
    EXPECT_NE(noAction.Header("Status").find("400"), std::string::npos) << noAction.output;
    for (const char* node :
         {"", "musiclib_root", "musiclib_music_personal", "musiclib_music_shared",
          "musiclib_music_personal/smart/Jazz", "radio_x", "musiclib_music_shared/playlist/x"}) {
        const CgiResult r = ListNode(node);
        EXPECT_NE(r.Header("Status").find("404"), std::string::npos) << node << r.output;
        EXPECT_TRUE(r.jsonOk) << node;
    }
}

// --- the failure kinds: a stable "error" code beside the status and the errinfo -----------------

std::string StatusOf(const CgiResult& r) {
    return r.Header("Status");
}

CgiResult Probe(const std::string& service, const std::string& user = "admin") {
    return Api({{"action", "probe"}, {"service", service}}, user);
}

TEST_F(LibraryApi, EveryErrorReplyCarriesTheStableCodeOfItsKind) {
    MakeGeneratedLibrary(3);
    const CgiResult noAction = Api({{"action", "nothing"}});
    EXPECT_NE(StatusOf(noAction).find("400"), std::string::npos) << noAction.output;
    EXPECT_EQ(noAction.json["error"].asString(), "request_invalid");
    const CgiResult unknown = ListNode("musiclib_music_personal/playlist/Absent");
    EXPECT_EQ(unknown.json["error"].asString(), "node_gone");
    const CgiResult stream = Api({{"action", "track"}, {"stream", "99.mp3"}});
    EXPECT_EQ(stream.json["error"].asString(), "node_gone");
    EXPECT_EQ(stream.json["errinfo"]["line"].asInt(), 104);
    AddUser("admin", 1 | 4 | 16);
    const CgiResult refused = ListNode(std::string("mediaserver_") + kNetworkServerUrl);
    EXPECT_NE(StatusOf(refused).find("403"), std::string::npos) << refused.output;
    EXPECT_EQ(refused.json["error"].asString(), "request_refused");
    AddUser("admin", 0);
    const CgiResult noAudio = ListNode("musiclib_random");
    EXPECT_EQ(noAudio.json["error"].asString(), "request_refused");
}

TEST_F(LibraryApi, AStoppedLocalMediaServerIsSaidToBeDown) {
    MakeGeneratedLibrary(1);
    const CgiResult r = ListNode("musiclib_music_album");  // nothing listens on 50003
    EXPECT_NE(StatusOf(r).find("502"), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["error"].asString(), "media_server_down");
    EXPECT_EQ(r.json["errinfo"]["line"].asInt(), 105);
}

TEST_F(LibraryApi, AContainerTheMediaServerNoLongerHoldsIsGoneNotAServerFault) {
    MakeGeneratedLibrary(1);
    ContentTree tree;
    tree.AddContainer("music_album", "album:A/First", "First Album");
    server.ServeTree(tree);
    ASSERT_TRUE(server.Start());
    const CgiResult r = ListNode("musiclib_album:A/Removed");  // UPnP error 701 from the server
    EXPECT_NE(StatusOf(r).find("404"), std::string::npos) << r.output;
    ASSERT_TRUE(r.jsonOk) << r.body;
    EXPECT_EQ(r.json["error"].asString(), "node_gone");
    EXPECT_EQ(r.json["errinfo"]["line"].asInt(), 110);
    EXPECT_EQ(r.json["message"].asString(), "Could not get the entry.");
}

TEST_F(LibraryApi, AMediaServerAnsweringWithSomethingElseIsNotCalledGone) {
    MakeGeneratedLibrary(1);
    server.Enqueue(Reply("<html>not a browse reply</html>"));
    ASSERT_TRUE(server.Start());
    const CgiResult r = ListNode("musiclib_music_album");
    EXPECT_NE(StatusOf(r).find("502"), std::string::npos) << r.output;
    EXPECT_EQ(r.json["error"].asString(), "media_server_invalid");
}

TEST_F(LibraryApi, BrowseFailuresAreToldApartByWhatTheClientSaw) {
    using harmona::webapi::BrowseFailure;
    using harmona::webapi::Failure;
    EXPECT_EQ(BrowseFailure("Couldn't connect to server", 3), Failure::mediaServerDown);
    EXPECT_EQ(BrowseFailure("Server returned nothing (no headers, no data)", 5),
              Failure::mediaServerDown);
    EXPECT_EQ(BrowseFailure("Timeout was reached", 20000), Failure::mediaServerTimeout);
    EXPECT_EQ(BrowseFailure("Timeout was reached", 2001), Failure::mediaServerTimeout);
    EXPECT_EQ(BrowseFailure("no whole reply within the time limit", 20001),
              Failure::mediaServerTimeout);
    EXPECT_EQ(BrowseFailure("Failure when receiving data from the peer", 20000),
              Failure::mediaServerTimeout);
    EXPECT_EQ(BrowseFailure("HTTP status 500", 4), Failure::nodeGone);
    EXPECT_EQ(BrowseFailure("SOAP fault", 4), Failure::nodeGone);
    EXPECT_EQ(BrowseFailure("too large: more than 200000 objects", 4), Failure::tooLarge);
    EXPECT_EQ(BrowseFailure("not a BrowseResponse", 4), Failure::mediaServerInvalid);
    EXPECT_EQ(BrowseFailure("Result is not DIDL-Lite", 4), Failure::mediaServerInvalid);
}

TEST_F(LibraryApi, ProbeTellsARunningAStoppedAndAHungLocalMediaServerApart) {
    const CgiResult down = Probe("media_server");
    EXPECT_NE(StatusOf(down).find("502"), std::string::npos) << down.output;
    EXPECT_EQ(down.json["error"].asString(), "media_server_down");
    {
        ScriptedHttpServer hung;
        ScriptedReply late = Reply("late");
        late.delayMs = 8000;
        hung.Enqueue(late);
        ASSERT_TRUE(hung.Start());
        const CgiResult r = Probe("media_server");
        EXPECT_FALSE(r.timedOut);
        EXPECT_NE(StatusOf(r).find("504"), std::string::npos) << r.output;
        EXPECT_EQ(r.json["error"].asString(), "media_server_timeout");
        EXPECT_EQ(r.json["errinfo"]["line"].asInt(), 109);
    }
    ASSERT_TRUE(server.Start());  // answers 404 to anything: it answers
    const CgiResult up = Probe("media_server");
    ASSERT_TRUE(up.jsonOk) << up.output;
    EXPECT_TRUE(up.json["success"].asBool());
    EXPECT_EQ(up.json["service"].asString(), "media_server");
}

TEST_F(LibraryApi, ProbeTellsARunningAStoppedAndAHungAudioDaemonApart) {
    const CgiResult down = Probe("audio_daemon");
    EXPECT_NE(StatusOf(down).find("503"), std::string::npos) << down.output;
    EXPECT_EQ(down.json["error"].asString(), "audio_daemon_down");
    {
        ScriptedDaemon silent([](const DaemonRequest&) { return DaemonAnswer::Never(); });
        const CgiResult r = Probe("audio_daemon");
        EXPECT_NE(StatusOf(r).find("504"), std::string::npos) << r.output;
        EXPECT_EQ(r.json["error"].asString(), "audio_daemon_timeout");
    }
    {
        DaemonOptions stopped;
        stopped.accept = false;
        stopped.backlog = 1;
        ScriptedDaemon notAccepting(ServeMediaServers({}), stopped);
        for (int i = 0; i < 3; ++i) {
            const CgiResult r = Probe("audio_daemon");
            EXPECT_EQ(r.json["error"].asString(), "audio_daemon_timeout") << i;
        }
    }
    ScriptedDaemon daemon(ServeMediaServers({}));
    const CgiResult up = Probe("audio_daemon");
    ASSERT_TRUE(up.jsonOk) << up.output;
    EXPECT_TRUE(up.json["success"].asBool());
    const CgiResult unknown = Probe("elsewhere");
    EXPECT_NE(StatusOf(unknown).find("400"), std::string::npos) << unknown.output;
    EXPECT_EQ(unknown.json["error"].asString(), "request_invalid");
    AddUser("admin", 1 | 4 | 16);
    EXPECT_EQ(Probe("audio_daemon").json["error"].asString(), "request_refused");
}

TEST_F(LibraryApi, AMediaServerListingSaysWhenTheAudioDaemonIsDownOrHung) {
    const std::string node = std::string("mediaserver_") + kNetworkServerUrl;
    const CgiResult down = ListNode(node);
    EXPECT_NE(StatusOf(down).find("503"), std::string::npos) << down.output;
    EXPECT_EQ(down.json["error"].asString(), "audio_daemon_down");
    {
        ScriptedDaemon silent([](const DaemonRequest&) { return DaemonAnswer::Never(); });
        const CgiResult hung = ListNode(node);
        EXPECT_NE(StatusOf(hung).find("504"), std::string::npos) << hung.output;
        EXPECT_EQ(hung.json["error"].asString(), "audio_daemon_timeout");
    }
    ScriptedDaemon daemon(ServeMediaServers({}));  // running, but the server left the network
    const CgiResult gone = ListNode(node);
    EXPECT_NE(StatusOf(gone).find("404"), std::string::npos) << gone.output;
    EXPECT_EQ(gone.json["error"].asString(), "node_gone");
}

TEST_F(LibraryApi, RandomNodeSaysWhetherTheUserHasADrawYet) {
    MakeGeneratedLibrary(5);
    const CgiResult before = ListNode("musiclib_random");
    ASSERT_TRUE(before.jsonOk) << before.body;
    EXPECT_FALSE(before.json["drawn"].asBool());
    CgiRequest draw;
    draw.queryString = "action=rerandom100";
    ASSERT_EQ(RunCgi(draw).exitStatus, 1);
    const CgiResult after = ListNode("musiclib_random");
    ASSERT_TRUE(after.jsonOk) << after.body;
    EXPECT_TRUE(after.json["drawn"].asBool());
    EXPECT_EQ(after.json["tracks"].size(), 5u);
}

}  // namespace
