// The real vanuaudiod (platform/README.md, "Audio daemon") in the test's private network: its
// control socket, its robustness against bad clients, its concurrency, and the discovery of real
// (MiniDLNA) and scripted media servers over a veth link.
#include <grp.h>
#include <gtest/gtest.h>
#include <net/if.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <future>
#include <iostream>
#include <memory>
#include <thread>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "platform/lib/gupnp/HttpFetch.h"
#include "platform/paths/DaemonAccount.h"
#include "tests/harness/Fixtures.h"
#include "tests/vanuaudiod/DaemonKit.h"

using namespace harmona::test;

namespace {

constexpr const char* kSocket = "/tmp/vanuaudiod.sock";

Json::Value Reply(const Exchange& exchange) {
    Json::Value value;
    EXPECT_TRUE(exchange.answered);
    EXPECT_TRUE(ParseJson(exchange.reply, value)) << exchange.reply;
    return value;
}

// A raw client for the malformed cases: connects and sends `bytes`, optionally closing its
// sending side; returns the descriptor.
int SendRaw(const std::string& bytes, bool closeSending) {
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, kSocket);
    EXPECT_EQ(connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    EXPECT_EQ(send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
    if (closeSending)
        shutdown(fd, SHUT_WR);
    return fd;
}

// Reads the reply (one read) within `timeoutMs`; "" when none.
std::string ReadReply(int fd, int timeoutMs) {
    struct timeval limit {
        timeoutMs / 1000, (timeoutMs % 1000) * 1000
    };
    setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof(limit));
    char buffer[40960];
    const ssize_t n = recv(fd, buffer, sizeof(buffer), 0);
    close(fd);
    return n > 0 ? std::string(buffer, static_cast<std::size_t>(n)) : "";
}

std::string Record(int32_t command, const std::string& arguments) {
    std::string record(8196, '\0');
    std::memcpy(&record[0], &command, 4);
    std::memcpy(&record[4], arguments.data(), arguments.size());
    return record;
}

// A socket file at the daemon's path, bound by a process that is gone (stale).
bool LeaveStaleSocket() {
    const int fd = socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, kSocket);
    const bool bound = bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0;
    close(fd);
    return bound;
}

bool HasServer(const Json::Value& list, const std::string& name) {
    for (const Json::Value& server : list) {
        if (server["friendly_name"].asString() == name)
            return true;
    }
    return false;
}

// LeakSanitizer's suppressions file for the programs started while this lives (the environment
// they inherit), with whole allocation stacks (the libraries' frames are what the file names); the
// previous LSAN_OPTIONS come back after.
class ScopedLeakSuppressions {
  public:
    explicit ScopedLeakSuppressions(const std::string& file) {
        const char* previous = std::getenv("LSAN_OPTIONS");
        hadPrevious_ = previous != nullptr;
        previous_ = hadPrevious_ ? previous : "";
        const std::string options = "suppressions=" + file +
                                    ":print_suppressions=0:fast_unwind_on_malloc=0" +
                                    (hadPrevious_ ? ":" + previous_ : "");
        setenv("LSAN_OPTIONS", options.c_str(), 1);
    }
    ~ScopedLeakSuppressions() {
        if (hadPrevious_)
            setenv("LSAN_OPTIONS", previous_.c_str(), 1);
        else
            unsetenv("LSAN_OPTIONS");
    }
    ScopedLeakSuppressions(const ScopedLeakSuppressions&) = delete;
    ScopedLeakSuppressions& operator=(const ScopedLeakSuppressions&) = delete;

  private:
    bool hadPrevious_ = false;
    std::string previous_;
};

class AudioDaemon : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_TRUE(peer_); }
    // The daemon of the test ends the way a service manager ends it: SIGTERM, then a clean exit
    // with nothing from the sanitizers (in the sanitizer build) in its output.
    void TearDown() override {
        if (!daemon_)
            return;
        const int status = daemon_.Stop(SIGTERM, 5000);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << "status " << status;
        const std::string log = ReadFile("/tmp/vanuaudiod.log");
        EXPECT_EQ(log.find("Sanitizer"), std::string::npos) << log;
        EXPECT_EQ(log.find("runtime error"), std::string::npos) << log;
    }
    PeerNetwork peer_;
    Process daemon_;
};

}  // namespace

TEST_F(AudioDaemon, SocketIsOpenToTheCgiUserAndAStaleOneIsReplaced) {
    ASSERT_TRUE(LeaveStaleSocket());
    daemon_ = StartDaemon();
    struct stat info {};
    ASSERT_EQ(stat(kSocket, &info), 0);
    EXPECT_TRUE(S_ISSOCK(info.st_mode));
    // Owner and group only: the web server's group, whose CGI is the one client.
    EXPECT_EQ(info.st_mode & 0777, 0660u);
    const group* web = getgrnam(harmona::paths::kDaemonSocketGroup);
    ASSERT_NE(web, nullptr);
    EXPECT_EQ(info.st_gid, web->gr_gid);
    EXPECT_TRUE(Call(16, "0 10").answered);
}

TEST_F(AudioDaemon, ASecondDaemonDoesNotTakeOverALiveSocket) {
    daemon_ = StartDaemon();
    Process second = Spawn({DaemonProgram(), "--interface", kHostInterface}, "/tmp/second.log");
    int status = 0;
    ASSERT_TRUE(second.WaitExit(5000, status));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    EXPECT_NE(ReadFile("/tmp/second.log").find("another daemon"), std::string::npos);
    EXPECT_TRUE(Call(16, "0 10").answered);
}

TEST_F(AudioDaemon, AFileThatIsNotASocketIsLeftAlone) {
    WriteFile(kSocket, "precious");
    Process daemon = Spawn({DaemonProgram(), "--interface", kHostInterface}, "/tmp/d.log");
    int status = 0;
    ASSERT_TRUE(daemon.WaitExit(5000, status));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1);
    EXPECT_EQ(ReadFile(kSocket), "precious");
}

TEST_F(AudioDaemon, SigtermAndSigintStopItCleanlyAndRemoveTheSocket) {
    for (int signal : {SIGTERM, SIGINT}) {
        daemon_ = StartDaemon();
        const int status = daemon_.Stop(signal, 5000);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << signal << " " << status;
        EXPECT_FALSE(Exists(kSocket)) << signal;
        EXPECT_EQ(ReadFile("/tmp/vanuaudiod.log").find("Sanitizer"), std::string::npos);
    }
}

TEST_F(AudioDaemon, CommandFourteenIsAnsweredAtOnceAndTheListStaysAnswerableDuringTheSearch) {
    daemon_ = StartDaemon();
    const Exchange prepare = Call(14);
    EXPECT_EQ(prepare.reply, "{\"success\": true}");
    // The search runs now (MX 2 s); pages are answered meanwhile, each within the budget.
    for (int i = 0; i < 20; ++i) {
        const Json::Value page = Reply(Call(16, "0 10"));
        EXPECT_EQ(page["success"], true);
        EXPECT_TRUE(page["list"].isArray());
        EXPECT_TRUE(page["total"].isInt());
    }
}

TEST_F(AudioDaemon, OtherCommandCodesAreUnsupported) {
    daemon_ = StartDaemon();
    for (int32_t code : {1, 15, 17, 19, 27, 35, 38, 99, -7}) {
        const Json::Value reply = Reply(Call(code, "1 2"));
        EXPECT_EQ(reply["success"], false) << code;
        EXPECT_EQ(reply["error"], "unsupported") << code;
    }
}

