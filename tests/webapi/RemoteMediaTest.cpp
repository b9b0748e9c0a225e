// The tracks of a media server on the network through the real built library.cgi: listed with their
// tags, and played through this server, which fetches only the resource that the server's own
// Browse names, on that server's host, with Range passed on and within a size and time bound. A
// real MiniDLNA serves real files; a scripted server makes the faults no real one makes.
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <map>
#include <string>
#include <thread>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Network.h"
#include "tests/harness/ScriptedDaemon.h"
#include "tests/harness/ScriptedHttpServer.h"
#include "tests/harness/Service.h"

using namespace harmona::test;

namespace {

// The server's host on a link of the test's own namespace, and another host on the same link.
constexpr const char* kServerAddress = "198.51.100.2";
constexpr const char* kOtherAddress = "198.51.100.1";
constexpr const char* kControlUrl = "http://198.51.100.2:50004/ctl";
const std::string kNode = std::string("mediaserver_") + kControlUrl;

std::vector<MediaServer> ListedServer(const std::string& controlUrl) {
    MediaServer server;
    server.controlUrl = controlUrl;
    server.friendlyName = "Shelf";
    server.ip = kServerAddress;
    return {server};
}

CgiResult Api(const std::vector<std::pair<std::string, std::string>>& params,
              const std::string& range = "", bool parseJson = true) {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query(params);
    if (!range.empty())
        request.extraEnv["HTTP_RANGE"] = range;
    request.parseJson = parseJson;
    return RunCgi(request);
}

// The request the page makes for a track row: the row's "url" as it stands.
CgiResult Play(const Json::Value& row, const std::string& range = "", bool parseJson = false) {
    const std::string url = row["url"].asString();
    const std::string prefix = "webapi/library.cgi?";
    EXPECT_EQ(url.compare(0, prefix.size(), prefix), 0) << url;
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = url.substr(prefix.size());
    if (!range.empty())
        request.extraEnv["HTTP_RANGE"] = range;
    request.parseJson = parseJson;
    return RunCgi(request);
}

CgiResult Stream(const std::string& object, const std::string& range = "") {
    return Api({{"action", "remote_stream"}, {"node", kNode}, {"object", object}}, range);
}

void ExpectError(const CgiResult& r, const char* status, const char* code) {
    EXPECT_NE(r.Header("Status").find(status), std::string::npos) << code << r.output;
    ASSERT_TRUE(r.jsonOk) << r.output.substr(0, 400);
    EXPECT_FALSE(r.json["success"].asBool());
    EXPECT_EQ(r.json["error"].asString(), code);
    EXPECT_FALSE(r.json["message"].asString().empty());
}

// A scripted ContentDirectory at kControlUrl that also serves its media under /media/: objects are
// answered by BrowseDirectChildren and BrowseMetadata; GET requests by `media`.
class ScriptedServer {
  public:
    ScriptedServer() : http_(50004, kServerAddress) {}

    void Add(DidlObject object, const std::string& duration = "") {
        objects_[object.id] = {object, duration};
        children_[object.parentId].push_back(object.id);
    }
    void Media(std::function<ScriptedReply(const RecordedRequest&)> media) {
        media_ = std::move(media);
    }
    bool Start() {
        http_.SetResponder([this](const RecordedRequest& request) { return Answer(request); });
        return http_.Start();
    }
    std::vector<RecordedRequest> Gets() const {
        std::vector<RecordedRequest> gets;
        for (const RecordedRequest& request : http_.Requests())
            if (request.method == "GET")
                gets.push_back(request);
        return gets;
    }

    // Changes what BrowseMetadata tells of `id` from now on.
    void Replace(DidlObject object) { objects_[object.id].first = std::move(object); }

  private:
    std::string Didl(const std::vector<std::string>& ids) const {
        std::vector<DidlObject> objects;
        for (const std::string& id : ids)
            objects.push_back(objects_.at(id).first);
        std::string didl = DidlLite(objects);
        // The durations go into the res elements, in order.
        std::size_t at = 0;
        for (const std::string& id : ids) {
            const DidlObject& object = objects_.at(id).first;
            if (object.res.empty())
                continue;
            at = didl.find("<res ", at);
            const std::string& duration = objects_.at(id).second;
            if (!duration.empty())
                didl.insert(at + 5, "duration=\"" + duration + "\" ");
            at += 5;
        }
        return didl;
    }

