// A user's own UI language, chosen from the page, through the real built library.cgi: kept in the
// user's own preference folder, spoken by the page before users.conf's and the browser's, never
// touching users.conf (the administrator's) nor what the tree CGI answers; bad input refused with a
// clear 4xx that changes nothing.
#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

const std::string kPreferences = "/usr/vanu/etc/preference";
const std::string kLanguageFile = "/usr/vanu/etc/preference/admin/language";

CgiResult Save(const std::string& language, const std::string& user = "admin") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.method = "POST";
    request.contentType = "application/x-www-form-urlencoded";
    request.body = Query({{"action", "language"}, {"language", language}});
    request.remoteUser = user;
    return RunCgi(request);
}

CgiResult Ask(const std::string& user = "admin", const std::string& acceptLanguage = "",
              const std::string& query = "action=language") {
    CgiRequest request;
    request.program = LibraryCgiProgram();
    request.queryString = query;
    request.remoteUser = user;
    request.acceptLanguage = acceptLanguage;
    return RunCgi(request);
}

void ExpectLanguages(const CgiResult& r, const char* language, const char* tree,
                     const char* saved) {
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_TRUE(r.json["success"].asBool()) << r.output;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.json["language"].asString(), language) << r.output;
    EXPECT_EQ(r.json["tree"].asString(), tree) << r.output;
    EXPECT_EQ(r.json["saved"].asString(), saved) << r.output;
}

void ExpectError(const CgiResult& r, const char* status, const char* code) {
    EXPECT_NE(r.Header("Status").find(status), std::string::npos) << code << r.output;
    ASSERT_TRUE(r.jsonOk) << r.output;
    EXPECT_FALSE(r.json["success"].asBool());
    EXPECT_EQ(r.json["error"].asString(), code) << r.output;
    EXPECT_TRUE(r.json["errinfo"].isObject());
    EXPECT_EQ(r.exitStatus, 0);
}

// The tree CGI's root, as the page asks for it.
std::string TreeRoot(const std::string& acceptLanguage = "en-US") {
    CgiRequest tree;
    tree.method = "POST";
    tree.contentType = "application/x-www-form-urlencoded";
    tree.body = "action=gettreenode&node=audiotree_root";
    tree.acceptLanguage = acceptLanguage;
    return RunCgi(tree).body;
}

class UserLanguage : public ::testing::Test {
  protected:
    void SetUp() override {
        StandardFixture();
        // The platform keeps the folder of the users' preferences; each user's own is made on the
        // first change.
        MakeDirs(kPreferences);
    }
};

TEST_F(UserLanguage, TheChoiceIsKeptInTheUsersOwnPreferenceFolderAndThePageSpeaksIt) {
    const std::string users = ReadFile("/var/packages/Harmona/etc/users.conf");
    ExpectLanguages(Save("fre"), "fre", "enu", "fre");
    EXPECT_EQ(ReadFile(kLanguageFile), "language=fre\n");
    ExpectLanguages(Ask(), "fre", "enu", "fre");
    EXPECT_EQ(ReadFile("/var/packages/Harmona/etc/users.conf"), users)
        << "users.conf is the administrator's";
}

TEST_F(UserLanguage, WithoutAChoiceThePageSpeaksUsersConfsLanguageElseTheBrowsers) {
    ExpectLanguages(Ask("admin", "ja,en;q=0.5"), "jpn", "jpn", "");
    ExpectLanguages(Ask("admin", ""), "enu", "enu", "");
    AddUser("admin", 29, "ger");
    ExpectLanguages(Ask("admin", "ja,en;q=0.5"), "ger", "ger", "");
}

TEST_F(UserLanguage, TheUsersOwnChoiceComesBeforeUsersConfsAndDefGivesItBack) {
    AddUser("admin", 29, "ger");
    ExpectLanguages(Save("ita"), "ita", "ger", "ita");
    ExpectLanguages(Save("def"), "ger", "ger", "def");
    EXPECT_EQ(ReadFile(kLanguageFile), "language=def\n");
    AddUser("admin", 29);
    ExpectLanguages(Ask("admin", "zh-TW"), "cht", "cht", "def");
}

