#include "tests/vanuaudiod/DaemonKit.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <functional>

#include "tests/harness/Fixtures.h"

#ifndef HARMONA_VANUAUDIOD_PATH
#error "HARMONA_VANUAUDIOD_PATH must name the built daemon"
#endif

namespace harmona::test {
namespace {

using SteadyClock = std::chrono::steady_clock;

// The device type every fake announces, searches look for and answers name.
const std::string kType = "urn:schemas-upnp-org:device:MediaServer:1";

// Runs `make` in the network namespace of process `netnsOf` (on a thread of its own that enters
// it), or here when `netnsOf` is 0: a socket belongs to the network it was made in wherever it is
// used later.
int MakeSocketIn(pid_t netnsOf, const std::function<int()>& make) {
    if (netnsOf <= 0)
        return make();
    int made = -1;
    std::thread([&] {
        const std::string path = "/proc/" + std::to_string(netnsOf) + "/ns/net";
        const int ns = open(path.c_str(), O_RDONLY | O_CLOEXEC);
        if (ns >= 0 && setns(ns, CLONE_NEWNET) == 0)
            made = make();
        else
            ADD_FAILURE() << "cannot enter " << path << ": " << std::strerror(errno);
        if (ns >= 0)
            close(ns);
    }).join();
    return made;
}

}  // namespace

void SendNotify(const std::string& fromAddress, const std::string& udn, const std::string& location,
                int maxAgeSeconds) {
    const std::string message =
        "NOTIFY * HTTP/1.1\r\nHOST: 239.255.255.250:1900\r\nCACHE-CONTROL: "
        "max-age=" +
        std::to_string(maxAgeSeconds) + "\r\nLOCATION: " + location +
        "\r\nSERVER: Linux/6 UPnP/1.0 forged/1\r\nNT: " + kType +
        "\r\nNTS: ssdp:alive\r\nUSN: " + udn + "::" + kType + "\r\n\r\n";
    const int fd = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, fromAddress.c_str(), &local.sin_addr);
    EXPECT_EQ(bind(fd, reinterpret_cast<sockaddr*>(&local), sizeof(local)), 0) << fromAddress;
    in_addr interfaceAddress{};
    inet_pton(AF_INET, kHostAddress, &interfaceAddress);
    setsockopt(fd, IPPROTO_IP, IP_MULTICAST_IF, &interfaceAddress, sizeof(interfaceAddress));
    const unsigned char loop = 1;
    setsockopt(fd, IPPROTO_IP, IP_MULTICAST_LOOP, &loop, sizeof(loop));
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    EXPECT_EQ(sendto(fd, message.data(), message.size(), 0, reinterpret_cast<sockaddr*>(&group),
                     sizeof(group)),
              static_cast<ssize_t>(message.size()));
    close(fd);
}

ConnectionCounter::ConnectionCounter(const std::string& address) {
    listenFd_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, address.c_str(), &local.sin_addr);
    EXPECT_EQ(bind(listenFd_, reinterpret_cast<sockaddr*>(&local), sizeof(local)), 0)
        << address << ": " << std::strerror(errno);
    socklen_t length = sizeof(local);
    getsockname(listenFd_, reinterpret_cast<sockaddr*>(&local), &length);
    port_ = ntohs(local.sin_port);
    listen(listenFd_, 256);
    thread_ = std::thread([this] {
        std::vector<int> held;
        while (!stop_) {
            pollfd entry{listenFd_, POLLIN, 0};
            if (poll(&entry, 1, 50) != 1)
                continue;
            const int client = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC);
            if (client >= 0) {
                ++accepted_;
                held.push_back(client);  // never answered
            }
        }
        for (int fd : held)
            close(fd);
    });
}

ConnectionCounter::~ConnectionCounter() {
    stop_ = true;
    thread_.join();
    close(listenFd_);
}

namespace {
std::string& DaemonProgramPath() {
    static std::string path = HARMONA_VANUAUDIOD_PATH;
    return path;
}
}  // namespace

std::string DaemonProgram() {
    return DaemonProgramPath();
}

