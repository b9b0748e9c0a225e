// Hostile input through the real CGI: every request, file, database, daemon and media server
// answer below comes from someone who wants the program to crash, hang, eat memory or write where
// it should not. Each test checks the reply the program gives such input, that the program ended by
// itself within its time limit, its peak memory, and that no file changed but the one the action
// writes.
#include <gtest/gtest.h>
#include <zlib.h>

#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <map>

#include "platform/cgi/RequestMemory.h"
#include "platform/dma/SoapBrowse.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/ScriptedDaemon.h"
#include "tests/harness/ScriptedHttpServer.h"

using namespace harmona::test;
using Strings = std::vector<std::string>;

namespace {

// Memory a request may take at the most (ru_maxrss includes the test process's own pages from
// before the exec, a few MiB).
#ifdef HARMONA_SANITIZE
constexpr long kMemoryFactor = 3;  // AddressSanitizer's shadow memory and quarantine
#else
constexpr long kMemoryFactor = 1;
#endif
constexpr long kMemoryBoundKb = 200 * 1024 * kMemoryFactor;

class Hostile : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        MakeDirs("/volume1/music");
        WriteFile("/run/vanu/service/3.pid", std::to_string(getpid()) + "\n");
        WritePersonalPlaylistFile("admin", "Mine.m3u");
        MakeLibraryDb({}, {{1, "Shared"}});
    }

    // Runs the request and checks what every hostile request must satisfy.
    CgiResult Run(const CgiRequest& request, const std::vector<std::string>& mayChange = {}) {
        const FileSnapshot before = Snapshot();
        CgiResult r = RunCgi(request);
        EXPECT_TRUE(r.exited) << "timed out: " << r.timedOut << ", signal " << r.signal << "\n"
                              << r.errors;
        EXPECT_FALSE(r.timedOut);
        EXPECT_LE(r.peakRssKb, kMemoryBoundKb);
        for (const std::string& path : ChangedPaths(before, Snapshot())) {
            const bool allowed =
                std::any_of(mayChange.begin(), mayChange.end(), [&](const std::string& prefix) {
                    return path.compare(0, prefix.size(), prefix) == 0;
                });
            EXPECT_TRUE(allowed) << "changed: " << path;
        }
        if (r.headerEnded && r.Header("Content-Type").find("text/plain") == 0) {
            EXPECT_TRUE(r.jsonOk) << r.body.substr(0, 300);
        }
        return r;
    }

    CgiResult RunQuery(const std::string& query, const std::string& user = "admin") {
        CgiRequest request;
        request.queryString = query;
        request.remoteUser = user;
        return Run(request);
    }

    // A request whose answer may take long (a media server that is slow or sends a huge reply).
    CgiResult RunQueryWithin(const std::string& query, int timeoutMs) {
        CgiRequest request;
        request.queryString = query;
        request.timeoutMs = timeoutMs;
        return Run(request);
    }
};

TEST_F(Hostile, PathTricksInEveryParameter) {
    const Strings tricks = {"../../../../etc/passwd",
                            "/etc/passwd",
                            "..%2F..%2Fetc",
                            "musiclib_../../etc",
                            "musiclib_/etc/shadow",
                            "ipod_../../x",
                            "%00",
                            "musiclib_%2e%2e%2f",
                            std::string(5000, '/'),
                            "musiclib_" + std::string(100000, 'A')};
    for (const std::string& trick : tricks) {
        for (const char* name : {"action", "node", "target"}) {
            for (const char* action : {"gettreenode", "refresh", "rerandom100", "avoid_timeout"}) {
                const CgiResult r = RunQuery(Query({{"action", action}, {name, trick}}));
                EXPECT_TRUE(r.exited) << action << " " << name << "=" << trick.substr(0, 40);
            }
        }
    }
}

TEST_F(Hostile, PathTricksInRemoteUserAreRefused) {
    for (const std::string& user :
         {std::string("../admin"), std::string("admin/../admin"), std::string("/"),
          std::string(".."), std::string("a\nb"), std::string(200, 'x')}) {
        CgiRequest request;
        request.queryString = "action=rerandom100";
        request.remoteUser = user;
        const CgiResult r = Run(request);
        EXPECT_EQ(r.output, "Status: 401 Unauthorized\r\n\r\n") << user;
    }
}

TEST_F(Hostile, UserNamesWithOddButValidBytesStayInsideTheirFiles) {
    // Valid names (no '/', no control byte) that look like tricks: "..." and names with spaces,
    // quotes and non-ASCII. Their random-100 file stays in /tmp.
    for (const std::string& user : {std::string("..."), std::string("a b"), std::string("\"x\""),
                                    std::string("Grüße"), std::string("-rf")}) {
        AddUser(user, 13);
        MakeGeneratedLibrary(50);
        CgiRequest request;
        request.queryString = "action=rerandom100";
        request.remoteUser = user;
        const CgiResult r = Run(request, {"/tmp"});
        EXPECT_EQ(r.json["success"], true) << user;
        EXPECT_TRUE(Exists("/tmp/==DynaRandom100==." + user)) << user;
    }
}

TEST_F(Hostile, OversizedAndMalformedBodies) {
    const std::vector<std::pair<std::string, std::string>> bodies = {
        {std::string(2 << 20, 'a'), "application/x-www-form-urlencoded"},
        {std::string(1 << 20, '&'), "application/x-www-form-urlencoded"},
        {std::string(1 << 20, '%'), "application/x-www-form-urlencoded"},
        {std::string(300000, '='), "application/x-www-form-urlencoded"},
        {"action=gettreenode&node=audiotree_root\xff\xfe\x00\x01",
         "application/x-www-form-urlencoded"},
        {"\x00\x00\x00action=avoid_timeout", "application/x-www-form-urlencoded; charset=binary"},
        {"action=avoid_timeout", "application/x-www-form-urlencoded; ;;;===;"},
    };
    for (const auto& [body, type] : bodies) {
        CgiRequest request;
        request.method = "POST";
        request.contentType = type;
        request.body = body;
        const CgiResult r = Run(request);
        EXPECT_TRUE(r.exitStatus == 0 || r.exitStatus == 1) << body.size();
    }
}