TEST_F(UserLanguage, WhatTheTreeCgiAnswersDoesNotChange) {
    const std::string before = TreeRoot();
    ASSERT_FALSE(before.empty());
    ExpectLanguages(Save("jpn"), "jpn", "enu", "jpn");
    EXPECT_EQ(TreeRoot(), before);
}

TEST_F(UserLanguage, EachUserHasTheirOwn) {
    WriteUsersConf({{"admin", {"29", ""}}, {"guest", {"4", "spn"}}});
    ExpectLanguages(Save("fre"), "fre", "enu", "fre");
    ExpectLanguages(Save("chs", "guest"), "chs", "spn", "chs");
    ExpectLanguages(Ask("admin"), "fre", "enu", "fre");
    ExpectLanguages(Ask("guest"), "chs", "spn", "chs");
    EXPECT_EQ(ReadFile(kPreferences + "/guest/language"), "language=chs\n");
}

TEST_F(UserLanguage, ALanguageThePageHasNoWordsForOrAnyOtherValueIsRefusedAndChangesNothing) {
    ASSERT_TRUE(Save("ger").json["success"].asBool());
    const FileSnapshot before = Snapshot();
    for (const std::string& bad :
         std::vector<std::string>{"", "xxx", "dan", "FRE", "fre ", "fre\nlanguage=ita", "../enu",
                                  "en", "deff", std::string(5000, 'a')})
        ExpectError(Save(bad), "400", "request_invalid");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), std::vector<std::string>{});
    ExpectLanguages(Ask(), "ger", "enu", "ger");
}

TEST_F(UserLanguage, AGetOnlyReadsEvenWithALanguageInTheQuery) {
    const FileSnapshot before = Snapshot();
    ExpectLanguages(Ask("admin", "", "action=language&language=fre"), "enu", "enu", "");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), std::vector<std::string>{});
}

TEST_F(UserLanguage, AUserWithoutPermissionOrWithoutAnEntryCannotSave) {
    WriteUsersConf({{"admin", {"29", ""}}, {"idle", {"0", ""}}});
    const FileSnapshot before = Snapshot();
    ExpectError(Save("fre", "idle"), "403", "request_refused");
    ExpectError(Save("fre", "stranger"), "403", "request_refused");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), std::vector<std::string>{});
}

TEST_F(UserLanguage, AFileThatSaysNothingUsableCountsAsNoChoice) {
    WriteFile(kLanguageFile, "language=klingon\n");
    ExpectLanguages(Ask("admin", "it"), "ita", "ita", "");
    WriteFile(kLanguageFile, "# nothing\n");
    ExpectLanguages(Ask("admin", "it"), "ita", "ita", "");
}

TEST_F(UserLanguage, APreferenceFolderThatCannotBeWrittenGivesAServerErrorAndChangesNothing) {
    WriteFile(kPreferences + "/admin", "a file where the folder should be\n");
    const FileSnapshot before = Snapshot();
    ExpectError(Save("fre"), "500", "language_unwritable");
    EXPECT_EQ(ChangedPaths(before, Snapshot()), std::vector<std::string>{});
}

TEST_F(UserLanguage, SavesAtTheSameTimeLeaveOneWholeChoiceAndNoTemporaryFile) {
    std::vector<std::thread> savers;
    std::vector<CgiResult> results(8);
    const char* languages[] = {"fre", "ger", "ita", "jpn"};
    for (int n = 0; n < 8; ++n)
        savers.emplace_back([n, &results, &languages] { results[n] = Save(languages[n % 4]); });
    for (std::thread& saver : savers)
        saver.join();
    for (const CgiResult& r : results)
        EXPECT_TRUE(r.json["success"].asBool()) << r.output;
    const std::string file = ReadFile(kLanguageFile);
    EXPECT_TRUE(file == "language=fre\n" || file == "language=ger\n" || file == "language=ita\n" ||
                file == "language=jpn\n")
        << file;
    for (const auto& [path, state] : Snapshot())
        EXPECT_EQ(path.find("/.language."), std::string::npos) << "left behind: " << path;
}

}  // namespace
