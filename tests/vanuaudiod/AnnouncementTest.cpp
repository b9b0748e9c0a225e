// What vanuaudiod takes from one SSDP message, and which description locations it refuses to
// fetch: another host than the sender, loopback, multicast, broadcast, link-local beside
// routable addresses.
#include <gtest/gtest.h>

#include "services/vanuaudiod/Announcement.h"

using namespace harmona::vanuaudiod;

namespace {

constexpr const char* kType = "urn:schemas-upnp-org:device:MediaServer:1";

AnnouncerFacts From(const std::string& source) {
    AnnouncerFacts facts;
    facts.sourceAddress = source;
    facts.interfaceBroadcast = "10.77.0.255";
    return facts;
}

}  // namespace

TEST(ServerAnnouncement, AliveNotifyGivesUdnLocationAndMaxAge) {
    const std::string usn = std::string("uuid:abc::") + kType;
    const Announcement a = ReadAnnouncement(
        kType, "ssdp:alive", usn.c_str(), "http://10.0.0.2:8200/d.xml", "no-cache, max-age = 130");
    EXPECT_EQ(a.kind, AnnouncementKind::alive);
    EXPECT_EQ(a.udn, "uuid:abc");
    EXPECT_EQ(a.location, "http://10.0.0.2:8200/d.xml");
    EXPECT_EQ(a.maxAgeSeconds, 130);
}

TEST(ServerAnnouncement, SearchAnswersAndByebyesAndOtherTypes) {
    EXPECT_EQ(ReadAnnouncement("urn:schemas-upnp-org:device:MediaServer:4", nullptr, "uuid:x",
                               "http://10.0.0.2/", "max-age=60")
                  .kind,
              AnnouncementKind::alive);
    const Announcement bye = ReadAnnouncement(kType, "ssdp:byebye", "uuid:x::y", nullptr, nullptr);
    EXPECT_EQ(bye.kind, AnnouncementKind::byebye);
    EXPECT_EQ(bye.udn, "uuid:x");
    EXPECT_EQ(ReadAnnouncement("urn:schemas-upnp-org:device:MediaRenderer:1", "ssdp:alive",
                               "uuid:x", "http://10.0.0.2/", "max-age=60")
                  .kind,
              AnnouncementKind::other);
    EXPECT_EQ(ReadAnnouncement(kType, "ssdp:alive", "no-uuid", "http://10.0.0.2/", nullptr).kind,
              AnnouncementKind::other);
    EXPECT_EQ(ReadAnnouncement(kType, "ssdp:alive", "uuid:x", "http://10.0.0.2/a b", nullptr).kind,
              AnnouncementKind::other);
    EXPECT_EQ(ReadAnnouncement(kType, "ssdp:alive", "uuid:x", nullptr, nullptr).kind,
              AnnouncementKind::other);
}

TEST(ServerAnnouncement, ALocationOnTheSendersOwnAddressIsAccepted) {
    EXPECT_EQ(RefuseLocation("http://10.77.0.2:8200/rootDesc.xml", From("10.77.0.2")), "");
    EXPECT_EQ(RefuseLocation("http://[2001:db8::5]:80/d.xml", From("2001:db8::5")), "");
}

TEST(ServerAnnouncement, ALocationOnAnotherHostIsRefused) {
    EXPECT_NE(RefuseLocation("http://10.77.0.3/d.xml", From("10.77.0.2")), "");
    EXPECT_NE(RefuseLocation("http://127.0.0.1:631/", From("10.77.0.2")), "");
    EXPECT_NE(RefuseLocation("http://[::1]:8080/", From("10.77.0.2")), "");
    EXPECT_NE(RefuseLocation("http://printer.lan/", From("10.77.0.2")), "");
    EXPECT_NE(RefuseLocation("https://10.77.0.2/", From("10.77.0.2")), "");
    EXPECT_NE(RefuseLocation("http://user@10.77.0.2/", From("10.77.0.2")), "");
}

TEST(ServerAnnouncement,
     LoopbackMulticastBroadcastAndUnspecifiedAreRefusedEvenFromThemselves) {
    for (const char* address : {"127.0.0.1", "224.0.0.1", "239.255.255.250", "255.255.255.255",
                                "10.77.0.255", "0.0.0.0"}) {
        EXPECT_NE(RefuseLocation(std::string("http://") + address + "/d.xml", From(address)), "")
            << address;
    }
    EXPECT_NE(RefuseLocation("http://[::1]/d.xml", From("::1")), "");
    EXPECT_NE(RefuseLocation("http://[ff02::c]/d.xml", From("ff02::c")), "");
}

TEST(ServerAnnouncement, LinkLocalIsAcceptedOnlyOnALinkLocalOnlyInterface) {
    AnnouncerFacts facts = From("169.254.10.20");
    EXPECT_NE(RefuseLocation("http://169.254.10.20/d.xml", facts), "");
    facts.linkLocalAllowed = true;
    EXPECT_EQ(RefuseLocation("http://169.254.10.20/d.xml", facts), "");
    AnnouncerFacts v6 = From("fe80::2");
    EXPECT_NE(RefuseLocation("http://[fe80::2]/d.xml", v6), "");
}
