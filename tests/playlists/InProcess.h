// The playlist builders (categories, ordinary and smart playlist listings) run in the test process.
// A request reaches them only through the root tree and the refresh action, and those show less: a
// failing category turns the whole tree into one error reply, hiding the category's own error
// envelope and buttons, and both start from an empty array. Called directly, a builder shows its
// result, what it appends to an array that already holds nodes, and what it logs. The request
// route has its own tests with the root tree and the refresh action. The handler is constructed as
// the CGI entry does it, with the request's environment set as a web server would set it.
#pragma once

#include <gtest/gtest.h>
#include <json/json.h>
#include <stdlib.h>
#include <syslog.h>

#include <string>
#include <vector>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"

namespace harmona::test {

// Sets the CGI environment of a GET request by `user` (no parameters).
inline void SetRequestEnvironment(const std::string& user) {
    setenv("REMOTE_USER", user.c_str(), 1);
    setenv("REQUEST_METHOD", "GET", 1);
    setenv("QUERY_STRING", "", 1);
    unsetenv("HTTP_ACCEPT_LANGUAGE");
    unsetenv("CONTENT_LENGTH");
    unsetenv("CONTENT_TYPE");
}

// A handler for `user` whose permission bits Process would have read.
struct InProcessHandler {
    explicit InProcessHandler(const std::string& user, int permission) {
        SetRequestEnvironment(user);
        handler.userPermission = permission;
    }
    HarmonaHandler handler;
};

// The fixture of the tests of one builder: the standard fixture files, a request by "admin" with
// every permission a playlist builder looks at, and the array the builder fills.
class PlaylistBuilderTest : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }
    InProcessHandler request{"admin", PERM_IPOD | PERM_NEW_SHARED_PLAYLIST | PERM_MEDIA_SERVER};
    Json::Value children{Json::arrayValue};
};

// The messages that the test process sent to the system log since the last call.
inline std::vector<std::string> LoggedErrors() {
    std::vector<std::string> messages;
    for (const LogLine& line : TakeLogLines(100))
        if ((line.priority & 7) == LOG_ERR)
            messages.push_back(line.message);
    return messages;
}

inline std::vector<std::string> Ids(const Json::Value& nodes) {
    std::vector<std::string> ids;
    for (const Json::Value& node : nodes)
        ids.push_back(node["id"].asString());
    return ids;
}

inline std::vector<std::string> Texts(const Json::Value& nodes) {
    std::vector<std::string> texts;
    for (const Json::Value& node : nodes)
        texts.push_back(node["text"].asString());
    return texts;
}

// Checks a playlist node: its id, parent id, text and icon, and a leaf that is neither dragged,
// dropped on nor expanded.
inline void ExpectPlaylistNode(const Json::Value& node, const std::string& id,
                               const std::string& parentId, const std::string& text,
                               const std::string& icon) {
    EXPECT_EQ(node["id"].asString(), id);
    EXPECT_EQ(node["pid"].asString(), parentId);
    EXPECT_EQ(node["text"].asString(), text);
    EXPECT_EQ(node["icon"].asString(), icon);
    EXPECT_TRUE(node["leaf"].asBool());
    for (const char* flag : {"allowDrag", "allowDrop", "draggable", "expanded"})
        EXPECT_FALSE(node[flag].asBool()) << flag;
}

// Checks the error envelope that SetError writes into a builder's children array: the system error
// of the common section with the line `line`, and the nodes the builder had added, in `itemIds`.
inline void ExpectSystemError(const Json::Value& children, int line,
                              const std::vector<std::string>& itemIds) {
    ASSERT_TRUE(children.isObject());
    EXPECT_FALSE(children["success"].asBool());
    EXPECT_EQ(children["errinfo"]["sec"].asString(), "common");
    EXPECT_EQ(children["errinfo"]["key"].asString(), "error_system");
    EXPECT_EQ(children["errinfo"]["line"].asInt(), line);
    EXPECT_EQ(Ids(children["items"]), itemIds);
}

}  // namespace harmona::test
