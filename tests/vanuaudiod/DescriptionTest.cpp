// vanuaudiod's reading of UPnP device descriptions and its bounded HTTP fetch (against a real TCP
// server on loopback).
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "platform/lib/gupnp/HttpFetch.h"
#include "services/vanuaudiod/Description.h"
#include "services/vanuaudiod/Url.h"

using namespace harmona::vanuaudiod;

namespace {

std::string Description(const std::string& urlBase, const std::string& control,
                        const std::string& name = "Living Room",
                        const std::string& type = "urn:schemas-upnp-org:device:MediaServer:1") {
    return "<?xml version=\"1.0\"?>\n<root xmlns=\"urn:schemas-upnp-org:device-1-0\">" +
           (urlBase.empty() ? std::string() : "<URLBase>" + urlBase + "</URLBase>") +
           "<device><deviceType>" + type + "</deviceType><friendlyName>" + name +
           "</friendlyName><UDN>uuid:abc</UDN><serviceList>"
           "<service><serviceType>urn:schemas-upnp-org:service:ConnectionManager:1</serviceType>"
           "<controlURL>/cm</controlURL></service>"
           "<service><serviceType>urn:schemas-upnp-org:service:ContentDirectory:1</serviceType>"
           "<controlURL>" +
           control + "</controlURL></service></serviceList></device></root>";
}

// A one-shot HTTP server on 127.0.0.1 that answers the first connection with `reply` (after
// `delayMs`), or never answers when `silent`.
class OneShotServer {
  public:
    OneShotServer(std::string reply, int delayMs = 0, bool silent = false) {
        fd_ = socket(AF_INET, SOCK_STREAM, 0);
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        EXPECT_EQ(bind(fd_, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
        socklen_t length = sizeof(address);
        getsockname(fd_, reinterpret_cast<sockaddr*>(&address), &length);
        port_ = ntohs(address.sin_port);
        listen(fd_, 4);
        thread_ = std::thread([this, reply = std::move(reply), delayMs, silent] {
            pollfd entry{fd_, POLLIN, 0};
            if (poll(&entry, 1, 5000) <= 0)
                return;
            const int client = accept(fd_, nullptr, nullptr);
            char buffer[4096];
            (void)!recv(client, buffer, sizeof(buffer), 0);
            std::this_thread::sleep_for(std::chrono::milliseconds(delayMs));
            if (!silent)
                (void)!send(client, reply.data(), reply.size(), MSG_NOSIGNAL);
            else
                std::this_thread::sleep_for(std::chrono::milliseconds(1500));
            close(client);
        });
    }
    ~OneShotServer() {
        thread_.join();
        close(fd_);
    }
    std::string Url(const std::string& path) const {
        return "http://127.0.0.1:" + std::to_string(port_) + path;
    }

  private:
    int fd_ = -1;
    unsigned short port_ = 0;
    std::thread thread_;
};

}  // namespace

TEST(ServerDescription, RelativeControlUrlIsResolvedAgainstTheLocation) {
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(Description("", "/ctl/ContentDir"),
                                       "http://192.168.1.20:8200/rootDesc.xml", "uuid:abc",
                                       server));
    EXPECT_EQ(server.controlUrl, "http://192.168.1.20:8200/ctl/ContentDir");
    EXPECT_EQ(server.friendlyName, "Living Room");
    EXPECT_EQ(server.ip, "192.168.1.20");
}

TEST(ServerDescription, PathRelativeControlUrlUsesTheLocationsFolder) {
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(Description("", "cd/control"),
                                       "http://10.1.2.3:49152/desc/device.xml", "uuid:abc",
                                       server));
    EXPECT_EQ(server.controlUrl, "http://10.1.2.3:49152/desc/cd/control");
}

TEST(ServerDescription, UrlBaseWinsOverTheLocation) {
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(Description("http://10.1.2.3:5000/", "ContentDirectory/ctl"),
                                       "http://10.1.2.3:49152/desc.xml", "uuid:abc", server));
    EXPECT_EQ(server.controlUrl, "http://10.1.2.3:5000/ContentDirectory/ctl");
    EXPECT_EQ(server.ip, "10.1.2.3");  // the ip is the location's host
}

TEST(ServerDescription, AbsoluteControlUrlIsKept) {
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(Description("", "http://10.1.2.3:80/x"),
                                       "http://10.1.2.3:1/d.xml", "uuid:abc", server));
    EXPECT_EQ(server.controlUrl, "http://10.1.2.3:80/x");
}

TEST(ServerDescription, ControlUrlOnAnotherHostThanTheDescriptionIsRefused) {
    MediaServer server;
    for (const char* urlBase : {"http://127.0.0.1:8080/", "http://10.9.9.9:5000/",
                                "http://localhost:631/", "http://[::1]:80/"}) {
        SCOPED_TRACE(urlBase);
        EXPECT_FALSE(ParseDeviceDescription(Description(urlBase, "admin/ctl"),
                                            "http://10.1.2.3:49152/desc.xml", "uuid:abc", server));
    }
    for (const char* control : {"http://127.0.0.1:50003/ContentDirectory/control",
                                "http://10.5.5.5:80/x", "http://169.254.1.1/x"}) {
        SCOPED_TRACE(control);
        EXPECT_FALSE(ParseDeviceDescription(Description("", control), "http://10.1.2.3:1/d.xml",
                                            "uuid:abc", server));
    }
}

