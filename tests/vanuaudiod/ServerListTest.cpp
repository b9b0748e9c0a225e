// vanuaudiod's list of found servers: order, byebye, expiry, moved devices, failed descriptions.
#include <gtest/gtest.h>

#include "ServerList.h"

using namespace vanuaudiod;

namespace {

MediaServer Described(const std::string& name) {
    return {"", name, "http://10.0.0.1/cd", "10.0.0.1"};
}

void Add(ServerList& list, const std::string& udn, const std::string& name, int maxAge,
         Clock::time_point now) {
    const std::string location = "http://10.0.0.1/" + udn;
    if (list.Seen(udn, location, maxAge, now))
        list.Described(udn, location, true, Described(name), now);
}

std::vector<std::string> Names(const ServerList& list) {
    std::vector<std::string> names;
    for (const MediaServer& server : *list.Snapshot())
        names.push_back(server.friendlyName + "/" + server.udn);
    return names;
}

}  // namespace

TEST(Vanuaudiod_ServerList, ListedByFriendlyNameThenUdn) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:3", "Bravo", 100, now);
    Add(list, "uuid:2", "Alpha", 100, now);
    Add(list, "uuid:1", "Bravo", 100, now);
    EXPECT_EQ(Names(list),
              (std::vector<std::string>{"Alpha/uuid:2", "Bravo/uuid:1", "Bravo/uuid:3"}));
}

TEST(Vanuaudiod_ServerList, OnlyDescribedDevicesAreListed) {
    ServerList list;
    const auto now = Clock::now();
    EXPECT_TRUE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now));
    EXPECT_TRUE(list.Snapshot()->empty());
    EXPECT_FALSE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now));  // fetch already pending
    list.Described("uuid:a", "http://10.0.0.1/a", true, Described("A"), now);
    EXPECT_EQ(list.Snapshot()->size(), 1u);
    EXPECT_FALSE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now));
}

TEST(Vanuaudiod_ServerList, ByebyeRemovesTheDevice) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    Add(list, "uuid:b", "B", 100, now);
    list.Remove("uuid:a");
    EXPECT_EQ(Names(list), (std::vector<std::string>{"B/uuid:b"}));
}

TEST(Vanuaudiod_ServerList, DevicesExpireAfterTheirMaxAgeUnlessRenewed) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 10, now);
    Add(list, "uuid:b", "B", 10, now);
    EXPECT_FALSE(list.Seen("uuid:b", "http://10.0.0.1/uuid:b", 10, now + std::chrono::seconds(8)));
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(9)), 0);
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(11)), 1);
    EXPECT_EQ(Names(list), (std::vector<std::string>{"B/uuid:b"}));
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(19)), 1);
    EXPECT_TRUE(list.Snapshot()->empty());
}

TEST(Vanuaudiod_ServerList, MovedDeviceIsUnlistedUntilDescribedAgain) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    EXPECT_TRUE(list.Seen("uuid:a", "http://10.0.0.2/new", 100, now));
    EXPECT_TRUE(list.Snapshot()->empty());
    // A late answer for the old location is ignored.
    list.Described("uuid:a", "http://10.0.0.1/uuid:a", true, Described("Old"), now);
    EXPECT_TRUE(list.Snapshot()->empty());
    list.Described("uuid:a", "http://10.0.0.2/new", true, Described("New"), now);
    EXPECT_EQ(Names(list), (std::vector<std::string>{"New/uuid:a"}));
}

TEST(Vanuaudiod_ServerList, FailedDescriptionIsRetriedOnlyAfterAPause) {
    ServerList list;
    const auto now = Clock::now();
    ASSERT_TRUE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now));
    list.Described("uuid:a", "http://10.0.0.1/a", false, {}, now);
    EXPECT_FALSE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now + std::chrono::seconds(1)));
    EXPECT_TRUE(list.Seen("uuid:a", "http://10.0.0.1/a", 100, now + std::chrono::seconds(11)));
}

TEST(Vanuaudiod_ServerList, SnapshotTakenBeforeAChangeStaysAsItWas) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    const ServerSnapshot before = list.Snapshot();
    list.Remove("uuid:a");
    EXPECT_EQ(before->size(), 1u);
    EXPECT_TRUE(list.Snapshot()->empty());
}