    ScriptedReply Answer(const RecordedRequest& request) {
        if (request.method == "GET")
            return media_ ? media_(request) : Reply("", 404);
        if (request.browseFlag == "BrowseMetadata") {
            if (objects_.count(request.objectId) == 0)
                return Reply(SoapFaultBody(701, "No such object"), 500);
            return Reply(BrowseResponseBody(Didl({request.objectId}), 1, 1));
        }
        const auto found = children_.find(request.objectId);
        const std::vector<std::string> ids =
            found == children_.end() ? std::vector<std::string>() : found->second;
        return Reply(BrowseResponseBody(Didl(ids), ids.size(), ids.size()));
    }

    ScriptedHttpServer http_;
    std::map<std::string, std::pair<DidlObject, std::string>> objects_;
    std::map<std::string, std::vector<std::string>> children_;
    std::function<ScriptedReply(const RecordedRequest&)> media_;
};

DidlObject Track(const std::string& id, const std::string& title, const std::string& res) {
    DidlObject item = DidlItem("0", id, title, res);
    item.artist = "Artist of " + title;
    item.album = "Album of " + title;
    return item;
}

ScriptedReply Audio(const std::string& body) {
    ScriptedReply reply = Reply(body);
    reply.contentType = "audio/mpeg";
    return reply;
}

class RemoteMedia : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        ASSERT_TRUE(VethPair("lan0", kOtherAddress, "lan1", kServerAddress));
    }
    ScriptedDaemon daemon{ServeMediaServers(ListedServer(kControlUrl))};
    ScriptedServer server;
};

TEST_F(RemoteMedia, TracksAreListedWithTheirTagsAndAUrlOfThisServer) {
    server.Add(DidlContainer("0", "64", "Music"));
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"), "0:03:05.600");
    server.Add(Track("t/2&x", "Second", "http://198.51.100.2:8200/other-port.mp3"), "1:00:00");
    server.Add(Track("t3", "No duration", "http://198.51.100.2:50004/media/3.mp3"));
    ASSERT_TRUE(server.Start());
    const CgiResult r = Api({{"action", "list"}, {"node", kNode}});
    ASSERT_TRUE(r.jsonOk) << r.output;
    ASSERT_EQ(r.json["containers"].size(), 1u);
    ASSERT_EQ(r.json["tracks"].size(), 3u) << r.body;
    const Json::Value& first = r.json["tracks"][0];
    EXPECT_EQ(first["title"].asString(), "First");
    EXPECT_EQ(first["artist"].asString(), "Artist of First");
    EXPECT_EQ(first["album"].asString(), "Album of First");
    EXPECT_EQ(first["duration"].asInt(), 186);
    EXPECT_FALSE(first.isMember("stream"));
    EXPECT_EQ(first["url"].asString(),
              "webapi/library.cgi?action=remote_stream&node=mediaserver_http%3A%2F%2F198.51.100.2"
              "%3A50004%2Fctl&object=t1");
    EXPECT_EQ(r.json["tracks"][1]["duration"].asInt(), 3600);
    EXPECT_NE(r.json["tracks"][1]["url"].asString().find("&object=t%2F2%26x"), std::string::npos);
    EXPECT_EQ(r.json["tracks"][2]["duration"].asInt(), -1);
    EXPECT_EQ(r.json["missing"].asInt(), 0);
    EXPECT_TRUE(server.Gets().empty());  // listing fetches no media
}

TEST_F(RemoteMedia, ATrackPlaysThroughThisServerWithRangePassedOn) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    std::string body;
    for (int n = 0; n < 70000; ++n)
        body += static_cast<char>(n * 7);
    server.Media([&](const RecordedRequest&) { return Audio(body); });
    ASSERT_TRUE(server.Start());
    const CgiResult list = Api({{"action", "list"}, {"node", kNode}});
    ASSERT_EQ(list.json["tracks"].size(), 1u) << list.output;

    const CgiResult played = Play(list.json["tracks"][0], "bytes=100-");
    ASSERT_TRUE(played.exited) << played.errors;
    EXPECT_EQ(played.exitStatus, 1);
    EXPECT_NE(played.Header("Status").find("200"), std::string::npos)
        << played.output.substr(0, 300);
    EXPECT_EQ(played.Header("Content-Type"), "audio/mpeg");
    EXPECT_EQ(played.Header("Content-Length"), "70000");
    EXPECT_EQ(played.body, body);
    const std::vector<RecordedRequest> gets = server.Gets();
    ASSERT_EQ(gets.size(), 1u);
    EXPECT_EQ(gets[0].target, "/media/1.mp3");
    EXPECT_EQ(gets[0].Header("Range"), "bytes=100-");
    // Nothing of the browser's request but Range goes on.
    EXPECT_EQ(gets[0].Header("Authorization"), "");
    EXPECT_EQ(gets[0].Header("Cookie"), "");
}

