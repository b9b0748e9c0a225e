// The root tree over a radio builder that fails (ScriptedRadio.cpp), which the real one never
// does: the categories built before it stay, the reply reports the error and nothing after it is
// built.
#include <gtest/gtest.h>
#include <stdlib.h>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/CgiRunner.h"
#include "tests/tree/ScriptedRadio.h"
#include "tests/tree/TreeFixture.h"

using namespace harmona::test;
using Strings = std::vector<std::string>;

namespace {

TEST(RootTreeFaults, RadioBuilderFailureAfterFourCategoriesKeepsThemAndReportsTheError) {
    TreeFixture fixture(TreeWorld{});
    setenv("REMOTE_USER", "admin", 1);
    unsetenv("HTTP_ACCEPT_LANGUAGE");
    RadioBuilderCalls() = 0;
    HarmonaHandler handler;
    handler.userPermission = PERM_IPOD | PERM_MEDIA_SERVER;
    ::testing::internal::CaptureStdout();
    const int result = handler.BuildRootTree();
    const std::string output = ::testing::internal::GetCapturedStdout();
    EXPECT_EQ(result, 0);  // Process turns it into exit status 0
    EXPECT_EQ(RadioBuilderCalls(), 1);
    const std::size_t bodyStart = output.find("\r\n\r\n");
    ASSERT_NE(bodyStart, std::string::npos) << output;
    Json::Value reply;
    ASSERT_TRUE(ParseJson(output.substr(bodyStart + 4), reply)) << output;
    EXPECT_EQ(Ids(reply["items"]), (Strings{"musiclib_root", "musiclib_music_personal",
                                            "musiclib_music_shared", "ipod_root"}));
    EXPECT_EQ(reply["success"], false);
    EXPECT_EQ(reply["errinfo"]["sec"], "common");
    EXPECT_EQ(reply["errinfo"]["key"], "error_system");
    EXPECT_EQ(output.find("mediaserver_root"), std::string::npos);
}

}  // namespace