TEST_F(AudioDaemon, GarbageAndHalfRecordsDoNotUpsetLaterClients) {
    daemon_ = StartDaemon();
    // Garbage, then the client stops sending: a short request.
    Json::Value reply;
    ASSERT_TRUE(ParseJson(ReadReply(SendRaw("\xff\xfe garbage \x01\x02", true), 2000), reply));
    EXPECT_EQ(reply["success"], false);
    // Half a record, held open: the others are served meanwhile.
    const int half = SendRaw(Record(16, "0 10").substr(0, 4000), false);
    for (int i = 0; i < 5; ++i)
        EXPECT_EQ(Reply(Call(16, "0 10"))["success"], true);
    // The half record gets an error after the daemon's time limit and is closed.
    ASSERT_TRUE(ParseJson(ReadReply(half, 4000), reply));
    EXPECT_EQ(reply["success"], false);
    EXPECT_EQ(reply["error"], "request timed out");
    // A record with more bytes after it.
    ASSERT_TRUE(ParseJson(ReadReply(SendRaw(Record(16, "0 10") + "trailing", false), 2000), reply));
    EXPECT_EQ(reply["error"], "oversized request");
    // A record whose argument text has no terminator.
    std::string unterminated = Record(16, "");
    std::memset(&unterminated[4], '7', 8192);
    ASSERT_TRUE(ParseJson(ReadReply(SendRaw(unterminated, false), 2000), reply));
    EXPECT_EQ(reply["error"], "bad request");
    // Page arguments that are not two integers.
    EXPECT_EQ(Reply(Call(16, "zero ten"))["success"], false);
    // And the daemon is as before.
    const Json::Value page = Reply(Call(16, "0 10"));
    EXPECT_EQ(page["success"], true);
    EXPECT_EQ(waitpid(daemon_.pid(), nullptr, WNOHANG), 0);
}

TEST_F(AudioDaemon, FiftyClientsAtOnceAreAllAnsweredWithinHalfASecond) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    for (int i = 0; i < 12; ++i) {
        const std::string udn = "uuid:fifty-" + std::to_string(i);
        fake.Add(udn, FakeMediaServers::DescriptionXml(udn, "Server " + std::to_string(i), "/cd"));
        fake.Alive(udn, 60);
    }
    WaitForList([](const Json::Value& list) { return list.size() == 12; }, 10000);
    std::promise<void> go;
    std::shared_future<void> start = go.get_future().share();
    std::vector<std::future<Exchange>> clients;
    for (int i = 0; i < 50; ++i) {
        clients.push_back(std::async(std::launch::async, [start, i] {
            start.wait();
            return Call(16, i % 2 == 0 ? "0 10" : "10 10");
        }));
    }
    go.set_value();
    for (int i = 0; i < 50; ++i) {
        const Exchange exchange = clients[i].get();
        ASSERT_TRUE(exchange.answered) << "client " << i << " after " << exchange.ms << " ms";
        const Json::Value page = Reply(exchange);
        EXPECT_EQ(page["total"], 12);
        EXPECT_EQ(page["list"].size(), i % 2 == 0 ? 10u : 2u);
    }
}

TEST_F(AudioDaemon, FindsARealMiniDlnaWithItsContentDirectory) {
    daemon_ = StartDaemon();
    Process minidlna = StartMiniDlna(peer_, "Shelf MiniDLNA", 8200);
    EXPECT_TRUE(Call(14).answered);
    const std::string text = WaitForList(
        [](const Json::Value& list) { return HasServer(list, "Shelf MiniDLNA"); }, 15000);
    Json::Value reply;
    ASSERT_TRUE(ParseJson(text, reply)) << text;
    ASSERT_EQ(reply["list"].size(), 1u) << text << ReadFile("/tmp/vanuaudiod.log");
    const Json::Value& server = reply["list"][0];
    EXPECT_EQ(server["control_url"], "http://10.77.0.2:8200/ctl/ContentDir");
    EXPECT_EQ(server["ip"], kPeerAddress);
    EXPECT_EQ(server["udn"].asString().rfind("uuid:", 0), 0u);
    EXPECT_EQ(reply["total"], 1);
}

TEST_F(AudioDaemon, AStoppedServerDisappearsAfterItsByebye) {
    daemon_ = StartDaemon();
    Process minidlna = StartMiniDlna(peer_, "Leaving MiniDLNA", 8201);
    Call(14);
    ASSERT_TRUE(HasServer(
        [] {
            Json::Value r;
            ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 15000), r);
            return r["list"];
        }(),
        "Leaving MiniDLNA"));
    // MiniDLNA announces a max-age of 130 s: gone within seconds means its byebye was heard.
    minidlna.Stop(SIGTERM, 5000);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.empty(); }, 5000), reply));
    EXPECT_EQ(reply["list"].size(), 0u);
    EXPECT_EQ(reply["total"], 0);
}

TEST_F(AudioDaemon, AServerThatStopsAnnouncingExpiresAfterItsMaxAge) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    fake.Add("uuid:short", FakeMediaServers::DescriptionXml("uuid:short", "Short Lived", "/cd"));
    fake.Add("uuid:long", FakeMediaServers::DescriptionXml("uuid:long", "Long Lived", "/cd"));
    fake.Alive("uuid:short", 2);
    fake.Alive("uuid:long", 300);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 2; }, 5000), reply));
    ASSERT_EQ(reply["list"].size(), 2u);
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 6000), reply));
    ASSERT_EQ(reply["list"].size(), 1u);
    EXPECT_EQ(reply["list"][0]["friendly_name"], "Long Lived");
}

TEST_F(AudioDaemon, ServersAreListedInAStableOrderAndPaged) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    // Announced in a scrambled order; two share a name.
    const std::vector<std::pair<std::string, std::string>> devices = {
        {"uuid:c", "Charlie"}, {"uuid:a2", "Alpha"}, {"uuid:b", "Bravo"}, {"uuid:a1", "Alpha"}};
    for (const auto& [udn, name] : devices) {
        fake.Add(udn, FakeMediaServers::DescriptionXml(udn, name, "/cd/" + udn));
        fake.Alive(udn, 60);
    }
    WaitForList([](const Json::Value& l) { return l.size() == 4; }, 5000);
    const Json::Value first = Reply(Call(16, "0 3"));
    const Json::Value second = Reply(Call(16, "3 3"));
    ASSERT_EQ(first["list"].size(), 3u);
    ASSERT_EQ(second["list"].size(), 1u);
    EXPECT_EQ(first["total"], 4);
    EXPECT_EQ(first["list"][0]["udn"], "uuid:a1");
    EXPECT_EQ(first["list"][1]["udn"], "uuid:a2");
    EXPECT_EQ(first["list"][2]["udn"], "uuid:b");
    EXPECT_EQ(second["list"][0]["udn"], "uuid:c");
    EXPECT_EQ(first["list"][0]["control_url"],
              "http://10.77.0.1:" + std::to_string(fake.Port()) + "/cd/uuid:a1");
}

TEST_F(AudioDaemon, ByebyeOfOneServerLeavesTheOthers) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    for (const char* udn : {"uuid:stay", "uuid:go"}) {
        fake.Add(udn, FakeMediaServers::DescriptionXml(udn, udn + 5, "/cd"));
        fake.Alive(udn, 300);
    }
    WaitForList([](const Json::Value& l) { return l.size() == 2; }, 5000);
    fake.Byebye("uuid:go");
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 3000), reply));
    ASSERT_EQ(reply["list"].size(), 1u);
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:stay");
}