void UseDaemonProgram(const std::string& path) {
    DaemonProgramPath() = path;
}

Process StartDaemon(const char* interfaceName, bool waitForDiscovery) {
    Process daemon =
        Spawn({DaemonProgram(), "--interface", interfaceName, "--verbose"}, "/tmp/vanuaudiod.log");
    // The socket answers at once; discovery listens once the interface's address has its SSDP
    // client, which its log line tells.
    const std::string discovering =
        "searching for media servers on " + std::string(interfaceName) + " (" + kHostAddress + ")";
    bool answered = false;
    const bool ready = daemon.WaitUntilReady(
        [&] {
            answered = answered || Call(3).answered;
            return answered &&
                   (!waitForDiscovery ||
                    ReadFile("/tmp/vanuaudiod.log").find(discovering) != std::string::npos);
        },
        5000);
    if (ready)
        return daemon;
    int status = 0;
    if (!daemon || daemon.WaitExit(0, status))
        ADD_FAILURE() << "vanuaudiod exited (" << status
                      << "): " << ReadFile("/tmp/vanuaudiod.log");
    else
        ADD_FAILURE() << "vanuaudiod did not answer (or discover) within 5 s: "
                      << ReadFile("/tmp/vanuaudiod.log");
    return daemon;
}

Exchange Call(int32_t command, const std::string& arguments, int budgetMs, const char* socketPath) {
    Exchange result;
    const auto start = SteadyClock::now();
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0)
        return result;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::snprintf(address.sun_path, sizeof(address.sun_path), "%s", socketPath);
    if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
        close(fd);
        return result;
    }
    result.connected = true;
    std::vector<unsigned char> record(8196, 0);
    std::memcpy(record.data(), &command, 4);
    std::snprintf(reinterpret_cast<char*>(record.data() + 4), 8192, "%s", arguments.c_str());
    pollfd entry{fd, POLLOUT, 0};
    if (poll(&entry, 1, budgetMs) == 1 &&
        write(fd, record.data(), record.size()) == static_cast<ssize_t>(record.size())) {
        entry = {fd, POLLIN, 0};
        const int left = budgetMs - ElapsedMs(start);
        if (left > 0 && poll(&entry, 1, left) == 1) {
            std::vector<char> reply(40960, 0);
            const ssize_t n = read(fd, reply.data(), reply.size());
            if (n > 0) {
                result.answered = true;
                result.reply.assign(reply.data(), static_cast<std::size_t>(n));
            }
        }
    }
    result.ms = std::chrono::duration<double, std::milli>(SteadyClock::now() - start).count();
    close(fd);
    return result;
}

Process StartMiniDlna(PeerNetwork& peer, const std::string& friendlyName, int port) {
    const std::string root = "/tmp/minidlna-" + std::to_string(port);
    MakeDirs(root + "/media");
    MakeDirs(root + "/db");
    WriteFile(root + "/media/silence.txt", "not audio\n");
    WriteFile(root + "/minidlna.conf",
              "media_dir=A," + root + "/media\ndb_dir=" + root + "/db\nlog_dir=" + root +
                  "\nport=" + std::to_string(port) + "\nnetwork_interface=" + kPeerInterface +
                  "\nfriendly_name=" + friendlyName + "\ninotify=no\nnotify_interval=60\n");
    return peer.SpawnOnPeer({"minidlnad", "-d", "-f", root + "/minidlna.conf", "-P", root + "/pid"},
                            root + "/out.log");
}

