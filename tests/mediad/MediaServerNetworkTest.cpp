// harmona-mediad on a network that changes under it, heard from the other end of the link: after
// each fault (an interface that comes after the server, a link down and up, an address replaced in
// either order) an alive from the server reaches the peer and a search finds it within a stated
// time, and no byebye is sent while the server stays (a byebye makes every control point drop the
// server). Each test prints the time the peer waited.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <net/if.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <iostream>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "platform/lib/sqlite/Database.h"
#include "platform/paths/PlatformPaths.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Network.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

using Clock = std::chrono::steady_clock;

constexpr const char* kPeerSide = "192.0.2.2";
constexpr const char* kPeerInterface = "hm1";
constexpr int kRecoveryBoundMs = 5000;
// How long the test waits for its own lock on library.db (nobody else holds it).
constexpr int kLockWaitMs = 1000;

long MsSince(Clock::time_point start) {
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count());
}

std::string Header(const std::string& datagram, const std::string& name) {
    std::string lower = datagram;
    for (char& c : lower)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    std::string key = "\n" + name + ":";
    for (char& c : key)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    const std::size_t at = lower.find(key);
    if (at == std::string::npos)
        return "";
    std::size_t begin = at + key.size();
    while (begin < datagram.size() && datagram[begin] == ' ')
        ++begin;
    const std::size_t end = datagram.find('\r', begin);
    return datagram.substr(begin, end == std::string::npos ? std::string::npos : end - begin);
}

// Every SSDP NOTIFY that arrives on the peer's interface (hm1), with the time it came, heard by a
// thread from construction to destruction.
class SsdpRecorder {
  public:
    struct Notice {
        long atMs;
        std::string nts, location, usn;
    };