TEST_F(RemoteMedia, ARangeThatIsNotAByteRangeIsNotPassedOn) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) { return Audio("abc"); });
    ASSERT_TRUE(server.Start());
    for (const char* range : {"items=1-2", "bytes=1-2\r\nX-Evil: 1", "bytes=a-b"}) {
        const CgiResult r = Stream("t1", range);
        EXPECT_EQ(r.body, "abc") << range;
    }
    for (const RecordedRequest& get : server.Gets())
        EXPECT_EQ(get.Header("Range"), "");
}

TEST_F(RemoteMedia, TheResourceIsTakenFromTheServersAnswerAtPlayTimeNeverFromTheRequest) {
    ScriptedHttpServer other(50004, kOtherAddress);
    other.SetResponder([](const RecordedRequest&) { return Audio("from elsewhere"); });
    ASSERT_TRUE(other.Start());
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Add(Track("away", "Elsewhere", "http://198.51.100.1:50004/media/2.mp3"));
    server.Add(Track("local", "Loopback", "http://127.0.0.1:50004/media/3.mp3"));
    server.Add(DidlContainer("0", "box", "A folder"));
    server.Media([](const RecordedRequest&) { return Audio("track"); });
    ASSERT_TRUE(server.Start());

    // Resources on another host are not listed, and not fetched when asked for.
    const CgiResult list = Api({{"action", "list"}, {"node", kNode}});
    ASSERT_TRUE(list.jsonOk) << list.output;
    EXPECT_EQ(list.json["tracks"].size(), 1u);
    EXPECT_EQ(list.json["missing"].asInt(), 2);
    ExpectError(Stream("away"), "403", "resource_refused");
    ExpectError(Stream("local"), "403", "resource_refused");
    // A container or an unknown object is no track.
    ExpectError(Stream("box"), "404", "node_gone");
    ExpectError(Stream("nothing"), "502", "media_server_invalid");
    // A URL in the request is never used.
    const CgiResult withUrl = Api({{"action", "remote_stream"},
                                   {"node", kNode},
                                   {"object", "t1"},
                                   {"url", "http://198.51.100.1:50004/media/2.mp3"},
                                   {"res", "http://198.51.100.1:50004/media/2.mp3"}});
    EXPECT_EQ(withUrl.body, "track");
    // The server now names another host for a listed track: asked again, refused.
    server.Replace(Track("t1", "First", "http://198.51.100.1:50004/media/2.mp3"));
    ExpectError(Stream("t1"), "403", "resource_refused");
    EXPECT_TRUE(other.Requests().empty());
}

TEST_F(RemoteMedia, OnlyAListedNetworkServerAndAUserWithTheMediaServerBitArePlayedFrom) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) { return Audio("track"); });
    ASSERT_TRUE(server.Start());
    for (const std::string& node :
         {std::string("mediaserver_http://198.51.100.2:50004/other"), std::string("mediaserver_"),
          std::string("musiclib_music_all"), std::string("")}) {
        ExpectError(Api({{"action", "remote_stream"}, {"node", node}, {"object", "t1"}}), "404",
                    "node_gone");
    }
    for (const std::string& object : {std::string(""), std::string("a\nb"), std::string(1025, 'o')})
        ExpectError(Stream(object), "400", "object_invalid");
    AddUser("admin", 1 | 4 | 16);
    ExpectError(Stream("t1"), "403", "request_refused");
    EXPECT_TRUE(server.Gets().empty());
}

TEST_F(RemoteMedia, AnAnnouncedBodyOverTheBoundIsRefusedBeforeAnyByte) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) {
        ScriptedReply reply = Audio("");
        reply.paddingBytes = (std::size_t{512} << 20) + 1;
        return reply;
    });
    ASSERT_TRUE(server.Start());
    const CgiResult r = Stream("t1");
    EXPECT_FALSE(r.timedOut);
    ExpectError(r, "502", "resource_too_large");
}

