// Request parameters through the real CGI, from the query string and from a urlencoded POST body,
// as the exit status of "avoid_timeout" (1) and of an unknown action (0) shows them.
#include <gtest/gtest.h>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

class CgiPlatform : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }

    static CgiResult PostForm(
        const std::string& body, const std::string& query = "",
        const std::string& type = "application/x-www-form-urlencoded; charset=UTF-8") {
        CgiRequest request;
        request.method = "POST";
        request.contentType = type;
        request.body = body;
        request.queryString = query;
        return RunCgi(request);
    }
};

TEST_F(CgiPlatform, PostBodyParametersAreRead) {
    const CgiResult r = PostForm("action=avoid_timeout");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "{\"success\":true}\n");
}

TEST_F(CgiPlatform, BodyParametersComeBeforeQueryParameters) {
    EXPECT_EQ(PostForm("action=avoid_timeout", "action=other").exitStatus, 1);
    EXPECT_EQ(PostForm("action=other", "action=avoid_timeout").exitStatus, 0);
}

TEST_F(CgiPlatform, FirstOccurrenceWins) {
    EXPECT_EQ(Get("action=avoid_timeout&action=other").exitStatus, 1);
    EXPECT_EQ(Get("action=other&action=avoid_timeout").exitStatus, 0);
}

TEST_F(CgiPlatform, PercentAndPlusAreDecoded) {
    EXPECT_EQ(Get("%61ction=avoid%5Ftimeout").exitStatus, 1);
    EXPECT_EQ(Get("action=avoid+timeout").exitStatus, 0);
}

TEST_F(CgiPlatform, MalformedPercentSequenceIsKeptAsItStands) {
    // "avoid_timeout%" is not "avoid_timeout": the stray % stays.
    EXPECT_EQ(Get("action=avoid_timeout%").exitStatus, 0);
    EXPECT_EQ(Get("action=avoid_timeout%G1").exitStatus, 0);
}

TEST_F(CgiPlatform, DecodedNulEndsTheValue) {
    EXPECT_EQ(Get("action=avoid_timeout%00garbage").exitStatus, 1);
}

TEST_F(CgiPlatform, BodyOfOtherContentTypeIsNotRead) {
    EXPECT_EQ(PostForm("action=avoid_timeout", "", "text/plain").exitStatus, 0);
    EXPECT_EQ(
        PostForm("action=avoid_timeout", "action=avoid_timeout", "multipart/form-data").exitStatus,
        1);
}

TEST_F(CgiPlatform, GetRequestBodyIsNotRead) {
    CgiRequest request;
    request.method = "GET";
    request.contentType = "application/x-www-form-urlencoded";
    request.body = "action=avoid_timeout";
    EXPECT_EQ(RunCgi(request).exitStatus, 0);
}

TEST_F(CgiPlatform, BodyOverOneMebibyteIsIgnoredAndQueryStillCounts) {
    std::string body = "action=avoid_timeout&pad=" + std::string(1 << 20, 'x');
    const CgiResult r = PostForm(body, "action=other");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    const CgiResult q = PostForm(body, "action=avoid_timeout");
    EXPECT_EQ(q.exitStatus, 1);
}

TEST_F(CgiPlatform, BodyOfExactlyOneMebibyteIsRead) {
    std::string body = "action=avoid_timeout&pad=";
    body += std::string((1u << 20) - body.size(), 'x');
    ASSERT_EQ(body.size(), 1u << 20);
    EXPECT_EQ(PostForm(body, "action=other").exitStatus, 1);
}

TEST_F(CgiPlatform, OnlyContentLengthBytesAreRead) {
    // "action=avoid_" only.
    EXPECT_EQ(RunCgi(FormPostWithLength("action=avoid_timeout&x=1", "13")).exitStatus, 0);
}

TEST_F(CgiPlatform, ShortBodyAndBogusLengthsDoNotHang) {
    for (const char* length : {"100", "-5", "abc", "", "99999999999999999999"}) {
        const CgiResult r = RunCgi(FormPostWithLength("action=avoid_timeout", length));
        ASSERT_TRUE(r.exited) << length;
        // An announced 100 bytes of which 20 arrive: what arrived is used.
        EXPECT_EQ(r.exitStatus, std::string(length) == "100" ? 1 : 0) << length;
    }
}

TEST_F(CgiPlatform, ReplyIsValidUtf8WithCrLfHeader) {
    const CgiResult r = Get("action=avoid_timeout");
    EXPECT_EQ(r.output, "Content-Type: text/plain; charset=\"UTF-8\"\r\n\r\n{\"success\":true}\n");
}

}  // namespace