    SsdpRecorder() : start_(Clock::now()) {
        fd_ = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        const int yes = 1;
        setsockopt(fd_, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
        setsockopt(fd_, IPPROTO_IP, IP_PKTINFO, &yes, sizeof(yes));
        const int no = 0;
        setsockopt(fd_, IPPROTO_IP, IP_MULTICAST_ALL, &no, sizeof(no));
        sockaddr_in any{};
        any.sin_family = AF_INET;
        any.sin_port = htons(1900);
        bind(fd_, reinterpret_cast<sockaddr*>(&any), sizeof(any));
        Join();
        thread_ = std::thread([this] { Run(); });
    }
    ~SsdpRecorder() {
        stop_ = true;
        thread_.join();
        close(fd_);
    }
    // Joins the group on the peer's interface again (after that interface was down).
    void Join() {
        ip_mreqn join{};
        inet_pton(AF_INET, "239.255.255.250", &join.imr_multiaddr);
        join.imr_ifindex = static_cast<int>(if_nametoindex(kPeerInterface));
        setsockopt(fd_, IPPROTO_IP, IP_DROP_MEMBERSHIP, &join, sizeof(join));
        setsockopt(fd_, IPPROTO_IP, IP_ADD_MEMBERSHIP, &join, sizeof(join));
    }
    Clock::time_point start() const { return start_; }

    std::vector<Notice> Notices() {
        std::lock_guard<std::mutex> lock(mutex_);
        return notices_;
    }
    // The byebyes heard since `fromMs`.
    std::vector<Notice> ByeByes(long fromMs = 0) {
        std::vector<Notice> found;
        for (const Notice& notice : Notices()) {
            if (notice.atMs >= fromMs && notice.nts == "ssdp:byebye")
                found.push_back(notice);
        }
        return found;
    }
    // Waits until an alive whose location names `address` was heard at or after `fromMs`; its
    // time, or -1 after `waitMs`.
    long WaitForAlive(const std::string& address, long fromMs, int waitMs) {
        const auto deadline = Clock::now() + std::chrono::milliseconds(waitMs);
        while (Clock::now() < deadline) {
            for (const Notice& notice : Notices()) {
                if (notice.atMs >= fromMs && notice.nts == "ssdp:alive" &&
                    notice.location.find("http://" + address + ":50003/") != std::string::npos)
                    return notice.atMs;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
        }
        return -1;
    }

  private:
    void Run() {
        const unsigned peerIndex = if_nametoindex(kPeerInterface);
        while (!stop_) {
            pollfd entry{fd_, POLLIN, 0};
            if (poll(&entry, 1, 100) <= 0)
                continue;
            char buffer[2048];
            char control[256];
            iovec vector{buffer, sizeof(buffer)};
            msghdr message{};
            message.msg_iov = &vector;
            message.msg_iovlen = 1;
            message.msg_control = control;
            message.msg_controllen = sizeof(control);
            const ssize_t got = recvmsg(fd_, &message, 0);
            if (got <= 0)
                continue;
            unsigned arrivedOn = 0;
            for (cmsghdr* c = CMSG_FIRSTHDR(&message); c != nullptr; c = CMSG_NXTHDR(&message, c)) {
                if (c->cmsg_level == IPPROTO_IP && c->cmsg_type == IP_PKTINFO)
                    arrivedOn = static_cast<unsigned>(
                        reinterpret_cast<in_pktinfo*>(CMSG_DATA(c))->ipi_ifindex);
            }
            const std::string datagram(buffer, static_cast<std::size_t>(got));
            if (arrivedOn != peerIndex || datagram.compare(0, 6, "NOTIFY") != 0)
                continue;
            std::lock_guard<std::mutex> lock(mutex_);
            notices_.push_back(Notice{MsSince(start_), Header(datagram, "NTS"),
                                      Header(datagram, "Location"), Header(datagram, "USN")});
        }
    }

    Clock::time_point start_;
    int fd_ = -1;
    std::atomic<bool> stop_{false};
    std::mutex mutex_;
    std::vector<Notice> notices_;
    std::thread thread_;
};

// An M-SEARCH for media servers sent from the peer's address; whether an answer locating the
// server at `address` came within `waitMs`.
bool SearchFinds(const std::string& address, int waitMs) {
    const int s = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, kPeerSide, &local.sin_addr);
    bind(s, reinterpret_cast<sockaddr*>(&local), sizeof(local));
    setsockopt(s, IPPROTO_IP, IP_MULTICAST_IF, &local.sin_addr, sizeof(local.sin_addr));
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    const std::string search =
        "M-SEARCH * HTTP/1.1\r\nHost: 239.255.255.250:1900\r\nMan: \"ssdp:discover\"\r\nMX: 1\r\n"
        "ST: urn:schemas-upnp-org:device:MediaServer:1\r\n\r\n";
    bool found = false;
    const auto deadline = Clock::now() + std::chrono::milliseconds(waitMs);
    auto nextSearch = Clock::now();
    while (!found && Clock::now() < deadline) {
        if (Clock::now() >= nextSearch) {
            sendto(s, search.data(), search.size(), 0, reinterpret_cast<sockaddr*>(&group),
                   sizeof(group));
            nextSearch = Clock::now() + std::chrono::milliseconds(1200);
        }
        pollfd entry{s, POLLIN, 0};
        if (poll(&entry, 1, 100) <= 0)
            continue;
        char buffer[2048];
        const ssize_t got = recv(s, buffer, sizeof(buffer), 0);
        const std::string answer(buffer, got > 0 ? static_cast<std::size_t>(got) : 0);
        found = answer.find("http://" + address + ":50003/") != std::string::npos;
    }
    close(s);
    return found;
}

std::string Describe(const std::vector<SsdpRecorder::Notice>& notices) {
    std::string text;
    for (const auto& notice : notices)
        text += std::to_string(notice.atMs) + " ms " + notice.nts + " " + notice.usn + " " +
                notice.location + "\n";
    return text;
}

bool Shell(const std::string& command) {
    return std::system(command.c_str()) == 0;
}

class MediaServerOnAChangingNetwork : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_NO_FATAL_FAILURE(IndexStandardShare()); }

    // The server on the network (made first); true once an alive was heard on the peer's side.
    bool StartOnTheNetwork(SsdpRecorder& recorder) {
        if (!server_.Start())
            return false;
        return recorder.WaitForAlive("192.0.2.1", 0, 10000) >= 0;
    }

    // After a fault at `faultMs`: the time (from the fault) until the peer heard an alive naming
    // `address`, its search found the server there, and no byebye came since `quietFromMs`
    // through `watchMs` after the fault.
    void ExpectRecovered(SsdpRecorder& recorder, const std::string& address, long faultMs,
                         long quietFromMs, const char* fault) {
        const long alive = recorder.WaitForAlive(address, faultMs, kRecoveryBoundMs);
        EXPECT_GE(alive, 0) << "no alive from " << address << " within " << kRecoveryBoundMs
                            << " ms of: " << fault;
        EXPECT_TRUE(SearchFinds(address, kRecoveryBoundMs))
            << "a search from the peer did not find the server at " << address
            << " after: " << fault << "\n"
            << ReadFile("/tmp/harmona-mediad.log");
        if (alive >= 0)
            std::cout << "[ recovery ] " << fault << ": alive heard " << alive - faultMs
                      << " ms after the fault\n";
        // Past the announcements that follow a return (3 and 10 s later).
        std::this_thread::sleep_for(std::chrono::milliseconds(11000));
        const auto byebyes = recorder.ByeByes(quietFromMs);
        EXPECT_TRUE(byebyes.empty()) << byebyes.size() << " byebye(s) while the server stayed, "
                                     << "after: " << fault << "\n"
                                     << Describe(recorder.Notices());
    }

    ServerProcess server_;
};

