// vanuaudiod's pieces beneath the socket: the request record, the replies of commands 14 (search)
// and 16 (a page of the server list; platform/README.md, "Audio daemon"), their size bound, and the
// text cleaning of what it lists (util::CleanText with util::kPrintableUtf8).
#include <gtest/gtest.h>
#include <json/json.h>

#include <cstring>

#include "common/util/CleanText.h"
#include "services/vanuaudiod/Protocol.h"
#include "tests/harness/CgiRunner.h"

using namespace harmona::vanuaudiod;
using harmona::util::CleanText;
using harmona::util::kPrintableUtf8;

namespace {

std::vector<unsigned char> Record(int32_t command, const std::string& arguments) {
    std::vector<unsigned char> record(kRequestSize, 0xAB);  // garbage after the terminator
    std::memcpy(record.data(), &command, sizeof(command));
    std::memcpy(record.data() + 4, arguments.c_str(), arguments.size() + 1);
    return record;
}

Json::Value Parse(const std::string& text) {
    Json::Value value;
    EXPECT_TRUE(harmona::test::ParseJson(text, value)) << text;
    return value;
}

MediaServer Server(const std::string& name, const std::string& udn) {
    return {udn, name, "http://10.0.0.1:8200/ctl/" + udn, "10.0.0.1"};
}

// The largest elements the daemon can hold: every field at its bound, every byte escaped twice
// as long (quotes in the name, the longest URL).
// `count` of them, told apart by their udn.
std::vector<MediaServer> WorstCaseServers(int count) {
    std::vector<MediaServer> servers(count);
    for (int i = 0; i < count; ++i) {
        MediaServer& server = servers[i];
        server.udn = "uuid:" + std::string(kMaxUdnBytes - 5 - 3, 'u') + std::to_string(100 + i);
        server.friendlyName = std::string(kMaxFriendlyNameBytes, '"');
        server.controlUrl = "http://10.0.0.1/" + std::string(kMaxControlUrlBytes - 16, 'c');
        server.ip = std::string(kMaxIpBytes, 'f');
    }
    return servers;
}

}  // namespace

TEST(DaemonRequestRecord, RecordIsReadWithNativeCommandAndTextUpToItsTerminator) {
    const auto record = Record(16, "0 10");
    Request request;
    ASSERT_TRUE(ParseRequest(record.data(), record.size(), request));
    EXPECT_EQ(request.command, 16);
    EXPECT_EQ(request.arguments, "0 10");
}

TEST(DaemonRequestRecord, RecordWithoutTerminatorOrOfWrongSizeIsRefused) {
    std::vector<unsigned char> record(kRequestSize, 'x');
    Request request;
    EXPECT_FALSE(ParseRequest(record.data(), record.size(), request));
    const auto good = Record(14, "");
    EXPECT_FALSE(ParseRequest(good.data(), good.size() - 1, request));
    EXPECT_FALSE(ParseRequest(nullptr, kRequestSize, request));
}

TEST(DaemonReplies, PageArgumentsAreParsedStrictly) {
    int offset = -1;
    int count = -1;
    ASSERT_TRUE(ParsePageArguments("20 10", offset, count));
    EXPECT_EQ(offset, 20);
    EXPECT_EQ(count, 10);
    ASSERT_TRUE(ParsePageArguments("0 0", offset, count));
    EXPECT_EQ(count, 0);
    for (const char* bad : {"", "0", "0 ", " 0 10", "0  10", "0 10 ", "0 10x", "a b", "-1 10",
                            "0 -5", "0\t10", "2147483648 1", "1 99999999999", "+1 2", "0 10 3"})
        EXPECT_FALSE(ParsePageArguments(bad, offset, count)) << '"' << bad << '"';
}

TEST(DaemonReplies, CommandFourteenAnswersSuccessAndAsksForASearch) {
    bool search = false;
    const std::string reply = Answer({14, ""}, {}, search);
    EXPECT_TRUE(search);
    EXPECT_EQ(Parse(reply), Parse("{\"success\": true}"));
}

TEST(DaemonReplies, OtherCommandsAreUnsupported) {
    for (int32_t code : {0, 1, 13, 15, 17, 19, 27, 38, -1, 1 << 30}) {
        bool search = true;
        const Json::Value reply = Parse(Answer({code, "1 2"}, {}, search));
        EXPECT_FALSE(search);
        EXPECT_EQ(reply["success"], false) << code;
        EXPECT_EQ(reply["error"], "unsupported") << code;
    }
}