// GSSDP-based servers (harmona-mediad, Rygel) still send the search answers they owed when they
// leave, so one can arrive after the byebye; it must not bring the device back for its max-age.
TEST_F(AudioDaemon, ASearchAnswerThatFollowsTheByebyeDoesNotBringTheServerBack) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    fake.Add("uuid:leaving", FakeMediaServers::DescriptionXml("uuid:leaving", "Leaving", "/cd"));
    fake.Alive("uuid:leaving", 1800);
    WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000);
    const int searchesBefore = fake.SearchesSeen();
    EXPECT_TRUE(Call(14).answered);
    for (int waited = 0; fake.SearchesSeen() == searchesBefore && waited < 5000; waited += 50)
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    ASSERT_GT(fake.SearchesSeen(), searchesBefore);
    fake.Byebye("uuid:leaving");
    WaitForList([](const Json::Value& l) { return l.empty(); }, 5000);
    fake.AnswerLastSearch("uuid:leaving", 1800);
    // Listed again within a few hundred milliseconds when the answer is taken for a return.
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return !l.empty(); }, 3000), reply));
    EXPECT_EQ(reply["list"].size(), 0u) << reply;
    // Its next NOTIFY alive is a return.
    fake.Alive("uuid:leaving", 1800);
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    ASSERT_EQ(reply["list"].size(), 1u);
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:leaving");
}

TEST_F(AudioDaemon, DevicesWithoutAUsableDescriptionAreNotListed) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    fake.Add("uuid:broken", "<root><device><deviceType>nonsense");
    fake.Add("uuid:nocd", FakeMediaServers::DescriptionXml("uuid:nocd", "No CD", ""));
    fake.Add("uuid:good", FakeMediaServers::DescriptionXml("uuid:good", "Good", "/cd"));
    fake.Alive("uuid:broken", 60);
    fake.Alive("uuid:nocd", 60);
    fake.Alive("uuid:missing", 60);  // its location answers 404
    fake.Alive("uuid:good", 60);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    // Give the broken ones the same time to (not) show up.
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    reply = Reply(Call(16, "0 10"));
    ASSERT_EQ(reply["list"].size(), 1u);
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:good");
}

TEST_F(AudioDaemon, HostileNamesAreCleanedAndRepliesStayInsideTheClientsBuffer) {
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    // Long names of quotes (twice as long once escaped) and invalid UTF-8.
    for (int i = 0; i < 15; ++i) {
        const std::string udn = "uuid:big-" + std::to_string(10 + i);
        fake.Add(udn, FakeMediaServers::DescriptionXml(
                          udn, std::string(3000, '"') + "\xff" + std::to_string(i), "/cd"));
        fake.Alive(udn, 60);
    }
    WaitForList([](const Json::Value& l) { return l.size() == 15; }, 8000);
    const Exchange page = Call(16, "0 15");
    ASSERT_TRUE(page.answered);
    EXPECT_LT(page.reply.size(), 40960u);
    const Json::Value reply = Reply(page);
    EXPECT_EQ(reply["total"], 15);
    ASSERT_GE(reply["list"].size(), 10u);  // a page of the CGI's size (10) always fits
    EXPECT_EQ(reply["list"][0]["friendly_name"].asString(), std::string(512, '"'));
}

// Through the real CGI: the media server list pages the real daemon's list into nodes.
namespace {

const Json::Value* FindNode(const Json::Value& nodes, const std::string& id) {
    for (const Json::Value& node : nodes) {
        if (node["id"].asString() == id)
            return &node;
    }
    return nullptr;
}

CgiResult RefreshMediaServers() {
    return Get(Query({{"action", "refresh"}, {"target", "mediaserver"}}));
}

}  // namespace

TEST_F(AudioDaemon, ServersOnTheNetworkAppearAsMediaServerNodesThroughTheCgi) {
    StandardFixture();
    daemon_ = StartDaemon();
    Process minidlna = StartMiniDlna(peer_, "Kitchen MiniDLNA", 8200);
    FakeMediaServers fake;
    fake.Add("uuid:nameless", FakeMediaServers::DescriptionXml("uuid:nameless", "", "/cd"));
    fake.Alive("uuid:nameless", 60);
    // The scan: the CGI's refresh sends command 14 (the search), then pages with command 16.
    const CgiResult first = RefreshMediaServers();
    ASSERT_TRUE(first.jsonOk) << first.output;
    EXPECT_EQ(first.json["success"], true);
    WaitForList([](const Json::Value& l) { return l.size() == 2; }, 15000);

    const CgiResult refresh = RefreshMediaServers();
    ASSERT_TRUE(refresh.jsonOk) << refresh.output;
    EXPECT_EQ(refresh.json["success"], true);
    const Json::Value& items = refresh.json["items"];
    ASSERT_EQ(items.size(), 2u) << refresh.body;
    const Json::Value* kitchen =
        FindNode(items, "mediaserver_http://10.77.0.2:8200/ctl/ContentDir");
    ASSERT_NE(kitchen, nullptr) << refresh.body;
    EXPECT_EQ((*kitchen)["text"], "Kitchen MiniDLNA");
    EXPECT_EQ((*kitchen)["pid"], "mediaserver_root");
    EXPECT_EQ((*kitchen)["leaf"], true);
    const std::string namelessId =
        "mediaserver_http://10.77.0.1:" + std::to_string(fake.Port()) + "/cd";
    const Json::Value* nameless = FindNode(items, namelessId);
    ASSERT_NE(nameless, nullptr) << refresh.body;
    EXPECT_EQ((*nameless)["text"], kHostAddress);  // no friendly name: its ip

    // The same servers under the root tree's media server node, after the scan button.
    const CgiResult root = Get(Query({{"action", "gettreenode"}, {"node", "audiotree_root"}}));
    ASSERT_TRUE(root.jsonOk) << root.output;
    const Json::Value* mediaRoot = FindNode(root.json, "mediaserver_root");
    ASSERT_NE(mediaRoot, nullptr) << root.body;
    const Json::Value& children = (*mediaRoot)["children"];
    ASSERT_EQ(children.size(), 3u) << root.body;
    EXPECT_EQ(children[0]["id"], "mediaserver_refresh");
    EXPECT_NE(FindNode(children, "mediaserver_http://10.77.0.2:8200/ctl/ContentDir"), nullptr);
    EXPECT_NE(FindNode(children, namelessId), nullptr);
}

TEST_F(AudioDaemon, AStoppedServerLeavesTheCgisListAfterItsByebye) {
    StandardFixture();
    daemon_ = StartDaemon();
    Process minidlna = StartMiniDlna(peer_, "Garage MiniDLNA", 8202);
    RefreshMediaServers();
    WaitForList([](const Json::Value& l) { return l.size() == 1; }, 15000);
    const CgiResult before = RefreshMediaServers();
    ASSERT_EQ(before.json["items"].size(), 1u) << before.body;
    minidlna.Stop(SIGTERM, 5000);
    WaitForList([](const Json::Value& l) { return l.empty(); }, 5000);
    const CgiResult after = RefreshMediaServers();
    ASSERT_TRUE(after.jsonOk) << after.output;
    EXPECT_EQ(after.json["success"], true);
    EXPECT_EQ(after.json["items"].size(), 0u) << after.body;
}

TEST_F(AudioDaemon, TwentyFiveServersArePagedIntoTwentyFiveNodesByTheCgi) {
    StandardFixture();
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    for (int i = 0; i < 25; ++i) {
        const std::string udn = "uuid:many-" + std::to_string(i);
        fake.Add(udn, FakeMediaServers::DescriptionXml(udn, "Server " + std::to_string(100 + i),
                                                       "/cd/" + std::to_string(i)));
        fake.Alive(udn, 60);
    }
    WaitForList([](const Json::Value& l) { return l.size() == 25; }, 10000);
    const CgiResult refresh = RefreshMediaServers();
    ASSERT_TRUE(refresh.jsonOk) << refresh.output;
    const Json::Value& items = refresh.json["items"];
    ASSERT_EQ(items.size(), 25u) << refresh.body;
    for (int i = 0; i < 25; ++i)
        EXPECT_EQ(items[i]["text"], "Server " + std::to_string(100 + i));
}

