#include "services/vanuaudiod/Discovery.h"

#include <arpa/inet.h>
#include <libgssdp/gssdp.h>
#include <libgupnp/gupnp.h>
#include <net/if.h>
#include <netinet/in.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <deque>
#include <map>
#include <memory>
#include <utility>

#include "common/io/FileDescriptor.h"
#include "platform/lib/gupnp/ContextManager.h"
#include "platform/lib/gupnp/HttpFetch.h"
#include "platform/lib/gupnp/MainLoop.h"
#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"
#include "services/vanuaudiod/Announcement.h"
#include "services/vanuaudiod/Description.h"

namespace harmona::vanuaudiod {
namespace {

using harmona::gupnp::ObjectRef;
using harmona::gupnp::SignalConnection;
using harmona::gupnp::Source;

constexpr const char kSearchTarget[] = "urn:schemas-upnp-org:device:MediaServer:1";
// GSSDP's kinds of received message, as its "message-received" signal passes them.
constexpr int kSearchAnswer = 1;
constexpr int kNotify = 2;
// Searches are sent at most this often: many browsers pressing the scan button at once (command
// 14 each) must not flood the network; a request within the interval is served at its end.
constexpr guint kSearchIntervalMs = 1000;
// A search listens this long for answers through GSSDP's browser, whose cache is then dropped
// (our own table holds what was found; the browser's would grow with every forged answer).
constexpr guint kSearchWindowMs = 10000;
// A multicast route often follows its interface's address by a moment (a DHCP client, a network
// manager): it is reported missing only when it still is this much later.
constexpr guint kRouteGraceMs = 3000;
// Queued description fetches beyond this are refused (a flood must not grow memory); the device
// is fetched again on a later announcement.
constexpr std::size_t kMaxQueuedFetches = 64;
// Refusals are logged at most this many per window, then counted: a flood of forged NOTIFYs must
// not flood the log.
constexpr int kRefusalLinesPerWindow = 10;
constexpr auto kRefusalWindow = std::chrono::seconds(10);
// Devices that said byebye are remembered for their search answers' window (the MX of a search
// sent just before, and this margin), so that a late answer is not taken for a return; bounded,
// as forged byebyes cost nothing to send.
constexpr std::size_t kMaxDepartedRemembered = 256;
constexpr auto kLateAnswerMargin = std::chrono::seconds(1);

std::string AddressText(GInetAddress* address) {
    return harmona::gupnp::Chars(g_inet_address_to_string(address)).c_str();
}

// The broadcast address of an IPv4 network ("" for IPv6 or an unknown mask).
std::string BroadcastOf(GSSDPClient* client) {
    GInetAddressMask* mask = gssdp_client_get_address_mask(client);
    if (mask == nullptr)
        return "";
    ObjectRef<GInetAddressMask> owned = ObjectRef<GInetAddressMask>::Adopt(mask);
    GInetAddress* network = g_inet_address_mask_get_address(mask);
    const guint length = g_inet_address_mask_get_length(mask);
    if (g_inet_address_get_family(network) != G_SOCKET_FAMILY_IPV4 || length > 32)
        return "";
    in_addr bytes{};
    std::memcpy(&bytes, g_inet_address_to_bytes(network), 4);
    const uint32_t hostBits = length == 32 ? 0 : (0xFFFFFFFFu >> length);
    bytes.s_addr = htonl(ntohl(bytes.s_addr) | hostBits);
    char text[INET_ADDRSTRLEN] = {};
    inet_ntop(AF_INET, &bytes, text, sizeof(text));
    return text;
}

// Why the host has no route for the SSDP group from `address` ("" when it has one). GSSDP
// binds its searches to the interface, so they leave all the same; but a host without the
// route is misconfigured for SSDP (other programs' announcements and searches fail), which the
// log should say.
std::string MulticastRouteProblem(GInetAddress* address) {
    if (g_inet_address_get_family(address) != G_SOCKET_FAMILY_IPV4)
        return "";  // IPv6 SSDP uses the link-scope group, which needs no route
    const harmona::io::FileDescriptor fd(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, IPPROTO_UDP));
    if (!fd)
        return "";
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    std::string problem;
    if (connect(fd.Get(), reinterpret_cast<sockaddr*>(&group), sizeof(group)) != 0)
        problem = std::strerror(errno);
    return problem;
}

// Whether `interfaceName` is up and has its carrier (IFF_RUNNING: a cable in, a switch port up, a
// Wi-Fi association). True when the kernel cannot be asked, so that a failed question never
// reads as a lost link.
bool HasCarrier(const harmona::io::FileDescriptor& fd, const std::string& interfaceName) {
    ifreq request{};
    std::strncpy(request.ifr_name, interfaceName.c_str(), IFNAMSIZ - 1);
    if (!fd || ioctl(fd.Get(), SIOCGIFFLAGS, &request) != 0)
        return true;
    return (request.ifr_flags & IFF_UP) != 0 && (request.ifr_flags & IFF_RUNNING) != 0;
}

}  // namespace