TEST(DaemonReplies, BadPageArgumentsGetAnErrorReply) {
    bool search = true;
    const Json::Value reply = Parse(Answer({16, "ten"}, {Server("a", "uuid:a")}, search));
    EXPECT_EQ(reply["success"], false);
    EXPECT_FALSE(search);
}

TEST(DaemonReplies, PageHoldsTheElementsFromOffsetAndTheWholeTotal) {
    std::vector<MediaServer> servers;
    for (int i = 0; i < 25; ++i)
        servers.push_back(Server("S" + std::to_string(100 + i), "uuid:" + std::to_string(i)));
    bool search = false;
    const Json::Value page = Parse(Answer({16, "20 10"}, servers, search));
    EXPECT_EQ(page["success"], true);
    EXPECT_EQ(page["total"], 25);
    ASSERT_EQ(page["list"].size(), 5u);
    EXPECT_EQ(page["list"][0]["friendly_name"], "S120");
    EXPECT_EQ(page["list"][0]["control_url"], "http://10.0.0.1:8200/ctl/uuid:20");
    EXPECT_EQ(page["list"][0]["ip"], "10.0.0.1");
    EXPECT_EQ(page["list"][0]["udn"], "uuid:20");
    const Json::Value past = Parse(Answer({16, "30 10"}, servers, search));
    EXPECT_EQ(past["list"].size(), 0u);
    EXPECT_TRUE(past["list"].isArray());
    EXPECT_EQ(past["total"], 25);
}

TEST(DaemonReplies, TenWorstCaseServersFitTheCgisReplyBuffer) {
    const std::vector<MediaServer> servers = WorstCaseServers(10);
    bool search = false;
    const std::string reply = Answer({16, "0 10"}, servers, search);
    EXPECT_LT(reply.size(), 40960u);
    const Json::Value page = Parse(reply);
    EXPECT_EQ(page["list"].size(), 10u);
    EXPECT_EQ(page["list"][3]["friendly_name"].asString(), servers[3].friendlyName);
}

TEST(DaemonReplies, LargePageIsCutToFitAndTotalStillCountsAll) {
    const std::vector<MediaServer> servers = WorstCaseServers(40);
    bool search = false;
    const std::string reply = Answer({16, "0 40"}, servers, search);
    EXPECT_LE(reply.size(), kMaxReplySize);
    const Json::Value page = Parse(reply);
    EXPECT_GT(page["list"].size(), 0u);
    EXPECT_LT(page["list"].size(), 40u);
    EXPECT_EQ(page["total"], 40);
    // The elements present are whole and the first ones of the page.
    EXPECT_EQ(page["list"][0]["udn"].asString(), servers[0].udn);
}

TEST(DaemonReplies, JsonStringEscapesQuotesBackslashesAndControls) {
    EXPECT_EQ(JsonString("a\"b\\c\x01\n"), "\"a\\\"b\\\\c\\u0001\\u000a\"");
    EXPECT_EQ(JsonString("K\xC3\xBC"
                         "che"),
              "\"K\xC3\xBC"
              "che\"");
}

TEST(DaemonReplies, LongNamesAreCutOnAUtf8Boundary) {
    // "ü" is two bytes: a cut at 5 bytes must not split the third one.
    const std::string name = "\xC3\xBC\xC3\xBC\xC3\xBC";
    EXPECT_EQ(CleanText(name, kPrintableUtf8, 5), "\xC3\xBC\xC3\xBC");
    EXPECT_EQ(CleanText(name, kPrintableUtf8, 6), name);
    // Four-byte characters too.
    EXPECT_EQ(CleanText("a\xF0\x9F\x8E\xB5", kPrintableUtf8, 4), "a");
}

TEST(DaemonReplies, InvalidUtf8AndControlCharactersBecomeSpaces) {
    EXPECT_EQ(CleanText("a\xFF"
                        "b\x01"
                        "c\xC3",
                        kPrintableUtf8, 100),
              "a b c ");
    EXPECT_EQ(CleanText("\xED\xA0\x80", kPrintableUtf8, 100),
              "   ");                                             // a UTF-16 surrogate is not UTF-8
    EXPECT_EQ(CleanText("\xC0\xAF", kPrintableUtf8, 100), "  ");  // overlong '/'
}