TEST_F(Hostile, BodyThatNeverArrivesEndsAtTheBodyTimeLimit) {
    // 1000 bytes announced, never sent: the web server keeps the pipe open.
    CgiRequest request = FormPostWithLength("action=avoid_timeout", "1000");
    request.keepStdinOpen = true;
    request.timeoutMs = 30000;
    const CgiResult r = Run(request);
    EXPECT_EQ(r.exitStatus, 1);  // what arrived is used once the limit has passed
}

TEST_F(Hostile, EveryActionWithEveryParameterMissingOrEmpty) {
    const Strings queries = {"",
                             "action",
                             "action=",
                             "action=gettreenode",
                             "action=gettreenode&node",
                             "action=gettreenode&node=",
                             "action=refresh",
                             "action=refresh&target",
                             "action=refresh&target=",
                             "action=rerandom100&x",
                             "action=avoid_timeout&&&&",
                             "node=audiotree_root",
                             "target=ipod",
                             "=&=&=",
                             "&&&"};
    for (const std::string& query : queries) {
        const CgiResult r = RunQuery(query);
        EXPECT_TRUE(r.exited) << query;
        // Some print nothing (no action, or no node); whatever is printed is one JSON reply.
        if (!r.output.empty()) {
            EXPECT_TRUE(r.jsonOk) << query << ": " << r.output;
        }
    }
    EXPECT_EQ(RunQuery("action=gettreenode&node=").body, "[]\n");  // no underscore: malformed id
    EXPECT_EQ(RunQuery("action=refresh").body, "[]\n");
}

TEST_F(Hostile, MediaServerThatAnswersByteByByteIsCutAtTheTimeLimit) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    ScriptedReply reply =
        Reply(BrowseResponseBody(DidlLite({{true, "x", "music_album", "X"}}), 1, 1));
    reply.dribbleBytes = 1;
    reply.dribbleIntervalMs = 200;
    server.Enqueue(reply);
    const CgiResult r = RunQueryWithin("action=gettreenode&node=musiclib_music_album", 40000);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "[]\n");
    EXPECT_LT(r.wallMs, 30000);  // the 20-second whole-reply limit, with room for a loaded machine
}

// A DIDL-Lite document of `objects` items "<item id=\"N\"/>" (ids from 0).
std::string ManyItems(int objects) {
    std::string didl = "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\">";
    didl.reserve(static_cast<std::size_t>(objects) * 20 + 100);
    for (int i = 0; i < objects; ++i)
        didl += "<item id=\"" + std::to_string(i) + "\"/>";
    return didl + "</DIDL-Lite>";
}

std::size_t Count(const std::string& text, const std::string& what) {
    std::size_t count = 0;
    for (std::size_t at = text.find(what); at != std::string::npos;
         at = text.find(what, at + what.size()))
        ++count;
    return count;
}

// Ten million objects make a reply of about 200 MB, far over the browse library's 64 MiB limit:
// refused while it arrives, with bounded memory. The reply is 100,000 real objects followed by
// white space to that size, streamed by the server (the test process stays small).
TEST_F(Hostile, MediaServerReplyOfTenMillionObjectsIsRefused) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    const int objects = 100000;
    ScriptedReply reply = Reply(BrowseResponseBody(ManyItems(objects), 10000000, 10000000));
    reply.sendContentLength = false;
    reply.paddingBytes = 200u << 20;
    server.Enqueue(reply);
    const CgiResult r = RunQueryWithin("action=gettreenode&node=musiclib_big", 60000);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "[]\n");
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
}

// Browses "big" on the pages enqueued on `server`.
CgiResult BrowseBig(ScriptedHttpServer& server) {
    CgiRequest request;
    request.queryString = "action=gettreenode&node=musiclib_big";
    request.timeoutMs = 120000;
    request.parseJson = false;  // the test process stays small, so that ru_maxrss is the CGI's
    return RunCgi(request);
}

CgiResult BrowseBig(ScriptedHttpServer& server, ScriptedReply page) {
    server.Enqueue(std::move(page));
    return BrowseBig(server);
}

// 200,000 objects fit the limit: the music library turns the whole list into nodes, so memory
// grows with the list; recorded here, bounded by the 64 MiB reply limit.
TEST_F(Hostile, MediaServerWithTwoHundredThousandObjects) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    const int objects = 200000;
    const FileSnapshot before = Snapshot();
    const CgiResult r =
        BrowseBig(server, Reply(BrowseResponseBody(ManyItems(objects), objects, objects)));
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(Count(r.body, "\"pid\":\"musiclib_big\""), static_cast<std::size_t>(objects));
    EXPECT_TRUE(ChangedPaths(before, Snapshot()).empty());
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
    RecordProperty("wall_ms", std::to_string(static_cast<long>(r.wallMs)));
    EXPECT_LT(r.peakRssKb, 1024L * 1024 * kMemoryFactor);
}

// Makes this test process the reaper of its orphaned descendants: a process that the CGI forked
// and left behind would become its child when the CGI ends.
void AdoptOrphans() {
    ASSERT_EQ(prctl(PR_SET_CHILD_SUBREAPER, 1), 0);
}

// True when this process has no child at all (the CGI was reaped by the test kit; any process it
// left behind would have been adopted here).
bool NoProcessLeftBehind() {
    int status = 0;
    return waitpid(-1, &status, WNOHANG) == -1 && errno == ECHILD;
}