TEST_F(AudioDaemon, AServerAlreadyRunningIsFoundByTheSearchAtStart) {
    // MiniDLNA starts first; its start-up announcements go out before the daemon listens, and its
    // next ones are a minute away: only the daemon's own M-SEARCH can find it.
    Process minidlna = StartMiniDlna(peer_, "Early MiniDLNA", 8203);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    while (
        !harmona::gupnp::HttpFetcher::GetAndWait("http://10.77.0.2:8203/rootDesc.xml", {500, 65536})
             .ok &&
        std::chrono::steady_clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    daemon_ = StartDaemon();
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 10000), reply));
    ASSERT_EQ(reply["list"].size(), 1u) << ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(reply["list"][0]["friendly_name"], "Early MiniDLNA");
}

TEST_F(AudioDaemon, CommandFourteenSendsANewSearch) {
    FakeMediaServers fake;
    fake.Add("uuid:quiet", FakeMediaServers::DescriptionXml("uuid:quiet", "Quiet", "/cd"));
    daemon_ = StartDaemon();
    // The search at start arrives while the device does not answer yet.
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    while (fake.SearchesSeen() == 0 && std::chrono::steady_clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    ASSERT_GT(fake.SearchesSeen(), 0);
    std::this_thread::sleep_for(std::chrono::milliseconds(500));  // its repeats too
    const int before = fake.SearchesSeen();
    fake.AnswerSearches("uuid:quiet", 60);
    EXPECT_EQ(Reply(Call(16, "0 10"))["total"], 0);
    // The scan button: command 14, answered at once, and the device answers the new search.
    EXPECT_EQ(Call(14).reply, "{\"success\": true}");
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    ASSERT_EQ(reply["list"].size(), 1u);
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:quiet");
    EXPECT_GT(fake.SearchesSeen(), before);
    // And every later press of the button searches again: once the first search's repeats are
    // over, a device that answers from now on is found only by a new search.
    fake.Add("uuid:quieter", FakeMediaServers::DescriptionXml("uuid:quieter", "Quieter", "/cd"));
    std::this_thread::sleep_for(std::chrono::milliseconds(3000));
    fake.AnswerSearches("uuid:quieter", 60);
    const int beforeSecond = fake.SearchesSeen();
    EXPECT_EQ(Call(14).reply, "{\"success\": true}");
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 2; }, 5000), reply));
    EXPECT_EQ(reply["list"].size(), 2u);
    EXPECT_GT(fake.SearchesSeen(), beforeSecond);
}

// The storage server's own media server, harmona-mediad, found on the network beside MiniDLNA.
namespace {

Process StartMediad(PeerNetwork& peer) {
    Process mediad = peer.SpawnOnPeer({HARMONA_MEDIAD_PATH, "--interface", kPeerInterface},
                                      "/tmp/harmona-mediad.log");
    // It writes the pid file of service 3 once it serves (platform/README.md, "System
    // configuration, shares and services").
    mediad.WaitUntilReady([] { return Exists(Stack().mediadPidFile); }, 10000);
    EXPECT_TRUE(Exists("/run/vanu/service/3.pid")) << ReadFile("/tmp/harmona-mediad.log");
    return mediad;
}

std::string HostName() {
    char name[256] = {};
    gethostname(name, sizeof(name) - 1);
    return name;
}

constexpr const char* kMediadNodeId = "mediaserver_http://10.77.0.2:50003/ContentDirectory/control";

}  // namespace

TEST_F(AudioDaemon, HarmonaMediadAndMiniDlnaBothAppearAsMediaServerNodesThroughTheCgi) {
    StandardFixture();
    daemon_ = StartDaemon();
    Process mediad = StartMediad(peer_);
    Process minidlna = StartMiniDlna(peer_, "Attic MiniDLNA", 8204);
    RefreshMediaServers();  // the scan button
    WaitForList([](const Json::Value& l) { return l.size() == 2; }, 15000);
    const CgiResult refresh = RefreshMediaServers();
    ASSERT_TRUE(refresh.jsonOk) << refresh.output;
    const Json::Value& items = refresh.json["items"];
    ASSERT_EQ(items.size(), 2u) << refresh.body << ReadFile("/tmp/vanuaudiod.log");
    // Listed by friendly name: "Attic MiniDLNA" before "Harmona Music Library (...)".
    EXPECT_EQ(items[0]["id"], "mediaserver_http://10.77.0.2:8204/ctl/ContentDir");
    EXPECT_EQ(items[0]["text"], "Attic MiniDLNA");
    EXPECT_EQ(items[1]["id"], kMediadNodeId);
    EXPECT_EQ(items[1]["text"], "Harmona Music Library (" + HostName() + ")");
    EXPECT_EQ(items[1]["pid"], "mediaserver_root");
    // The control URLs the daemon lists are the real ContentDirectory endpoints: the project's
    // browse library browses the root of each.
    const Json::Value list = Reply(Call(16, "0 10"))["list"];
    ASSERT_EQ(list.size(), 2u);
    for (const Json::Value& server : list) {
        SCOPED_TRACE(server["control_url"].asString());
        DMABrowse browse(BrowseDirectChildren, server["control_url"].asString());
        browse.objectId = "0";
        ASSERT_EQ(browse.Prepare(), 0);
        DMAParser parser;
        ASSERT_EQ(parser.Parse(&browse), 0) << parser.Error();
        ASSERT_NE(parser.GetResult(), nullptr);
        EXPECT_FALSE(parser.GetResult()->empty());
    }
    // harmona-mediad's root holds the music library's seven categories.
    DMABrowse browse(BrowseDirectChildren, list[1]["control_url"].asString());
    browse.objectId = "0";
    ASSERT_EQ(browse.Prepare(), 0);
    DMAParser parser;
    ASSERT_EQ(parser.Parse(&browse), 0) << parser.Error();
    ASSERT_NE(parser.GetResult(), nullptr);
    ASSERT_EQ(parser.GetResult()->size(), 7u);
    EXPECT_EQ((*parser.GetResult())[0]->getValueByKey("id"), "music_all");
}

TEST_F(AudioDaemon, AStoppedHarmonaMediadLeavesTheListAfterItsByebye) {
    StandardFixture();
    daemon_ = StartDaemon();
    Process mediad = StartMediad(peer_);
    RefreshMediaServers();
    WaitForList([](const Json::Value& l) { return l.size() == 1; }, 15000);
    const CgiResult before = RefreshMediaServers();
    ASSERT_EQ(before.json["items"].size(), 1u) << before.body;
    EXPECT_EQ(before.json["items"][0]["id"], kMediadNodeId);
    EXPECT_EQ(mediad.Stop(SIGTERM, 10000), 0);
    // The byebye arrives at once; the sanitizer build under a parallel test run once took longer
    // than 5 s to act on it.
    WaitForList([](const Json::Value& l) { return l.empty(); }, 15000);
    const CgiResult after = RefreshMediaServers();
    ASSERT_TRUE(after.jsonOk) << after.output;
    EXPECT_EQ(after.json["items"].size(), 0u) << after.body << ReadFile("/tmp/vanuaudiod.log");
}

// What a forger on the LAN and a local user can no longer do.
namespace {

int CountOf(const std::string& text, const std::string& part) {
    int count = 0;
    for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1))
        ++count;
    return count;
}

// Waits until the daemon's log holds `part` (the log is its standard error, a file).
bool WaitForLog(const std::string& part, int timeoutMs) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(timeoutMs);
    while (ReadFile("/tmp/vanuaudiod.log").find(part) == std::string::npos) {
        if (std::chrono::steady_clock::now() >= deadline)
            return false;
        DrainSyslog();
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    return true;
}

}  // namespace

