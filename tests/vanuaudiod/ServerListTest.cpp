// vanuaudiod's list of found servers: order, byebye, expiry, moved devices, failed descriptions.
#include <gtest/gtest.h>

#include <algorithm>

#include "services/vanuaudiod/ServerList.h"

using namespace harmona::vanuaudiod;

namespace {

MediaServer Described(const std::string& name) {
    return {"", name, "http://10.0.0.1/cd", "10.0.0.1"};
}

constexpr const char* kAnnouncer = "10.0.0.1";

// An announcement from kAnnouncer; true when it asks for a fetch.
bool Seen(ServerList& list, const std::string& udn, const std::string& location, int maxAge,
          Clock::time_point now) {
    return list.Seen(udn, location, kAnnouncer, maxAge, now) == SeenOutcome::fetch;
}

void Add(ServerList& list, const std::string& udn, const std::string& name, int maxAge,
         Clock::time_point now) {
    const std::string location = "http://10.0.0.1/" + udn;
    if (Seen(list, udn, location, maxAge, now))
        list.Described(udn, location, true, Described(name), now);
}

void Remove(ServerList& list, const std::string& udn) {
    MediaServer gone;
    list.Remove(udn, kAnnouncer, gone);
}

std::vector<std::string> Names(const ServerList& list) {
    std::vector<std::string> names;
    for (const MediaServer& server : *list.Snapshot())
        names.push_back(server.friendlyName + "/" + server.udn);
    return names;
}

}  // namespace

TEST(DaemonServerList, ListedByFriendlyNameThenUdn) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:3", "Bravo", 100, now);
    Add(list, "uuid:2", "Alpha", 100, now);
    Add(list, "uuid:1", "Bravo", 100, now);
    EXPECT_EQ(Names(list),
              (std::vector<std::string>{"Alpha/uuid:2", "Bravo/uuid:1", "Bravo/uuid:3"}));
}

TEST(DaemonServerList, OnlyDescribedDevicesAreListed) {
    ServerList list;
    const auto now = Clock::now();
    EXPECT_TRUE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now));
    EXPECT_TRUE(list.Snapshot()->empty());
    EXPECT_FALSE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now));  // fetch already pending
    list.Described("uuid:a", "http://10.0.0.1/a", true, Described("A"), now);
    EXPECT_EQ(list.Snapshot()->size(), 1u);
    EXPECT_FALSE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now));
}

TEST(DaemonServerList, ByebyeRemovesTheDevice) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    Add(list, "uuid:b", "B", 100, now);
    Remove(list, "uuid:a");
    EXPECT_EQ(Names(list), (std::vector<std::string>{"B/uuid:b"}));
}

TEST(DaemonServerList, DevicesExpireAfterTheirMaxAgeUnlessRenewed) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 10, now);
    Add(list, "uuid:b", "B", 10, now);
    EXPECT_FALSE(Seen(list, "uuid:b", "http://10.0.0.1/uuid:b", 10, now + std::chrono::seconds(8)));
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(9)).size(), 0u);
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(11)).size(), 1u);
    EXPECT_EQ(Names(list), (std::vector<std::string>{"B/uuid:b"}));
    EXPECT_EQ(list.Expire(now + std::chrono::seconds(19)).size(), 1u);
    EXPECT_TRUE(list.Snapshot()->empty());
}

TEST(DaemonServerList, MovedDeviceIsUnlistedUntilDescribedAgain) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    EXPECT_TRUE(Seen(list, "uuid:a", "http://10.0.0.2/new", 100, now));
    EXPECT_TRUE(list.Snapshot()->empty());
    // A late answer for the old location is ignored.
    list.Described("uuid:a", "http://10.0.0.1/uuid:a", true, Described("Old"), now);
    EXPECT_TRUE(list.Snapshot()->empty());
    list.Described("uuid:a", "http://10.0.0.2/new", true, Described("New"), now);
    EXPECT_EQ(Names(list), (std::vector<std::string>{"New/uuid:a"}));
}

TEST(DaemonServerList, FailedDescriptionIsRetriedOnlyAfterAPause) {
    ServerList list;
    const auto now = Clock::now();
    ASSERT_TRUE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now));
    list.Described("uuid:a", "http://10.0.0.1/a", false, {}, now);
    EXPECT_FALSE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now + std::chrono::seconds(1)));
    EXPECT_TRUE(Seen(list, "uuid:a", "http://10.0.0.1/a", 100, now + std::chrono::seconds(11)));
}

TEST(DaemonServerList, SnapshotTakenBeforeAChangeStaysAsItWas) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    const ServerSnapshot before = list.Snapshot();
    Remove(list, "uuid:a");
    EXPECT_EQ(before->size(), 1u);
    EXPECT_TRUE(list.Snapshot()->empty());
}

TEST(DaemonServerList, OneAddressHoldsAtMostSixteenDevices) {
    ServerList list;
    const auto now = Clock::now();
    for (std::size_t i = 0; i < kMaxDevicesPerAnnouncer; ++i) {
        const std::string udn = "uuid:flood-" + std::to_string(i);
        EXPECT_EQ(list.Seen(udn, "http://10.0.0.9/" + udn, "10.0.0.9", 86400, now),
                  SeenOutcome::fetch);
    }
    EXPECT_EQ(list.Seen("uuid:one-more", "http://10.0.0.9/x", "10.0.0.9", 86400, now),
              SeenOutcome::announcerFull);
    // Another host is not held back by it.
    EXPECT_TRUE(Seen(list, "uuid:real", "http://10.0.0.1/real", 100, now));
    EXPECT_EQ(list.KnownCount(), kMaxDevicesPerAnnouncer + 1);
}

