// The media server list: "refresh" with target "mediaserver" through the real CGI against a
// scripted daemon on /tmp/vanuaudiod.sock; GetMediaServerNodes through a HarmonaHandler built in
// the test process (the root tree that shows it to the browser is tested in tests/tree).
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <string>
#include <vector>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/ScriptedDaemon.h"

using namespace harmona::test;

namespace {

constexpr const char* kScanText = "Scan for media servers";
constexpr const char* kServerIcon = "3rdparty/Harmona/images/files_class/icon_mediaserver.png";
constexpr const char* kScanIcon = "3rdparty/Harmona/images/button/btn_search_dms.png";
constexpr const char* kParseError = "audio:1130 Parse error";
constexpr int kReplySize = 40960;

// A leaf node as the tree writes it: the same text as label and tooltip, not dragged, dropped on
// or expanded.
Json::Value LeafNode(const std::string& text, const std::string& id, const std::string& icon) {
    Json::Value node(Json::objectValue);
    node["text"] = text;
    node["qtip"] = text;
    node["id"] = id;
    node["icon"] = icon;
    node["allowDrag"] = false;
    node["allowDrop"] = false;
    node["draggable"] = false;
    node["expanded"] = false;
    node["leaf"] = true;
    return node;
}

std::string Compact(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

// A page reply with the given elements and total (a null total is left out).
std::string Page(const std::vector<MediaServer>& servers, const Json::Value& total) {
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["list"] = Json::Value(Json::arrayValue);
    for (const MediaServer& server : servers)
        reply["list"].append(MediaServerElement(server));
    if (!total.isNull())
        reply["total"] = total;
    return Compact(reply);
}

// The script of a daemon that answers 14 with success and each command 16 with `page(offset)`.
DaemonScript Pages(std::function<DaemonAnswer(int offset)> page) {
    return [page](const DaemonRequest& request) {
        if (request.command == 14)
            return DaemonAnswer::Reply("{\"success\": true}");
        int offset = -1;
        int count = -1;
        std::sscanf(request.arguments.c_str(), "%d %d", &offset, &count);
        return page(offset);
    };
}

class MediaServerList : public ::testing::Test {
  protected:
    void SetUp() override {
        WriteFile(std::string(kTextsDir) + "enu/strings",
                  "[common]\nbtn_scan_dms=\"" + std::string(kScanText) + "\"\n");
        AddUser("admin", 1 | 4 | 8 | 16);
    }

    // Runs "refresh" with target "mediaserver" through the CGI and checks what every such reply
    // shares: a normal exit with 1, a success envelope with an "items" member.
    CgiResult Refresh() {
        const CgiResult r = Get(Query({{"action", "refresh"}, {"target", "mediaserver"}}));
        EXPECT_TRUE(r.exited) << "signal " << r.signal << (r.timedOut ? " (timed out)" : "");
        EXPECT_EQ(r.exitStatus, 1);
        EXPECT_TRUE(r.jsonOk) << r.body;
        EXPECT_TRUE(r.json.isObject()) << r.body;
        if (r.json.isObject()) {
            EXPECT_EQ(r.json["success"], Json::Value(true)) << r.body;
            EXPECT_TRUE(r.json.isMember("items")) << r.body;
        }
        return r;
    }

    // The ids of the reply's items.
    static std::vector<std::string> Ids(const CgiResult& r) {
        std::vector<std::string> ids;
        for (const Json::Value& item : r.json["items"])
            ids.push_back(item["id"].asString());
        return ids;
    }

    static std::vector<std::string> PageArguments(const ScriptedDaemon& daemon) {
        std::vector<std::string> arguments;
        for (const DaemonRequest& request : daemon.Requests()) {
            if (request.command == 16)
                arguments.push_back(request.arguments);
        }
        return arguments;
    }

    static int Count(const std::vector<std::string>& lines, const std::string& line) {
        return static_cast<int>(std::count(lines.begin(), lines.end(), line));
    }
};

TEST_F(MediaServerList, TotalOf25AsksThreeTimesWithOffsets0_10_20AndCount10) {
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(25)));
    const CgiResult r = Refresh();
    EXPECT_EQ(daemon.Commands(), (std::vector<std::int32_t>{14, 16, 16, 16}));
    EXPECT_EQ(PageArguments(daemon), (std::vector<std::string>{"0 10", "10 10", "20 10"}));
    const std::vector<std::string> ids = Ids(r);
    ASSERT_EQ(ids.size(), 25u);
    for (int i = 0; i < 25; ++i) {
        const std::string n = std::to_string(i + 1);
        EXPECT_EQ(ids[static_cast<size_t>(i)], "mediaserver_http://10.0.0." + n + ":8200/ctl/" + n);
    }
    EXPECT_TRUE(r.LogMessages().empty());
}

