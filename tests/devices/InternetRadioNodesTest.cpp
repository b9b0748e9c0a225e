// Internet radio nodes. The builder runs in the test process, where the array it appends to can be
// seen; the root tree shows it through a request and has tests of its own.
#include <gtest/gtest.h>

#include "tests/devices/DeviceTestSupport.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

class InternetRadioNodes : public ::testing::Test {
  protected:
    void SetUp() override { WriteDeviceFixture(); }

    Json::Value Children() {
        Json::Value children(Json::arrayValue);
        EXPECT_EQ(MakeHandler()->AddRadioChildren(children), 1);
        return children;
    }
};

TEST_F(InternetRadioNodes, TheRadioCategoryAlwaysHasFiveLeafChildrenInOrderUnderInetradioRoot) {
    const Json::Value children = Children();
    const std::vector<std::string> ids = {"inetradio_new", "inetradio_sc", "inetradio_rio",
                                          "inetradio_userdefined", "inetradio_favorite"};
    ASSERT_EQ(children.size(), ids.size()) << children.toStyledString();
    for (Json::ArrayIndex i = 0; i < children.size(); ++i) {
        const Json::Value& node = children[i];
        EXPECT_EQ(Text(node, "id"), ids[i]);
        EXPECT_EQ(Text(node, "pid"), "inetradio_root") << ids[i];
        EXPECT_TRUE(node["leaf"].asBool()) << ids[i];
        EXPECT_FALSE(node["draggable"].asBool()) << ids[i];
        EXPECT_FALSE(node["allowDrag"].asBool()) << ids[i];
        EXPECT_FALSE(node["allowDrop"].asBool()) << ids[i];
        EXPECT_FALSE(node["expanded"].asBool()) << ids[i];
    }
}

TEST_F(InternetRadioNodes, TheSourcesCarryTheirTextsAndTheInetradioIcon) {
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 5u);
    const char* texts[] = {kShoutcastText, kRadioIoText, kUserDefinedText, kFavoriteText};
    for (Json::ArrayIndex i = 1; i < 5; ++i) {
        EXPECT_EQ(Text(children[i], "text"), texts[i - 1]);
        EXPECT_EQ(Text(children[i], "qtip"), texts[i - 1]);
        EXPECT_EQ(Text(children[i], "icon"),
                  "3rdparty/Harmona/images/files_class/icon_inetradio.png");
    }
    EXPECT_EQ(Text(children[0], "icon"), "3rdparty/Harmona/images/button/btn_new_station.png");
}

TEST_F(InternetRadioNodes, TheFavouritesTakeTheirTextFromDefRadioStation) {
    // The fixture also holds "player_source_favorite" with another text: it must not be used.
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 5u);
    EXPECT_EQ(Text(children[4], "id"), "inetradio_favorite");
    EXPECT_EQ(Text(children[4], "text"), kFavoriteText);
}

TEST_F(InternetRadioNodes, TheButtonsTextComesFromSectionRadioAndTheSourcesFromSectionPlayer) {
    // Each section also holds the other's keys with a wrong text.
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 5u);
    EXPECT_EQ(Text(children[0], "text"), kNewStationText);
    EXPECT_EQ(Text(children[1], "text"), kShoutcastText);
    EXPECT_EQ(Text(children[4], "text"), kFavoriteText);
}

TEST_F(InternetRadioNodes, MissingTextsGiveEmptyTextsAndStillFiveChildren) {
    WriteFile(std::string(kTextsDir) + "enu/strings", "[other]\nkey=value\n");
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 5u);
    for (const Json::Value& node : children) {
        EXPECT_EQ(Text(node, "text"), "") << Text(node, "id");
        EXPECT_TRUE(Has(node, "text"));
    }
}

TEST_F(InternetRadioNodes, TextsAreHtmlEncodedAndTakenInTheUsersLanguage) {
    WriteFile(std::string(kTextsDir) + "ger/strings",
              "[radio]\nnew_radio_title=Neuer Sender & mehr\n[player]\n"
              "player_source_shoutcast=<SHOUTcast>\n");
    AddUser("admin", 1 | 4 | 8 | 16, "ger");
    const Json::Value children = Children();
    ASSERT_EQ(children.size(), 5u);
    EXPECT_EQ(Text(children[0], "text"), "Neuer Sender &amp; mehr");
    EXPECT_EQ(Text(children[1], "text"), "&lt;SHOUTcast&gt;");
    EXPECT_EQ(Text(children[2], "text"), "");
}

TEST_F(InternetRadioNodes, ChildrenAreAppendedAfterWhatTheArrayHolds) {
    Json::Value children(Json::arrayValue);
    children.append("earlier");
    EXPECT_EQ(MakeHandler()->AddRadioChildren(children), 1);
    ASSERT_EQ(children.size(), 6u);
    EXPECT_EQ(children[0].asString(), "earlier");
    EXPECT_EQ(Text(children[1], "id"), "inetradio_new");
}

}  // namespace
