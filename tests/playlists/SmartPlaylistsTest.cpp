// Smart playlist listing, built in the test process (see InProcess.h) over real smart playlist
// files.
#include <gtest/gtest.h>

#include "src/playlists/SmartPlaylists.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/playlists/InProcess.h"

using namespace harmona::test;

namespace {

constexpr const char* kSmartIcon = "3rdparty/Harmona/images/files_class/icon_smartpls.png";

class SmartPlaylists : public PlaylistBuilderTest {
  protected:
    std::vector<std::string> PersonalTexts(const std::vector<std::string>& enumerated) {
        WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), enumerated);
        Json::Value nodes(Json::arrayValue);
        EXPECT_EQ(request.handler.ListSmartPlaylists(nodes, "music_personal"), 1);
        return Texts(nodes);
    }
};

TEST_F(SmartPlaylists, NamesBADAreListedAsAbd) {
    EXPECT_EQ(PersonalTexts({"b", "A", "d"}), (std::vector<std::string>{"A", "b", "d"}));
}

TEST_F(SmartPlaylists, RockAndrockBothAppearInEnumerationOrder) {
    EXPECT_EQ(PersonalTexts({"Rock", "pop", "rock"}),
              (std::vector<std::string>{"pop", "Rock", "rock"}));
    EXPECT_EQ(PersonalTexts({"rock", "pop", "Rock"}),
              (std::vector<std::string>{"pop", "rock", "Rock"}));
}

TEST_F(SmartPlaylists, NoNameIsListedFewerTimesThanEnumerated) {
    EXPECT_EQ(PersonalTexts({"Jazz", "jazz", "Jazz", "JAZZ", "blues", "jAzz"}),
              (std::vector<std::string>{"blues", "Jazz", "jazz", "Jazz", "JAZZ", "jAzz"}));
}

TEST_F(SmartPlaylists, OrderFoldsAsciiLettersOnlyDigitsAndUnderscoreFirst) {
    EXPECT_EQ(
        PersonalTexts({"cherry", "_under", "Banana", "9lives", "apple", "Zed", "[x]"}),
        (std::vector<std::string>{"9lives", "[x]", "_under", "apple", "Banana", "cherry", "Zed"}));
}

TEST_F(SmartPlaylists, NameOrderIsCaseInsensitiveStrictComparison) {
    SmartPlaylistNameOrder before;
    EXPECT_TRUE(before("apple", "Banana"));
    EXPECT_FALSE(before("Banana", "apple"));
    EXPECT_FALSE(before("Rock", "rock"));  // tied: neither goes before the other
    EXPECT_FALSE(before("rock", "Rock"));
    EXPECT_TRUE(before("_", "a"));
}

TEST_F(SmartPlaylists, PersonalNodesCarryIdParentIconAndLeafFlagOnly) {
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {"Best of <80s>"});
    ASSERT_EQ(request.handler.ListSmartPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    ExpectPlaylistNode(children[0], "musiclib_music_personal/smart/Best of <80s>",
                       "musiclib_music_personal", "Best of &lt;80s&gt;", kSmartIcon);
}

TEST_F(SmartPlaylists, SharedCategoryReadsTheSharedFileAndAddressesByName) {
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"party", "Ambient"});
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {"not shared"});
    ASSERT_EQ(request.handler.ListSmartPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(Ids(children), (std::vector<std::string>{"musiclib_music_shared/smart/Ambient",
                                                       "musiclib_music_shared/smart/party"}));
    EXPECT_EQ(children[0]["pid"].asString(), "musiclib_music_shared");
    EXPECT_EQ(children[0]["icon"].asString(), kSmartIcon);
}

TEST_F(SmartPlaylists, PersonalUserWithoutTheFileGetsButtonsAndOrdinaryPlaylistsOnlyAndNoError) {
    WritePersonalPlaylistFile("admin", "one.m3u");
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"shared smart"});  // not the user's
    EXPECT_EQ(request.handler.ListSmartPlaylists(children, "music_personal"), 1);
    EXPECT_EQ(children.size(), 0u);

    Json::Value category(Json::arrayValue);
    ASSERT_EQ(request.handler.AddPersonalPlaylistCategory(category), 1);
    EXPECT_EQ(Ids(category), (std::vector<std::string>{"musiclib_music_personal_refresh",
                                                       "musiclib_music_personal_new",
                                                       "musiclib_music_personal/playlist/one"}));
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(SmartPlaylists, NameWithSlashIsPutIntoTheIdUnescaped) {
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {"rock/80s/live"});
    ASSERT_EQ(request.handler.ListSmartPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(children[0]["id"].asString(), "musiclib_music_personal/smart/rock/80s/live");
    EXPECT_EQ(children[0]["text"].asString(), "rock/80s/live");
}

TEST_F(SmartPlaylists, IdLongerThan4095BytesIsCutTextKeepsTheWholeName) {
    const std::string name(5000, 'L');
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {name});
    ASSERT_EQ(request.handler.ListSmartPlaylists(children, "music_personal"), 1);
    ASSERT_EQ(children.size(), 1u);
    const std::string id = children[0]["id"].asString();
    EXPECT_EQ(id.size(), 4095u);
    EXPECT_EQ(id, ("musiclib_music_personal/smart/" + name).substr(0, 4095));
    EXPECT_EQ(children[0]["text"].asString(), name);
}

TEST_F(SmartPlaylists, UnknownCategoryGivesNothingResultOneAndNoLog) {
    WriteSmartPlaylistFile(UserSmartPlaylistFile("admin"), {"a"});
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"b"});
    for (const char* category : {"MUSIC_PERSONAL", "music_Shared", "ipod", ""})
        EXPECT_EQ(request.handler.ListSmartPlaylists(children, category), 1) << category;
    EXPECT_EQ(children.size(), 0u);
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(SmartPlaylists, EmptyOrUnreadableFilesGiveNoNodesAndSuccess) {
    WriteFile(UserSmartPlaylistFile("admin"), "# no sections\nkey=value\n[]\n");
    EXPECT_EQ(request.handler.ListSmartPlaylists(children, "music_personal"), 1);
    MakeDirs(kSharedSmartPlaylistFile);  // a folder where the file should be
    EXPECT_EQ(request.handler.ListSmartPlaylists(children, "music_shared"), 1);
    EXPECT_EQ(children.size(), 0u);
    EXPECT_TRUE(LoggedErrors().empty());
}

TEST_F(SmartPlaylists, SmartNodesAreAppendedAfterWhatTheArrayHolds) {
    children.append("ordinary");
    WriteSmartPlaylistFile(kSharedSmartPlaylistFile, {"s"});
    ASSERT_EQ(request.handler.ListSmartPlaylists(children, "music_shared"), 1);
    ASSERT_EQ(children.size(), 2u);
    EXPECT_EQ(children[0].asString(), "ordinary");
    EXPECT_EQ(children[1]["text"].asString(), "s");
}

}  // namespace