Process StartGerbera(PeerNetwork& peer, const std::string& friendlyName, int port) {
    const std::string root = "/tmp/gerbera-" + std::to_string(port);
    MakeDirs(root);
    const std::vector<std::string> argv = {
        "gerbera", "-m", root, "-f", "cfg", "-e", kPeerInterface, "-p", std::to_string(port)};
    const std::string config = root + "/cfg/config.xml";
    {
        // Its first start writes a configuration of its own, which then gets our name.
        Process first = peer.SpawnOnPeer(argv, root + "/first.log");
        const auto start = SteadyClock::now();
        while (!Exists(config) && ElapsedMs(start) < 10000)
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
        std::this_thread::sleep_for(std::chrono::milliseconds(300));
        first.Stop(SIGTERM, 5000);
    }
    std::string text = ReadFile(config);
    const std::string defaultName = "<name>gerbera</name>";
    const std::size_t at = text.find(defaultName);
    EXPECT_NE(at, std::string::npos) << text;
    if (at != std::string::npos)
        text.replace(at, defaultName.size(), "<name>" + friendlyName + "</name>");
    WriteFile(config, text);
    return peer.SpawnOnPeer(argv, root + "/out.log");
}

Process StartRygel(PeerNetwork& peer, const std::string& friendlyName, int port) {
    const std::string root = "/tmp/rygel-" + std::to_string(port);
    MakeDirs(root + "/media");
    MakeDirs(root + "/cache");
    MakeDirs(root + "/config");
    std::string config =
        "[general]\nipv6=false\nenable-transcoding=false\nupnp-enabled=true\n"
        "interface=" +
        std::string(kPeerInterface) + "\nport=" + std::to_string(port) +
        "\n\n[MediaExport]\nenabled=true\ntitle=" + friendlyName + "\nuris=" + root + "/media\n";
    // Every other plugin off: the media server alone, without D-Bus or a desktop around it.
    for (const char* plugin :
         {"Tracker", "Tracker3", "Playbin", "GstLaunch", "External", "MPRIS", "LMS", "Ruih"})
        config += std::string("\n[") + plugin + "]\nenabled=false\n";
    // Its user configuration (the one that can enable and disable plugins) in a home of its own.
    WriteFile(root + "/config/rygel.conf", config);
    return peer.SpawnOnPeer({"env", "HOME=" + root, "XDG_CACHE_HOME=" + root + "/cache",
                             "XDG_CONFIG_HOME=" + root + "/config", "rygel"},
                            root + "/out.log");
}

FakeMediaServers::FakeMediaServers() {
    Open();
}

FakeMediaServers::FakeMediaServers(const PeerNetwork& peer)
    : address_(kPeerAddress), netnsOf_(peer.PeerPid()) {
    Open();
}

void FakeMediaServers::Open() {
    listenFd_ =
        MakeSocketIn(netnsOf_, [] { return socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0); });
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_ANY);  // every address the devices announce
    EXPECT_EQ(bind(listenFd_, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0)
        << std::strerror(errno);
    socklen_t length = sizeof(address);
    getsockname(listenFd_, reinterpret_cast<sockaddr*>(&address), &length);
    port_ = ntohs(address.sin_port);
    listen(listenFd_, 64);

    in_addr interfaceAddress{};
    inet_pton(AF_INET, address_.c_str(), &interfaceAddress);

    ssdpFd_ = MakeSocketIn(netnsOf_, [] { return socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0); });
    const int yes = 1;
    setsockopt(ssdpFd_, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
    sockaddr_in ssdp{};
    ssdp.sin_family = AF_INET;
    ssdp.sin_port = htons(1900);
    EXPECT_EQ(bind(ssdpFd_, reinterpret_cast<sockaddr*>(&ssdp), sizeof(ssdp)), 0)
        << std::strerror(errno);
    ip_mreq membership{};
    inet_pton(AF_INET, "239.255.255.250", &membership.imr_multiaddr);
    membership.imr_interface = interfaceAddress;
    EXPECT_EQ(setsockopt(ssdpFd_, IPPROTO_IP, IP_ADD_MEMBERSHIP, &membership, sizeof(membership)),
              0)
        << std::strerror(errno);
    thread_ = std::thread(&FakeMediaServers::Serve, this);
}

FakeMediaServers::~FakeMediaServers() {
    stop_ = true;
    thread_.join();
    close(listenFd_);
    for (const auto& [address, fd] : udpFds_)
        close(fd);
    close(ssdpFd_);
}