// Checks a request over an iPod whose database is never read to its end: the listing fails after
// the time limit with the log line naming the mountpoint, the category shows its refresh button
// alone, and no reading process is left behind.
void ExpectIPodListingCutAtTheTimeLimit(const CgiResult& r, const std::string& mountpoint) {
    ASSERT_TRUE(r.exited) << "timed out: " << r.timedOut;
    EXPECT_EQ(r.exitStatus, 1);
    const std::string cut = "iPod: the database of the iPod mounted at " + mountpoint +
                            " was not read within 5 seconds; its playlists are not listed";
    EXPECT_EQ(r.LogMessages(), std::vector<std::string>{cut});
    EXPECT_GE(r.wallMs, 4900);
    EXPECT_LT(r.wallMs, 15000);
    EXPECT_TRUE(NoProcessLeftBehind());
}

// A database that libgpod waits for forever: a FIFO in its place (libgpod opens it and blocks,
// as no writer ever comes).
TEST_F(Hostile, IPodDatabaseThatIsNeverReadToItsEndFailsTheListingAfterFiveSeconds) {
    const std::string mountpoint = "/tmp/ipod";
    MakeDirs(mountpoint + "/iPod_Control/iTunes");
    ASSERT_EQ(mkfifo((mountpoint + "/iPod_Control/iTunes/iTunesDB").c_str(), 0644), 0);
    WriteFile("/usr/vanu/etc/audio/ipod/mountpoint", mountpoint + "\n");
    ScriptedDaemon daemon(ServeMediaServers({}));
    AdoptOrphans();

    CgiRequest root;
    root.queryString = "action=gettreenode&node=audiotree_root";
    const CgiResult r = Run(root);
    ExpectIPodListingCutAtTheTimeLimit(r, mountpoint);
    // The iPod category holds its refresh button alone, as for any failed listing.
    ASSERT_TRUE(r.json.isArray());
    bool sawIPod = false;
    for (const Json::Value& category : r.json) {
        if (category["id"] != "ipod_root")
            continue;
        sawIPod = true;
        ASSERT_EQ(category["children"].size(), 1u);
        EXPECT_EQ(category["children"][0]["id"], "ipod_refresh");
    }
    EXPECT_TRUE(sawIPod) << r.body.substr(0, 300);

    CgiRequest refresh;
    refresh.queryString = "action=refresh&target=ipod";
    const CgiResult again = Run(refresh);
    ExpectIPodListingCutAtTheTimeLimit(again, mountpoint);
    EXPECT_EQ(again.body, "{\"items\":null,\"success\":true}\n");
}

// The database as libgpod stores it for the iPods that keep it compressed (iTunesCDB, which
// itdb_parse reads before iTunesDB): the header as it stands with byte 0xa8 set to 1, the rest
// compressed with zlib at level 1, and the header's total length (bytes 8 to 11, little-endian)
// set to the compressed file's size. Replaces the iTunesDB that WriteIPodDatabase wrote.
void CompressIPodDatabase(const std::string& mountpoint) {
    const std::string plain = ReadFile(IPodDatabasePath(mountpoint));
    ASSERT_GT(plain.size(), 0xa8u);
    const auto le32 = [](const std::string& bytes, std::size_t at) {
        return static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[at])) |
               static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[at + 1])) << 8 |
               static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[at + 2])) << 16 |
               static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[at + 3])) << 24;
    };
    const std::uint32_t headerBytes = le32(plain, 4);
    ASSERT_GT(headerBytes, 0xa8u);
    ASSERT_LT(headerBytes, plain.size());
    uLongf compressedBytes = compressBound(plain.size() - headerBytes);
    std::string file(headerBytes + compressedBytes, '\0');
    ASSERT_EQ(compress2(reinterpret_cast<Bytef*>(&file[headerBytes]), &compressedBytes,
                        reinterpret_cast<const Bytef*>(plain.data() + headerBytes),
                        plain.size() - headerBytes, 1),
              Z_OK);
    file.replace(0, headerBytes, plain, 0, headerBytes);
    file.resize(headerBytes + compressedBytes);
    file[0xa8] = 1;
    for (int i = 0; i < 4; ++i)
        file[8 + i] = static_cast<char>((file.size() >> (8 * i)) & 0xff);
    WriteFile(mountpoint + "/iPod_Control/iTunes/iTunesCDB", file);
    ASSERT_EQ(unlink(IPodDatabasePath(mountpoint).c_str()), 0);
}

// The hang as it was found: two changed bytes of a valid database make libgpod spin at full CPU
// for good. Here the two bytes are the low half of the compressed database's total length, which
// then says 256: the compressed part ends early, and libgpod's inflate loop keeps asking zlib for
// more of it, which never comes. Every root tree and iPod refresh of every user hung while such an
// iPod was attached.
TEST_F(Hostile, IPodDatabaseThatSpinsTheParserFailsTheListingAfterFiveSeconds) {
    const std::string mountpoint = "/tmp/ipod";
    const std::vector<std::uint64_t> ids = AttachIPod({"Road Trip", "Gym"}, mountpoint);
    CompressIPodDatabase(mountpoint);
    ScriptedDaemon daemon(ServeMediaServers({}));
    AdoptOrphans();
    CgiRequest refresh;
    refresh.queryString = "action=refresh&target=ipod";

    // Intact, libgpod reads it: both playlists are listed.
    const CgiResult intact = Run(refresh);
    EXPECT_EQ(intact.json["items"].size(), 2u) << intact.body;
    EXPECT_NE(intact.body.find("\"ipod_" + IPodKey(ids[1]) + "\""), std::string::npos);
    EXPECT_TRUE(intact.LogMessages().empty());

    const std::string database = mountpoint + "/iPod_Control/iTunes/iTunesCDB";
    std::string damaged = ReadFile(database);
    damaged[8] = '\x00';
    damaged[9] = '\x01';
    WriteFile(database, damaged);

    CgiRequest root;
    root.queryString = "action=gettreenode&node=audiotree_root";
    const CgiResult r = Run(root);
    ExpectIPodListingCutAtTheTimeLimit(r, mountpoint);
    EXPECT_NE(r.body.find("\"ipod_refresh\""), std::string::npos);
    EXPECT_EQ(r.body.find("\"ipod_" + IPodKey(ids[0]) + "\""), std::string::npos);

    const CgiResult again = Run(refresh);
    ExpectIPodListingCutAtTheTimeLimit(again, mountpoint);
    EXPECT_EQ(again.body, "{\"items\":null,\"success\":true}\n");
}