TEST_F(MediaServerList, HundredServersArePagedInTenRequests) {
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(100)));
    const CgiResult r = Refresh();
    std::vector<std::string> expected;
    for (int offset = 0; offset < 100; offset += 10)
        expected.push_back(std::to_string(offset) + " 10");
    EXPECT_EQ(PageArguments(daemon), expected);
    EXPECT_EQ(Ids(r).size(), 100u);
    // Command 14 is sent once per listing, before the first page.
    const std::vector<std::int32_t> commands = daemon.Commands();
    ASSERT_EQ(commands.size(), 11u);
    EXPECT_EQ(commands.front(), 14);
    EXPECT_EQ(std::count(commands.begin(), commands.end(), 14), 1);
}

TEST_F(MediaServerList, TotalOfTenOrLessGivesExactlyOnePageRequest) {
    for (int n : {10, 3, 0}) {
        ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(n)));
        const CgiResult r = Refresh();
        EXPECT_EQ(daemon.Commands(), (std::vector<std::int32_t>{14, 16})) << n;
        EXPECT_EQ(Ids(r).size(), static_cast<size_t>(n));
    }
}

TEST_F(MediaServerList, AbsentOrNonIntegerTotalGivesExactlyOnePageRequest) {
    for (const Json::Value& total :
         {Json::Value(), Json::Value("25"), Json::Value(25.5), Json::Value(1e12)}) {
        ScriptedDaemon daemon(
            Pages([&](int) { return DaemonAnswer::Reply(Page(MakeMediaServers(10), total)); }));
        const CgiResult r = Refresh();
        EXPECT_EQ(daemon.Commands(), (std::vector<std::int32_t>{14, 16})) << Compact(total);
        EXPECT_EQ(Ids(r).size(), 10u);
    }
}

TEST_F(MediaServerList, TotalIsTakenAnewFromEveryPage) {
    ScriptedDaemon daemon(Pages([](int offset) {
        return DaemonAnswer::Reply(Page(MakeMediaServers(10), offset == 0 ? 40 : 15));
    }));
    const CgiResult r = Refresh();
    EXPECT_EQ(PageArguments(daemon), (std::vector<std::string>{"0 10", "10 10"}));
    // The same ten servers twice: nodes are not deduplicated across pages.
    EXPECT_EQ(Ids(r).size(), 20u);
}

TEST_F(MediaServerList, ServerWithEmptyOrAbsentFriendlyNameShowsItsIp) {
    std::vector<MediaServer> servers = {
        {"http://a/ctl", "", "192.168.1.10"},
        {"http://b/ctl", Json::Value(), "192.168.1.11"},
        {"http://c/ctl", "Named", "192.168.1.12"},
        {"http://d/ctl", 42, "192.168.1.13"},  // a name that is no text counts as absent
    };
    ScriptedDaemon daemon(ServeMediaServers(servers));
    const CgiResult r = Refresh();
    const Json::Value& items = r.json["items"];
    ASSERT_EQ(items.size(), 4u) << r.body;
    EXPECT_EQ(items[0]["text"], "192.168.1.10");
    EXPECT_EQ(items[0]["qtip"], "192.168.1.10");
    EXPECT_EQ(items[1]["text"], "192.168.1.11");
    EXPECT_EQ(items[2]["text"], "Named");
    EXPECT_EQ(items[3]["text"], "192.168.1.13");
}

TEST_F(MediaServerList, ControlUrlLongerThan1011CharactersIsCutTo1023InTheId) {
    const std::string exact(1011, 'e');
    const std::string longer(1012, 'l');
    const std::string huge(5000, 'h');
    ScriptedDaemon daemon(
        ServeMediaServers({{exact, "E", "1"}, {longer, "L", "2"}, {huge, "H", "3"}}));
    const std::vector<std::string> ids = Ids(Refresh());
    ASSERT_EQ(ids.size(), 3u);
    EXPECT_EQ(ids[0], "mediaserver_" + exact);
    EXPECT_EQ(ids[0].size(), 1023u);
    EXPECT_EQ(ids[1], "mediaserver_" + std::string(1011, 'l'));
    EXPECT_EQ(ids[2], "mediaserver_" + std::string(1011, 'h'));
    EXPECT_EQ(ids[2].size(), 1023u);
}

