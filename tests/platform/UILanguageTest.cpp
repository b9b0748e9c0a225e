// The UI language from users.conf and Accept-Language (platform/README.md, "Requests, users and
// permissions").
#include <gtest/gtest.h>

#include <cstdlib>

#include "platform/cgi/UILanguage.h"
#include "platform/cgi/WebMan.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::cgi;

namespace {

TEST(UILanguage, EveryCodeOfThePlatformIsKnown) {
    for (const char* code :
         {"enu", "ger", "fre", "ita", "spn", "jpn", "dan", "nor", "sve", "nld", "rus",
          "plk", "ptb", "ptg", "hun", "trk", "csy", "chs", "cht", "krn", "tha"})
        EXPECT_TRUE(IsLanguageCode(code)) << code;
    for (const char* code : {"def", "", "ENU", "en", "../enu", "enu/"})
        EXPECT_FALSE(IsLanguageCode(code)) << code;
}

TEST(UILanguage, TagsMapByPrimarySubtagUnlessALongerTagMatches) {
    EXPECT_EQ(LanguageFromAcceptLanguage("de-AT"), "ger");
    EXPECT_EQ(LanguageFromAcceptLanguage("EN-us"), "enu");
    EXPECT_EQ(LanguageFromAcceptLanguage("pt-BR"), "ptb");
    EXPECT_EQ(LanguageFromAcceptLanguage("pt-PT"), "ptg");
    EXPECT_EQ(LanguageFromAcceptLanguage("pt"), "ptg");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh-TW"), "cht");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh-hk"), "cht");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh-Hant-TW"), "cht");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh-Hans-CN"), "chs");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh"), "chs");
    EXPECT_EQ(LanguageFromAcceptLanguage("zh-CN"), "chs");
    EXPECT_EQ(LanguageFromAcceptLanguage("nn-NO"), "nor");
    EXPECT_EQ(LanguageFromAcceptLanguage("nb"), "nor");
    EXPECT_EQ(LanguageFromAcceptLanguage("ko-KR"), "krn");
    // "ptx" is not "pt" followed by a subtag.
    EXPECT_EQ(LanguageFromAcceptLanguage("ptx"), "");
}

TEST(UILanguage, HighestQValueFirstThenOrder) {
    EXPECT_EQ(LanguageFromAcceptLanguage("fr;q=0.5, de;q=0.9, it"), "ita");
    EXPECT_EQ(LanguageFromAcceptLanguage("fr;q=0.5, de;q=0.9"), "ger");
    EXPECT_EQ(LanguageFromAcceptLanguage("fr;q=0.8, de;q=0.8"), "fre");
    EXPECT_EQ(LanguageFromAcceptLanguage("xx, *;q=0.9, ja;q=0.1"), "jpn");
    EXPECT_EQ(LanguageFromAcceptLanguage("de;q=0, fr;q=0.001"), "fre");
    EXPECT_EQ(LanguageFromAcceptLanguage("de;q=bogus, fr;q=0.2"), "fre");
    EXPECT_EQ(LanguageFromAcceptLanguage(" , ;;, de ; q=0.3 "), "ger");
    EXPECT_EQ(LanguageFromAcceptLanguage(""), "");
    EXPECT_EQ(LanguageFromAcceptLanguage("xx-YY, qq"), "");
}

class WebManLanguage : public ::testing::Test {
  protected:
    void SetUp() override {
        setenv("REMOTE_USER", "alice", 1);
        unsetenv("HTTP_ACCEPT_LANGUAGE");
    }
};

TEST_F(WebManLanguage, UsersConfLanguageWins) {
    harmona::test::AddUser("alice", 1, "jpn");
    setenv("HTTP_ACCEPT_LANGUAGE", "de", 1);
    WebMan webMan;
    EXPECT_EQ(webMan.GetUILanguage(), "jpn");
}

TEST_F(WebManLanguage, DefOrUnknownFallsBackToAcceptLanguage) {
    setenv("HTTP_ACCEPT_LANGUAGE", "fr-CA;q=0.4, es;q=0.6", 1);
    for (const char* language : {"def", "klingon", "", "../../etc"}) {
        harmona::test::AddUser("alice", 1, language);
        WebMan webMan;
        EXPECT_EQ(webMan.GetUILanguage(), "spn") << language;
    }
}

TEST_F(WebManLanguage, NothingUsableGivesEnu) {
    WebMan webMan;
    EXPECT_EQ(webMan.GetUILanguage(), "enu");
    setenv("HTTP_ACCEPT_LANGUAGE", "xx, yy;q=0.5", 1);
    EXPECT_EQ(webMan.GetUILanguage(), "enu");
}

TEST_F(WebManLanguage, PreferenceDirectoryIsPrefixAndUserName) {
    WebMan webMan;
    EXPECT_EQ(webMan.GetPreferenceDir(), "/usr/vanu/etc/preference/alice");
    EXPECT_EQ(webMan.GetLoginUserName(), "alice");
}

}  // namespace