TEST_F(AudioDaemon, ANotifyPointingAtLoopbackOrAnotherHostMakesNoRequestAndListsNothing) {
    daemon_ = StartDaemon();
    ConnectionCounter loopback("127.0.0.1");
    ConnectionCounter elsewhere("10.77.0.12");
    const std::string loopbackUrl =
        "http://127.0.0.1:" + std::to_string(loopback.Port()) + "/admin/reset";
    const std::string elsewhereUrl =
        "http://10.77.0.12:" + std::to_string(elsewhere.Port()) + "/d.xml";
    SendNotify(kHostAddress, "uuid:forged-loopback", loopbackUrl, 1800);
    SendNotify(kHostAddress, "uuid:forged-elsewhere", elsewhereUrl, 1800);
    // A real announcement after them: once it is listed, the forged ones were heard and judged.
    FakeMediaServers fake;
    fake.Add("uuid:real", FakeMediaServers::DescriptionXml("uuid:real", "Real", "/cd"));
    fake.Alive("uuid:real", 60);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return !l.empty(); }, 5000), reply));
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    reply = Reply(Call(16, "0 10"));
    ASSERT_EQ(reply["list"].size(), 1u) << reply;
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:real");
    EXPECT_EQ(loopback.Accepted(), 0);
    EXPECT_EQ(elsewhere.Accepted(), 0);
    const std::string log = ReadFile("/tmp/vanuaudiod.log");
    EXPECT_NE(log.find("description refused: uuid:forged-loopback announced by 10.77.0.1: location "
                       "host 127.0.0.1 is not the announcing address 10.77.0.1"),
              std::string::npos)
        << log;
    EXPECT_NE(log.find("description refused: uuid:forged-elsewhere announced by 10.77.0.1"),
              std::string::npos)
        << log;
}

TEST_F(AudioDaemon, AThousandForgedAnnouncementsDoNotKeepARealServerOut) {
    daemon_ = StartDaemon();
    // Forged devices on the forger's own address, whose descriptions never come.
    ConnectionCounter tarpit(kHostAddress);
    for (int i = 0; i < 1024; ++i) {
        const std::string udn = "uuid:flood-" + std::to_string(i);
        SendNotify(kHostAddress, udn,
                   "http://10.77.0.1:" + std::to_string(tarpit.Port()) + "/" + udn, 86400);
        if (i % 64 == 63)
            DrainSyslog();
    }
    Process minidlna = StartMiniDlna(peer_, "Survivor MiniDLNA", 8205);
    Call(14);
    Json::Value reply;
    ASSERT_TRUE(ParseJson(
        WaitForList([](const Json::Value& l) { return HasServer(l, "Survivor MiniDLNA"); }, 20000),
        reply));
    ASSERT_TRUE(HasServer(reply["list"], "Survivor MiniDLNA")) << reply;
    EXPECT_EQ(reply["total"], 1);
    // One address gets sixteen devices at most, so sixteen fetches at most reached the tarpit.
    EXPECT_LE(tarpit.Accepted(), 16);
    EXPECT_TRUE(WaitForLog("announces 16 devices already", 2000));
}

TEST_F(AudioDaemon, ASocketPlantedByAnotherUserKeepsItFromStartingAndItSaysWhy) {
    ASSERT_TRUE(LeaveStaleSocket());
    ASSERT_EQ(lchown(kSocket, 12345, 12345), 0);
    Process daemon = Spawn({DaemonProgram(), "--interface", kHostInterface}, "/tmp/d.log");
    int status = 0;
    ASSERT_TRUE(daemon.WaitExit(5000, status));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    EXPECT_NE(ReadFile("/tmp/d.log")
                  .find("/tmp/vanuaudiod.sock is owned by uid 12345, not by the "
                        "daemon's account; not replacing it"),
              std::string::npos)
        << ReadFile("/tmp/d.log");
    struct stat info {};
    ASSERT_EQ(lstat(kSocket, &info), 0);
    EXPECT_EQ(info.st_uid, 12345u);
}

TEST_F(AudioDaemon, SixHundredIdleConnectionsOfOneUserDoNotKeepTheListFromTheCgi) {
    StandardFixture();
    daemon_ = StartDaemon();
    FakeMediaServers fake;
    fake.Add("uuid:one", FakeMediaServers::DescriptionXml("uuid:one", "The One", "/cd"));
    fake.Alive("uuid:one", 60);
    WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000);
    // Another local user opens 600 connections and sends nothing.
    int ready[2];
    ASSERT_EQ(pipe(ready), 0);
    const pid_t hog = fork();
    if (hog == 0) {
        close(ready[0]);
        // A user of the web server's group, so that the socket lets it in.
        const group* web = getgrnam(harmona::paths::kDaemonSocketGroup);
        const gid_t groups[] = {web != nullptr ? web->gr_gid : 0};
        if (web == nullptr || setgroups(1, groups) != 0 || setgid(12345) != 0 || setuid(12345) != 0)
            _exit(1);
        std::vector<int> held;
        for (int i = 0; i < 600; ++i) {
            const int fd = socket(AF_UNIX, SOCK_STREAM, 0);
            sockaddr_un address{};
            address.sun_family = AF_UNIX;
            std::strcpy(address.sun_path, kSocket);
            if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0)
                held.push_back(fd);
        }
        const char count = held.size() >= 600 ? 'y' : 'n';
        (void)!write(ready[1], &count, 1);
        pause();
        _exit(0);
    }
    Process hogProcess(hog);
    close(ready[1]);
    char connected = 0;
    ASSERT_EQ(read(ready[0], &connected, 1), 1);
    close(ready[0]);
    EXPECT_EQ(connected, 'y');
    const CgiResult refresh = RefreshMediaServers();
    ASSERT_TRUE(refresh.jsonOk) << refresh.output;
    ASSERT_EQ(refresh.json["items"].size(), 1u) << refresh.body;
    EXPECT_EQ(refresh.json["items"][0]["text"], "The One");
}

TEST_F(AudioDaemon, StartedBeforeItsInterfaceHasAnAddressItAnswersAtOnceAndFindsServersLater) {
    ASSERT_TRUE(RunCommand("ip addr flush dev va"));
    daemon_ = StartDaemon(kHostInterface, false);
    const Json::Value empty = Reply(Call(16, "0 10"));
    EXPECT_EQ(empty["success"], true);
    EXPECT_EQ(empty["total"], 0);
    ASSERT_TRUE(
        RunCommand("ip addr add 10.77.0.1/24 dev va && "
                   "ip route replace 224.0.0.0/4 dev va"));
    ASSERT_TRUE(WaitForLog("searching for media servers on va (10.77.0.1)", 5000))
        << ReadFile("/tmp/vanuaudiod.log");
    FakeMediaServers fake;
    fake.Add("uuid:late", FakeMediaServers::DescriptionXml("uuid:late", "Late", "/cd"));
    fake.Alive("uuid:late", 60);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    EXPECT_EQ(reply["list"][0]["friendly_name"], "Late");
}

