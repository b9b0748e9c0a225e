#include "services/harmona-mediad/MediaServer.h"

#include <arpa/inet.h>
#include <net/if.h>
#include <netinet/in.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "services/harmona-mediad/DeviceDescription.h"

namespace harmona::mediad {
namespace {

constexpr unsigned kLoopbackRetryMs = 2000;
constexpr unsigned kLibraryWatchMs = 2000;
constexpr unsigned kMulticastWatchMs = 2000;
// After a context appears: announce again this many seconds later, so that a player that missed
// the first set (a link still negotiating, a switch still learning) hears one soon.
constexpr unsigned kAnnounceAgainSeconds[] = {3, 10, 30};
// GSSDP's pause between SSDP messages; short, so that the byebye set leaves before exit.
constexpr unsigned kSsdpMessageDelayMs = 20;

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

void ServedContext::BecomeAvailable() {
    gupnp_root_device_set_available(device_.get(), TRUE);
    if (onAvailable_)
        std::exchange(onAvailable_, nullptr)(*this);
}

ServedContext::~ServedContext() {
    if (introspection_)
        g_cancellable_cancel(introspection_.get());
    announcements_.clear();
    // The services and the file handler go before the device and the context they hang on.
    guard_.reset();
    files_.reset();
    contentDirectoryService_.reset();
    connectionManagerService_.reset();
    device_.Reset();
}

void ServedContext::AnnounceAgain() {
    // GSSDP announces on becoming available; taking the resource group (not the root device,
    // whose services would drop their subscribers) down and up again sends a fresh set.
    GSSDPResourceGroup* group = ResourceGroupOf(device_.get());
    gssdp_resource_group_set_available(group, FALSE);
    gssdp_resource_group_set_available(group, TRUE);
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

void ServedContext::NotifyIfLibraryChanged() {
    contentDirectoryService_->NotifyIfChanged();
}

void ServedContext::CheckMulticast() {
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
    if (!TryLoopback()) {
        loopbackRetry_ =
            gupnp::Source::Timeout(kLoopbackRetryMs, [this] { return !TryLoopback(); });
    }
    StartContextManager();
    // The library as it is now, loaded before anything is served; later changes are loaded by a
    // thread (RefreshLibrary), so that SSDP and the other requests never wait for a load.
    directory_->SystemUpdateId();
    libraryWatch_ = gupnp::Source::Timeout(kLibraryWatchMs, [this] {
        RefreshLibrary();
        return true;
    });
    multicastWatch_ = gupnp::Source::Timeout(kMulticastWatchMs, [this] {
        for (auto& entry : lan_)
            entry.second->CheckMulticast();
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
        // Loopback has a context of its own, made first; the manager's attempt on lo then fails
        // to bind (GUPnP warns once). Should the manager have got there first, its context
        // serves 127.0.0.1 instead.
        std::string error;
        if (!me->loopback_ && me->ServeLoopback(context, error))
            me->loopbackRetry_.Remove();
        return;
    }
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
    syslog(LOG_INFO, "%s (%s) went away; no longer served there",
           it->second->interfaceName().c_str(), it->second->address().c_str());
    me->lan_.erase(it);
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