int FakeMediaServers::SocketFrom(const std::string& address) {
    std::lock_guard<std::mutex> lock(mutex_);
    const auto found = udpFds_.find(address);
    if (found != udpFds_.end())
        return found->second;
    const int fd =
        MakeSocketIn(netnsOf_, [] { return socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0); });
    sockaddr_in local{};
    local.sin_family = AF_INET;
    inet_pton(AF_INET, address.c_str(), &local.sin_addr);
    EXPECT_EQ(bind(fd, reinterpret_cast<sockaddr*>(&local), sizeof(local)), 0)
        << address << ": " << std::strerror(errno);
    in_addr interfaceAddress{};
    inet_pton(AF_INET, address_.c_str(), &interfaceAddress);
    setsockopt(fd, IPPROTO_IP, IP_MULTICAST_IF, &interfaceAddress, sizeof(interfaceAddress));
    const unsigned char loop = 1;
    setsockopt(fd, IPPROTO_IP, IP_MULTICAST_LOOP, &loop, sizeof(loop));
    udpFds_[address] = fd;
    return fd;
}

std::string FakeMediaServers::AddressOf(const std::string& udn) const {
    std::lock_guard<std::mutex> lock(mutex_);
    const auto found = addresses_.find(udn);
    return found == addresses_.end() ? address_ : found->second;
}

void FakeMediaServers::AnswerSearches(const std::string& udn, int maxAgeSeconds) {
    std::lock_guard<std::mutex> lock(mutex_);
    searchAnswers_[udn] = maxAgeSeconds;
}

void FakeMediaServers::AnswerSearch() {
    char buffer[2048];
    sockaddr_in from{};
    socklen_t fromLength = sizeof(from);
    const ssize_t n = recvfrom(ssdpFd_, buffer, sizeof(buffer), MSG_DONTWAIT,
                               reinterpret_cast<sockaddr*>(&from), &fromLength);
    if (n <= 0)
        return;
    const std::string datagram(buffer, static_cast<std::size_t>(n));
    if (datagram.rfind("M-SEARCH", 0) != 0 || (datagram.find(kType) == std::string::npos &&
                                               datagram.find("ssdp:all") == std::string::npos))
        return;
    ++searchesSeen_;
    std::map<std::string, int> answers;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        answers = searchAnswers_;
        lastSearcher_ = from;
    }
    for (const auto& [udn, maxAge] : answers)
        SendSearchAnswer(udn, maxAge, from);
}

void FakeMediaServers::AnswerLastSearch(const std::string& udn, int maxAgeSeconds) {
    sockaddr_in to{};
    {
        std::lock_guard<std::mutex> lock(mutex_);
        to = lastSearcher_;
    }
    ASSERT_NE(to.sin_port, 0) << "no search has arrived yet";
    SendSearchAnswer(udn, maxAgeSeconds, to);
}

void FakeMediaServers::SendSearchAnswer(const std::string& udn, int maxAgeSeconds,
                                        const sockaddr_in& to) {
    const std::string reply =
        "HTTP/1.1 200 OK\r\nCACHE-CONTROL: max-age=" + std::to_string(maxAgeSeconds) +
        "\r\nEXT:\r\nLOCATION: " + Location(udn) +
        "\r\nSERVER: Linux/6 UPnP/1.0 fake/1\r\nST: " + kType + "\r\nUSN: " + udn + "::" + kType +
        "\r\n\r\n";
    sendto(SocketFrom(AddressOf(udn)), reply.data(), reply.size(), 0,
           reinterpret_cast<const sockaddr*>(&to), sizeof(to));
}

std::string FakeMediaServers::DescriptionXml(const std::string& udn,
                                             const std::string& friendlyName,
                                             const std::string& controlPath) {
    return "<?xml version=\"1.0\"?>\r\n<root xmlns=\"urn:schemas-upnp-org:device-1-0\">"
           "<specVersion><major>1</major><minor>0</minor></specVersion><device>"
           "<deviceType>urn:schemas-upnp-org:device:MediaServer:1</deviceType><friendlyName>" +
           friendlyName + "</friendlyName><UDN>" + udn +
           "</UDN><serviceList><service>"
           "<serviceType>urn:schemas-upnp-org:service:ContentDirectory:1</serviceType>"
           "<serviceId>urn:upnp-org:serviceId:ContentDirectory</serviceId><controlURL>" +
           controlPath + "</controlURL></service></serviceList></device></root>";
}