// --- Memory: every request stays within its bound (RequestMemory.h) ----------------------------

// The bound as ru_maxrss counts it (KiB); the sanitizer build sets no address-space limit and needs
// more for its shadow memory.
constexpr long kRequestBoundKb =
    static_cast<long>(harmona::cgi::kRequestMemoryBytes >> 10) * kMemoryFactor;

// A BrowseResponse whose Result holds `count` objects made by `object(i)`, the DIDL-Lite escaped as
// a media server escapes text (only & < >; quotes need no escape in text). Built as one string
// and moved into the reply, so that the test process holds it once.
template <typename Object>
ScriptedReply PageOf(std::size_t count, std::size_t bytesPerObject, Object object,
                     std::size_t first = 0, std::size_t total = 0) {
    std::string body =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?><s:Envelope "
        "xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\"><s:Body><u:BrowseResponse "
        "xmlns:u=\"urn:schemas-upnp-org:service:ContentDirectory:1\"><Result>"
        "&lt;DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
        "xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
        "xmlns:upnp=\"urn:schemas-upnp-org:metadata-1-0/upnp/\"&gt;";
    body.reserve(body.size() + count * bytesPerObject + 1024);
    for (std::size_t i = first; i < first + count; ++i)
        object(i, body);
    body += "&lt;/DIDL-Lite&gt;</Result><NumberReturned>" + std::to_string(count) +
            "</NumberReturned><TotalMatches>" + std::to_string(total > 0 ? total : count) +
            "</TotalMatches><UpdateID>1</UpdateID></u:BrowseResponse></s:Body></s:Envelope>";
    ScriptedReply reply;
    reply.body = std::move(body);
    return reply;
}

void TinyObject(std::size_t i, std::string& out) {
    out += "&lt;item id=\"";
    out += std::to_string(i);
    out += "\"/&gt;";
}

// A track as a real media server describes it: title, class, artist, album and a resource.
void TrackObject(std::size_t i, std::string& out) {
    const std::string n = std::to_string(i);
    out += "&lt;item id=\"64$" + n +
           "\" parentID=\"64\" restricted=\"1\"&gt;&lt;dc:title&gt;Track " + n +
           " of a long album title&lt;/dc:title&gt;&lt;upnp:class&gt;object.item.audioItem." +
           "musicTrack&lt;/upnp:class&gt;&lt;upnp:artist&gt;Artist " + n.substr(0, 3) +
           "&lt;/upnp:artist&gt;&lt;upnp:album&gt;Album " + n.substr(0, 4) +
           "&lt;/upnp:album&gt;&lt;res protocolInfo=\"http-get:*:audio/mpeg:*\"&gt;"
           "http://192.168.1.10:50003/MediaItems/" +
           n + ".mp3&lt;/res&gt;&lt;/item&gt;";
}

// A browse that the browse library gave up on: the empty reply of a failed child listing, and one
// log line that holds `logged`.
void ExpectAbandonedBrowse(const CgiResult& r, const std::string& logged) {
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "[]\n");
    ASSERT_EQ(r.LogMessages().size(), 1u);
    EXPECT_NE(r.LogMessages()[0].find(logged), std::string::npos) << r.LogMessages()[0];
}

// The attack as it was measured: a 61 MiB page (under the 64 MiB reply limit) of 2.5 million tiny
// objects took 3.2 GB. Now refused before it is parsed, with a log line.
TEST_F(Hostile, MediaServerPageOfTwoAndAHalfMillionTinyObjectsFailsWithinTheBound) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    ScriptedReply page = PageOf(2500000, 26, TinyObject);
    EXPECT_GT(page.body.size(), 60u << 20);
    EXPECT_LT(page.body.size(), harmona::dma::kMaxReplyBytes);
    const FileSnapshot before = Snapshot();
    const CgiResult r = BrowseBig(server, std::move(page));
    ASSERT_NO_FATAL_FAILURE(ExpectAbandonedBrowse(r, "MiB to parse"));
    EXPECT_NE(r.LogMessages()[0].find("browse: object big of "), std::string::npos);
    EXPECT_LT(r.peakRssKb, kRequestBoundKb);
    EXPECT_TRUE(ChangedPaths(before, Snapshot()).empty());
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
}

// Objects without attributes parse to less than the tree bound allows, so the object count stops
// them: the browse ends at the first object past the limit.
TEST_F(Hostile, MediaServerPageOfBareObjectsFailsAtTheObjectLimitWithinTheBound) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    ScriptedReply page =
        PageOf(2500000, 13, [](std::size_t, std::string& out) { out += "&lt;item/&gt;"; });
    const CgiResult r = BrowseBig(server, std::move(page));
    ASSERT_NO_FATAL_FAILURE(ExpectAbandonedBrowse(r, "more than 200000 objects"));
    EXPECT_LT(r.peakRssKb, kRequestBoundKb);
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
}