TEST_F(MediaServerList, ControlUrlGoesIntoTheIdUnescaped) {
    const std::string url = "http://10.0.0.9:8200/ctl?x=<1>&y=\"2\"";
    ScriptedDaemon daemon(ServeMediaServers({{url, "S", "10.0.0.9"}}));
    EXPECT_EQ(Ids(Refresh()), std::vector<std::string>{"mediaserver_" + url});
}

TEST_F(MediaServerList, SecondPageNotJsonKeepsTheFirstTenLogsOneParseErrorAndAsksNoThirdPage) {
    ScriptedDaemon daemon(Pages([](int offset) {
        return DaemonAnswer::Reply(offset == 0 ? Page(MakeMediaServers(10), 30)
                                               : "this is not JSON");
    }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r).size(), 10u);
    EXPECT_EQ(r.LogMessages(), std::vector<std::string>{kParseError});
    EXPECT_EQ(PageArguments(daemon), (std::vector<std::string>{"0 10", "10 10"}));
}

TEST_F(MediaServerList, FailedPageRequestKeepsEarlierNodesAndStopsWithoutParseError) {
    ScriptedDaemon daemon(Pages([](int offset) {
        return offset == 0 ? DaemonAnswer::Reply(Page(MakeMediaServers(10), 30))
                           : DaemonAnswer::Close();
    }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r).size(), 10u);
    EXPECT_EQ(PageArguments(daemon).size(), 2u);
    const std::vector<std::string> log = r.LogMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_EQ(log[0].rfind("ctrl:90 Failed to read action [", 0), 0u) << log[0];
}

TEST_F(MediaServerList, WithTheDaemonDownRefreshIsASuccessWithNullItems) {
    const CgiResult r = Refresh();
    EXPECT_EQ(r.body, "{\"items\":null,\"success\":true}\n");
    EXPECT_EQ(
        r.LogMessages(),
        std::vector<std::string>{
            "ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [No such file or directory]"});
}

TEST_F(MediaServerList, WithTheDaemonDownTheMediaServerNodeHasOnlyTheScanButton) {
    setenv("REMOTE_USER", "admin", 1);
    HarmonaHandler handler;
    Json::Value children(Json::arrayValue);
    EXPECT_EQ(handler.GetMediaServerNodes(children), 1);
    const Json::Value scan = LeafNode(kScanText, "mediaserver_refresh", kScanIcon);
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(children[0], scan) << Compact(children);
}

TEST_F(MediaServerList, MediaServerNodeListsTheScanButtonThenTheServers) {
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(12)));
    setenv("REMOTE_USER", "admin", 1);
    HarmonaHandler handler;
    Json::Value children(Json::arrayValue);
    children.append("kept");  // the caller's earlier elements stay
    EXPECT_EQ(handler.GetMediaServerNodes(children), 1);
    ASSERT_EQ(children.size(), 14u) << Compact(children);
    EXPECT_EQ(children[0], "kept");
    EXPECT_EQ(children[1]["id"], "mediaserver_refresh");
    EXPECT_FALSE(children[1].isMember("pid"));
    Json::Value server =
        LeafNode("Server 12", "mediaserver_http://10.0.0.12:8200/ctl/12", kServerIcon);
    server["pid"] = "mediaserver_root";
    EXPECT_EQ(children[13], server);
}

TEST_F(MediaServerList, AppendMediaServersReturnsTheLastTotalOrZeroOnFailure) {
    setenv("REMOTE_USER", "admin", 1);
    HarmonaHandler handler;
    Json::Value children;
    EXPECT_EQ(handler.AppendMediaServers(children), 0);  // daemon down
    EXPECT_TRUE(children.isNull());
    {
        ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(23)));
        EXPECT_EQ(handler.AppendMediaServers(children), 23);
        EXPECT_EQ(children.size(), 23u);
    }
    {
        ScriptedDaemon daemon(Pages([](int) { return DaemonAnswer::Reply("{"); }));
        EXPECT_EQ(handler.AppendMediaServers(children), 0);
        EXPECT_EQ(children.size(), 23u);
    }
}

