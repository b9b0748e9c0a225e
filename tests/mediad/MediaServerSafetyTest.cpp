// harmona-mediad against requests a hostile host or local user can send, and against a share
// that changes under it: the server stays up and serving, sends no NOTIFY where the subscriber
// has no business sending it, serves nothing outside the share and no longer runs as root.
#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <pwd.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "services/harmona-mediad/ShareFile.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

constexpr const char* kEventPath = "/ContentDirectory/event";

std::string GenaRequest(const std::string& method, const std::string& host,
                        const std::string& extraHeaders) {
    return method + " " + kEventPath + " HTTP/1.1\r\nHOST: " + host + ":50003\r\n" + extraHeaders +
           "Content-Length: 0\r\n\r\n";
}

int StatusOf(const std::string& response) {
    if (response.compare(0, 9, "HTTP/1.1 ") != 0 && response.compare(0, 9, "HTTP/1.0 ") != 0)
        return -1;
    return std::atoi(response.c_str() + 9);
}

// The ContentDirectory description fetched from the LAN address, retried for up to 10 s while
// the server has not taken up the interface yet; the last response.
std::string WaitForTheLanSide() {
    std::string description;
    for (int i = 0; i < 100 && StatusOf(description) != 200; ++i) {
        description = RawHttpExchange("192.0.2.1", 50003,
                                      "GET /ContentDirectory.xml HTTP/1.1\r\nHost: 192.0.2.1:50003"
                                      "\r\nConnection: close\r\n\r\n",
                                      1000);
        if (StatusOf(description) != 200)
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
    return description;
}

// A TCP listener that counts the requests (NOTIFY or any other) it receives.
class CallbackListener {
  public:
    explicit CallbackListener(const std::string& address) {
        fd_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
        sockaddr_in local{};
        local.sin_family = AF_INET;
        inet_pton(AF_INET, address.c_str(), &local.sin_addr);
        bind(fd_, reinterpret_cast<sockaddr*>(&local), sizeof(local));
        listen(fd_, 8);
        socklen_t length = sizeof(local);
        getsockname(fd_, reinterpret_cast<sockaddr*>(&local), &length);
        port_ = ntohs(local.sin_port);
    }
    ~CallbackListener() { close(fd_); }
    unsigned short port() const { return port_; }

    // The text of the first request that arrives within `waitMs`; "" when none does.
    std::string WaitForRequest(int waitMs) {
        pollfd pfd{fd_, POLLIN, 0};
        if (poll(&pfd, 1, waitMs) <= 0)
            return "";
        const int connection = accept4(fd_, nullptr, nullptr, SOCK_CLOEXEC);
        if (connection < 0)
            return "";
        std::string text;
        pollfd cfd{connection, POLLIN, 0};
        while (text.find("</e:propertyset>") == std::string::npos && poll(&cfd, 1, 2000) > 0) {
            char buffer[4096];
            const ssize_t got = recv(connection, buffer, sizeof(buffer), 0);
            if (got <= 0)
                break;
            text.append(buffer, static_cast<std::size_t>(got));
        }
        const std::string ok = "HTTP/1.1 200 OK\r\nContent-Length: 0\r\n\r\n";
        send(connection, ok.data(), ok.size(), MSG_NOSIGNAL);
        close(connection);
        return text;
    }

  private:
    int fd_ = -1;
    unsigned short port_ = 0;
};

class MediaServerSafety : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(IndexStandardShare());
        ASSERT_TRUE(server_.Start()) << "harmona-mediad did not come up";
    }
    bool StillServes() {
        const BrowseReply root = SoapBrowse("0");
        return root.httpStatus == 200 && root.entries.size() == 7;
    }
    // A subscription to ContentDirectory's events with `listener` (on 127.0.0.1) as the callback;
    // the server's answer.
    static std::string SubscribeOnLoopback(const CallbackListener& listener) {
        const std::string callback =
            "CALLBACK: <http://127.0.0.1:" + std::to_string(listener.port()) + "/>\r\n";
        return RawHttpExchange("127.0.0.1", 50003,
                               GenaRequest("SUBSCRIBE", "127.0.0.1",
                                           callback + "NT: upnp:event\r\nTIMEOUT: Second-300\r\n"));
    }
    // The library changes: a new file (a second after the last change, so that its time differs),
    // indexed.
    static void AddATrackAndIndex() {
        std::this_thread::sleep_for(std::chrono::milliseconds(1100));
        MakeAudioFile(std::string(kShare) + "/New/added.flac",
                      {"Added", "Band A", "", "", "", 0, 0, 0});
        ASSERT_EQ(RunIndexer().exitStatus, 0);
    }
    ServerProcess server_;
};

