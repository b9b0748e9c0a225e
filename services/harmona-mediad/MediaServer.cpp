#include "services/harmona-mediad/MediaServer.h"

#include <arpa/inet.h>
#include <ifaddrs.h>
#include <net/if.h>
#include <netinet/in.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "platform/lib/gupnp/ContextManager.h"
#include "services/harmona-mediad/DeviceDescription.h"

namespace harmona::mediad {
namespace {

constexpr unsigned kLoopbackRetryMs = 1000;
constexpr unsigned kLibraryWatchMs = 2000;
constexpr unsigned kMulticastWatchMs = 2000;
// After a context appears: announce again this many seconds later, so that a player that missed
// the first set (a link still negotiating, a switch still learning) hears one soon.
constexpr unsigned kAnnounceAgainSeconds[] = {3, 10, 30};
// GSSDP's pause between SSDP messages; short, so that the byebye set leaves before exit.
constexpr unsigned kSsdpMessageDelayMs = 20;
// How many times each alive datagram goes out per announcement (UDP may lose one).
constexpr int kAliveCopies = 2;
// The hop limit of SSDP multicast, as GSSDP sets it.
constexpr int kSsdpTtl = 4;

const char* OrEmpty(const char* text) {
    return text != nullptr ? text : "";
}

GSSDPResourceGroup* ResourceGroupOf(GUPnPRootDevice* device) {
    return gupnp_root_device_get_ssdp_resource_group(device);
}

// Whether SSDP datagrams sent from `address` on `interfaceName` reach the link: GSSDP picks the
// interface by address (IP_MULTICAST_IF), which needs no multicast route, so what stops them is an
// interface that is down, has no carrier or does not do multicast; and connect() still does the
// route lookup GSSDP's sends do, without sending anything.
bool MulticastCanLeave(const std::string& interfaceName, const std::string& address,
                       std::string& why) {
    const io::FileDescriptor socketFd(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const int s = socketFd.Get();
    if (!socketFd) {
        why = std::strerror(errno);
        return false;
    }
    ifreq request{};
    std::strncpy(request.ifr_name, interfaceName.c_str(), IFNAMSIZ - 1);
    bool ok = ioctl(s, SIOCGIFFLAGS, &request) == 0;
    if (!ok)
        why = std::strerror(errno);
    else if ((request.ifr_flags & IFF_UP) == 0)
        why = "interface down";
    else if ((request.ifr_flags & IFF_RUNNING) == 0)
        why = "no carrier";
    else if ((request.ifr_flags & IFF_MULTICAST) == 0)
        why = "multicast off";
    ok = ok && why.empty();
    if (ok) {
        in_addr local{};
        inet_pton(AF_INET, address.c_str(), &local);
        setsockopt(s, IPPROTO_IP, IP_MULTICAST_IF, &local, sizeof(local));
        sockaddr_in group{};
        group.sin_family = AF_INET;
        group.sin_port = htons(1900);
        inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
        ok = connect(s, reinterpret_cast<sockaddr*>(&group), sizeof(group)) == 0;
        if (!ok)
            why = std::strerror(errno);
    }
    return ok;
}

// Whether `address` is still configured on some interface of this host: after a link goes down
// it is, after the address was removed it is not.
bool AddressIsConfigured(const std::string& address) {
    ifaddrs* list = nullptr;
    if (getifaddrs(&list) != 0)
        return true;  // cannot tell: keep what is served
    bool found = false;
    for (ifaddrs* entry = list; entry != nullptr && !found; entry = entry->ifa_next) {
        if (entry->ifa_addr == nullptr || entry->ifa_addr->sa_family != AF_INET)
            continue;
        char text[INET_ADDRSTRLEN] = "";
        inet_ntop(AF_INET, &reinterpret_cast<sockaddr_in*>(entry->ifa_addr)->sin_addr, text,
                  sizeof(text));
        found = address == text;
    }
    freeifaddrs(list);
    return found;
}

// The ssdp:alive set of a root device: the root, its UDN, its type and each service type, as
// GSSDP announces them, sent from `address` to the SSDP group. GSSDP has no way to send an alive
// set alone (it announces only on becoming available, after a byebye), so the re-announcements
// are written here.
void SendAliveSet(GUPnPRootDevice* device, GUPnPContext* context, const std::string& address) {
    GUPnPDeviceInfo* info = GUPNP_DEVICE_INFO(device);
    const std::string location = OrEmpty(gupnp_device_info_get_location(info));
    const std::string udn = OrEmpty(gupnp_device_info_get_udn(info));
    const std::string deviceType = OrEmpty(gupnp_device_info_get_device_type(info));
    if (location.empty() || udn.empty())
        return;
    std::vector<std::pair<std::string, std::string>> resources = {
        {"upnp:rootdevice", udn + "::upnp:rootdevice"}, {udn, udn}};
    if (!deviceType.empty())
        resources.emplace_back(deviceType, udn + "::" + deviceType);
    GList* services = gupnp_device_info_list_service_types(info);
    for (GList* l = services; l != nullptr; l = l->next)
        resources.emplace_back(static_cast<char*>(l->data),
                               udn + "::" + static_cast<char*>(l->data));
    g_list_free_full(services, g_free);

    const io::FileDescriptor socketFd(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    if (!socketFd)
        return;
    sockaddr_in local{};
    local.sin_family = AF_INET;
    if (inet_pton(AF_INET, address.c_str(), &local.sin_addr) != 1 ||
        bind(socketFd.Get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)) != 0)
        return;
    setsockopt(socketFd.Get(), IPPROTO_IP, IP_MULTICAST_IF, &local.sin_addr,
               sizeof(local.sin_addr));
    setsockopt(socketFd.Get(), IPPROTO_IP, IP_MULTICAST_TTL, &kSsdpTtl, sizeof(kSsdpTtl));
    sockaddr_in group{};
    group.sin_family = AF_INET;
    group.sin_port = htons(1900);
    inet_pton(AF_INET, "239.255.255.250", &group.sin_addr);
    GSSDPClient* client = GSSDP_CLIENT(context);
    const unsigned maxAge =
        gssdp_resource_group_get_max_age(gupnp_root_device_get_ssdp_resource_group(device));
    const std::string head =
        "NOTIFY * HTTP/1.1\r\nHost: 239.255.255.250:1900\r\n"
        "Cache-Control: max-age=" +
        std::to_string(maxAge) + "\r\nLocation: " + location +
        "\r\nServer: " + OrEmpty(gssdp_client_get_server_id(client)) + "\r\nNTS: ssdp:alive\r\n";
    for (int copy = 0; copy < kAliveCopies; ++copy) {
        for (const auto& [target, usn] : resources) {
            const std::string message = head + "NT: " + target + "\r\nUSN: " + usn + "\r\n\r\n";
            sendto(socketFd.Get(), message.data(), message.size(), 0,
                   reinterpret_cast<sockaddr*>(&group), sizeof(group));
        }
    }
}

}  // namespace

// --- ServedContext -------------------------------------------------------------------------------

std::unique_ptr<ServedContext> ServedContext::Create(
    GUPnPContext* context, const MediaServerOptions& options,
    std::shared_ptr<ContentDirectory> directory, std::function<void(ServedContext&)> onAvailable,
    std::string& error) {
    std::unique_ptr<ServedContext> served(new ServedContext);
    served->context_ = gupnp::ObjectRef<GUPnPContext>::Share(context);
    served->address_ = OrEmpty(gssdp_client_get_host_ip(GSSDP_CLIENT(context)));
    served->interface_ = OrEmpty(gssdp_client_get_interface(GSSDP_CLIENT(context)));
    const std::string base = "http://" + served->address_ + ":" +
                             std::to_string(gupnp_context_get_port(context)) + kMediaPath + "/";
    served->directory_ = std::move(directory);
    gupnp::Error gerror;
    // The filled description by its own (absolute) path; the service descriptions from their
    // data folder, which GUPnP serves at the root.
    served->device_ = gupnp::ObjectRef<GUPnPRootDevice>::Adopt(
        gupnp_root_device_new(context, options.descriptions.descriptionPath.c_str(),
                              options.descriptions.servicesFolder.c_str(), gerror.out()));
    if (!served->device_) {
        error = std::string("no root device on ") + served->address_ + ": " + gerror.message();
        return nullptr;
    }
    GUPnPDeviceInfo* info = GUPNP_DEVICE_INFO(served->device_.get());
    auto contentDirectory = gupnp::ObjectRef<GUPnPServiceInfo>::Adopt(
        gupnp_device_info_get_service(info, kContentDirectoryType));
    auto connectionManager = gupnp::ObjectRef<GUPnPServiceInfo>::Adopt(
        gupnp_device_info_get_service(info, kConnectionManagerType));
    if (!contentDirectory || !connectionManager) {
        error = "the device description lacks its services";
        return nullptr;
    }
    served->contentDirectoryService_ = std::make_unique<ContentDirectoryService>(
        GUPNP_SERVICE(contentDirectory.get()), served->directory_, base);
    served->connectionManagerService_ =
        std::make_unique<ConnectionManagerService>(GUPNP_SERVICE(connectionManager.get()));
    served->files_ =
        std::make_unique<MediaFileServer>(context, *served->directory_, options.sharePath);
    served->guard_ = std::make_unique<SubscriptionGuard>(context);
    served->bodyLimit_ = std::make_unique<RequestBodyLimit>(context);
    gssdp_resource_group_set_message_delay(ResourceGroupOf(served->device_.get()),
                                           kSsdpMessageDelayMs);
    served->onAvailable_ = std::move(onAvailable);
    served->introspection_ = gupnp::ObjectRef<GCancellable>::Adopt(g_cancellable_new());
    gupnp_service_info_introspect_async(contentDirectory.get(), served->introspection_.get(),
                                        &ServedContext::OnIntrospected, served.get());
    return served;
}

void ServedContext::OnIntrospected(GObject* service, GAsyncResult* result, gpointer self) {
    gupnp::Error error;
    GUPnPServiceIntrospection* introspection =
        gupnp_service_info_introspect_finish(GUPNP_SERVICE_INFO(service), result, error.out());
    if (introspection != nullptr)
        g_object_unref(introspection);
    if (error && g_error_matches(error.get(), G_IO_ERROR, G_IO_ERROR_CANCELLED))
        return;  // the context went away first; `self` is gone
    auto* me = static_cast<ServedContext*>(self);
    if (error)
        syslog(LOG_WARNING, "ContentDirectory description on %s unreadable (%s); serving anyway",
               me->address_.c_str(), error.message());
    me->BecomeAvailable();
}

// GSSDP starts a resource group with a byebye for every resource before the first alive: a
// control point that still lists this server (the same device back on an interface after a
// reset, or on a new address of it) would drop it and find it again. Those first messages are
// sent while the client is passive, so that they go nowhere (a delay of 0 lets GSSDP's queue
// drain within a few loop turns; the idle source runs once it has), and this server's own alive
// set follows. Searches are answered from then on.
void ServedContext::BecomeAvailable() {
    GSSDPResourceGroup* group = ResourceGroupOf(device_.get());
    gupnp::MakePassive(context_.get());
    gssdp_resource_group_set_message_delay(group, 0);
    gupnp_root_device_set_available(device_.get(), TRUE);
    settling_ = true;
    settle_ = gupnp::Source::Idle([this, group] {
        settling_ = false;
        gssdp_resource_group_set_message_delay(group, kSsdpMessageDelayMs);
        if (!down_) {
            gupnp::MakeActive(context_.get());
            AnnounceAgain();
        }
        if (onAvailable_)
            std::exchange(onAvailable_, nullptr)(*this);
        return false;
    });
}

ServedContext::~ServedContext() {
    if (introspection_)
        g_cancellable_cancel(introspection_.get());
    settle_.Remove();
    announcements_.clear();
    // The services and the file handler go before the device and the context they hang on.
    bodyLimit_.reset();
    guard_.reset();
    files_.reset();
    contentDirectoryService_.reset();
    connectionManagerService_.reset();
    device_.Reset();
}

void ServedContext::AnnounceAgain() {
    if (down_ || settling_ || !gssdp_client_get_active(GSSDP_CLIENT(context_.get())))
        return;
    SendAliveSet(device_.get(), context_.get(), address_);
}

void ServedContext::ScheduleAnnouncements() {
    announcements_.clear();
    for (unsigned seconds : kAnnounceAgainSeconds) {
        announcements_.push_back(gupnp::Source::Timeout(seconds * 1000, [this] {
            AnnounceAgain();
            return false;
        }));
    }
}

void ServedContext::SayByeBye() {
    announcements_.clear();
    gupnp_root_device_set_available(device_.get(), FALSE);
}

void ServedContext::GoDown() {
    down_ = true;
    announcements_.clear();
    gupnp::MakePassive(context_.get());
}

void ServedContext::ComeBack() {
    down_ = false;
    gupnp::MakeActive(context_.get());
    multicastOk_ = true;
    ScheduleAnnouncements();
    AnnounceAgain();
}

void ServedContext::Withdraw() {
    down_ = true;
    announcements_.clear();
    // Passive, so that the byebye GSSDP sends when the device goes reaches no one: the address
    // is gone, the server is not.
    gupnp::MakePassive(context_.get());
}

void ServedContext::NotifyIfLibraryChanged() {
    contentDirectoryService_->NotifyIfChanged();
}

void ServedContext::CheckMulticast() {
    if (down_)
        return;
    std::string why;
    const bool ok = MulticastCanLeave(interface_, address_, why);
    if (ok == multicastOk_)
        return;
    multicastOk_ = ok;
    if (!ok) {
        syslog(LOG_WARNING, "announcements cannot leave %s (%s): %s", interface_.c_str(),
               address_.c_str(), why.c_str());
    } else {
        syslog(LOG_NOTICE, "multicast leaves %s (%s) again; announcing", interface_.c_str(),
               address_.c_str());
        ScheduleAnnouncements();
        AnnounceAgain();
    }
}

// --- MediaServer ---------------------------------------------------------------------------------

MediaServer::MediaServer(MediaServerOptions options)
    : options_(std::move(options)),
      directory_(std::make_shared<ContentDirectory>(
          options_.dbPath, options_.sharePath,
          "http://127.0.0.1:" + std::to_string(options_.port) + kMediaPath + "/")) {}

MediaServer::~MediaServer() {
    *alive_ = false;
    managerSignals_.clear();
    lan_.clear();
    loopback_.reset();
    manager_.Reset();
}

void MediaServer::Start(std::function<void()> onLoopbackReady) {
    onLoopbackReady_ = std::move(onLoopbackReady);
    // The library as it is now, loaded before anything is served; later changes are loaded by a
    // thread (RefreshLibrary), so that SSDP and the other requests never wait for a load.
    directory_->SystemUpdateId();
    // The context manager makes the loopback context too, within its first turns of the loop; a
    // context of our own is made only when it has not, so that nothing binds the port twice (GLib
    // warns of a port in use). Both start after the load: a timer started before a load of some
    // seconds would fire in the loop's first turn, ahead of the manager's context.
    StartContextManager();
    loopbackRetry_ =
        gupnp::Source::Timeout(kLoopbackRetryMs, [this] { return !loopback_ && !TryLoopback(); });
    libraryWatch_ = gupnp::Source::Timeout(kLibraryWatchMs, [this] {
        RefreshLibrary();
        return true;
    });
    multicastWatch_ = gupnp::Source::Timeout(kMulticastWatchMs, [this] {
        for (auto& entry : lan_)
            entry.second->CheckMulticast();
        DropStale("");
        return true;
    });
}

// Loads a changed library in a thread, then tells every context's subscribers.
void MediaServer::RefreshLibrary() {
    if (refreshing_)
        return;
    refreshing_ = true;
    gupnp::RunInThread(
        [directory = directory_] { directory->SystemUpdateId(); },
        [this, alive = alive_] {
            if (!*alive)
                return;
            refreshing_ = false;
            ForEachContext([](ServedContext& served) { served.NotifyIfLibraryChanged(); });
        });
}

// 127.0.0.1 on the fixed port, served whatever the LAN does: the CGI's endpoint.
bool MediaServer::TryLoopback() {
    gupnp::Error gerror;
    GInetAddress* address = g_inet_address_new_loopback(G_SOCKET_FAMILY_IPV4);
    auto context = gupnp::ObjectRef<GUPnPContext>::Adopt(
        gupnp_context_new_full("lo", address, options_.port, GSSDP_UDA_VERSION_1_0, gerror.out()));
    g_object_unref(address);
    std::string error = gerror.message();
    if (!context || !ServeLoopback(context.get(), error)) {
        static bool logged = false;
        if (!logged)
            syslog(LOG_ERR, "cannot serve 127.0.0.1:%u yet (%s); trying again every %u s",
                   options_.port, error.c_str(), kLoopbackRetryMs / 1000);
        logged = true;
        return false;
    }
    return true;
}

bool MediaServer::ServeLoopback(GUPnPContext* context, std::string& error) {
    loopback_ = ServedContext::Create(
        context, options_, directory_,
        [this](ServedContext&) {
            syslog(LOG_INFO, "serving 127.0.0.1:%u", options_.port);
            if (onLoopbackReady_)
                std::exchange(onLoopbackReady_, nullptr)();
        },
        error);
    return loopback_ != nullptr;
}

void MediaServer::StartContextManager() {
    manager_ = gupnp::ObjectRef<GUPnPContextManager>::Adopt(gupnp_context_manager_create_full(
        GSSDP_UDA_VERSION_1_0, G_SOCKET_FAMILY_IPV4, options_.port));
    if (options_.interfaceName != nullptr) {
        GUPnPContextFilter* filter = gupnp_context_manager_get_context_filter(manager_.get());
        gupnp_context_filter_add_entry(filter, options_.interfaceName);
        // Loopback serves this host's own programs whatever interface serves the LAN.
        gupnp_context_filter_add_entry(filter, "lo");
        gupnp_context_filter_set_enabled(filter, TRUE);
    }
    managerSignals_.emplace_back(manager_.get(), "context-available",
                                 G_CALLBACK(&OnContextAvailable), this);
    managerSignals_.emplace_back(manager_.get(), "context-unavailable",
                                 G_CALLBACK(&OnContextUnavailable), this);
}

void MediaServer::OnContextAvailable(GUPnPContextManager*, GUPnPContext* context, gpointer self) {
    auto* me = static_cast<MediaServer*>(self);
    const std::string address = OrEmpty(gssdp_client_get_host_ip(GSSDP_CLIENT(context)));
    const std::string interfaceName = OrEmpty(gssdp_client_get_interface(GSSDP_CLIENT(context)));
    if (address.rfind("127.", 0) == 0) {
        // The manager's context on lo serves 127.0.0.1 (a context of our own is made only when
        // none came from the manager in time).
        std::string error;
        if (!me->loopback_ && me->ServeLoopback(context, error))
            me->loopbackRetry_.Remove();
        return;
    }
    auto known = me->lan_.find(context);
    if (known != me->lan_.end()) {
        // The same address on an interface that was down: GUPnP hands back the same context.
        if (known->second->down()) {
            syslog(LOG_INFO, "serving %s (%s:%u) again; announcing", interfaceName.c_str(),
                   address.c_str(), me->options_.port);
            known->second->ComeBack();
        }
        return;
    }
    // An earlier context on this address whose removal GUPnP did not report (the address went
    // while the link was down) holds the port: it goes first.
    me->DropStale(address);
    std::string error;
    auto served = ServedContext::Create(
        context, me->options_, me->directory_,
        [port = me->options_.port](ServedContext& available) {
            syslog(LOG_INFO, "serving %s (%s:%u)", available.interfaceName().c_str(),
                   available.address().c_str(), port);
            available.ScheduleAnnouncements();
            available.CheckMulticast();
        },
        error);
    if (!served) {
        syslog(LOG_ERR, "cannot serve %s (%s): %s", interfaceName.c_str(), address.c_str(),
               error.c_str());
        return;
    }
    me->lan_[context] = std::move(served);
}

void MediaServer::OnContextUnavailable(GUPnPContextManager*, GUPnPContext* context, gpointer self) {
    auto* me = static_cast<MediaServer*>(self);
    auto it = me->lan_.find(context);
    if (it == me->lan_.end())
        return;
    ServedContext& served = *it->second;
    if (AddressIsConfigured(served.address())) {
        // The link went down with its address kept: the device stays, silent, until it is up.
        syslog(LOG_INFO, "%s (%s) is down; serving there again when it is back",
               served.interfaceName().c_str(), served.address().c_str());
        served.GoDown();
        return;
    }
    syslog(LOG_INFO, "%s (%s) went away; no longer served there", served.interfaceName().c_str(),
           served.address().c_str());
    served.Withdraw();
    me->lan_.erase(it);
}

void MediaServer::DropStale(const std::string& address) {
    for (auto it = lan_.begin(); it != lan_.end();) {
        ServedContext& served = *it->second;
        const bool stale = served.down() &&
                           (served.address() == address || !AddressIsConfigured(served.address()));
        if (stale) {
            syslog(LOG_INFO, "%s (%s) went away while down; no longer served there",
                   served.interfaceName().c_str(), served.address().c_str());
            served.Withdraw();
            it = lan_.erase(it);
        } else {
            ++it;
        }
    }
}

void MediaServer::ForEachContext(const std::function<void(ServedContext&)>& action) {
    if (loopback_)
        action(*loopback_);
    for (auto& entry : lan_)
        action(*entry.second);
}

void MediaServer::SayByeBye() {
    ForEachContext([](ServedContext& served) { served.SayByeBye(); });
}

}  // namespace harmona::mediad