// The largest container the bound allows: kMaxBrowseObjects tracks, each described in full, in two
// pages of 100,000 (a page of 200,000 such objects would pass the 64 MiB reply limit; servers cap
// their pages). Served whole; one object more is refused.
TEST_F(Hostile, ContainerOfTwoHundredThousandTracksIsServedWithinTheBound) {
    ASSERT_EQ(harmona::dma::kMaxBrowseObjects, 200000u);
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    server.Enqueue(PageOf(100000, 420, TrackObject, 0, 200000));
    server.Enqueue(PageOf(100000, 420, TrackObject, 100000, 200000));
    const CgiResult r = BrowseBig(server);
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(Count(r.body, "\"pid\":\"musiclib_big\""), 200000u);
    EXPECT_NE(r.body.find("\"text\":\"Track 199999 of a long album title\""), std::string::npos);
    EXPECT_EQ(r.LogMessages(), std::vector<std::string>{});
    EXPECT_LT(r.peakRssKb, kRequestBoundKb);
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
    RecordProperty("wall_ms", std::to_string(static_cast<long>(r.wallMs)));

    server.Enqueue(PageOf(100000, 420, TrackObject, 0, 200001));
    server.Enqueue(PageOf(100001, 420, TrackObject, 100000, 200001));
    ExpectAbandonedBrowse(BrowseBig(server), "more than 200000 objects");
}

// What the readers' bounds let through and still needs more than the bound: one object whose
// 47 MiB title is all double quotes, which the tree node holds HTML-encoded (six bytes each) twice,
// as text and tooltip. The address-space limit set at start-up stops it: one log line, no reply at
// all (the web server answers 500), nothing written.
TEST_F(Hostile, RequestPastTheAddressSpaceLimitEndsWithALogLineAndNoReply) {
#ifdef HARMONA_SANITIZE
    GTEST_SKIP() << "sanitizer builds reserve terabytes of address space and set no limit";
#endif
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    const std::size_t titleBytes = 47u << 20;
    ScriptedReply page = PageOf(1, titleBytes + 100, [&](std::size_t, std::string& out) {
        out += "&lt;item id=\"q\"&gt;&lt;dc:title&gt;";
        out.append(titleBytes, '"');
        out += "&lt;/dc:title&gt;&lt;/item&gt;";
    });
    const FileSnapshot before = Snapshot();
    const CgiResult r = BrowseBig(server, std::move(page));
    ASSERT_NO_FATAL_FAILURE(ExpectNoReply(r));
    EXPECT_EQ(r.LogMessages(), std::vector<std::string>{
                                   "request: out of memory within its bound of 512 MiB; no reply"});
    EXPECT_TRUE(ChangedPaths(before, Snapshot()).empty());
}

// The attack as it was measured: an 8 MiB smart playlist file of one-letter sections took 3.0 GB,
// 15.6 s and a 505 MB reply. Now the file is not listed, with one log line; the ordinary playlists
// still are.
TEST_F(Hostile, SmartPlaylistFileOfTwoMillionOneLetterSectionsFailsWithinTheBound) {
    {
        std::string sections;
        sections.reserve(8u << 20);
        while (sections.size() + 4 <= (8u << 20))
            sections += "[a]\n";
        WriteFile(UserSmartPlaylistFile("admin"), sections);
    }
    const CgiResult r = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(r.json["success"], true) << r.body.substr(0, 300);
    EXPECT_NE(r.body.find("musiclib_music_personal/playlist/Mine"), std::string::npos);
    EXPECT_EQ(r.body.find("/smart/"), std::string::npos);
    ASSERT_EQ(r.LogMessages().size(), 1u);
    EXPECT_EQ(r.LogMessages()[0], "playlist list: more than 10000 smart playlists in " +
                                      UserSmartPlaylistFile("admin") + "; the listing is refused");
    EXPECT_LT(r.peakRssKb, kRequestBoundKb);
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
    RecordProperty("wall_ms", std::to_string(static_cast<long>(r.wallMs)));
}

TEST_F(Hostile, SmartPlaylistFileOfTenThousandSectionsIsListedWhole) {
    std::vector<std::string> names;
    for (int i = 0; i < 10000; ++i)
        names.push_back("Smart " + std::to_string(100000 + i));
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), names);
    const CgiResult r = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(r.json["success"], true);
    EXPECT_EQ(Count(r.body, "\"musiclib_music_personal/smart/"), 10000u);
    EXPECT_TRUE(r.LogMessages().empty());
    RecordProperty("peak_rss_kb", std::to_string(r.peakRssKb));
}

// A playlists folder of more files than a list may hold is refused while it is read.
TEST_F(Hostile, PlaylistsFolderOfMoreThanTenThousandPlaylistsFailsWithALogLine) {
    for (int i = 1; i < 10000; ++i)  // "Mine.m3u" is the first
        WritePersonalPlaylistFile("admin", "List " + std::to_string(i) + ".m3u");
    const CgiResult listed = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(listed.json["success"], true);
    EXPECT_EQ(Count(listed.body, "\"musiclib_music_personal/playlist/"), 10000u);
    EXPECT_TRUE(listed.LogMessages().empty());
    RecordProperty("peak_rss_kb", std::to_string(listed.peakRssKb));

    WritePersonalPlaylistFile("admin", "One too many.m3u");
    const CgiResult refused = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(refused.json["success"], false);
    const std::vector<std::string> log = refused.LogMessages();
    ASSERT_FALSE(log.empty());
    EXPECT_EQ(log[0], "playlist list: more than 10000 playlists in " +
                          PersonalPlaylistDir("admin") + "; the listing is refused");
}