// Everything below runs on the discovery thread.
class Discovery::Worker {
  public:
    Worker(ServerList& servers, const DiscoveryOptions& options)
        : servers_(servers),
          options_(options),
          fetcher_({options.fetchTimeoutMs, options.maxDescriptionBytes}),
          contexts_(
              options.interfaceName, [this](GUPnPContext* c) { ContextAvailable(c); },
              [this](GUPnPContext* c) { ContextUnavailable(c); }) {
        expiry_ = Source::Timeout(1000, [this] {
            Expire();
            FlushRefusalCount();
            FollowCarriers();
            return true;
        });
        research_ = Source::Timeout(options.researchSeconds * 1000, [this] {
            SearchNow();
            return true;
        });
    }

    void RequestSearch() {
        if (searchTimer_.active())
            return;  // a search is due already
        const auto sinceLast =
            std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - lastSearch_);
        const guint wait = sinceLast.count() >= kSearchIntervalMs
                               ? 0
                               : kSearchIntervalMs - static_cast<guint>(sinceLast.count());
        searchTimer_ = Source::Timeout(wait, [this] {
            SearchNow();
            return false;
        });
    }

  private:
    struct Address {
        ObjectRef<GUPnPContext> context;
        std::string interfaceName;
        std::string address;
        std::string broadcast;
        bool linkLocal = false;
        SignalConnection messages;
        ObjectRef<GSSDPResourceBrowser> browser;
        Source searchWindow;
    };
    struct FetchJob {
        std::string udn;
        std::string location;
        std::string announcer;
    };

    void ContextAvailable(GUPnPContext* context) {
        auto entry = std::make_unique<Address>();
        GSSDPClient* client = GSSDP_CLIENT(context);
        entry->context = ObjectRef<GUPnPContext>::Share(context);
        entry->interfaceName = gssdp_client_get_interface(client);
        GInetAddress* address = gssdp_client_get_address(client);
        entry->address = AddressText(address);
        entry->linkLocal = g_inet_address_get_is_link_local(address);
        g_object_unref(address);
        entry->broadcast = BroadcastOf(client);
        entry->messages = SignalConnection(client, "message-received",
                                           G_CALLBACK(&Worker::MessageReceived), this);
        syslog(LOG_INFO, "network: searching for media servers on %s (%s)",
               entry->interfaceName.c_str(), entry->address.c_str());
        Address& added = *entry;
        addresses_[context] = std::move(entry);
        Search(added);
    }

    void ContextUnavailable(GUPnPContext* context) {
        auto found = addresses_.find(context);
        if (found == addresses_.end())
            return;
        syslog(LOG_INFO, "network: %s (%s) gone", found->second->interfaceName.c_str(),
               found->second->address.c_str());
        addresses_.erase(found);
        // Another address of the network may answer differently: look again.
        RequestSearch();
    }

    // GUPnP follows an interface's administrative state only: a link that loses its carrier (a
    // cable pulled, a switch restarted, a Wi-Fi association lost) keeps its contexts, and nothing
    // tells. Searches sent meanwhile reach no one, and a server that expired or arrived meanwhile
    // would wait for the periodic search; so the carrier of every interface with an address is
    // looked at each second, its loss logged, and its return searches at once.
    void FollowCarriers() {
        std::map<std::string, bool> now;
        for (const auto& [context, address] : addresses_)
            now.emplace(address->interfaceName, true);
        bool search = false;
        for (auto& [interfaceName, running] : now) {
            running = HasCarrier(flagsSocket_, interfaceName);
            const auto before = carrier_.find(interfaceName);
            if (before == carrier_.end()) {
                // Newly followed: its context has just searched, which reached no one without a
                // carrier.
                if (!running)
                    syslog(LOG_WARNING,
                           "network: %s has no carrier; searching again when it has one",
                           interfaceName.c_str());
                continue;
            }
            if (before->second == running)
                continue;
            if (!running) {
                syslog(LOG_WARNING, "network: %s lost its carrier; searching again when it is back",
                       interfaceName.c_str());
            } else {
                syslog(LOG_INFO, "network: %s has its carrier again; searching for media servers",
                       interfaceName.c_str());
                search = true;
            }
        }
        carrier_ = std::move(now);
        if (search)
            RequestSearch();
    }

    // Link-local locations are taken only on an interface that has nothing better.
    bool InterfaceIsLinkLocalOnly(const std::string& interfaceName) const {
        for (const auto& [context, address] : addresses_) {
            if (address->interfaceName == interfaceName && !address->linkLocal)
                return false;
        }
        return true;
    }

    void SearchNow() {
        lastSearch_ = Clock::now();
        for (auto& [context, address] : addresses_)
            Search(*address);
    }

    void Search(Address& address) {
        lastSearch_ = Clock::now();
        CheckMulticastRoute(address);
        // A fresh browser sends the search burst on activation; it lives for the answer window.
        address.browser = ObjectRef<GSSDPResourceBrowser>::Adopt(
            gssdp_resource_browser_new(GSSDP_CLIENT(address.context.get()), kSearchTarget));
        gssdp_resource_browser_set_mx(address.browser.get(), options_.searchMxSeconds);
        gssdp_resource_browser_set_active(address.browser.get(), TRUE);
        Address* target = &address;
        address.searchWindow = Source::Timeout(kSearchWindowMs, [target] {
            target->browser.Reset();
            return false;
        });
    }

    // The route is the host's, not the address's: one line when it goes missing (and stays so
    // for kRouteGraceMs), one when it is back.
    void CheckMulticastRoute(Address& address) {
        GInetAddress* local = gssdp_client_get_address(GSSDP_CLIENT(address.context.get()));
        const std::string problem = MulticastRouteProblem(local);
        const bool ipv4 = g_inet_address_get_family(local) == G_SOCKET_FAMILY_IPV4;
        g_object_unref(local);
        if (!ipv4)
            return;
        if (problem.empty()) {
            routeRecheck_.Remove();
            if (routeMissing_)
                syslog(LOG_INFO, "network: multicast route present again");
            routeMissing_ = false;
            return;
        }
        if (routeMissing_ || routeRecheck_.active())
            return;
        routeRecheck_ = Source::Timeout(
            kRouteGraceMs, [this, interfaceName = address.interfaceName, text = address.address] {
                GInetAddress* again = g_inet_address_new_from_string(text.c_str());
                const std::string still = again != nullptr ? MulticastRouteProblem(again) : "";
                if (again != nullptr)
                    g_object_unref(again);
                if (!still.empty() && !routeMissing_) {
                    syslog(LOG_WARNING,
                           "network: no multicast route (%s): searches are sent on %s (%s) only, "
                           "bound to it; add a default route or 224.0.0.0/4 for SSDP",
                           still.c_str(), interfaceName.c_str(), text.c_str());
                    routeMissing_ = true;
                }
                return false;
            });
    }

    static void MessageReceived(GSSDPClient* client, const char* fromIp, guint /*fromPort*/,
                                gint type, SoupMessageHeaders* headers, gpointer data) {
        auto* self = static_cast<Worker*>(data);
        auto found = self->addresses_.find(reinterpret_cast<GUPnPContext*>(client));
        if (found == self->addresses_.end() || fromIp == nullptr || headers == nullptr)
            return;
        if (type == kNotify || type == kSearchAnswer)
            self->OnMessage(*found->second, fromIp, type, headers);
    }

    void OnMessage(const Address& address, const std::string& fromIp, int type,
                   SoupMessageHeaders* headers) {
        const bool notify = type == kNotify;
        const Announcement announcement =
            ReadAnnouncement(soup_message_headers_get_one(headers, notify ? "NT" : "ST"),
                             notify ? soup_message_headers_get_one(headers, "NTS") : nullptr,
                             soup_message_headers_get_one(headers, "USN"),
                             soup_message_headers_get_one(headers, "LOCATION"),
                             soup_message_headers_get_one(headers, "CACHE-CONTROL"));
        if (announcement.kind == AnnouncementKind::byebye)
            Byebye(announcement.udn, fromIp);
        else if (announcement.kind == AnnouncementKind::alive &&
                 !(type == kSearchAnswer && RecentlyDeparted(announcement.udn, fromIp)))
            Alive(address, announcement, fromIp);
    }

    void Byebye(const std::string& udn, const std::string& fromIp) {
        RememberDeparture(udn, fromIp);
        MediaServer gone;
        if (servers_.Remove(udn, fromIp, gone))
            syslog(LOG_INFO, "media server gone (byebye): \"%s\" %s at %s",
                   gone.friendlyName.c_str(), udn.c_str(), gone.ip.c_str());
    }

    // A server answers a search after a random delay of up to its MX, and GSSDP-based servers
    // still send answers they owed when they leave: such an answer can follow the byebye. Within
    // that window only a NOTIFY alive brings the device back.
    void RememberDeparture(const std::string& udn, const std::string& fromIp) {
        const Clock::time_point now = Clock::now();
        for (auto it = departed_.begin(); it != departed_.end();) {
            if (now - it->second > LateAnswerWindow())
                it = departed_.erase(it);
            else
                ++it;
        }
        if (departed_.size() >= kMaxDepartedRemembered)
            departed_.erase(departed_.begin());
        departed_[{udn, fromIp}] = now;
    }

    bool RecentlyDeparted(const std::string& udn, const std::string& fromIp) const {
        const auto found = departed_.find({udn, fromIp});
        return found != departed_.end() && Clock::now() - found->second <= LateAnswerWindow();
    }

    Clock::duration LateAnswerWindow() const {
        return std::chrono::seconds(options_.searchMxSeconds) + kLateAnswerMargin;
    }

    void Alive(const Address& address, const Announcement& announcement,
               const std::string& fromIp) {
        AnnouncerFacts facts;
        facts.sourceAddress = fromIp;
        facts.linkLocalAllowed = InterfaceIsLinkLocalOnly(address.interfaceName);
        facts.interfaceBroadcast = address.broadcast;
        const std::string refusal = RefuseLocation(announcement.location, facts);
        if (!refusal.empty()) {
            Refused(announcement.udn, fromIp, refusal);
            return;
        }
        const SeenOutcome outcome = servers_.Seen(announcement.udn, announcement.location, fromIp,
                                                  announcement.maxAgeSeconds, Clock::now());
        for (const MediaServer& gone : servers_.TakeEvicted())
            syslog(LOG_WARNING,
                   "media server dropped: \"%s\" %s at %s gave its place to %s at %s (the device "
                   "table is full and its address announces the most devices)",
                   gone.friendlyName.c_str(), gone.udn.c_str(), gone.ip.c_str(),
                   announcement.udn.c_str(), fromIp.c_str());
        switch (outcome) {
            case SeenOutcome::fetch:
                Enqueue({announcement.udn, announcement.location, fromIp});
                return;
            case SeenOutcome::announcerFull:
                Refused(announcement.udn, fromIp,
                        "its address announces " + std::to_string(kMaxDevicesPerAnnouncer) +
                            " devices already");
                return;
            case SeenOutcome::tableFull:
                Refused(announcement.udn, fromIp, "the device table is full");
                return;
            case SeenOutcome::nothing:
                return;
        }
    }

    // Once a window is over: the refusals it did not log, in one line, and a fresh window.
    void FlushRefusalCount() {
        const auto now = Clock::now();
        if (now - refusalWindowStart_ < kRefusalWindow)
            return;
        if (refusalsUnlogged_ > 0)
            syslog(LOG_WARNING, "description refused for %d more announcement(s)",
                   refusalsUnlogged_);
        refusalWindowStart_ = now;
        refusalLines_ = 0;
        refusalsUnlogged_ = 0;
    }

    void Refused(const std::string& udn, const std::string& fromIp, const std::string& why) {
        FlushRefusalCount();
        if (refusalLines_ >= kRefusalLinesPerWindow) {
            ++refusalsUnlogged_;
            return;
        }
        ++refusalLines_;
        syslog(LOG_WARNING, "description refused: %s announced by %s: %s", udn.c_str(),
               fromIp.c_str(), why.c_str());
    }

    void Enqueue(FetchJob job) {
        if (queue_.size() >= kMaxQueuedFetches) {
            servers_.Described(job.udn, job.location, false, {}, Clock::now());
            Refused(job.udn, job.announcer, "too many descriptions waiting to be fetched");
            return;
        }
        queue_.push_back(std::move(job));
        StartFetches();
    }

    void StartFetches() {
        while (fetcher_.running() < options_.parallelFetches && !queue_.empty()) {
            FetchJob job = std::move(queue_.front());
            queue_.pop_front();
            const std::string location = job.location;
            fetcher_.Get(location, [this, job = std::move(job)](harmona::gupnp::FetchResult r) {
                Fetched(job, r);
                StartFetches();
            });
        }
    }

    void Fetched(const FetchJob& job, const harmona::gupnp::FetchResult& result) {
        MediaServer server;
        const bool ok =
            result.ok && ParseDeviceDescription(result.body, job.location, job.udn, server);
        if (!result.ok)
            Refused(job.udn, job.announcer, "description at " + job.location + ": " + result.error);
        else if (!ok)
            Refused(
                job.udn, job.announcer,
                "description at " + job.location + " has no usable MediaServer ContentDirectory");
        if (servers_.Described(job.udn, job.location, ok, server, Clock::now()))
            syslog(LOG_INFO, "media server added: \"%s\" %s at %s", server.friendlyName.c_str(),
                   job.udn.c_str(), server.ip.c_str());
    }

    void Expire() {
        for (const MediaServer& gone : servers_.Expire(Clock::now()))
            syslog(LOG_INFO, "media server expired: \"%s\" %s at %s", gone.friendlyName.c_str(),
                   gone.udn.c_str(), gone.ip.c_str());
    }

    ServerList& servers_;
    DiscoveryOptions options_;
    harmona::gupnp::HttpFetcher fetcher_;
    std::deque<FetchJob> queue_;
    std::map<GUPnPContext*, std::unique_ptr<Address>> addresses_;
    Clock::time_point lastSearch_{};
    std::map<std::pair<std::string, std::string>, Clock::time_point> departed_;
    bool routeMissing_ = false;
    // Interface name -> whether it had its carrier at the last look (interfaces with an address).
    std::map<std::string, bool> carrier_;
    const harmona::io::FileDescriptor flagsSocket_{socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)};
    Clock::time_point refusalWindowStart_{};
    int refusalLines_ = 0;
    int refusalsUnlogged_ = 0;
    Source expiry_;
    Source research_;
    Source searchTimer_;
    Source routeRecheck_;
    // Last: its handlers use everything above, and it goes first.
    harmona::gupnp::ContextManager contexts_;
};