TEST_F(MediaServerOnAChangingNetwork, AnnouncementsAfterStartAreAliveOnly) {
    SetUpNetwork();
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder)) << Describe(recorder.Notices());
    // The start and the announcements at 3 and 10 s.
    std::this_thread::sleep_for(std::chrono::milliseconds(11500));
    const auto notices = recorder.Notices();
    std::size_t alives = 0;
    for (const auto& notice : notices)
        alives += notice.nts == "ssdp:alive" ? 1 : 0;
    EXPECT_GE(alives, 3u) << Describe(notices);
    EXPECT_TRUE(recorder.ByeByes().empty()) << Describe(notices);
}

TEST_F(MediaServerOnAChangingNetwork, ALinkDownAndUpIsAnnouncedAgainWithoutAByebye) {
    SetUpNetwork();
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder)) << Describe(recorder.Notices());
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const long quietFrom = MsSince(recorder.start());
    ASSERT_TRUE(Shell("ip link set hm0 down"));
    std::this_thread::sleep_for(std::chrono::seconds(2));
    ASSERT_TRUE(Shell("ip link set hm0 up"));
    const long up = MsSince(recorder.start());
    recorder.Join();
    ExpectRecovered(recorder, "192.0.2.1", up, quietFrom, "link down for 2 s, then up");
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
}

TEST_F(MediaServerOnAChangingNetwork, ANewAddressAddedBeforeTheOldGoesIsServedAndAnnounced) {
    SetUpNetwork();
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder)) << Describe(recorder.Notices());
    // As DHCP clients and systemd hosts have it: the new address outlives the old one.
    ASSERT_TRUE(Shell("echo 1 > /proc/sys/net/ipv4/conf/hm0/promote_secondaries"));
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const long quietFrom = MsSince(recorder.start());
    ASSERT_TRUE(Shell("ip addr add 192.0.2.3/24 dev hm0"));
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    ASSERT_TRUE(Shell("ip addr del 192.0.2.1/24 dev hm0"));
    const long changed = MsSince(recorder.start());
    ExpectRecovered(recorder, "192.0.2.3", changed, quietFrom,
                    "new address added, then the old one removed");
}

TEST_F(MediaServerOnAChangingNetwork, AnAddressReplacedOldFirstIsServedAndAnnounced) {
    SetUpNetwork();
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder)) << Describe(recorder.Notices());
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const long quietFrom = MsSince(recorder.start());
    ASSERT_TRUE(Shell("ip addr del 192.0.2.1/24 dev hm0"));
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    ASSERT_TRUE(Shell("ip addr add 192.0.2.3/24 dev hm0"));
    const long changed = MsSince(recorder.start());
    ExpectRecovered(recorder, "192.0.2.3", changed, quietFrom,
                    "old address removed, then a new one added");
}

TEST_F(MediaServerOnAChangingNetwork, AnInterfaceMadeAfterTheServerStartedIsAnnounced) {
    ASSERT_TRUE(server_.Start());
    std::this_thread::sleep_for(std::chrono::seconds(1));
    SetUpNetwork();
    SsdpRecorder recorder;
    ExpectRecovered(recorder, "192.0.2.1", 0, 0, "the interface created after the server started");
}