TEST_F(MediaServerList, ServerNamesAreHtmlEncodedInTextAndQtip) {
    ScriptedDaemon daemon(
        ServeMediaServers({{"http://x/ctl", "Tom & Jerry's <\"NAS\">", "1.2.3.4"}}));
    const CgiResult r = Refresh();
    ASSERT_EQ(r.json["items"].size(), 1u);
    const std::string encoded = "Tom &amp; Jerry&#39;s &lt;&quot;NAS&quot;&gt;";
    EXPECT_EQ(r.json["items"][0]["text"], encoded);
    EXPECT_EQ(r.json["items"][0]["qtip"], encoded);
}

TEST_F(MediaServerList, AnswerAfterSevenTenthsOfASecondGivesNoServersNoLogLineAndEndsPromptly) {
    ScriptedDaemon daemon([](const DaemonRequest&) {
        return DaemonAnswer::Reply(Page(MakeMediaServers(5), 5), 700);
    });
    const CgiResult r = Refresh();
    EXPECT_TRUE(r.json["items"].isNull()) << r.body;
    EXPECT_TRUE(r.LogMessages().empty());
    EXPECT_FALSE(r.timedOut);
    EXPECT_LT(r.wallMs, 3000);  // one budget of 0.5 s, not a wait for the daemon
    EXPECT_EQ(daemon.Commands(), std::vector<std::int32_t>{14});
}

TEST_F(MediaServerList, LatePageAnswerKeepsEarlierPagesWithoutLogLine) {
    ScriptedDaemon daemon(Pages([](int offset) {
        return DaemonAnswer::Reply(Page(MakeMediaServers(10), 30), offset == 0 ? 0 : 700);
    }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r).size(), 10u);
    EXPECT_TRUE(r.LogMessages().empty());
    EXPECT_EQ(PageArguments(daemon).size(), 2u);
}

TEST_F(MediaServerList, UnansweredPrepareAsksForNoPage) {
    for (const DaemonAnswer& answer : {DaemonAnswer::Never(), DaemonAnswer::Close()}) {
        ScriptedDaemon daemon([&](const DaemonRequest&) { return answer; });
        const CgiResult r = Refresh();
        EXPECT_TRUE(r.json["items"].isNull());
        EXPECT_EQ(daemon.Commands(), std::vector<std::int32_t>{14});
    }
}

TEST_F(MediaServerList, ReplyThatFillsTheWholeBufferIsAParseFailureNeverAnOverread) {
    // Valid JSON padded with spaces to the buffer's size and beyond: no NUL fits, so no parse.
    for (size_t size : {size_t(kReplySize), size_t(kReplySize) + 1, size_t(100000)}) {
        std::string reply = Page(MakeMediaServers(3), 3);
        reply.append(size - reply.size(), ' ');
        ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
        const CgiResult r = Refresh();
        EXPECT_TRUE(r.json["items"].isNull()) << size;
        EXPECT_EQ(r.LogMessages(), std::vector<std::string>{kParseError}) << size;
    }
}

TEST_F(MediaServerList, ReplyOneByteShorterThanTheBufferIsParsed) {
    std::string reply = Page(MakeMediaServers(3), 3);
    reply.append(size_t(kReplySize) - 1 - reply.size(), ' ');
    ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r).size(), 3u);
    EXPECT_TRUE(r.LogMessages().empty());
}

TEST_F(MediaServerList, ReplyIsReadUpToItsFirstNul) {
    const std::string reply = Page(MakeMediaServers(2), 2) + std::string(1, '\0') + "garbage";
    ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
    EXPECT_EQ(Ids(Refresh()).size(), 2u);
}

TEST_F(MediaServerList, ReplyWithCommentsIsParsed) {
    const std::string reply = "/* vanuaudiod */ {\"list\": [ // one server\n" +
                              Compact(MediaServerElement(MakeMediaServers(1)[0])) +
                              "], \"total\": 1}";
    ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r), std::vector<std::string>{"mediaserver_http://10.0.0.1:8200/ctl/1"});
    EXPECT_TRUE(r.LogMessages().empty());
}

TEST_F(MediaServerList, ReplyInPiecesIsCutToTheFirstPieceAndFailsToParse) {
    ScriptedDaemon daemon(
        Pages([](int) { return DaemonAnswer::InPieces(Page(MakeMediaServers(5), 5), {20}, 200); }));
    const CgiResult r = Refresh();
    EXPECT_TRUE(r.json["items"].isNull());
    EXPECT_EQ(r.LogMessages(), std::vector<std::string>{kParseError});
}

