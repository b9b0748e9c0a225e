// harmona-mediad's network side on GUPnP: the same MediaServer:1 device on 127.0.0.1 (the CGI's
// fixed endpoint, served directly) and on every LAN interface GUPnP's context manager reports,
// following interfaces as they come, go and change address. Nothing here ends the process when
// the network is not ready: a context that cannot be made is logged and tried again.
#pragma once

#include <libgupnp/gupnp.h>

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/lib/gupnp/MainLoop.h"
#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-mediad/ConnectionManagerService.h"
#include "services/harmona-mediad/ContentDirectory.h"
#include "services/harmona-mediad/ContentDirectoryService.h"
#include "services/harmona-mediad/DeviceDescription.h"
#include "services/harmona-mediad/MediaFileServer.h"
#include "services/harmona-mediad/SubscriptionGuard.h"

namespace harmona::mediad {

// The fixed port the CGI connects to on 127.0.0.1 (platform/README.md, "Fixed paths"); the LAN
// interfaces use it too.
inline constexpr unsigned short kMediaServerPort = paths::kLocalMediaServerPort;

struct MediaServerOptions {
    const char* interfaceName = nullptr;  // nullptr: every interface the context manager finds
    unsigned short port = kMediaServerPort;
    std::string dbPath;
    std::string sharePath;
    DescriptionFiles descriptions;  // made by PrepareDescriptions
};

// Everything served on one context (one interface address): the root device with its two
// services, the files and the subscription guard.
class ServedContext {
  public:
    // The device goes on the network (and `onAvailable` runs) once GUPnP has read the
    // ContentDirectory's own description: before that its first events would be empty.
    static std::unique_ptr<ServedContext> Create(GUPnPContext* context,
                                                 const MediaServerOptions& options,
                                                 std::shared_ptr<ContentDirectory> directory,
                                                 std::function<void(ServedContext&)> onAvailable,
                                                 std::string& error);
    ~ServedContext();

    const std::string& address() const { return address_; }
    const std::string& interfaceName() const { return interface_; }
    GUPnPContext* context() const { return context_.get(); }
    // Sends the alive set again (after start and after network changes; not only at the
    // periodic renewal GSSDP does on its own). Alive only: a byebye would make every control
    // point drop the server and find it again.
    void AnnounceAgain();
    // Announces now and a few more times over the next half minute.
    void ScheduleAnnouncements();
    // The only byebye this server sends: when it leaves the network.
    void SayByeBye();
    // The interface went down (or lost its carrier, as GUPnP sees it): nothing is sent until it
    // is back; the device, its subscribers and its HTTP server stay.
    void GoDown();
    bool down() const { return down_; }
    // The same interface address is usable again: announced at once and a few times more.
    void ComeBack();
    // The address is gone: nothing more goes out (no byebye from a dead address).
    void Withdraw();
    void NotifyIfLibraryChanged();
    // Whether SSDP multicast can leave this context's interface; logged when that changes.
    void CheckMulticast();

  private:
    ServedContext() = default;
    static void OnIntrospected(GObject* service, GAsyncResult* result, gpointer self);
    void BecomeAvailable();

    gupnp::ObjectRef<GUPnPContext> context_;
    std::string address_, interface_;
    std::shared_ptr<ContentDirectory> directory_;
    gupnp::ObjectRef<GUPnPRootDevice> device_;
    std::unique_ptr<ContentDirectoryService> contentDirectoryService_;
    std::unique_ptr<ConnectionManagerService> connectionManagerService_;
    std::unique_ptr<MediaFileServer> files_;
    std::unique_ptr<SubscriptionGuard> guard_;
    std::unique_ptr<RequestBodyLimit> bodyLimit_;
    std::vector<gupnp::Source> announcements_;
    gupnp::ObjectRef<GCancellable> introspection_;
    std::function<void(ServedContext&)> onAvailable_;
    // Runs once GSSDP's own first messages were dropped (see BecomeAvailable).
    gupnp::Source settle_;
    bool settling_ = false;
    bool multicastOk_ = true;
    bool down_ = false;
};

class MediaServer {
  public:
    explicit MediaServer(MediaServerOptions options);
    ~MediaServer();
    MediaServer(const MediaServer&) = delete;
    MediaServer& operator=(const MediaServer&) = delete;

    // Starts serving on loopback (the context manager's context on lo; one of our own, retried
    // every second, when none came) and on the LAN (as the context manager reports interfaces).
    // `onLoopbackReady` runs once, when 127.0.0.1 serves.
    void Start(std::function<void()> onLoopbackReady);
    // Byebye on every context.
    void SayByeBye();

  private:
    bool TryLoopback();
    bool ServeLoopback(GUPnPContext* context, std::string& error);
    void StartContextManager();
    static void OnContextAvailable(GUPnPContextManager* manager, GUPnPContext* context,
                                   gpointer self);
    static void OnContextUnavailable(GUPnPContextManager* manager, GUPnPContext* context,
                                     gpointer self);
    void ForEachContext(const std::function<void(ServedContext&)>& action);
    // Ends (without a byebye) served contexts whose address left their interface.
    void DropStale(const std::string& address);
    void RefreshLibrary();

    MediaServerOptions options_;
    // One content tree for every context (each gives its own file server's URL per Browse).
    std::shared_ptr<ContentDirectory> directory_;
    // Set while a thread loads a changed library; cleared back on the main loop.
    bool refreshing_ = false;
    // Lets a load that ends after this server went know that it did.
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
    std::function<void()> onLoopbackReady_;
    std::unique_ptr<ServedContext> loopback_;
    std::map<GUPnPContext*, std::unique_ptr<ServedContext>> lan_;
    gupnp::ObjectRef<GUPnPContextManager> manager_;
    std::vector<gupnp::SignalConnection> managerSignals_;
    gupnp::Source loopbackRetry_;
    gupnp::Source libraryWatch_;
    gupnp::Source multicastWatch_;
};

}  // namespace harmona::mediad