TEST_F(MediaServerOnAChangingNetwork, AnInterfaceThatWasDownAtStartIsAnnouncedWhenItComesUp) {
    SetUpNetwork();
    ASSERT_TRUE(Shell("ip link set hm0 down"));
    ASSERT_TRUE(server_.Start());
    std::this_thread::sleep_for(std::chrono::seconds(1));
    SsdpRecorder recorder;
    ASSERT_TRUE(Shell("ip link set hm0 up"));
    recorder.Join();
    ExpectRecovered(recorder, "192.0.2.1", MsSince(recorder.start()), 0,
                    "the interface down at start, then up");
}

// SSDP leaves by the interface's address, which needs no multicast route: a host whose multicast
// route goes away (a network manager rewriting the table) and comes back keeps the server
// found, with no byebye and no warning.
TEST_F(MediaServerOnAChangingNetwork, AMulticastRouteLostAndBackKeepsTheServerFound) {
    SetUpNetwork();  // with a route for 239.0.0.0/8 through hm0
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder)) << Describe(recorder.Notices());
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const long quietFrom = MsSince(recorder.start());
    ASSERT_TRUE(Shell("ip route del 239.0.0.0/8 dev hm0"));
    ASSERT_FALSE(Shell("ip route get 239.255.255.250 >/dev/null 2>&1"));
    ExpectRecovered(recorder, "192.0.2.1", MsSince(recorder.start()), quietFrom,
                    "the multicast route removed");
    ASSERT_TRUE(Shell("ip route add 239.0.0.0/8 dev hm0"));
    EXPECT_TRUE(SearchFinds("192.0.2.1", kRecoveryBoundMs)) << "after the route came back";
    const std::string log = ReadFile("/tmp/harmona-mediad.log");
    EXPECT_EQ(log.find("cannot leave"), std::string::npos) << log;
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
}

// A start on a healthy host prints nothing that reads like a fault: no GLib warning about a port
// in use (the server's own loopback port, tried twice).
TEST_F(MediaServerOnAChangingNetwork, AStartPrintsNoWarningAboutItsOwnPort) {
    SetUpNetwork();
    SsdpRecorder recorder;
    ASSERT_TRUE(StartOnTheNetwork(recorder));
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const std::string log = ReadFile("/tmp/harmona-mediad.log");
    EXPECT_EQ(log.find("Address already in use"), std::string::npos) << log;
    EXPECT_EQ(log.find("Unable to listen"), std::string::npos) << log;
    EXPECT_EQ(log.find("WARNING"), std::string::npos) << log;
}

// The indexer holding library.db locked as the server starts keeps its loop waiting for the load
// for seconds; the server still binds its own loopback port once.
TEST_F(MediaServerOnAChangingNetwork, AStartThatWaitsSecondsForTheLibraryPrintsNoWarningAboutItsOwnPort) {
    SetUpNetwork();
    sqlite::Database writer =
        sqlite::Database::Open(paths::kLibraryDb, SQLITE_OPEN_READWRITE, kLockWaitMs);
    ASSERT_TRUE(writer);
    ASSERT_EQ(writer.Execute("BEGIN EXCLUSIVE"), SQLITE_OK);
    std::thread release([&writer] {
        std::this_thread::sleep_for(std::chrono::seconds(3));
        writer.Execute("COMMIT");
    });
    SsdpRecorder recorder;
    const bool started = StartOnTheNetwork(recorder);
    release.join();
    ASSERT_TRUE(started) << Describe(recorder.Notices());
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const std::string log = ReadFile("/tmp/harmona-mediad.log");
    EXPECT_EQ(log.find("Address already in use"), std::string::npos) << log;
    EXPECT_EQ(log.find("Unable to listen"), std::string::npos) << log;
}

// Requests whose body is too large, of unstated size or out of place are answered from their
// headers, at once, and the server goes on serving.
class MediaServerRequestBodies : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(IndexStandardShare());
        ASSERT_TRUE(server_.Start());
    }
    // The status of the answer to `head` followed by 64 KiB of body, read within 2 s; -1 if none.
    static int StatusOf(const std::string& head) {
        const std::string answer =
            RawHttpExchange("127.0.0.1", 50003, head + std::string(64 * 1024, 'x'), 2000);
        if (answer.compare(0, 9, "HTTP/1.1 ") != 0)
            return -1;
        return std::atoi(answer.c_str() + 9);
    }
    ServerProcess server_;
};