TEST_F(Hostile, MediaServerBillionLaughs) {
    ScriptedHttpServer server;
    ASSERT_TRUE(server.Start());
    std::string bomb = "<?xml version=\"1.0\"?><!DOCTYPE lolz [<!ENTITY lol \"lol\">";
    std::string previous = "lol";
    for (int i = 1; i <= 9; ++i) {
        const std::string name = "lol" + std::to_string(i);
        bomb += "<!ENTITY " + name + " \"";
        for (int k = 0; k < 10; ++k)
            bomb += "&" + previous + ";";
        bomb += "\">";
        previous = name;
    }
    bomb +=
        "]><s:Envelope "
        "xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\"><s:Body><u:BrowseResponse "
        "xmlns:u=\"urn:schemas-upnp-org:service:ContentDirectory:1\"><Result>&lol9;</"
        "Result><NumberReturned>1"
        "</NumberReturned><TotalMatches>1</TotalMatches></u:BrowseResponse></s:Body></s:Envelope>";
    server.Enqueue(Reply(bomb));
    const CgiResult r = RunQuery("action=gettreenode&node=musiclib_x");
    EXPECT_LT(r.peakRssKb, 64 * 1024 * kMemoryFactor);
    EXPECT_TRUE(r.body == "[]\n" || r.body == "[[]]\n") << r.body.substr(0, 200);
}

TEST_F(Hostile, DaemonThatSendsOneMebibyte) {
    ScriptedDaemon daemon([](const DaemonRequest& request) {
        if (request.command == 14)
            return DaemonAnswer::Reply("{\"success\":true}");
        return DaemonAnswer::Reply("{\"list\":[" + std::string(1 << 20, ' ') + "]}");
    });
    const CgiResult r = RunQuery("action=refresh&target=mediaserver");
    EXPECT_EQ(r.body, "{\"items\":null,\"success\":true}\n");
}

TEST_F(Hostile, DaemonThatSendsNothingOrNeverCloses) {
    for (DaemonAnswer answer : {DaemonAnswer::Close(), DaemonAnswer::Never()}) {
        ScriptedDaemon daemon([answer](const DaemonRequest&) { return answer; });
        const CgiResult r = RunQuery("action=refresh&target=mediaserver");
        EXPECT_EQ(r.body, "{\"items\":null,\"success\":true}\n");
        EXPECT_LT(r.wallMs, 5000);
    }
}

TEST_F(Hostile, HugeTextConfAndSmartPlaylistFiles) {
    // Written in pieces, so that the test process stays small and ru_maxrss speaks of the CGI.
    const std::size_t huge = 100u << 20;
    WriteLargeFile(std::string(kTextsDir) + "enu/strings", "[radio]\nradio=Radio\n", '#', huge, "");
    WriteLargeFile(kUsersConf, "[admin]\npermission=13\n", '#', huge, "\n[admin]\npermission=0\n");
    WriteLargeFile(kAudioConf, "", 'x', huge, "");
    WriteLargeFile(UserSmartPlaylistFile("admin"), "[Smart]\n", ';', huge, "");
    const CgiResult r = RunQuery("action=gettreenode&node=audiotree_root");
    // Only the first 8 MiB of a conf file are read: the late section does not revoke the user.
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.json.isArray());
    EXPECT_NE(r.body.find("\"inetradio_root\""), std::string::npos);
    EXPECT_NE(r.body.find("\"Radio\""), std::string::npos);
    EXPECT_NE(r.body.find("musiclib_music_personal/smart/Smart"), std::string::npos);
    EXPECT_LT(r.peakRssKb, 64 * 1024 * kMemoryFactor);
}

// A damaged text table of 2 million short entries would be parsed by every builder of a root
// request; the first 20,000 entries are kept and the table says so in the log.
TEST_F(Hostile, TextTableOfTwoMillionEntriesKeepsTheFirstTwentyThousand) {
    {
        std::string table = "[radio]\nradio=Radio\n[x]\n";
        table.reserve(8u << 20);
        for (int i = 0; table.size() < (8u << 20) - 16; ++i)
            table += "k" + std::to_string(i) + "=v\n";
        WriteFile(std::string(kTextsDir) + "enu/strings", table);
    }
    const CgiResult r = RunQuery("action=gettreenode&node=audiotree_root");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_NE(r.body.find("\"Radio\""), std::string::npos);
    // One line per parse of the table (the daemon is not running here: its lines are left aside).
    const std::string tooMany = "texts: " + std::string(kTextsDir) +
                                "enu/strings holds more than 20000 texts; the rest are ignored";
    const std::vector<std::string> log = r.LogMessages();
    EXPECT_GE(std::count(log.begin(), log.end(), tooMany), 1) << ::testing::PrintToString(log);
    for (const std::string& line : log)
        EXPECT_TRUE(line == tooMany || line.rfind("ctrl:", 0) == 0) << line;
    EXPECT_LT(r.peakRssKb, 64 * 1024 * kMemoryFactor);
}

TEST_F(Hostile, BinaryGarbageInTextConfAndSmartPlaylistFiles) {
    std::string garbage;
    for (int i = 0; i < (4 << 20); ++i)
        garbage.push_back(static_cast<char>((i * 2654435761u) >> 24));
    WriteFile(std::string(kTextsDir) + "enu/strings", garbage);
    WriteFile(kAudioConf, garbage);
    WriteFile(UserSmartPlaylistFile("admin"), garbage + "\n[Real one]\n");
    WriteFile(kSharedSmartPlaylistFile, garbage);
    const CgiResult r = RunQuery("action=gettreenode&node=audiotree_root");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_TRUE(r.jsonOk);
    EXPECT_NE(r.body.find("musiclib_music_personal/smart/Real one"), std::string::npos);
}