TEST_F(RemoteMedia, AnEndlessBodyIsCutOffAtTheBound) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) {
        ScriptedReply reply = Audio("");
        reply.sendContentLength = false;
        reply.neverEnd = true;
        reply.paddingByte = 'x';
        reply.dribbleBytes = 1 << 20;
        reply.dribbleIntervalMs = 1;
        return reply;
    });
    ASSERT_TRUE(server.Start());
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query({{"action", "remote_stream"}, {"node", kNode}, {"object", "t1"}});
    request.parseJson = false;
    request.timeoutMs = 100000;
    const CgiResult r = RunCgi(request);
    EXPECT_FALSE(r.timedOut);
    EXPECT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_NE(r.Header("Status").find("200"), std::string::npos);
    EXPECT_LE(r.body.size(), std::size_t{512} << 20);
    EXPECT_GT(r.body.size(), std::size_t{500} << 20);
    EXPECT_EQ(r.body.find_first_not_of('x'), std::string::npos);
}

TEST_F(RemoteMedia, AServerThatSendsNoReplyIsLeftAfterTenSeconds) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) {
        ScriptedReply reply = Audio("");
        reply.delayMs = 60000;  // no status line
        return reply;
    });
    ASSERT_TRUE(server.Start());
    const CgiResult silent = Stream("t1");
    EXPECT_FALSE(silent.timedOut);
    EXPECT_LT(silent.wallMs, 20000);
    ExpectError(silent, "504", "media_server_timeout");
}

TEST_F(RemoteMedia, AServerThatStopsSendingMidwayIsLeftAfterTenSeconds) {
    server.Add(Track("t1", "First", "http://198.51.100.2:50004/media/1.mp3"));
    server.Media([](const RecordedRequest&) {
        ScriptedReply reply = Audio("a beginning");
        reply.sendContentLength = false;
        reply.neverEnd = true;
        reply.dribbleIntervalMs = 60000;  // then nothing
        return reply;
    });
    ASSERT_TRUE(server.Start());
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = Query({{"action", "remote_stream"}, {"node", kNode}, {"object", "t1"}});
    request.parseJson = false;
    const CgiResult stalled = RunCgi(request);
    EXPECT_FALSE(stalled.timedOut);
    EXPECT_LT(stalled.wallMs, 20000);
    EXPECT_EQ(stalled.exitStatus, 0);
    EXPECT_NE(stalled.Header("Status").find("200"), std::string::npos) << stalled.output;
    EXPECT_EQ(stalled.body, "a beginning");
}

TEST_F(RemoteMedia, FailuresOfTheResourceAreToldApart) {
    server.Add(Track("gone", "Gone", "http://198.51.100.2:50004/media/gone.mp3"));
    server.Add(Track("range", "Range", "http://198.51.100.2:50004/media/range.mp3"));
    server.Add(Track("page", "Page", "http://198.51.100.2:50004/media/page.mp3"));
    server.Add(Track("closed", "Closed", "http://198.51.100.2:50009/media/closed.mp3"));
    server.Media([](const RecordedRequest& request) {
        if (request.target == "/media/gone.mp3")
            return Reply("missing", 404);
        if (request.target == "/media/range.mp3")
            return Reply("", 416);
        ScriptedReply html = Reply("<script>alert(1)</script>");
        html.contentType = "text/html";
        return html;
    });
    ASSERT_TRUE(server.Start());
    ExpectError(Stream("gone"), "502", "resource_failed");
    ExpectError(Stream("range", "bytes=999999-"), "416", "range_invalid");
    ExpectError(Stream("closed"), "502", "media_server_down");
    // Whatever the server calls it, it is passed on as bytes, never as a page of this site.
    const CgiResult page = Stream("page");
    EXPECT_EQ(page.Header("Content-Type"), "application/octet-stream");
}

// A real MiniDLNA on the server's address, serving three tagged FLAC files.
class MiniDlnaMedia : public ::testing::Test {
  protected:
    static constexpr int kPort = 50220;
    const std::string root_ = "/tmp/dlna-remote";

