// Request entry (the caller's name and permission) and action dispatch, through the real CGI.
#include <gtest/gtest.h>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

class RequestDispatch : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }
};

TEST_F(RequestDispatch, AvoidTimeoutPrintsSuccessAndExitsWithOne) {
    const CgiResult r = Get("action=avoid_timeout");
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.Header("Content-Type"), "text/plain; charset=\"UTF-8\"");
    EXPECT_EQ(r.body, "{\"success\":true}\n");
}

TEST_F(RequestDispatch, UnknownActionPrintsSuccessAndExitsWithZero) {
    for (const char* action : {"dance", "AVOID_TIMEOUT", "", "avoid_timeout "}) {
        const CgiResult r = Get(Query({{"action", action}}));
        ASSERT_TRUE(r.exited) << action;
        EXPECT_EQ(r.exitStatus, 0) << action;
        EXPECT_EQ(r.body, "{\"success\":true}\n") << action;
    }
}

TEST_F(RequestDispatch, PermissionZeroGetsNoReplyBody) {
    AddUser("admin", 0);
    const CgiResult r = Get("action=avoid_timeout");
    ExpectNoReply(r);
}

TEST_F(RequestDispatch, UnknownUserHasPermissionZero) {
    const CgiResult r = Get("action=avoid_timeout", "nobody");
    ExpectNoReply(r);
}

TEST_F(RequestDispatch, MissingActionPrintsNothing) {
    const CgiResult r = Get("node=audiotree_root");
    ExpectNoReply(r);
}

TEST_F(RequestDispatch, RefusedCallerGetsOnly401Header) {
    const std::string tooLong(65, 'a');
    for (const std::string& user :
         {std::string(""), std::string("a/b"), std::string(".."), std::string("."),
          std::string("ev\x01il"), std::string("del\x7f"), tooLong}) {
        CgiRequest request;
        request.queryString = "action=avoid_timeout";
        request.remoteUser = user;
        const CgiResult r = RunCgi(request);
        ASSERT_TRUE(r.exited) << user;
        EXPECT_EQ(r.exitStatus, 0) << user;
        EXPECT_EQ(r.output, "Status: 401 Unauthorized\r\n\r\n") << user;
    }
    CgiRequest noUser;
    noUser.queryString = "action=avoid_timeout";
    noUser.hasRemoteUser = false;
    const CgiResult r = RunCgi(noUser);
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.output, "Status: 401 Unauthorized\r\n\r\n");
}

TEST_F(RequestDispatch, LongestValidUserNameIsAuthorized) {
    const std::string name(64, 'u');
    AddUser(name, 8);
    const CgiResult r = Get("action=avoid_timeout", name);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "{\"success\":true}\n");
}

// The dispatch of "gettreenode" and "refresh" to their builders.

TEST_F(RequestDispatch, AudiotreeRootRunsTheRootBuilder) {
    const CgiResult r = Get("action=gettreenode&node=audiotree_root");
    EXPECT_EQ(r.exitStatus, 1);
    ASSERT_TRUE(r.json.isArray()) << r.output;
    // The radio category is always there, so the root builder answered.
    bool radio = false;
    for (const Json::Value& node : r.json)
        radio = radio || node["id"] == "inetradio_root";
    EXPECT_TRUE(radio) << r.body;
}

TEST_F(RequestDispatch, UpperCaseRootIsRoutedToChildNodes) {
    const CgiResult r = Get("action=gettreenode&node=AUDIOTREE_ROOT");
    // "AUDIOTREE_ROOT" is a family "AUDIOTREE" with rest "ROOT": the child node routing knows no
    // such family and answers with an empty reply.
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "[]\n");
}

TEST_F(RequestDispatch, RefreshMediaserverRunsTheMediaServerRefresh) {
    const CgiResult r = Get("action=refresh&target=mediaserver");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.json["success"], true);
    EXPECT_TRUE(r.json.isMember("items"));
}

TEST_F(RequestDispatch, RefreshIPodGoesToRefreshNodeAndExitsWithOne) {
    const CgiResult r = Get("action=refresh&target=ipod");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.json["success"], true);
}

TEST_F(RequestDispatch, GettreenodeWithoutNodePrintsNothing) {
    const CgiResult r = Get("action=gettreenode");
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.output, "");
}

}  // namespace