TEST(DaemonServerList, DevicesWithoutADescriptionGiveTheirSlotsUpSoon) {
    ServerList list;
    const auto now = Clock::now();
    ASSERT_TRUE(Seen(list, "uuid:fake", "http://10.0.0.1/fake", 86400, now));
    list.Described("uuid:fake", "http://10.0.0.1/fake", false, {}, now);
    EXPECT_EQ(list.Expire(now + kUndescribedHold - std::chrono::seconds(1)).size(), 0u);
    EXPECT_TRUE(list.Knows("uuid:fake"));
    list.Expire(now + kUndescribedHold + std::chrono::seconds(1));
    EXPECT_FALSE(list.Knows("uuid:fake"));
    // A described server keeps its announced max-age.
    Add(list, "uuid:real", "Real", 600, now);
    list.Expire(now + std::chrono::seconds(300));
    EXPECT_TRUE(list.Knows("uuid:real"));
}

TEST(DaemonServerList, AFullTableMakesRoomForANewcomerByDroppingAnUndescribedDevice) {
    ServerList list;
    const auto now = Clock::now();
    for (std::size_t i = 0; i < kMaxKnownDevices; ++i) {
        const std::string host = "10.1." + std::to_string(i / 16) + ".1";
        const std::string udn = "uuid:fake-" + std::to_string(i);
        ASSERT_EQ(list.Seen(udn, "http://" + host + "/d", host, 86400, now), SeenOutcome::fetch);
        list.Described(udn, "http://" + host + "/d", false, {}, now);
    }
    EXPECT_EQ(list.KnownCount(), kMaxKnownDevices);
    EXPECT_TRUE(Seen(list, "uuid:real", "http://10.0.0.1/real", 100, now));
    EXPECT_EQ(list.KnownCount(), kMaxKnownDevices);
    list.Described("uuid:real", "http://10.0.0.1/real", true, Described("Real"), now);
    EXPECT_EQ(Names(list), (std::vector<std::string>{"Real/uuid:real"}));
}

TEST(DaemonServerList, AByebyeFromAnotherAddressIsIgnored) {
    ServerList list;
    const auto now = Clock::now();
    Add(list, "uuid:a", "A", 100, now);
    MediaServer gone;
    EXPECT_FALSE(list.Remove("uuid:a", "10.0.0.66", gone));
    EXPECT_EQ(Names(list), (std::vector<std::string>{"A/uuid:a"}));
    EXPECT_TRUE(list.Remove("uuid:a", kAnnouncer, gone));
    EXPECT_EQ(gone.friendlyName, "A");
}

TEST(DaemonServerList, ATableFullOfOneForgersServersMakesRoomForAServerOfAnotherHost) {
    ServerList list;
    const auto now = Clock::now();
    // 64 addresses announcing 16 described servers each: the whole table.
    for (std::size_t i = 0; i < kMaxKnownDevices; ++i) {
        const std::string host = "10.1." + std::to_string(i / kMaxDevicesPerAnnouncer) + ".1";
        const std::string udn = "uuid:forged-" + std::to_string(i);
        const std::string location = "http://" + host + "/" + udn;
        ASSERT_EQ(list.Seen(udn, location, host, 86400, now + std::chrono::seconds(i)),
                  SeenOutcome::fetch);
        list.Described(udn, location, true, Described("Forged"), now);
    }
    ASSERT_EQ(list.Snapshot()->size(), kMaxKnownDevices);
    EXPECT_TRUE(Seen(list, "uuid:real", "http://10.0.0.1/real", 1800, now));
    list.Described("uuid:real", "http://10.0.0.1/real", true, Described("Real"), now);
    EXPECT_EQ(list.KnownCount(), kMaxKnownDevices);
    EXPECT_TRUE(list.Knows("uuid:real"));
    const auto listed = list.Snapshot();
    EXPECT_TRUE(std::any_of(listed->begin(), listed->end(),
                            [](const MediaServer& s) { return s.friendlyName == "Real"; }));
    // The one dropped is the first to run out of the busiest address's devices, and it is told.
    EXPECT_FALSE(list.Knows("uuid:forged-0"));
    const std::vector<MediaServer> evicted = list.TakeEvicted();
    ASSERT_EQ(evicted.size(), 1u);
    EXPECT_EQ(evicted[0].udn, "uuid:forged-0");
    EXPECT_TRUE(list.TakeEvicted().empty());
    // The forger announcing it again pushes out no one: not the real server, whose address
    // announces fewer, nor another of its own addresses, which announce as many.
    EXPECT_EQ(list.Seen("uuid:forged-0", "http://10.1.0.1/uuid:forged-0", "10.1.0.1", 86400, now),
              SeenOutcome::tableFull);
    EXPECT_TRUE(list.Knows("uuid:real"));
    EXPECT_EQ(list.KnownCount(), kMaxKnownDevices);
}

TEST(DaemonServerList, ATableFullOfOneDevicePerAddressRefusesANewcomer) {
    ServerList list;
    const auto now = Clock::now();
    for (std::size_t i = 0; i < kMaxKnownDevices; ++i) {
        const std::string host = "10.2." + std::to_string(i / 250) + "." + std::to_string(i % 250);
        const std::string udn = "uuid:single-" + std::to_string(i);
        ASSERT_EQ(list.Seen(udn, "http://" + host + "/d", host, 86400, now), SeenOutcome::fetch);
        list.Described(udn, "http://" + host + "/d", true, Described("Single"), now);
    }
    EXPECT_EQ(list.Seen("uuid:late", "http://10.0.0.1/late", kAnnouncer, 1800, now),
              SeenOutcome::tableFull);
    EXPECT_EQ(list.KnownCount(), kMaxKnownDevices);
    EXPECT_TRUE(list.TakeEvicted().empty());
}