TEST_F(Hostile, LibraryDatabaseCorruptLockedOrAFifo) {
    // Corrupt: a valid header over garbage pages.
    std::string corrupt = "SQLite format 3";
    corrupt.push_back('\0');
    corrupt += std::string(8192, '\x5a');
    WriteFile(kLibraryDb, corrupt);
    EXPECT_EQ(RunQuery("action=refresh&target=shared").json["success"], false);
    EXPECT_EQ(RunQuery("action=rerandom100").json["success"], false);

    unlink(kLibraryDb);
    ASSERT_EQ(mkfifo(kLibraryDb, 0644), 0);
    EXPECT_EQ(RunQuery("action=refresh&target=shared").json["success"], false);
    EXPECT_EQ(RunQuery("action=rerandom100").json["success"], false);

    unlink(kLibraryDb);
    MakeGeneratedLibrary(200, {{5, "Locked"}});
    DatabaseWriterLock lock(kLibraryDb, 1000);
    ASSERT_TRUE(lock.Locked());
    const CgiResult r = RunQuery("action=refresh&target=shared");
    EXPECT_EQ(r.json["success"], true);
}

TEST_F(Hostile, SymlinkAtTheRandomPathIsReplacedNotFollowed) {
    MakeGeneratedLibrary(150);
    WriteFile("/var/packages/Harmona/etc/victim", "precious\n");
    ASSERT_EQ(symlink("/var/packages/Harmona/etc/victim", "/tmp/==DynaRandom100==.admin"), 0);
    const CgiResult r = Run(
        [] {
            CgiRequest request;
            request.queryString = "action=rerandom100";
            return request;
        }(),
        {"/tmp"});
    EXPECT_EQ(r.json["success"], true);
    EXPECT_EQ(ReadFile("/var/packages/Harmona/etc/victim"), "precious\n");
    struct stat st {};
    ASSERT_EQ(lstat("/tmp/==DynaRandom100==.admin", &st), 0);
    EXPECT_TRUE(S_ISREG(st.st_mode));
}

// A request as a browser sends it when a page (of this host or of another site) makes it.
CgiRequest BrowserRequest(const std::string& query,
                          const std::map<std::string, std::string>& headers) {
    CgiRequest request;
    request.queryString = query;
    request.extraEnv = headers;
    return request;
}

constexpr const char* kUnauthorized = "Status: 401 Unauthorized\r\n\r\n";
const std::string kRandomFile = "/tmp/==DynaRandom100==.admin";

