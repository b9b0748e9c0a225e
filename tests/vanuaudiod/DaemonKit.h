// Test kit for the audio daemon, on the one kit's services and peer network
// (tests/harness/Service.h, Network.h): the real built vanuaudiod, a client sending the request
// record exactly as the CGI does, and a scriptable fake media server (SSDP announcer and
// description server) for the cases no real server can be made to produce.
#pragma once

#include <netinet/in.h>
#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Network.h"
#include "tests/harness/Sandbox.h"
#include "tests/harness/Service.h"

namespace harmona::test {

// A child process of the test (tests/harness/Service.h): killed and reaped when destroyed unless
// stopped before.
using Process = Service;

// Starts argv[0] with `argv`, stdout and stderr into `logPath`, in this network namespace, or in
// the one of process `netnsOf` when it is > 0.
inline Process Spawn(const std::vector<std::string>& argv, const std::string& logPath,
                     pid_t netnsOf = 0) {
    return Service::Start(argv, logPath, netnsOf);
}

// Sends one ssdp:alive NOTIFY for a MediaServer:1 device `udn` from `fromAddress` (one of this
// host's addresses on va) to the SSDP group, with whatever `location` the test wants to forge.
void SendNotify(const std::string& fromAddress, const std::string& udn, const std::string& location,
                int maxAgeSeconds);

// A TCP listener on `address` (an ephemeral port) that accepts and never answers, counting the
// connections: whether anybody was made to send a request there.
class ConnectionCounter {
  public:
    explicit ConnectionCounter(const std::string& address);
    ~ConnectionCounter();
    ConnectionCounter(const ConnectionCounter&) = delete;
    ConnectionCounter& operator=(const ConnectionCounter&) = delete;
    unsigned short Port() const { return port_; }
    int Accepted() const { return accepted_; }

  private:
    int listenFd_ = -1;
    unsigned short port_ = 0;
    std::atomic<int> accepted_{0};
    std::atomic<bool> stop_{false};
    std::thread thread_;
};

// Path of the built daemon (or of the one UseDaemonProgram named, for a benchmark of another
// build).
std::string DaemonProgram();
void UseDaemonProgram(const std::string& path);

// Starts the built vanuaudiod on interface `interfaceName` and waits (up to 5 s) until it answers
// on /tmp/vanuaudiod.sock and, with `waitForDiscovery`, until it listens for SSDP on 10.77.0.1.
// Its output goes to /tmp/vanuaudiod.log.
Process StartDaemon(const char* interfaceName = kHostInterface, bool waitForDiscovery = true);

// One exchange as the CGI's daemon client makes it: connect to the daemon's socket, wait for
// writability, write the 8196-byte record, wait for a reply within what is left of `budgetMs`
// (0.5 s by default), read once into 40960 bytes.
struct Exchange {
    bool connected = false;
    bool answered = false;  // a reply of at least one byte within the budget
    std::string reply;
    double ms = 0;
};
Exchange Call(int32_t command, const std::string& arguments = "", int budgetMs = 500,
              const char* socketPath = "/tmp/vanuaudiod.sock");

// Polls command 16 ("0 100") until `accept` holds for the parsed list or `timeoutMs` passes;
// returns the last reply's text.
template <typename Predicate>
std::string WaitForList(Predicate accept, int timeoutMs);

// Starts MiniDLNA in the foreground on the peer host with an empty media folder and its database
// under /tmp/minidlna-<port>, HTTP on `port`, announcing every 60 s (so a max-age of 130 s: a
// disappearance within seconds can only be its byebye).
Process StartMiniDlna(PeerNetwork& peer, const std::string& friendlyName, int port);

// Starts Gerbera on the peer host with its own home folder /tmp/gerbera-<port> (configuration
// and database), HTTP on `port` (49152 or more), under `friendlyName`.
Process StartGerbera(PeerNetwork& peer, const std::string& friendlyName, int port);

// Starts Rygel's media export on the peer host with its configuration, cache and an empty media
// folder under /tmp/rygel-<port>, HTTP on `port`, titled `friendlyName`; no other plugin.
Process StartRygel(PeerNetwork& peer, const std::string& friendlyName, int port);

// A media server played by the test: its descriptions are served over HTTP on this host (an
// ephemeral port) and its SSDP NOTIFY datagrams are sent to the multicast group on va (looped
// back to this host's listeners), for as many devices as the test adds. The first 16 devices
// announce from 10.77.0.1, the next ones from the host's further addresses 10.77.0.11 to .17.
// Made with a peer network, it is a host of the LAN instead: its sockets are the peer's (vb,
// 10.77.0.2, every device announcing from there), so that it is heard only over the link, and
// whatever happens to this host's addresses leaves it alone.
class FakeMediaServers {
  public:
    FakeMediaServers();
    explicit FakeMediaServers(const PeerNetwork& peer);
    ~FakeMediaServers();
    FakeMediaServers(const FakeMediaServers&) = delete;
    FakeMediaServers& operator=(const FakeMediaServers&) = delete;

