// iPod nodes over a scripted iPod library: keys longer than any real iPod's, and a library that
// fails after building a list. (Under AddressSanitizer a list that is not freed fails the run.)
#include <gtest/gtest.h>

#include "tests/devices/DeviceTestSupport.h"
#include "tests/devices/ScriptedIPodLibrary.h"

using namespace harmona::test;

namespace {

class IPodLibraryResults : public ::testing::Test {
  protected:
    void SetUp() override {
        WriteDeviceFixture();
        Script() = ScriptedIPod{};
    }
};

TEST_F(IPodLibraryResults, AKeyLongerThan4090CharactersIsCutToAnIdOf4095) {
    const std::string longKey(4300, 'k');
    const std::string fitting(4090, 'f');
    Script().records = {{"Long", longKey}, {"Fitting", fitting}, {"Over by one", fitting + "o"}};
    Json::Value items(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->ListIPodPlaylists(items), 3);
    ASSERT_EQ(items.size(), 3u);
    EXPECT_EQ(Text(items[0], "id"), "ipod_" + longKey.substr(0, 4090));
    EXPECT_EQ(Text(items[0], "id").size(), 4095u);
    EXPECT_EQ(Text(items[1], "id"), "ipod_" + fitting);
    EXPECT_EQ(Text(items[2], "id"), "ipod_" + fitting);
    EXPECT_EQ(Text(items[2], "text"), "Over by one");
}

TEST_F(IPodLibraryResults, AFailingLibraryGivesNoPlaylistNodesAndItsListIsFreed) {
    Script().result = -1;
    Script().records = {{"Left behind", "0000000000000001"}};
    Json::Value children(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->AddIPodChildren(children), 1);
    ASSERT_EQ(children.size(), 1u);
    EXPECT_EQ(Text(children[0], "id"), "ipod_refresh");
    EXPECT_EQ(Script().calls, 1);
    Json::Value items(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->ListIPodPlaylists(items), 0);
    EXPECT_EQ(items.size(), 0u);
}

TEST_F(IPodLibraryResults, AnyNonZeroResultIsAFailure) {
    Script().result = 1;
    Script().records = {{"Not listed", "00000000000000ff"}};
    Json::Value items(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->ListIPodPlaylists(items), 0);
    EXPECT_EQ(items.size(), 0u);
}

TEST_F(IPodLibraryResults, TheLibrarysOrderIsKeptWithoutSorting) {
    Script().records = {{"b", "2"}, {"A", "10"}, {"a", "1"}};
    Json::Value children(Json::arrayValue);
    EXPECT_EQ(MakeHandler()->AddIPodChildren(children), 1);
    ASSERT_EQ(children.size(), 4u);
    EXPECT_EQ(Text(children[1], "id"), "ipod_2");
    EXPECT_EQ(Text(children[2], "id"), "ipod_10");
    EXPECT_EQ(Text(children[3], "id"), "ipod_1");
}

}  // namespace
