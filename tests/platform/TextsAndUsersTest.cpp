// Permissions from users.conf, the UI text tables and the shipped texts (platform/README.md,
// "Requests, users and permissions" and "UI texts").
#include <gtest/gtest.h>

#include <set>

#include "platform/texts/LocalizedStringParser.h"
#include "platform/users/AudioUsers.h"
#include "tests/harness/Fixtures.h"

using harmona::test::WriteFile;

namespace {

TEST(AudioUsers, PermissionIsADecimalSigned32BitNumber) {
    WriteFile(harmona::test::kUsersConf,
              "[a]\npermission=13\n[b]\npermission=-1\n[c]\npermission=2147483647\n[d]\npermission="
              "2147483648\n"
              "[e]\npermission=12abc\n[f]\npermission=\n[g]\nlanguage=ger\n[h]\npermission=\"8\"\n"
              "[i]\npermission=0x10\n[j]\npermission= +4 \n[k]\npermission=-2147483648\n");
    EXPECT_EQ(AudioUsers::GetUserPermission("a"), 13);
    EXPECT_EQ(AudioUsers::GetUserPermission("b"), -1);
    EXPECT_EQ(AudioUsers::GetUserPermission("c"), 2147483647);
    EXPECT_EQ(AudioUsers::GetUserPermission("d"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("e"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("f"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("g"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("h"), 8);
    EXPECT_EQ(AudioUsers::GetUserPermission("i"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("j"), 4);
    EXPECT_EQ(AudioUsers::GetUserPermission("k"), -2147483647 - 1);
    EXPECT_EQ(AudioUsers::GetUserPermission("A"), 0);
    EXPECT_EQ(AudioUsers::GetUserPermission("zz"), 0);
}

TEST(AudioUsers, MissingFileGivesZero) {
    EXPECT_EQ(AudioUsers::GetUserPermission("admin"), 0);
}

TEST(ParseTexts, SectionsOfKeyToString) {
    WriteFile("/tmp/t/strings",
              "orphan=1\n[common]\na=A\n[player]\nb=\"B\"\n[common]\nc=C\na=A2\n");
    const Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts("/tmp/t");
    EXPECT_FALSE(texts.isMember("orphan"));
    EXPECT_EQ(texts["common"]["a"], "A2");
    EXPECT_EQ(texts["common"]["c"], "C");
    EXPECT_EQ(texts["player"]["b"], "B");
    EXPECT_EQ(texts.size(), 2u);
}

TEST(ParseTexts, MissingOrUnreadableGivesEmptyObject) {
    Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts("/tmp/nothing");
    EXPECT_TRUE(texts.isObject());
    EXPECT_EQ(texts.size(), 0u);
    harmona::test::MakeDirs("/tmp/d/strings");
    texts = VANU::ZET::LocalizedStringParser::ParseTexts("/tmp/d");
    EXPECT_TRUE(texts.isObject());
    EXPECT_EQ(texts.size(), 0u);
    // A missing member reads as an empty text.
    EXPECT_EQ(texts["common"]["x"].asString(), "");
}

// Every section and key that the tree and its replies use, in every shipped language, with a text
// of its own.
TEST(ShippedTexts, EveryLanguageHoldsEveryKeyTheTreeUses) {
    harmona::test::InstallTexts();
    const std::vector<std::pair<const char*, const char*>> keys = {
        {"playlist", "music_library"},
        {"playlist", "personal_playlist"},
        {"playlist", "shared_playlist"},
        {"player", "player_source_ipod"},
        {"radio", "radio"},
        {"common", "player_source_dms"},
        {"common", "error_system"},
        {"error", "Could not get the entry"},
        {"playlist", "error_create_random100"},
        {"common", "class_music_allmusic"},
        {"common", "class_music_userfile"},
        {"common", "class_music_album"},
        {"common", "class_music_artist"},
        {"common", "class_music_genre"},
        {"common", "random_playlist"},
        {"common", "class_music_latestalbum"},
        {"common", "btn_scan_dms"},
        {"player", "refresh_btn_title"},
        {"playlist", "newplaylist"},
        {"radio", "new_radio_title"},
        {"player", "player_source_shoutcast"},
        {"player", "player_source_radioio"},
        {"player", "player_source_userdefined"},
        {"player", "def_radio_station"}};
    const Json::Value english =
        VANU::ZET::LocalizedStringParser::ParseTexts(std::string(harmona::test::kTextsDir) + "enu");
    for (const char* lang : {"enu", "ger", "fre", "spn", "ita", "jpn", "chs", "cht"}) {
        const Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts(
            std::string(harmona::test::kTextsDir) + lang);
        for (const auto& [section, key] : keys) {
            EXPECT_FALSE(texts[section][key].asString().empty())
                << lang << " " << section << "/" << key;
        }
        // Translated: sentences differ from the English ones.
        if (std::string(lang) != "enu") {
            EXPECT_NE(texts["common"]["error_system"], english["common"]["error_system"]) << lang;
        }
    }
}

}  // namespace
