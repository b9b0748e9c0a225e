// UI text lookup in the user's language (the error envelope of a failing refresh is tested with
// the refresh action).
#include <gtest/gtest.h>

#include <cstdlib>

#include "src/handler/HarmonaHandler.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

class UITexts : public ::testing::Test {
  protected:
    void SetUp() override {
        setenv("REMOTE_USER", "alice", 1);
        unsetenv("HTTP_ACCEPT_LANGUAGE");
    }
};

TEST_F(UITexts, LanguageCodeIsAppendedToThePrefixAsItStands) {
    // A table right at "<prefix>ger/strings": no separator beyond the code, no file name but the
    // platform's own "strings".
    WriteFile(std::string(kTextsDir) + "ger/strings", "[radio]\nradio=Internetradio (Test)\n");
    WriteFile(std::string(kTextsDir) + "ger.strings", "[radio]\nradio=wrong\n");
    AddUser("alice", 1, "ger");
    HarmonaHandler handler;
    const Json::Value texts = handler.LoadUITexts();
    EXPECT_EQ(texts["radio"]["radio"], "Internetradio (Test)");
}

TEST_F(UITexts, LanguageFromAcceptLanguageSelectsTheTable) {
    InstallTexts();
    AddUser("alice", 1);
    setenv("HTTP_ACCEPT_LANGUAGE", "zh-TW,zh;q=0.9", 1);
    HarmonaHandler handler;
    EXPECT_EQ(handler.LoadUITexts()["radio"]["radio"], "網路電台");
}

TEST_F(UITexts, MissingSectionOrKeyYieldsEmptyText) {
    WriteFile(std::string(kTextsDir) + "enu/strings", "[radio]\nradio=Radio\n");
    AddUser("alice", 1);
    HarmonaHandler handler;
    Json::Value texts = handler.LoadUITexts();
    EXPECT_EQ(texts["radio"]["nope"].asString(), "");
    EXPECT_EQ(texts["nosection"]["nope"].asString(), "");
}

TEST_F(UITexts, MissingTableYieldsEmptyObject) {
    AddUser("alice", 1, "fre");
    HarmonaHandler handler;
    const Json::Value texts = handler.LoadUITexts();
    EXPECT_TRUE(texts.isObject());
    EXPECT_EQ(texts.size(), 0u);
}

}  // namespace
