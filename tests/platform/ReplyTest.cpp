// PrintResponse, SetError, SetSuccess, EncodeHtml and the UTF-8 repair (platform/README.md,
// "Requests, users and permissions").
#include <gtest/gtest.h>

#include <cstdio>

#include "common/util/Utf8.h"
#include "platform/cgi/ActionHandler.h"
#include "platform/cgi/JsonWriter.h"
#include "platform/cgi/WebUtils.h"
#include "tests/harness/CgiRunner.h"

using harmona::cgi::SerializeReply;
using harmona::util::IsValidUtf8;
using harmona::util::RepairUtf8;

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

// The writer tests eight bytes at a time for bytes that need escaping or repair; each such byte,
// at every offset around those eight-byte steps, must come out as a byte-at-a-time writer makes it.
std::string EscapedByteAtATime(const std::string& text) {
    std::string out = "\"";
    for (std::size_t i = 0; i < text.size();) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        if (c == '"' || c == '\\') {
            out += '\\';
            out += static_cast<char>(c);
        } else if (c == '\n') {
            out += "\\n";
        } else if (c < 0x20) {
            char escape[8];
            std::snprintf(escape, sizeof escape, "\\u%04x", c);
            out += escape;
        } else if (c < 0x80) {
            out += static_cast<char>(c);
        } else {
            const std::size_t length = harmona::util::Utf8SequenceLength(text, i);
            out += length == 0 ? "\xEF\xBF\xBD" : text.substr(i, length);
            i += length == 0 ? 1 : length;
            continue;
        }
        ++i;
    }
    return out + "\"";
}

TEST(PrintResponse, EveryByteThatNeedsEscapingIsFoundAtEveryOffset) {
    for (const std::string special :
         {"\x01", "\x1F", "\"", "\\", "\n", "\xC3\xA9", "\xFF", "\xE6\x97", "\x7F", " ", "~"}) {
        for (std::size_t offset = 0; offset < 20; ++offset) {
            const std::string text = std::string(offset, 'a') + special + std::string(19, 'z');
            EXPECT_EQ(SerializeReply(Json::Value(text)), EscapedByteAtATime(text))
                << "offset " << offset << ", byte " << static_cast<int>(special[0] & 0xFF);
        }
    }
}

// PrintResponse writes a large reply in chunks as it is made; an object whose member name needs
// repair is written again from its start, which must never have reached the file already.
TEST(PrintResponse, ChunkedReplyEqualsTheWholeTextWhenANameNeedsRepair) {
    Json::Value reply;
    for (int i = 0; i < 3000; ++i) {
        Json::Value node(Json::objectValue);
        node["id"] = "node " + std::to_string(i) + std::string(40, 'x');
        if (i == 2500) {
            for (int j = 0; j < 2000; ++j)
                node["a children"].append(std::string(50, 'c'));
            node["z\xFF"] = "bad name after a large member";
        }
        reply.append(std::move(node));
    }
    std::string whole;
    harmona::cgi::WriteCompactJson(reply, whole);
    std::FILE* file = std::tmpfile();
    ASSERT_NE(file, nullptr);
    ASSERT_TRUE(harmona::cgi::WriteCompactJson(reply, file));
    std::fflush(file);
    std::rewind(file);
    std::string chunked;
    char buffer[65536];
    for (std::size_t n; (n = std::fread(buffer, 1, sizeof buffer, file)) > 0;)
        chunked.append(buffer, n);
    std::fclose(file);
    EXPECT_GT(whole.size(), 200000u);
    EXPECT_EQ(chunked, whole);
    EXPECT_NE(whole.find("\"z\xEF\xBF\xBD\":\"bad name after a large member\""), std::string::npos);
    EXPECT_TRUE(IsValidUtf8(chunked));
}

}  // namespace