TEST_F(MediaServerList, JsonThatIsNoObjectGivesNoNodesAndNoCrash) {
    for (const char* reply :
         {"[1, 2, 3]", "42", "\"text\"", "null", "true",
          "{\"list\": {\"a\": {\"control_url\": \"x\", \"ip\": \"1\"}}}",
          "{\"list\": \"none\", \"total\": 5}", "{\"list\": [1, \"two\", []]}"}) {
        ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
        const CgiResult r = Refresh();
        EXPECT_EQ(r.json["items"], Json::Value()) << reply;
        EXPECT_TRUE(r.LogMessages().empty()) << reply;
    }
}

TEST_F(MediaServerList, DeeplyNestedReplyIsAParseFailureNotACrash) {
    for (const std::string& open : {std::string("["), std::string("{\"a\":")}) {
        std::string reply;
        for (int i = 0; i < 5000; ++i)
            reply += open;
        ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
        const CgiResult r = Refresh();
        EXPECT_TRUE(r.json["items"].isNull());
        EXPECT_EQ(r.LogMessages(), std::vector<std::string>{kParseError});
    }
}

TEST_F(MediaServerList, ElementsWithoutTextualControlUrlOrTextAreSkipped) {
    const std::string reply =
        "{\"list\": ["
        "{\"friendly_name\": \"no url\", \"ip\": \"1\"},"
        "{\"control_url\": 17, \"friendly_name\": \"number url\", \"ip\": \"2\"},"
        "{\"control_url\": \"http://no-ip\", \"friendly_name\": \"\"},"
        "{\"control_url\": \"http://bad-ip\", \"ip\": [1]},"
        "{\"control_url\": \"http://named-no-ip\", \"friendly_name\": \"Kept\"},"
        "\"not an object\","
        "{\"control_url\": \"http://ok\", \"ip\": \"10.1.1.1\"}"
        "], \"total\": 7}";
    ScriptedDaemon daemon(Pages([&](int) { return DaemonAnswer::Reply(reply); }));
    const CgiResult r = Refresh();
    EXPECT_EQ(Ids(r), (std::vector<std::string>{"mediaserver_http://named-no-ip",
                                                "mediaserver_http://ok"}));
    EXPECT_EQ(r.json["items"][1]["text"], "10.1.1.1");
}

TEST_F(MediaServerList, RealDaemonsUnsupportedAnswerGivesNoNodes) {
    ScriptedDaemon daemon(Pages([](int) {
        return DaemonAnswer::Reply("{\"success\": false, \"error\": \"unsupported\"}");
    }));
    const CgiResult r = Refresh();
    EXPECT_TRUE(r.json["items"].isNull());
    EXPECT_EQ(daemon.Commands(), (std::vector<std::int32_t>{14, 16}));
}

}  // namespace

// A daemon that claims a huge total is asked for 100 pages at most (1,000 servers), and the
// request ends with those, its memory bounded.
TEST_F(MediaServerList, AHugeTotalIsPagedAtMostAHundredTimes) {
    const std::vector<MediaServer> ten = MakeMediaServers(10);
    ScriptedDaemon daemon(
        Pages([&ten](int) { return DaemonAnswer::Reply(Page(ten, Json::Value(2000000000))); }));
    const CgiResult r = Refresh();
    EXPECT_FALSE(r.timedOut);
    EXPECT_EQ(PageArguments(daemon).size(), 100u);
    EXPECT_EQ(PageArguments(daemon).back(), "990 10");
    EXPECT_EQ(Ids(r).size(), 1000u);
    EXPECT_LT(r.peakRssKb, 200 * 1024) << "KiB";
}

// In world-writable /tmp, a socket that neither root nor the daemon's account owns was put
// there by somebody else: the CGI does not talk to it and logs the connect failure.
TEST_F(MediaServerList, ASocketOwnedByAnotherUserIsRefused) {
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(3)));
    ASSERT_EQ(lchown("/tmp/vanuaudiod.sock", 12345, 12345), 0);
    const CgiResult r = Refresh();
    EXPECT_EQ(r.body, "{\"items\":null,\"success\":true}\n");
    EXPECT_EQ(daemon.Connections(), 0);
    EXPECT_EQ(r.LogMessages(),
              std::vector<std::string>{
                  "ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [Permission denied]"});
    // The same socket given back to root is the daemon's again.
    ASSERT_EQ(lchown("/tmp/vanuaudiod.sock", 0, 0), 0);
    EXPECT_EQ(Ids(Refresh()).size(), 3u);
}