TEST_F(MediaServerSafety, SubscribeAndUnsubscribeWithASidLeaveTheServerServing) {
    const std::string sid = "SID: uuid:00000000-0000-0000-0000-000000000000\r\n";
    for (const std::string& path : {std::string(kEventPath), std::string("/")}) {
        for (const char* method : {"SUBSCRIBE", "UNSUBSCRIBE"}) {
            SCOPED_TRACE(std::string(method) + " " + path);
            std::string request = GenaRequest(method, "127.0.0.1", sid);
            request.replace(request.find(kEventPath), std::strlen(kEventPath), path);
            const std::string answer = RawHttpExchange("127.0.0.1", 50003, request);
            EXPECT_GE(StatusOf(answer), 400) << answer;  // no such subscription
            // With a callback and a SID together, as the crashing packet had it.
            const std::string both = GenaRequest(
                method, "127.0.0.1", sid + "CALLBACK: <http://127.0.0.1:9/>\r\nNT: upnp:event\r\n");
            EXPECT_GE(StatusOf(RawHttpExchange("127.0.0.1", 50003, both)), 400);
        }
    }
    EXPECT_TRUE(StillServes());
    EXPECT_EQ(server_.Stop(), 0);  // the same process ran all along
}

TEST_F(MediaServerSafety, ACallbackOnTheSubscribersOwnAddressHearsTheInitialStateAndEachChange) {
    CallbackListener listener("127.0.0.1");
    const std::string answer = SubscribeOnLoopback(listener);
    EXPECT_EQ(StatusOf(answer), 200) << answer;
    EXPECT_NE(answer.find("SID: uuid:"), std::string::npos) << answer;
    const std::string notify = listener.WaitForRequest(5000);
    EXPECT_EQ(notify.rfind("NOTIFY ", 0), 0u) << notify;
    EXPECT_NE(notify.find("SEQ: 0"), std::string::npos) << notify;
    EXPECT_NE(notify.find("<SystemUpdateID>"), std::string::npos) << notify;
    // The library changes; the subscriber hears of it.
    ASSERT_NO_FATAL_FAILURE(AddATrackAndIndex());
    const std::string updated = SoapSimpleAction("GetSystemUpdateID", "Id");
    const std::string change = listener.WaitForRequest(10000);
    EXPECT_EQ(change.rfind("NOTIFY ", 0), 0u) << change;
    EXPECT_NE(change.find("SEQ: 1"), std::string::npos) << change;
    EXPECT_NE(change.find("<SystemUpdateID>" + updated + "<"), std::string::npos) << change;
}

TEST_F(MediaServerSafety, ALibraryChangeReachesASubscriberAsOneNotifyWithBothVariables) {
    CallbackListener listener("127.0.0.1");
    const std::string answer = SubscribeOnLoopback(listener);
    ASSERT_EQ(StatusOf(answer), 200) << answer;
    ASSERT_EQ(listener.WaitForRequest(5000).rfind("NOTIFY ", 0), 0u);  // the initial state
    ASSERT_NO_FATAL_FAILURE(AddATrackAndIndex());
    const std::string change = listener.WaitForRequest(10000);
    EXPECT_EQ(change.rfind("NOTIFY ", 0), 0u) << change;
    EXPECT_NE(change.find("SEQ: 1"), std::string::npos) << change;
    EXPECT_NE(change.find("<SystemUpdateID>"), std::string::npos) << change;
    EXPECT_NE(change.find("<ContainerUpdateIDs>"), std::string::npos) << change;
    EXPECT_EQ(listener.WaitForRequest(2000), "") << "a second NOTIFY for the same change";
}