TEST_F(MediaServerRequestBodies, A300MebibytePostIsRefusedFromItsHeaders) {
    for (const char* path : {"/ContentDirectory/control", "/ConnectionManager/control",
                             "/ContentDirectory/event", "/media/1.mp3", "/"}) {
        SCOPED_TRACE(path);
        EXPECT_EQ(
            StatusOf(std::string("POST ") + path +
                     " HTTP/1.1\r\nHost: 127.0.0.1:50003\r\nContent-Type: text/xml\r\n"
                     "SOAPACTION: \"urn:schemas-upnp-org:service:ContentDirectory:1#Browse\"\r\n"
                     "Content-Length: 314572800\r\n\r\n"),
            413);
    }
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
}

TEST_F(MediaServerRequestBodies, AChunkedPostIsAskedForItsLength) {
    EXPECT_EQ(StatusOf("POST /ContentDirectory/control HTTP/1.1\r\nHost: 127.0.0.1:50003\r\n"
                       "Transfer-Encoding: chunked\r\n\r\n10000\r\n"),
              411);
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
}

TEST_F(MediaServerRequestBodies, AGetOrHeadWithABodyIsRefused) {
    for (const char* method : {"GET", "HEAD"}) {
        SCOPED_TRACE(method);
        EXPECT_EQ(StatusOf(std::string(method) +
                           " /ContentDirectory.xml HTTP/1.1\r\nHost: 127.0.0.1:50003\r\n"
                           "Content-Length: 1048576\r\n\r\n"),
                  400);
    }
    EXPECT_EQ(SoapBrowse("0").entries.size(), 7u);
}

TEST_F(MediaServerRequestBodies, AnOrdinaryActionStillWorks) {
    EXPECT_NE(SoapSimpleAction("GetSystemUpdateID", "Id"), "<failed>");
    EXPECT_EQ(SoapBrowse("0").httpStatus, 200);
}

// Event subscriptions from the LAN: one host holds a few of them at most, so that the others
// still get theirs.
class MediaServerLanSubscriptions : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(IndexStandardShare());
        SetUpNetwork();
        ASSERT_TRUE(Shell("ip addr add 192.0.2.4/24 dev hm1"));
        ASSERT_TRUE(server_.Start());
        std::string description;
        for (int i = 0; i < 100 && description.find(" 200 ") == std::string::npos; ++i) {
            description = RawHttpExchange("192.0.2.1", 50003,
                                          "GET /ContentDirectory.xml HTTP/1.1\r\nHost: "
                                          "192.0.2.1:50003\r\nConnection: close\r\n\r\n",
                                          1000);
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
        }
        ASSERT_NE(description.find(" 200 "), std::string::npos) << "the LAN side never served";
    }
    // A SUBSCRIBE from `peer` with a callback on `peer`; the answer's status, -1 if none.
    static int Subscribe(const std::string& peer) {
        const std::string request =
            "SUBSCRIBE /ContentDirectory/event HTTP/1.1\r\nHOST: 192.0.2.1:50003\r\n"
            "CALLBACK: <http://" +
            peer + ":9/>\r\nNT: upnp:event\r\nTIMEOUT: Second-1800\r\nContent-Length: 0\r\n\r\n";
        const std::string answer = RawHttpExchange("192.0.2.1", 50003, request, 3000, peer);
        if (answer.compare(0, 9, "HTTP/1.1 ") != 0)
            return -1;
        return std::atoi(answer.c_str() + 9);
    }
    ServerProcess server_;
};

TEST_F(MediaServerLanSubscriptions, OneHostHoldsEightAndAnotherStillGetsItsOwn) {
    int accepted = 0;
    int refused = 0;
    for (int i = 0; i < 12; ++i) {
        const int status = Subscribe(kPeerSide);
        accepted += status == 200 ? 1 : 0;
        refused += status == 503 ? 1 : 0;
    }
    EXPECT_EQ(accepted, 8);
    EXPECT_EQ(refused, 4);
    EXPECT_EQ(Subscribe("192.0.2.4"), 200);
}

}  // namespace
}  // namespace harmona::test::mediad