TEST_F(Hostile, CrossSiteRequestsAreRefusedBeforeAnyActionRuns) {
    MakeGeneratedLibrary(150);
    ScriptedDaemon daemon(
        [](const DaemonRequest&) { return DaemonAnswer::Reply("{\"success\":true}"); });
    const std::vector<std::map<std::string, std::string>> foreign = {
        {{"HTTP_SEC_FETCH_SITE", "cross-site"}},
        {{"HTTP_SEC_FETCH_SITE", "Cross-Site"}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://evil.example"}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://nas.local.evil.example"}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://nas.local:8081"}, {"HTTP_HOST", "nas.local:8080"}},
        {{"HTTP_ORIGIN", "https://nas.local"}, {"HTTP_HOST", "nas.local:80"}},
        {{"HTTP_ORIGIN", "null"}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://nas.local"}},  // no Host to compare with
        {{"HTTP_ORIGIN", ""}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://nas.local"},
         {"HTTP_HOST", "nas.local"},
         {"HTTP_SEC_FETCH_SITE", "cross-site"}},
    };
    for (const auto& headers : foreign) {
        std::string described;
        for (const auto& [name, value] : headers)
            described += name + "=" + value + " ";
        for (const char* query :
             {"action=rerandom100", "action=refresh&target=mediaserver",
              "action=refresh&target=personal", "action=gettreenode&node=audiotree_root"}) {
            const CgiResult r = Run(BrowserRequest(query, headers));
            EXPECT_EQ(r.output, kUnauthorized) << described << query;
            EXPECT_EQ(r.exitStatus, 0) << described << query;
        }
    }
    EXPECT_FALSE(Exists(kRandomFile));
    EXPECT_TRUE(daemon.Requests().empty());
}

// Another port or subdomain of the same site is not this origin: its pages may not act either.
TEST_F(Hostile, SameSiteRequestsAreRefusedBeforeAnyActionRuns) {
    MakeGeneratedLibrary(150);
    ScriptedDaemon daemon(
        [](const DaemonRequest&) { return DaemonAnswer::Reply("{\"success\":true}"); });
    const std::vector<std::map<std::string, std::string>> sameSite = {
        {{"HTTP_SEC_FETCH_SITE", "same-site"}},
        {{"HTTP_SEC_FETCH_SITE", "Same-Site"}, {"HTTP_HOST", "nas.local:8080"}},
        {{"HTTP_SEC_FETCH_SITE", "same-site"},
         {"HTTP_ORIGIN", "http://nas.local:8080"},
         {"HTTP_HOST", "nas.local:8080"}},
        {{"HTTP_SEC_FETCH_SITE", "something-new"}, {"HTTP_HOST", "nas.local"}},
    };
    for (const auto& headers : sameSite) {
        std::string described;
        for (const auto& [name, value] : headers)
            described += name + "=" + value + " ";
        for (const char* query : {"action=rerandom100", "action=refresh&target=mediaserver"}) {
            const CgiResult r = Run(BrowserRequest(query, headers));
            EXPECT_EQ(r.output, kUnauthorized) << described << query;
        }
    }
    EXPECT_FALSE(Exists(kRandomFile));
    EXPECT_TRUE(daemon.Requests().empty());
}

TEST_F(Hostile, SameOriginAndHeaderlessRequestsStillAct) {
    MakeGeneratedLibrary(150);
    ScriptedDaemon daemon(
        [](const DaemonRequest&) { return DaemonAnswer::Reply("{\"success\":true}"); });
    const std::vector<std::map<std::string, std::string>> own = {
        {},  // curl, scripts
        {{"HTTP_HOST", "nas.local"}},
        {{"HTTP_SEC_FETCH_SITE", "same-origin"}, {"HTTP_HOST", "nas.local:8080"}},
        {{"HTTP_SEC_FETCH_SITE", "none"}},  // typed into the address bar
        {{"HTTP_ORIGIN", "http://nas.local:8080"}, {"HTTP_HOST", "nas.local:8080"}},
        {{"HTTP_ORIGIN", "http://NAS.Local"}, {"HTTP_HOST", "nas.local:80"}},
        {{"HTTP_ORIGIN", "https://nas.local:443"}, {"HTTP_HOST", "nas.local"}},
        {{"HTTP_ORIGIN", "http://127.0.0.1:8080"},
         {"HTTP_HOST", "127.0.0.1:8080"},
         {"HTTP_SEC_FETCH_SITE", "same-origin"}},
    };
    for (const auto& headers : own) {
        unlink(kRandomFile.c_str());
        const CgiResult r = Run(BrowserRequest("action=rerandom100", headers), {"/tmp"});
        EXPECT_EQ(r.json["success"], true) << r.output;
        EXPECT_TRUE(Exists(kRandomFile));
    }
    const CgiResult scan =
        Run(BrowserRequest("action=refresh&target=mediaserver",
                           {{"HTTP_ORIGIN", "http://nas.local"}, {"HTTP_HOST", "nas.local"}}));
    EXPECT_EQ(scan.exitStatus, 1);
    EXPECT_FALSE(daemon.Requests().empty());
}

// Another local user made the random playlist's file first (in the shared, sticky /tmp). The draw
// fails as before, the file stays as it was, and the log says which file and whose it is.
TEST_F(Hostile, RandomPlaylistFileOfAnotherUserFailsTheDrawWithOneLogLineNamingItsOwner) {
    MakeGeneratedLibrary(150);
    const uid_t nobody = 65534;  // "nobody" on Debian
    WriteFile(kRandomFile, "#EXTM3U\n/volume1/music/planted.mp3\n");
    ASSERT_EQ(chown(kRandomFile.c_str(), nobody, nobody), 0);
    const CgiResult r = Run(BrowserRequest("action=rerandom100", {}));
    EXPECT_EQ(r.json["success"], false) << r.body;
    EXPECT_EQ(r.json["errinfo"]["key"], "error_create_random100") << r.body;
    EXPECT_EQ(ReadFile(kRandomFile), "#EXTM3U\n/volume1/music/planted.mp3\n");
    const std::vector<std::string> log = r.LogMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_NE(log[0].find(kRandomFile), std::string::npos) << log[0];
    EXPECT_NE(log[0].find("user nobody (uid 65534)"), std::string::npos) << log[0];

    // The same for a symbolic link that another user planted there.
    ASSERT_EQ(unlink(kRandomFile.c_str()), 0);
    ASSERT_EQ(symlink("/var/packages/Harmona/etc/users.conf", kRandomFile.c_str()), 0);
    ASSERT_EQ(lchown(kRandomFile.c_str(), 4321, 4321), 0);
    const CgiResult linked = Run(BrowserRequest("action=rerandom100", {}));
    EXPECT_EQ(linked.json["success"], false) << linked.body;
    ASSERT_EQ(linked.LogMessages().size(), 1u);
    EXPECT_NE(linked.LogMessages()[0].find("(uid 4321)"), std::string::npos);
}

// The user's playlists folder is a symbolic link to another user's: neither his playlists nor his
// smart playlists are listed; the listing fails as it does for a folder that cannot be read.
TEST_F(Hostile, SymlinkedPlaylistsFolderIsRefusedLikeAnUnreadableOne) {
    WritePersonalPlaylistFile("other", "Secret.m3u");
    WriteSmartPlaylistFile(UserSmartPlaylistFile("other"), {"Secret smart"});
    const std::string folder = PersonalPlaylistDir("admin");

    // What an unreadable folder gives: a file where the folder should be.
    ASSERT_EQ(system(("rm -rf '" + folder + "'").c_str()), 0);
    WriteFile(folder, "not a folder\n");
    const CgiResult unreadableRefresh = RunQuery("action=refresh&target=personal");
    const CgiResult unreadableCategory =
        RunQuery("action=gettreenode&node=musiclib_music_personal");
    EXPECT_EQ(unreadableRefresh.json["success"], false) << unreadableRefresh.body;

    ASSERT_EQ(unlink(folder.c_str()), 0);
    ASSERT_EQ(symlink(PersonalPlaylistDir("other").c_str(), folder.c_str()), 0);
    for (const char* query :
         {"action=refresh&target=personal", "action=gettreenode&node=musiclib_music_personal",
          "action=gettreenode&node=audiotree_root"}) {
        const CgiResult r = RunQuery(query);
        EXPECT_EQ(r.body.find("Secret"), std::string::npos) << query << ": " << r.body;
    }
    const CgiResult refresh = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(refresh.body, unreadableRefresh.body);
    EXPECT_EQ(refresh.LogMessages(), unreadableRefresh.LogMessages());
    const CgiResult category = RunQuery("action=gettreenode&node=musiclib_music_personal");
    EXPECT_EQ(category.body, unreadableCategory.body);
    EXPECT_EQ(category.exitStatus, unreadableCategory.exitStatus);
}

TEST_F(Hostile, PreferenceDirectoryThatIsASymlinkElsewhere) {
    // The administrator's folder is elsewhere; the user's preference folder points at it.
    WritePersonalPlaylistFile("other", "Secret.m3u");
    const std::string prefs = PreferenceDir("admin");
    ASSERT_EQ(system(("rm -rf '" + prefs + "'").c_str()), 0);
    ASSERT_EQ(symlink("/etc", prefs.c_str()), 0);
    const CgiResult r = RunQuery("action=refresh&target=personal");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_TRUE(r.jsonOk);
    // Nothing is listed from /etc (it has no playlists folder) and nothing is written anywhere.
    EXPECT_EQ(r.body.find("/etc"), std::string::npos);
    EXPECT_EQ(r.body.find("Secret"), std::string::npos);
}

}  // namespace