std::string FakeMediaServers::Add(const std::string& udn, const std::string& descriptionXml) {
    std::lock_guard<std::mutex> lock(mutex_);
    const std::size_t index = paths_.size();
    const std::string path = "/" + std::to_string(index) + ".xml";
    paths_[udn] = path;
    // Sixteen devices per address, as one host may announce: the first on the host's own
    // address, the next ones on its further addresses.
    // A peer host has its one address.
    addresses_[udn] = index < kDevicesPerAddress || netnsOf_ > 0
                          ? address_
                          : "10.77.0." + std::to_string(10 + index / kDevicesPerAddress);
    descriptions_[path] = descriptionXml;
    return path;
}

std::string FakeMediaServers::Location(const std::string& udn) const {
    std::lock_guard<std::mutex> lock(mutex_);
    const auto found = paths_.find(udn);
    const auto address = addresses_.find(udn);
    return "http://" + (address == addresses_.end() ? address_ : address->second) + ":" +
           std::to_string(port_) + (found == paths_.end() ? "/none.xml" : found->second);
}

void FakeMediaServers::Alive(const std::string& udn, int maxAgeSeconds) {
    Notify(udn, "ssdp:alive", maxAgeSeconds);
}

void FakeMediaServers::Byebye(const std::string& udn) {
    Notify(udn, "ssdp:byebye", 0);
}

void FakeMediaServers::Notify(const std::string& udn, const char* nts, int maxAgeSeconds) {
    std::string message = "NOTIFY * HTTP/1.1\r\nHOST: 239.255.255.250:1900\r\n";
    if (std::strcmp(nts, "ssdp:alive") == 0) {
        message += "CACHE-CONTROL: max-age=" + std::to_string(maxAgeSeconds) +
                   "\r\nLOCATION: " + Location(udn) + "\r\nSERVER: Linux/6 UPnP/1.0 fake/1\r\n";
    }
    message += "NT: " + kType + "\r\nNTS: " + nts + "\r\nUSN: " + udn + "::" + kType + "\r\n\r\n";
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    EXPECT_EQ(sendto(SocketFrom(AddressOf(udn)), message.data(), message.size(), 0,
                     reinterpret_cast<sockaddr*>(&group), sizeof(group)),
              static_cast<ssize_t>(message.size()))
        << std::strerror(errno);
}

void FakeMediaServers::Serve() {
    while (!stop_) {
        pollfd entries[2] = {{listenFd_, POLLIN, 0}, {ssdpFd_, POLLIN, 0}};
        if (poll(entries, 2, 50) <= 0)
            continue;
        if (entries[1].revents & POLLIN)
            AnswerSearch();
        if (!(entries[0].revents & POLLIN))
            continue;
        const int client = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC);
        if (client < 0)
            continue;
        std::string request;
        char buffer[2048];
        pollfd in{client, POLLIN, 0};
        while (request.find("\r\n\r\n") == std::string::npos && poll(&in, 1, 1000) == 1) {
            const ssize_t n = recv(client, buffer, sizeof(buffer), 0);
            if (n <= 0)
                break;
            request.append(buffer, static_cast<std::size_t>(n));
        }
        std::string path;
        const std::size_t space = request.find(' ');
        if (space != std::string::npos)
            path = request.substr(space + 1, request.find(' ', space + 1) - space - 1);
        std::string reply;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            const auto found = descriptions_.find(path);
            if (found == descriptions_.end())
                reply = "HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n";
            else
                reply = "HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\nContent-Length: " +
                        std::to_string(found->second.size()) + "\r\n\r\n" + found->second;
        }
        (void)!send(client, reply.data(), reply.size(), MSG_NOSIGNAL);
        close(client);
    }
}

}  // namespace harmona::test