    // Adds device `udn` whose description (served at /<index>.xml) is `descriptionXml`.
    std::string Add(const std::string& udn, const std::string& descriptionXml);
    // A standard MediaServer:1 description with a ContentDirectory at `controlPath`.
    static std::string DescriptionXml(const std::string& udn, const std::string& friendlyName,
                                      const std::string& controlPath);
    // Sends ssdp:alive (NT = the MediaServer:1 type) / ssdp:byebye for `udn`.
    void Alive(const std::string& udn, int maxAgeSeconds);
    void Byebye(const std::string& udn);
    std::string Location(const std::string& udn) const;
    unsigned short Port() const { return port_; }
    // Answers M-SEARCH requests (for the MediaServer:1 type or ssdp:all) for `udn` from now on,
    // as a device does: a unicast HTTP/1.1 200 reply to the searcher with its location.
    void AnswerSearches(const std::string& udn, int maxAgeSeconds);
    // Answers the last M-SEARCH that arrived for `udn`, now: an answer a device owed when it left.
    void AnswerLastSearch(const std::string& udn, int maxAgeSeconds);
    // How many M-SEARCH datagrams for media servers have arrived so far.
    int SearchesSeen() const { return searchesSeen_; }

  private:
    void Open();
    void Serve();
    void Notify(const std::string& udn, const char* nts, int maxAgeSeconds);
    void AnswerSearch();
    void SendSearchAnswer(const std::string& udn, int maxAgeSeconds, const sockaddr_in& to);

    static constexpr std::size_t kDevicesPerAddress = 16;
    // The datagram socket that sends from `address` (made on first use).
    int SocketFrom(const std::string& address);
    std::string AddressOf(const std::string& udn) const;

    std::string address_ = kHostAddress;  // the host the devices live on
    pid_t netnsOf_ = 0;                   // its network namespace's process (0: this one)
    int ssdpFd_ = -1;  // bound to port 1900, member of the SSDP group on the host's interface
    std::atomic<int> searchesSeen_{0};
    std::map<std::string, int> searchAnswers_;  // udn -> max-age
    sockaddr_in lastSearcher_{};

    int listenFd_ = -1;
    std::map<std::string, int> udpFds_;  // source address -> socket
    unsigned short port_ = 0;
    std::atomic<bool> stop_{false};
    mutable std::mutex mutex_;
    std::map<std::string, std::string> paths_;         // udn -> path
    std::map<std::string, std::string> addresses_;     // udn -> address it announces from
    std::map<std::string, std::string> descriptions_;  // path -> xml
    std::thread thread_;
};

template <typename Predicate>
std::string WaitForList(Predicate accept, int timeoutMs) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(timeoutMs);
    std::string last;
    for (;;) {
        const Exchange page = Call(16, "0 100");
        last = page.reply;
        Json::Value parsed;
        if (page.answered && ParseJson(page.reply, parsed) && accept(parsed["list"]))
            return last;
        if (std::chrono::steady_clock::now() >= deadline)
            return last;
        // The daemon logs each server it finds; the sandbox's log socket holds only a few lines
        // until read, and a daemon whose log is full waits for it as it would for a slow syslog.
        DrainSyslog();
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
}

}  // namespace harmona::test