TEST_F(MediaServerSafety, ALoopbackCallbackFromALanAddressIsRefusedAndNothingIsSentThere) {
    SetUpNetwork();
    // Wait until the LAN side serves (the interface came after the server).
    std::string probe;
    for (int i = 0; i < 100 && StatusOf(probe) <= 0; ++i) {
        probe = RawHttpExchange("192.0.2.1", 50003, GenaRequest("UNSUBSCRIBE", "192.0.2.1", ""),
                                500, "192.0.2.2");
        if (StatusOf(probe) <= 0)
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
    ASSERT_GT(StatusOf(probe), 0) << "the LAN side never answered";
    CallbackListener loopbackOnly("127.0.0.1");
    const std::string callback =
        "CALLBACK: <http://127.0.0.1:" + std::to_string(loopbackOnly.port()) + "/>\r\n";
    const std::string answer = RawHttpExchange(
        "192.0.2.1", 50003, GenaRequest("SUBSCRIBE", "192.0.2.1", callback + "NT: upnp:event\r\n"),
        3000, "192.0.2.2");
    EXPECT_EQ(StatusOf(answer), 412) << answer;
    EXPECT_EQ(loopbackOnly.WaitForRequest(3000), "");
    // A third host's address is refused the same way.
    const std::string third =
        RawHttpExchange("192.0.2.1", 50003,
                        GenaRequest("SUBSCRIBE", "192.0.2.1",
                                    "CALLBACK: <http://192.0.2.77:8080/>\r\nNT: upnp:event\r\n"),
                        3000, "192.0.2.2");
    EXPECT_EQ(StatusOf(third), 412) << third;
    EXPECT_TRUE(StillServes());
}

TEST_F(MediaServerSafety, SubscriptionsAreBoundedInNumber) {
    CallbackListener listener("127.0.0.1");
    const std::string request =
        GenaRequest("SUBSCRIBE", "127.0.0.1",
                    "CALLBACK: <http://127.0.0.1:" + std::to_string(listener.port()) +
                        "/>\r\nNT: upnp:event\r\n");
    int accepted = 0;
    int refused = 0;
    for (int i = 0; i < 40; ++i) {
        // A generous wait: under a sanitizer and a parallel run one reply once took over 3 s.
        const int status = StatusOf(RawHttpExchange("127.0.0.1", 50003, request, 15000));
        accepted += status == 200;
        refused += status == 503;
    }
    EXPECT_EQ(accepted, 32);
    EXPECT_EQ(refused, 8);
    EXPECT_TRUE(StillServes());
}

TEST_F(MediaServerSafety, AFolderSwappedForASymlinkServesNothingOutsideTheShare) {
    const BrowseReply all = SoapBrowse("music_all");
    std::string res;
    for (const DidlEntry& entry : all.entries) {
        if (entry.title == "Fourth")
            res = entry.res;
    }
    ASSERT_FALSE(res.empty()) << all.raw;
    ASSERT_EQ(HttpGet(res).status, 200);
    // The indexed folder becomes a link to a folder outside the share holding a secret under the
    // indexed file's name. The folder itself goes out of the share too (onto the same file system):
    // moved inside it, the server's watch would find the file at its new place and go on serving it
    // by the same id, whichever came first, the request or the watch.
    mkdir("/tmp/outside", 0700);
    WriteFile("/tmp/outside/04 Fourth.wav", "SECRET-OUTSIDE-THE-SHARE");
    const std::string folder = std::string(kShare) + "/Jazz/Blue";
    const std::string aside = "/volume1/Blue.moved";
    ASSERT_EQ(rename(folder.c_str(), aside.c_str()), 0) << std::strerror(errno);
    ASSERT_EQ(symlink("/tmp/outside", folder.c_str()), 0);
    const HttpReply reply = HttpGet(res);
    EXPECT_EQ(reply.status, 404);
    EXPECT_EQ(reply.body.find("SECRET"), std::string::npos);
    // A link as the file itself is refused too.
    ASSERT_EQ(unlink(folder.c_str()), 0);
    ASSERT_EQ(rename(aside.c_str(), folder.c_str()), 0);
    const std::string file = folder + "/04 Fourth.wav";
    ASSERT_EQ(unlink(file.c_str()), 0);
    ASSERT_EQ(symlink("/tmp/outside/04 Fourth.wav", file.c_str()), 0);
    EXPECT_EQ(HttpGet(res).status, 404);
    EXPECT_TRUE(StillServes());
}

TEST_F(MediaServerSafety, AResourceCarriesTheDlnaHeadersAndAnUnsatisfiableRangeGets416) {
    const BrowseReply all = SoapBrowse("music_all");
    ASSERT_FALSE(all.entries.empty());
    const std::string res = all.entries[0].res;
    const HttpReply part = HttpGet(res, "0-9");
    EXPECT_EQ(part.status, 206);
    EXPECT_EQ(part.body.size(), 10u);
    EXPECT_NE(part.headers.find("contentFeatures.dlna.org: DLNA.ORG_OP=01"), std::string::npos)
        << part.headers;
    EXPECT_NE(part.headers.find("Content-Range: bytes 0-9/"), std::string::npos) << part.headers;
    EXPECT_EQ(HttpGet(res, "999999999-").status, 416);
    EXPECT_TRUE(StillServes());
}

TEST_F(MediaServerSafety, TheServerNoLongerRunsAsRoot) {
    // The process started keeps the pid file; the one that serves is its child.
    const std::string children = ReadFile("/proc/" + std::to_string(server_.pid()) + "/task/" +
                                          std::to_string(server_.pid()) + "/children");
    ASSERT_FALSE(children.empty());
    const std::string status =
        ReadFile("/proc/" + std::to_string(std::atol(children.c_str())) + "/status");
    const std::size_t uid = status.find("Uid:");
    ASSERT_NE(uid, std::string::npos);
    // The library's own account, never root and never a shared one such as "nobody".
    const passwd* account = getpwnam("harmona");
    ASSERT_NE(account, nullptr);
    const std::string id = std::to_string(account->pw_uid);
    EXPECT_EQ(status.substr(uid, status.find('\n', uid) - uid),
              "Uid:\t" + id + "\t" + id + "\t" + id + "\t" + id);
    EXPECT_NE(account->pw_uid, 65534u);
}

TEST_F(MediaServerSafety, TheServingProcessEndsWhenThePidFileKeeperIsKilled) {
    const std::string children = ReadFile("/proc/" + std::to_string(server_.pid()) + "/task/" +
                                          std::to_string(server_.pid()) + "/children");
    const pid_t serving = static_cast<pid_t>(std::atol(children.c_str()));
    ASSERT_GT(serving, 0);
    ASSERT_EQ(kill(server_.pid(), SIGKILL), 0);
    bool gone = false;
    for (int i = 0; i < 100 && !gone; ++i) {
        const std::string status = ReadFile("/proc/" + std::to_string(serving) + "/status");
        gone = status.empty() || status.find("State:\tZ") != std::string::npos;
        if (!gone)
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
    EXPECT_TRUE(gone) << "the server outlived its parent";
    server_.Stop();  // reaps the killed parent
}

TEST_F(MediaServerSafety, AServerStartedBeforeItsInterfaceHasAnAddressServesOnceItArrives) {
    // The interface exists and is up but has no address yet (a DHCP client still asking).
    std::system(
        "ip link add hm0 type veth peer name hm1 && "
        "echo 1 > /proc/sys/net/ipv6/conf/hm0/disable_ipv6 && "
        "echo 1 > /proc/sys/net/ipv6/conf/hm1/disable_ipv6 && "
        "ip link set hm0 up && ip link set hm1 up");
    std::this_thread::sleep_for(std::chrono::seconds(1));
    EXPECT_TRUE(StillServes());
    std::system("ip addr add 192.0.2.1/24 dev hm0");
    const std::string description = WaitForTheLanSide();
    EXPECT_EQ(StatusOf(description), 200) << description;
    EXPECT_NE(description.find("<name>Browse</name>"), std::string::npos);
}

// Waits up to `ms` for a log line holding one of `texts`; the line found, or "".
std::string WaitForLogLine(const std::vector<std::string>& texts, int ms) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    while (std::chrono::steady_clock::now() < deadline) {
        for (const LogLine& line : TakeLogLines(100)) {
            for (const std::string& text : texts) {
                if (line.message.find(text) != std::string::npos)
                    return line.message;
            }
        }
    }
    return "";
}

// A socket on hm1 that hears the SSDP multicast group; the first alive from the server within
// `ms`, or "".
std::string WaitForAlive(int ms) {
    const int s = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    const int yes = 1;
    setsockopt(s, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
    sockaddr_in any{};
    any.sin_family = AF_INET;
    any.sin_port = htons(1900);
    bind(s, reinterpret_cast<sockaddr*>(&any), sizeof(any));
    ip_mreq join{};
    inet_pton(AF_INET, "239.255.255.250", &join.imr_multiaddr);
    inet_pton(AF_INET, "192.0.2.2", &join.imr_interface);
    setsockopt(s, IPPROTO_IP, IP_ADD_MEMBERSHIP, &join, sizeof(join));
    std::string alive;
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    pollfd pfd{s, POLLIN, 0};
    while (alive.empty() && std::chrono::steady_clock::now() < deadline &&
           poll(&pfd, 1, 200) >= 0) {
        if ((pfd.revents & POLLIN) == 0)
            continue;
        char buffer[2048];
        const ssize_t got = recv(s, buffer, sizeof(buffer), 0);
        const std::string datagram(buffer, got > 0 ? static_cast<std::size_t>(got) : 0);
        if (datagram.find("ssdp:alive") != std::string::npos &&
            datagram.find("http://192.0.2.1:50003/") != std::string::npos)
            alive = datagram;
    }
    close(s);
    return alive;
}

TEST_F(MediaServerSafety, ALinkThatLosesItsCarrierIsLoggedAndAnnouncedAgainWhenItReturns) {
    SetUpNetwork();
    const std::string description = WaitForTheLanSide();
    ASSERT_EQ(StatusOf(description), 200) << "the LAN side never served";
    // Past the announcements that follow start, so that an alive heard later is the one the
    // returning link caused.
    std::this_thread::sleep_for(std::chrono::seconds(4));
    TakeLogLines();
    ASSERT_EQ(std::system("ip link set hm1 down"), 0);  // hm0 loses its carrier
    EXPECT_NE(WaitForLogLine({"announcements cannot leave hm0", "hm0 (192.0.2.1) went away"}, 8000),
              "");
    ASSERT_EQ(std::system("ip link set hm1 up"), 0);
    const std::string alive = WaitForAlive(8000);
    EXPECT_NE(alive, "") << "no alive within 8 s of the link's return";
    EXPECT_TRUE(StillServes());
}

// The opener itself, with the kernel's openat2 and with the walk used where it is missing.
class ShareFileOpening : public ::testing::TestWithParam<bool> {};

TEST_P(ShareFileOpening, OnlyRegularFilesBeneathTheDirectoryWithoutLinks) {
    const bool openat2 = GetParam();
    mkdir("/tmp/share", 0755);
    mkdir("/tmp/share/a", 0755);
    WriteFile("/tmp/share/a/song.flac", "fLaC");
    WriteFile("/tmp/secret", "SECRET");
    symlink("/tmp", "/tmp/share/up");
    symlink("/tmp/secret", "/tmp/share/a/link.flac");
    mkfifo("/tmp/share/a/pipe.flac", 0644);
    const int share = open("/tmp/share", O_PATH | O_DIRECTORY | O_CLOEXEC);
    ASSERT_GE(share, 0);
    const harmona::io::FileDescriptor good =
        harmona::mediad::OpenBeneath(share, "a/song.flac", openat2);
    EXPECT_GE(good.Get(), 0);
    for (const char* bad :
         {"up/secret", "a/link.flac", "a/pipe.flac", "../secret", "a/../a/song.flac", "/tmp/secret",
          "a", "", "a//song.flac", "missing.flac"}) {
        SCOPED_TRACE(bad);
        const harmona::io::FileDescriptor fd = harmona::mediad::OpenBeneath(share, bad, openat2);
        EXPECT_LT(fd.Get(), 0);
    }
    close(share);
    EXPECT_EQ(harmona::mediad::PathBelowShare("/volume1/music", "/volume1/music/a/b.mp3"),
              "a/b.mp3");
    EXPECT_EQ(harmona::mediad::PathBelowShare("/volume1/music", "/volume1/musicx/b.mp3"), "");
    EXPECT_EQ(harmona::mediad::PathBelowShare("/volume1/music", "/etc/passwd"), "");
}

INSTANTIATE_TEST_SUITE_P(KernelAndWalk, ShareFileOpening, ::testing::Values(true, false));

}  // namespace
}  // namespace harmona::test::mediad