// An interface that goes down and comes back (ifdown/ifup, a Wi-Fi reconnect): GUPnP hands the
// same context back; the daemon searches on it again and the scan button finds servers.
TEST_F(AudioDaemon, AfterItsLinkGoesDownAndUpTheScanButtonStillFindsServers) {
    FakeMediaServers fake;
    fake.Add("uuid:back", FakeMediaServers::DescriptionXml("uuid:back", "Back", "/cd"));
    {
        // A leak of GUPnP's own on each link change (see the file) is not this daemon's.
        const ScopedLeakSuppressions suppressions(SourceDir() +
                                                  "/tests/vanuaudiod/gupnp-link-change.supp");
        daemon_ = StartDaemon();
    }
    ASSERT_TRUE(RunCommand("ip link set va down"));
    std::this_thread::sleep_for(std::chrono::seconds(1));
    ASSERT_TRUE(RunCommand("ip link set va up && ip route replace 224.0.0.0/4 dev va"));
    const auto up = std::chrono::steady_clock::now();
    std::this_thread::sleep_for(std::chrono::seconds(2));  // past the search on its return
    fake.AnswerSearches("uuid:back", 60);
    const int before = fake.SearchesSeen();
    EXPECT_EQ(Call(14).reply, "{\"success\": true}");
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply))
        << "searches seen since the link came back: " << fake.SearchesSeen() - before << "\n"
        << ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(reply["list"][0]["friendly_name"], "Back");
    std::cout << "[ recovery ] vanuaudiod, link down for 1 s then up: listed "
              << std::chrono::duration_cast<std::chrono::milliseconds>(
                     std::chrono::steady_clock::now() - up)
                     .count()
              << " ms after the link came back (2 s of it waiting before the scan)\n";
}

// The host lacks a route for multicast: one line says so, and the searches, bound to the
// interface, still find the servers.
TEST_F(AudioDaemon, WithoutAMulticastRouteOneLogLineSaysSoAndSearchesStillFindServers) {
    ASSERT_TRUE(RunCommand("ip route del 224.0.0.0/4 dev va"));
    FakeMediaServers fake;
    fake.Add("uuid:quiet", FakeMediaServers::DescriptionXml("uuid:quiet", "Quiet", "/cd"));
    fake.AnswerSearches("uuid:quiet", 60);
    daemon_ = StartDaemon();
    ASSERT_TRUE(WaitForLog("no multicast route", 5000)) << ReadFile("/tmp/vanuaudiod.log");
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    EXPECT_EQ(reply["list"][0]["udn"], "uuid:quiet");
    // More searches (the scan button) do not repeat it.
    EXPECT_TRUE(Call(14).answered);
    std::this_thread::sleep_for(std::chrono::milliseconds(1500));
    EXPECT_TRUE(Call(14).answered);
    std::this_thread::sleep_for(std::chrono::milliseconds(1500));
    DrainSyslog();
    const std::string log = ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(CountOf(log, "no multicast route"), 1) << log;
    EXPECT_NE(log.find("network: no multicast route (Network is unreachable): searches are sent "
                       "on va (10.77.0.1) only"),
              std::string::npos)
        << log;
}

// The route comes a moment after the address (as a DHCP client or a network manager sets them):
// no warning about a missing route.
TEST_F(AudioDaemon, AMulticastRouteThatFollowsItsAddressIsNotReportedMissing) {
    ASSERT_TRUE(RunCommand("ip route del 224.0.0.0/4 dev va && ip addr flush dev va"));
    daemon_ = StartDaemon(kHostInterface, false);
    ASSERT_TRUE(RunCommand("ip addr add 10.77.0.1/24 dev va"));
    ASSERT_TRUE(WaitForLog("searching for media servers on va (10.77.0.1)", 5000))
        << ReadFile("/tmp/vanuaudiod.log");
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    ASSERT_TRUE(RunCommand("ip route replace 224.0.0.0/4 dev va"));
    std::this_thread::sleep_for(std::chrono::milliseconds(4000));
    DrainSyslog();
    const std::string log = ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(log.find("no multicast route"), std::string::npos) << log;
}

// The route goes while the daemon runs (a network manager rewriting the table) and comes back: the
// scan button finds servers all along, and the log says once that it went and once that it is back.
TEST_F(AudioDaemon, AMulticastRouteLostAndBackKeepsTheScanFindingServers) {
    FakeMediaServers fake;
    fake.Add("uuid:before", FakeMediaServers::DescriptionXml("uuid:before", "Before", "/cd"));
    fake.Add("uuid:during", FakeMediaServers::DescriptionXml("uuid:during", "During", "/cd"));
    fake.Add("uuid:after", FakeMediaServers::DescriptionXml("uuid:after", "After", "/cd"));
    fake.AnswerSearches("uuid:before", 600);
    daemon_ = StartDaemon();
    WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000);
    ASSERT_TRUE(RunCommand("ip route del 224.0.0.0/4 dev va"));
    fake.AnswerSearches("uuid:during", 600);
    EXPECT_TRUE(Call(14).answered);
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 2; }, 5000), reply))
        << ReadFile("/tmp/vanuaudiod.log");
    ASSERT_TRUE(WaitForLog("no multicast route", 6000)) << ReadFile("/tmp/vanuaudiod.log");
    ASSERT_TRUE(RunCommand("ip route replace 224.0.0.0/4 dev va"));
    fake.AnswerSearches("uuid:after", 600);
    std::this_thread::sleep_for(std::chrono::milliseconds(1100));  // past the search interval
    EXPECT_TRUE(Call(14).answered);
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 3; }, 5000), reply))
        << ReadFile("/tmp/vanuaudiod.log");
    ASSERT_TRUE(WaitForLog("multicast route present again", 5000))
        << ReadFile("/tmp/vanuaudiod.log");
    DrainSyslog();
    const std::string log = ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(CountOf(log, "no multicast route"), 1) << log;
    EXPECT_EQ(CountOf(log, "multicast route present again"), 1) << log;
}

// The media servers users have beside ours, found through the real CGI and gone when they stop.
namespace {

bool HasNode(const Json::Value& items, const std::string& text) {
    for (const Json::Value& item : items) {
        if (item["text"].asString() == text && item["pid"].asString() == "mediaserver_root")
            return true;
    }
    return false;
}

// Scans through the CGI until the server named `name` is one of its nodes (or 20 s pass); the
// items of the last scan. A peer that has just started may announce its leaving once before its
// first "alive" (GSSDP clears a stale entry that way, and an answer to a search can arrive before
// it), so a listing is asked for again rather than taken from the first scan that saw it.
Json::Value ScanUntilListed(const std::string& name) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    Json::Value items = RefreshMediaServers().json["items"];
    while (!HasNode(items, name) && std::chrono::steady_clock::now() < deadline) {
        WaitForList([&name](const Json::Value& l) { return HasServer(l, name); }, 2000);
        items = RefreshMediaServers().json["items"];
    }
    return items;
}

// A peer server started on the peer host under `name` with HTTP on `port`: listed through the
// CGI under that name, at its own address, and gone within seconds of its stop (its byebye; its
// max-age is far longer).
void ExpectListedUnderItsNameAndGoneAfterItsByebye(Process& server, const std::string& name,
                                                   int port, const std::string& serverLog) {
    const Json::Value items = ScanUntilListed(name);
    ASSERT_TRUE(HasNode(items, name))
        << items << ReadFile(serverLog) << ReadFile("/tmp/vanuaudiod.log");
    Json::Value reply;
    ASSERT_TRUE(
        ParseJson(WaitForList([](const Json::Value& l) { return l.size() == 1; }, 5000), reply));
    const Json::Value list = reply["list"];
    ASSERT_EQ(list.size(), 1u) << list << ReadFile(serverLog) << ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(list[0]["ip"], kPeerAddress);
    const std::string base = "http://10.77.0.2:" + std::to_string(port) + "/";
    EXPECT_EQ(list[0]["control_url"].asString().rfind(base, 0), 0u) << list;
    server.Stop(SIGTERM, 10000);
    WaitForList([](const Json::Value& l) { return l.empty(); }, 10000);
    EXPECT_EQ(RefreshMediaServers().json["items"].size(), 0u) << ReadFile("/tmp/vanuaudiod.log");
}

}  // namespace

