// Decoding of CGI parameters (platform/README.md, "Requests, users and permissions").
#include <gtest/gtest.h>

#include <unistd.h>

#include "platform/cgi/CgiParams.h"

using namespace harmona::cgi;

namespace {

ParamList Decode(std::string_view text) {
    ParamList list;
    DecodeForm(text, list);
    return list;
}

TEST(CgiParams, PlusIsSpaceAndPercentIsDecoded) {
    EXPECT_EQ(DecodeComponent("a+b%20c%2Bd%41"), "a b c+dA");
    EXPECT_EQ(DecodeComponent("%e4%C3%a4"), "\xe4\xc3\xa4");
}

TEST(CgiParams, MalformedPercentSequenceStaysAsItStands) {
    EXPECT_EQ(DecodeComponent("100%"), "100%");
    EXPECT_EQ(DecodeComponent("%4"), "%4");
    EXPECT_EQ(DecodeComponent("%zz%4g%"), "%zz%4g%");
    EXPECT_EQ(DecodeComponent("%%41"), "%A");
}

TEST(CgiParams, DecodedNulEndsTheValue) {
    EXPECT_EQ(DecodeComponent("abc%00def"), "abc");
    EXPECT_EQ(DecodeComponent("%00"), "");
}

TEST(CgiParams, NamesWithoutEqualsHaveEmptyValues) {
    const ParamList list = Decode("a&b=&c=1&&=x");
    ASSERT_EQ(list.size(), 4u);
    EXPECT_EQ(list[0], (std::pair<std::string, std::string>{"a", ""}));
    EXPECT_EQ(list[1], (std::pair<std::string, std::string>{"b", ""}));
    EXPECT_EQ(list[2], (std::pair<std::string, std::string>{"c", "1"}));
    EXPECT_EQ(list[3], (std::pair<std::string, std::string>{"", "x"}));
}

TEST(CgiParams, OrderIsKept) {
    const ParamList list = Decode("x=1&x=2");
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0].second, "1");
    EXPECT_EQ(list[1].second, "2");
}

TEST(CgiParams, FormContentType) {
    EXPECT_TRUE(IsFormContentType("application/x-www-form-urlencoded"));
    EXPECT_TRUE(IsFormContentType("Application/X-WWW-Form-UrlEncoded; charset=UTF-8"));
    EXPECT_TRUE(IsFormContentType(" application/x-www-form-urlencoded ;charset=utf-8"));
    EXPECT_FALSE(IsFormContentType("multipart/form-data; boundary=x"));
    EXPECT_FALSE(IsFormContentType("application/x-www-form-urlencodedX"));
    EXPECT_FALSE(IsFormContentType(nullptr));
}

TEST(CgiParams, ContentLength) {
    EXPECT_EQ(ParseContentLength("0"), 0);
    EXPECT_EQ(ParseContentLength("1048576"), 1048576);
    EXPECT_EQ(ParseContentLength("1048577"), -1);
    EXPECT_EQ(ParseContentLength("99999999999999999999999"), -1);
    EXPECT_EQ(ParseContentLength("-1"), -1);
    EXPECT_EQ(ParseContentLength("12abc"), -1);
    EXPECT_EQ(ParseContentLength(""), -1);
    EXPECT_EQ(ParseContentLength(nullptr), -1);
}

TEST(CgiParams, ReadBodyStopsAtEndOfFileAndAtTheTimeLimit) {
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    ASSERT_EQ(write(fds[1], "abc", 3), 3);
    // Announced 10 bytes, 3 arrive and the writer stays open: the limit ends the wait.
    EXPECT_EQ(ReadBody(fds[0], 10, 200), "abc");
    close(fds[1]);
    EXPECT_EQ(ReadBody(fds[0], 10, 200), "");
    close(fds[0]);
}

}  // namespace