Discovery::Discovery(ServerList& servers, DiscoveryOptions options)
    : servers_(servers),
      options_(options),
      context_(g_main_context_new()),
      loop_(g_main_loop_new(context_, FALSE)) {}

Discovery::~Discovery() {
    Stop();
    g_main_loop_unref(loop_);
    g_main_context_unref(context_);
}

void Discovery::Start() {
    if (!thread_.joinable())
        thread_ = std::thread(&Discovery::Run, this);
}

void Discovery::Run() {
    g_main_context_push_thread_default(context_);
    {
        Worker worker(servers_, options_);
        worker_ = &worker;
        g_main_loop_run(loop_);
        worker_ = nullptr;
    }
    // Cancelled fetches finish on the loop: let them, so that nothing is left behind.
    while (g_main_context_iteration(context_, FALSE)) {
    }
    g_main_context_pop_thread_default(context_);
}

void Discovery::RequestSearch() {
    g_main_context_invoke(
        context_,
        [](gpointer data) -> gboolean {
            Worker* worker = static_cast<Discovery*>(data)->worker_;
            if (worker != nullptr)
                worker->RequestSearch();
            return G_SOURCE_REMOVE;
        },
        this);
}

void Discovery::Stop() {
    if (!thread_.joinable())
        return;
    g_main_context_invoke(
        context_,
        [](gpointer data) -> gboolean {
            g_main_loop_quit(static_cast<GMainLoop*>(data));
            return G_SOURCE_REMOVE;
        },
        loop_);
    thread_.join();
}

}  // namespace harmona::vanuaudiod