TEST(ServerDescription, EmbeddedMediaServerIsFound) {
    const std::string xml =
        "<root><device><deviceType>urn:schemas-upnp-org:device:Basic:1</deviceType>"
        "<friendlyName>NAS</friendlyName><UDN>uuid:root</UDN><deviceList><device>"
        "<deviceType>urn:schemas-upnp-org:device:MediaServer:2</deviceType>"
        "<friendlyName>NAS Media</friendlyName><UDN>uuid:ms</UDN><serviceList><service>"
        "<serviceType>urn:schemas-upnp-org:service:ContentDirectory:2</serviceType>"
        "<controlURL>/ms/cd</controlURL></service></serviceList></device></deviceList></device>"
        "</root>";
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(xml, "http://10.0.0.7:9000/d.xml", "uuid:ms", server));
    EXPECT_EQ(server.friendlyName, "NAS Media");
    EXPECT_EQ(server.controlUrl, "http://10.0.0.7:9000/ms/cd");
}

TEST(ServerDescription, DocumentsWithoutAUsableContentDirectoryAreRefused) {
    MediaServer server;
    EXPECT_FALSE(ParseDeviceDescription("<root><device>", "http://10.0.0.1/d.xml", "", server));
    EXPECT_FALSE(ParseDeviceDescription(
        Description("", "/cd", "x", "urn:schemas-upnp-org:device:MediaRenderer:1"),
        "http://10.0.0.1/d.xml", "", server));
    EXPECT_FALSE(ParseDeviceDescription(Description("", ""), "http://10.0.0.1/d.xml", "", server));
    EXPECT_FALSE(ParseDeviceDescription(Description("", "/" + std::string(2000, 'a')),
                                        "http://10.0.0.1/d.xml", "", server));
    EXPECT_FALSE(ParseDeviceDescription(Description("", "/with space"), "http://10.0.0.1/d.xml", "",
                                        server));
}

TEST(ServerDescription, NamesAreTrimmedCleanedAndBounded) {
    MediaServer server;
    ASSERT_TRUE(ParseDeviceDescription(Description("", "/cd", "\n  " + std::string(600, 'n') + " "),
                                       "http://10.0.0.1/d.xml", "", server));
    EXPECT_EQ(server.friendlyName.size(), 512u);
}

TEST(ServerDescription, HostOfUrlHandlesPortsAndIpv6) {
    EXPECT_EQ(HostOfUrl("http://10.0.0.1:8200/x"), "10.0.0.1");
    EXPECT_EQ(HostOfUrl("http://[fe80::1]:8200/x"), "fe80::1");
    EXPECT_EQ(HostOfUrl("http://host/x"), "host");
    EXPECT_EQ(HostOfUrl("ftp://10.0.0.1/x"), "");
    EXPECT_EQ(HostOfUrl("http://user@10.0.0.1/x"), "");
    EXPECT_EQ(HostOfUrl("http://10.0.0.1:99999/x"), "");
}

namespace {

harmona::gupnp::FetchResult Fetch(const std::string& url, unsigned timeoutMs, std::size_t maxBody) {
    return harmona::gupnp::HttpFetcher::GetAndWait(url, {timeoutMs, maxBody});
}

}  // namespace

TEST(ServerDescriptionFetch, FetchesAWholeBody) {
    OneShotServer server("HTTP/1.1 200 OK\r\nContent-Length: 5\r\n\r\nhello");
    const auto r = Fetch(server.Url("/d.xml"), 2000, 1024);
    ASSERT_TRUE(r.ok) << r.error;
    EXPECT_EQ(r.body, "hello");
}

TEST(ServerDescriptionFetch, DecodesChunkedBodies) {
    OneShotServer server(
        "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n3\r\nabc\r\n2\r\nde\r\n0\r\n\r\n");
    const auto r = Fetch(server.Url("/"), 2000, 1024);
    ASSERT_TRUE(r.ok) << r.error;
    EXPECT_EQ(r.body, "abcde");
}

TEST(ServerDescriptionFetch, RefusesBodiesOverTheBound) {
    OneShotServer server("HTTP/1.0 200 OK\r\n\r\n" + std::string(5000, 'x'));
    const auto r = Fetch(server.Url("/"), 2000, 1000);
    EXPECT_FALSE(r.ok);
    EXPECT_NE(r.error.find("longer than 1000"), std::string::npos) << r.error;
}

TEST(ServerDescriptionFetch, RefusesOtherStatusesRedirectsAndTruncatedBodies) {
    {
        OneShotServer server("HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n");
        EXPECT_FALSE(Fetch(server.Url("/"), 2000, 1000).ok);
    }
    {
        OneShotServer server(
            "HTTP/1.1 302 Found\r\nLocation: http://127.0.0.1:1/\r\n"
            "Content-Length: 0\r\n\r\n");
        const auto r = Fetch(server.Url("/"), 2000, 1000);
        EXPECT_FALSE(r.ok);
        EXPECT_EQ(r.status, 302u);
    }
    {
        OneShotServer server("HTTP/1.1 200 OK\r\nContent-Length: 50\r\n\r\nshort");
        EXPECT_FALSE(Fetch(server.Url("/"), 2000, 1000).ok);
    }
}

TEST(ServerDescriptionFetch, GivesUpAtItsTimeLimit) {
    OneShotServer server("", 0, true);
    const auto start = std::chrono::steady_clock::now();
    const auto r = Fetch(server.Url("/"), 300, 1000);
    const auto took = std::chrono::steady_clock::now() - start;
    EXPECT_FALSE(r.ok);
    EXPECT_LT(took, std::chrono::milliseconds(1200));
}

TEST(ServerDescriptionFetch, RefusedConnectionsAndOtherSchemesFail) {
    EXPECT_FALSE(Fetch("ftp://127.0.0.1:1/", 300, 10).ok);
    EXPECT_FALSE(Fetch("http://127.0.0.1:1/", 300, 10).ok);  // refused connection
}