TEST_F(AudioDaemon, GerberaIsListedUnderItsOwnNameThroughTheCgiAndGoesWithItsByebye) {
    StandardFixture();
    // Gerbera first: the start that writes its configuration announces it under its default
    // name, which is no part of this test.
    Process gerbera = StartGerbera(peer_, "Cellar Gerbera", 49494);
    daemon_ = StartDaemon();
    ExpectListedUnderItsNameAndGoneAfterItsByebye(gerbera, "Cellar Gerbera", 49494,
                                                  "/tmp/gerbera-49494/out.log");
}

TEST_F(AudioDaemon, RygelIsListedUnderItsOwnNameThroughTheCgiAndGoesWithItsByebye) {
    StandardFixture();
    daemon_ = StartDaemon();
    Process rygel = StartRygel(peer_, "Porch Rygel", 49600);
    ExpectListedUnderItsNameAndGoneAfterItsByebye(rygel, "Porch Rygel", 49600,
                                                  "/tmp/rygel-49600/out.log");
}

// The faults of a home network on this host's side of the link, with the media servers on a LAN
// host at the other end (a peer namespace whose devices answer searches): a server is listed
// after a fault only when the daemon's SSDP reaches the LAN again from where the host is now.
// Each test prints how long after the fault the server was listed again.
namespace {

using FaultClock = std::chrono::steady_clock;

// A server of the LAN is listed again within this time of the end of each fault, without the
// scan button.
constexpr int kRecoveryBoundMs = 5000;
// What the LAN's server announces before a fault: short enough to expire while the fault lasts,
// so that a listing after it is a new finding and not the old entry.
constexpr int kShortMaxAgeSeconds = 2;

long MsSince(FaultClock::time_point start) {
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(FaultClock::now() - start).count());
}

bool HasUdn(const Json::Value& list, const std::string& udn) {
    for (const Json::Value& server : list) {
        if (server["udn"].asString() == udn)
            return true;
    }
    return false;
}

// Whether `udn` is listed (`listed`) or not within `timeoutMs`.
bool WaitUntilListed(const std::string& udn, bool listed, long timeoutMs) {
    Json::Value reply;
    const std::string text =
        WaitForList([&](const Json::Value& l) { return HasUdn(l, udn) == listed; },
                    static_cast<int>(std::max(timeoutMs, 0L)));
    return ParseJson(text, reply) && HasUdn(reply["list"], udn) == listed;
}

// The LAN's server `udn`, listed from its NOTIFY before the fault.
void ListBeforeTheFault(FakeMediaServers& lan, const std::string& udn) {
    lan.Add(udn, FakeMediaServers::DescriptionXml(udn, "LAN Server", "/cd"));
    lan.Alive(udn, kShortMaxAgeSeconds);
    ASSERT_TRUE(WaitUntilListed(udn, true, 5000)) << ReadFile("/tmp/vanuaudiod.log");
}

// During the fault: the server's entry expires, and from now on it answers searches (as every
// server does; it does not announce again, as a server that did not see the fault would not).
void ExpireDuringTheFault(FakeMediaServers& lan, const std::string& udn) {
    ASSERT_TRUE(WaitUntilListed(udn, false, kShortMaxAgeSeconds * 1000 + 3000))
        << "the entry did not expire during the fault";
    lan.AnswerSearches(udn, 1800);
}

// After a fault that ended at `end`: the LAN's server `udn` is listed again within the bound, by
// the daemon's own search (no button pressed), and the recovery time is printed; then the scan
// button (command 14) finds a server that answers searches only from then on.
void ExpectFoundAgainAndByTheScan(FakeMediaServers& lan, const std::string& udn,
                                  FaultClock::time_point end, const std::string& fault) {
    const bool listed = WaitUntilListed(udn, true, kRecoveryBoundMs - MsSince(end));
    const long recoveryMs = MsSince(end);
    EXPECT_TRUE(listed) << udn << " not listed within " << kRecoveryBoundMs
                        << " ms of the end of: " << fault
                        << " (searches heard on the LAN: " << lan.SearchesSeen() << ")\n"
                        << ReadFile("/tmp/vanuaudiod.log");
    if (listed)
        std::cout << "[ recovery ] vanuaudiod, " << fault << ": listed again " << recoveryMs
                  << " ms after\n";
    // Past the repeats of the search that found it, so that only the scan can find the next one.
    std::this_thread::sleep_for(std::chrono::milliseconds(2500));
    const std::string scanned = "uuid:lan-scanned";
    lan.Add(scanned, FakeMediaServers::DescriptionXml(scanned, "LAN Scanned", "/cd"));
    lan.AnswerSearches(scanned, 1800);
    const int before = lan.SearchesSeen();
    EXPECT_EQ(Call(14).reply, "{\"success\": true}");
    EXPECT_TRUE(WaitUntilListed(scanned, true, 5000))
        << "the scan found nothing after: " << fault << "\n"
        << ReadFile("/tmp/vanuaudiod.log");
    EXPECT_GT(lan.SearchesSeen(), before) << "no search reached the LAN after: " << fault;
}

// The interface's flags as the kernel reports them (IFF_UP, IFF_RUNNING: up with a carrier); 0
// when it cannot say.
unsigned InterfaceFlags(const char* interfaceName) {
    const int fd = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    ifreq request{};
    std::strncpy(request.ifr_name, interfaceName, IFNAMSIZ - 1);
    const bool asked = fd >= 0 && ioctl(fd, SIOCGIFFLAGS, &request) == 0;
    if (fd >= 0)
        close(fd);
    return asked ? static_cast<unsigned short>(request.ifr_flags) : 0u;
}

// The peer side of the link set down: the carrier of this side goes (the kernel says so a moment
// later, within two seconds).
void WaitUntilTheCarrierIsGone() {
    for (int waited = 0; (InterfaceFlags(kHostInterface) & IFF_RUNNING) != 0 && waited < 2000;
         waited += 50)
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
}

}  // namespace

