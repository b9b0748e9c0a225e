// platform.md section 3: PrintResponse, SetError, SetSuccess, EncodeHtml and the UTF-8 repair.
#include <gtest/gtest.h>

#include "ActionHandler.h"
#include "CgiRunner.h"
#include "Utf8.h"
#include "WebUtils.h"

using harmona::cgi::IsValidUtf8;
using harmona::cgi::RepairUtf8;
using harmona::cgi::SerializeReply;

namespace {

class TestHandler : public ActionHandler {
  public:
    int Process() override { return 0; }
};

TEST(EncodeHtml, ReplacesTheFiveSpecialCharactersOnly) {
    EXPECT_EQ(WebUtils::EncodeHtml("a&b<c>d\"e'f", false), "a&amp;b&lt;c&gt;d&quot;e&#39;f");
    EXPECT_EQ(WebUtils::EncodeHtml("&amp;", true), "&amp;amp;");
    EXPECT_EQ(WebUtils::EncodeHtml("Ünïcödé / \\ % + =", false), "Ünïcödé / \\ % + =");
    EXPECT_EQ(WebUtils::EncodeHtml("", false), "");
}

TEST(Utf8Repair, ValidTextIsKept) {
    for (const char* text : {"", "plain", "Grüße", "日本語", "\xF0\x9F\x8E\xB5", "\xEF\xBF\xBD"}) {
        EXPECT_TRUE(IsValidUtf8(text)) << text;
        EXPECT_EQ(RepairUtf8(text), text);
    }
}

TEST(Utf8Repair, EachBadByteBecomesAReplacementCharacter) {
    const std::string fffd = "\xEF\xBF\xBD";
    EXPECT_EQ(RepairUtf8("a\xFF"
                         "b"),
              "a" + fffd + "b");
    EXPECT_EQ(RepairUtf8("\xC3"), fffd);                                   // truncated
    EXPECT_EQ(RepairUtf8("\xC0\xAF"), fffd + fffd);                        // overlong
    EXPECT_EQ(RepairUtf8("\xED\xA0\x80"), fffd + fffd + fffd);             // surrogate
    EXPECT_EQ(RepairUtf8("\xF4\x90\x80\x80"), fffd + fffd + fffd + fffd);  // above U+10FFFF
    EXPECT_EQ(RepairUtf8("\xE6\x97"
                         "x"),
              fffd + fffd + "x");
    EXPECT_FALSE(IsValidUtf8("\x80"));
}

TEST(PrintResponse, NullPrintsAsEmptyListAtTopLevelOnly) {
    EXPECT_EQ(SerializeReply(Json::Value()), "[]");
    Json::Value reply(Json::objectValue);
    reply["items"] = Json::Value();
    EXPECT_EQ(SerializeReply(reply), "{\"items\":null}");
    Json::Value nested(Json::arrayValue);
    nested.append(Json::Value(Json::arrayValue));
    EXPECT_EQ(SerializeReply(nested), "[[]]");
}

TEST(PrintResponse, CompactJsonWithUtf8NotEscapes) {
    Json::Value reply(Json::objectValue);
    reply["text"] = "Grüße 日本 \"q\" \\ \n";
    EXPECT_EQ(SerializeReply(reply), "{\"text\":\"Grüße 日本 \\\"q\\\" \\\\ \\n\"}");
}

TEST(PrintResponse, InvalidUtf8InValuesAndNamesIsRepaired) {
    Json::Value reply(Json::objectValue);
    reply["bad\xFF"] = "x\xC3";
    reply["list"].append("\x80");
    const std::string text = SerializeReply(reply);
    EXPECT_TRUE(IsValidUtf8(text)) << text;
    Json::Value parsed;
    ASSERT_TRUE(harmona::test::ParseJson(text, parsed)) << text;
    EXPECT_EQ(parsed["bad\xEF\xBF\xBD"].asString(), "x\xEF\xBF\xBD");
    EXPECT_EQ(parsed["list"][0].asString(), "\xEF\xBF\xBD");
}

// Found by fuzz_reply_utf8: two bad member names repair to the same name; the object must still
// hold each name once (strict parsers reject duplicates).
TEST(PrintResponse, BadNamesThatCoincideAfterRepairAreWrittenOnce) {
    Json::Value reply(Json::objectValue);
    reply["\xB5"] = "first";
    reply["\xC3"] = "second";
    reply["ok"] = 1;
    const std::string text = SerializeReply(reply);
    EXPECT_EQ(text, "{\"ok\":1,\"\xEF\xBF\xBD\":\"second\"}");
    Json::Value parsed;
    EXPECT_TRUE(harmona::test::ParseJson(text, parsed)) << text;
}

TEST(SetError, ArrayElementsMoveToItemsInOrder) {
    TestHandler handler;
    Json::Value reply;
    reply.append("a");
    reply.append("b");
    handler.SetError(reply, "common", "error_system", 364);
    EXPECT_EQ(SerializeReply(reply),
              "{\"errinfo\":{\"key\":\"error_system\",\"line\":364,\"sec\":\"common\"},\"items\":["
              "\"a\",\"b\"],"
              "\"success\":false}");
}

TEST(SetError, NullBecomesAnObjectWithoutItems) {
    TestHandler handler;
    Json::Value reply;
    handler.SetError(reply, "error", "Could not get the entry", 12);
    EXPECT_FALSE(reply.isMember("items"));
    EXPECT_EQ(reply["success"], false);
    EXPECT_EQ(reply["errinfo"]["key"], "Could not get the entry");
    EXPECT_EQ(reply["errinfo"]["line"], 12);
}

TEST(SetSuccess, KeepsObjectMembersAndMarksSuccess) {
    TestHandler handler;
    Json::Value reply(Json::objectValue);
    reply["items"] = Json::Value();
    handler.SetSuccess(reply, true);
    EXPECT_EQ(SerializeReply(reply), "{\"items\":null,\"success\":true}");
    Json::Value list;
    list.append(1);
    handler.SetSuccess(list, true);
    EXPECT_EQ(SerializeReply(list), "{\"items\":[1],\"success\":true}");
}

TEST(SetSuccess, ErrorAfterSuccessIsFalse) {
    TestHandler handler;
    Json::Value reply;
    handler.SetSuccess(reply, true);
    handler.SetError(reply, "playlist", "error_create_random100", 616);
    EXPECT_EQ(reply["success"], false);
}

}  // namespace