    void SetUp() override {
        if (access("/usr/sbin/minidlnad", X_OK) != 0 || access("/usr/bin/sox", X_OK) != 0)
            GTEST_FAIL() << "minidlna and sox are needed (scripts/packages.txt)";
        StandardFixture();
        ASSERT_TRUE(VethPair("lan0", kOtherAddress, "lan1", kServerAddress));
        MakeDirs(root_ + "/music/Album");
        MakeDirs(root_ + "/db");
        for (int n = 1; n <= 3; ++n) {
            const std::string file = root_ + "/music/Album/track" + std::to_string(n) + ".flac";
            const std::string sox =
                "sox -n -r 8000 -c 1 -b 16 --comment 'TITLE=Song " + std::to_string(n) +
                "' --add-comment 'ARTIST=The Band' " +
                "--add-comment 'ALBUM=The Album' --add-comment 'TRACKNUMBER=" + std::to_string(n) +
                "' '" + file + "' synth " + std::to_string(n + 1) + " sine 440 2>&1";
            ASSERT_EQ(std::system(sox.c_str()), 0) << sox;
        }
        WriteFile(root_ + "/minidlna.conf",
                  "port=" + std::to_string(kPort) + "\nmedia_dir=A," + root_ +
                      "/music\ndb_dir=" + root_ + "/db\nlog_dir=" + root_ +
                      "\ninotify=no\nnetwork_interface=lan1\nfriendly_name=remote-shelf\n");
        server_ = Service::Start({"/usr/sbin/minidlnad", "-f", root_ + "/minidlna.conf", "-P",
                                  root_ + "/minidlna.pid", "-S", "-R"},
                                 root_ + "/minidlnad.out");
        ASSERT_TRUE(server_);
    }
    void TearDown() override { server_.Stop(SIGTERM, Stack().stopGraceMs); }

    std::string ControlUrl() const {
        return "http://" + std::string(kServerAddress) + ":" + std::to_string(kPort) +
               "/ctl/ContentDir";
    }

    Service server_;
};

TEST_F(MiniDlnaMedia, ItsTracksAreListedWithTagsAndPlayWholeAndInRanges) {
    ScriptedDaemon daemon(ServeMediaServers(ListedServer(ControlUrl())));
    const std::string node = "mediaserver_" + ControlUrl();
    // "1$4" is MiniDLNA's All Music; wait, bounded, until its scan has found the three files.
    CgiResult list;
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    do {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        list = Api({{"action", "list"}, {"node", node}, {"object", "1$4"}});
    } while ((!list.jsonOk || list.json["tracks"].size() < 3) &&
             std::chrono::steady_clock::now() < deadline);
    ASSERT_TRUE(list.jsonOk) << list.output << ReadFile(root_ + "/minidlnad.out");
    ASSERT_EQ(list.json["tracks"].size(), 3u) << list.body;
    std::map<std::string, Json::Value> byTitle;
    for (const Json::Value& row : list.json["tracks"])
        byTitle[row["title"].asString()] = row;
    ASSERT_EQ(byTitle.count("Song 2"), 1u) << list.body;
    const Json::Value& song = byTitle["Song 2"];
    EXPECT_EQ(song["artist"].asString(), "The Band");
    EXPECT_EQ(song["album"].asString(), "The Album");
    EXPECT_EQ(song["duration"].asInt(), 3);
    EXPECT_EQ(list.json["missing"].asInt(), 0);

    const std::string file = ReadFile(root_ + "/music/Album/track2.flac");
    const CgiResult whole = Play(song);
    ASSERT_TRUE(whole.exited) << whole.errors;
    EXPECT_EQ(whole.exitStatus, 1) << whole.output.substr(0, 400);
    EXPECT_NE(whole.Header("Status").find("200"), std::string::npos);
    EXPECT_NE(whole.Header("Content-Type").find("audio/"), std::string::npos)
        << whole.Header("Content-Type");
    EXPECT_EQ(whole.Header("Content-Length"), std::to_string(file.size()));
    EXPECT_TRUE(whole.body == file) << whole.body.size() << " bytes of " << file.size();

    const CgiResult part = Play(song, "bytes=4-11");
    EXPECT_NE(part.Header("Status").find("206"), std::string::npos) << part.output.substr(0, 400);
    EXPECT_EQ(part.Header("Content-Range"), "bytes 4-11/" + std::to_string(file.size()));
    EXPECT_EQ(part.body, file.substr(4, 8));
}

}  // namespace