// The cable (or the switch port, or the Wi-Fi association) goes and comes back while the
// interface stays up with its address: GUPnP sees nothing, so the daemon follows the carrier
// itself, says so in its log, and searches again when it returns.
TEST_F(AudioDaemon, AfterItsLinkLosesItsCarrierAndGetsItBackALanServerIsListedAgain) {
    FakeMediaServers lan(peer_);
    {
        const ScopedLeakSuppressions suppressions(SourceDir() +
                                                  "/tests/vanuaudiod/gupnp-link-change.supp");
        daemon_ = StartDaemon();
    }
    ASSERT_NO_FATAL_FAILURE(ListBeforeTheFault(lan, "uuid:lan"));
    std::this_thread::sleep_for(std::chrono::milliseconds(1500));  // the link in use a while
    ASSERT_TRUE(peer_.RunOnPeer("ip link set vb down"));
    WaitUntilTheCarrierIsGone();
    // Up, with its address, and no carrier.
    ASSERT_EQ(InterfaceFlags(kHostInterface) & (IFF_UP | IFF_RUNNING), unsigned{IFF_UP});
    ASSERT_NO_FATAL_FAILURE(ExpireDuringTheFault(lan, "uuid:lan"));
    EXPECT_TRUE(WaitForLog("network: va lost its carrier", 3000))
        << ReadFile("/tmp/vanuaudiod.log");
    const auto end = FaultClock::now();
    ASSERT_TRUE(peer_.RunOnPeer("ip link set vb up && ip route replace 224.0.0.0/4 dev vb"));
    ExpectFoundAgainAndByTheScan(lan, "uuid:lan", end, "carrier lost for about 4 s");
    EXPECT_TRUE(WaitForLog("network: va has its carrier again; searching for media servers", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
    const std::string log = ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(CountOf(log, "lost its carrier"), 1) << log;
    EXPECT_EQ(log.find(" gone"), std::string::npos) << "the addresses stayed: " << log;
}

// Started with its cable out (or its switch still starting): the interface is up with its
// address, and the search at start reaches no one.
TEST_F(AudioDaemon, StartedWithoutACarrierItFindsTheLanServersWhenTheLinkComesUp) {
    FakeMediaServers lan(peer_);
    lan.Add("uuid:lan", FakeMediaServers::DescriptionXml("uuid:lan", "LAN Server", "/cd"));
    lan.AnswerSearches("uuid:lan", 1800);
    ASSERT_TRUE(peer_.RunOnPeer("ip link set vb down"));
    // The kernel tells a carrier's loss a moment later: the daemon starts once it is gone.
    WaitUntilTheCarrierIsGone();
    ASSERT_EQ(InterfaceFlags(kHostInterface) & (IFF_UP | IFF_RUNNING), unsigned{IFF_UP});
    {
        const ScopedLeakSuppressions suppressions(SourceDir() +
                                                  "/tests/vanuaudiod/gupnp-link-change.supp");
        daemon_ = StartDaemon();
    }
    EXPECT_TRUE(WaitForLog("network: va has no carrier; searching again when it has one", 3000))
        << ReadFile("/tmp/vanuaudiod.log");
    EXPECT_EQ(Reply(Call(16, "0 10"))["total"], 0);
    const auto end = FaultClock::now();
    ASSERT_TRUE(peer_.RunOnPeer("ip link set vb up && ip route replace 224.0.0.0/4 dev vb"));
    ExpectFoundAgainAndByTheScan(lan, "uuid:lan", end, "no carrier at start, then the link up");
    EXPECT_TRUE(WaitForLog("network: va has its carrier again; searching for media servers", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
}

// As DHCP clients and network managers renew into another address: the new one arrives, then the
// old one goes (the kernel promotes the secondary, as those hosts have it).
TEST_F(AudioDaemon, AfterANewAddressIsAddedBeforeTheOldGoesALanServerIsListedAgain) {
    // One address on the interface, so that the change is the host's only one.
    ASSERT_TRUE(
        RunCommand("for n in 11 12 13 14 15 16 17; do ip addr del 10.77.0.$n/24 dev va; "
                   "done && echo 1 > /proc/sys/net/ipv4/conf/va/promote_secondaries"));
    FakeMediaServers lan(peer_);
    daemon_ = StartDaemon();
    ASSERT_NO_FATAL_FAILURE(ListBeforeTheFault(lan, "uuid:lan"));
    ASSERT_TRUE(RunCommand("ip addr add 10.77.0.3/24 dev va"));
    ASSERT_TRUE(WaitForLog("network: searching for media servers on va (10.77.0.3)", 5000))
        << ReadFile("/tmp/vanuaudiod.log");
    ASSERT_NO_FATAL_FAILURE(ExpireDuringTheFault(lan, "uuid:lan"));
    const auto end = FaultClock::now();
    ASSERT_TRUE(RunCommand("ip addr del 10.77.0.1/24 dev va"));
    ExpectFoundAgainAndByTheScan(lan, "uuid:lan", end,
                                 "new address added, then the old one removed");
    EXPECT_TRUE(WaitForLog("network: va (10.77.0.1) gone", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
    const Json::Value list = Reply(Call(16, "0 10"))["list"];
    ASSERT_EQ(list.size(), 2u) << list;
    EXPECT_EQ(list[0]["ip"], kPeerAddress);
}

// The other order: the old address goes first and the interface is without one for a moment.
TEST_F(AudioDaemon, AfterTheOldAddressGoesBeforeANewOneIsAddedALanServerIsListedAgain) {
    ASSERT_TRUE(
        RunCommand("for n in 11 12 13 14 15 16 17; do ip addr del 10.77.0.$n/24 dev va; done"));
    FakeMediaServers lan(peer_);
    daemon_ = StartDaemon();
    ASSERT_NO_FATAL_FAILURE(ListBeforeTheFault(lan, "uuid:lan"));
    ASSERT_TRUE(RunCommand("ip addr del 10.77.0.1/24 dev va"));
    ASSERT_TRUE(WaitForLog("network: va (10.77.0.1) gone", 5000))
        << ReadFile("/tmp/vanuaudiod.log");
    ASSERT_NO_FATAL_FAILURE(ExpireDuringTheFault(lan, "uuid:lan"));
    const auto end = FaultClock::now();
    ASSERT_TRUE(
        RunCommand("ip addr add 10.77.0.3/24 dev va && ip route replace 224.0.0.0/4 dev va"));
    ExpectFoundAgainAndByTheScan(lan, "uuid:lan", end, "old address removed, then a new one added");
    EXPECT_TRUE(WaitForLog("network: searching for media servers on va (10.77.0.3)", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
}

// Started at boot before the network: its interface is there, with its address, but down.
TEST_F(AudioDaemon, StartedWhileItsInterfaceIsDownItFindsTheLanServersWhenItComesUp) {
    FakeMediaServers lan(peer_);
    lan.Add("uuid:lan", FakeMediaServers::DescriptionXml("uuid:lan", "LAN Server", "/cd"));
    lan.AnswerSearches("uuid:lan", 1800);
    ASSERT_TRUE(RunCommand("ip link set va down"));
    {
        const ScopedLeakSuppressions suppressions(SourceDir() +
                                                  "/tests/vanuaudiod/gupnp-link-change.supp");
        daemon_ = StartDaemon(kHostInterface, false);
    }
    const Json::Value empty = Reply(Call(16, "0 10"));
    EXPECT_EQ(empty["success"], true);
    EXPECT_EQ(empty["total"], 0);
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const auto end = FaultClock::now();
    ASSERT_TRUE(RunCommand("ip link set va up && ip route replace 224.0.0.0/4 dev va"));
    ExpectFoundAgainAndByTheScan(lan, "uuid:lan", end, "interface down at start, then up");
    EXPECT_TRUE(WaitForLog("network: searching for media servers on va (10.77.0.1)", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
}

// Started at boot before the network: its interface does not exist yet (a driver not loaded, a
// USB adapter plugged in later); the LAN is there when it arrives.
TEST_F(AudioDaemon, StartedBeforeItsInterfaceExistsItFindsTheLanServersOnceItIsMade) {
    ASSERT_TRUE(peer_.Unlink());
    {
        const ScopedLeakSuppressions suppressions(SourceDir() +
                                                  "/tests/vanuaudiod/gupnp-link-change.supp");
        daemon_ = StartDaemon(kHostInterface, false);
    }
    const Json::Value empty = Reply(Call(16, "0 10"));
    EXPECT_EQ(empty["success"], true);
    EXPECT_EQ(empty["total"], 0);
    std::this_thread::sleep_for(std::chrono::seconds(1));
    std::unique_ptr<FakeMediaServers> lan;
    FaultClock::time_point end;  // when this host's side of the link gets its address
    ASSERT_TRUE(peer_.Link([&] {
        lan = std::make_unique<FakeMediaServers>(peer_);
        lan->Add("uuid:lan", FakeMediaServers::DescriptionXml("uuid:lan", "LAN Server", "/cd"));
        lan->AnswerSearches("uuid:lan", 1800);
        end = FaultClock::now();
    }));
    ASSERT_NE(lan, nullptr);
    ExpectFoundAgainAndByTheScan(*lan, "uuid:lan", end, "interface created after the start");
    EXPECT_TRUE(WaitForLog("network: searching for media servers on va (10.77.0.1)", 1000))
        << ReadFile("/tmp/vanuaudiod.log");
}
