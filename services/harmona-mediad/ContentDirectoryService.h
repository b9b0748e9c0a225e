// ContentDirectory:1 on a GUPnP service: the SOAP actions mapped onto ContentDirectory (Browse,
// the capabilities, the system update id) and its evented variables (SystemUpdateID,
// ContainerUpdateIDs), sent to subscribers whenever the library changes. A Browse runs in GLib's
// thread pool and is answered from the main loop, so that a large listing never holds up SSDP,
// other clients or file transfers.
#pragma once

#include <libgupnp/gupnp.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"
#include "services/harmona-mediad/ContentDirectory.h"

namespace harmona::mediad {

class ContentDirectoryService {
  public:
    // `directory` answers the actions (shared: a Browse in a thread may outlive this object);
    // the res URLs of its replies start with `mediaBaseUrl`, this context's file server.
    ContentDirectoryService(GUPnPService* service,
                            std::shared_ptr<const ContentDirectory> directory,
                            std::string mediaBaseUrl);
    ContentDirectoryService(const ContentDirectoryService&) = delete;
    ContentDirectoryService& operator=(const ContentDirectoryService&) = delete;

    // Sends SystemUpdateID and ContainerUpdateIDs to every subscriber when the update id of the
    // loaded library moved since the last call (or since this service started). Never loads.
    void NotifyIfChanged();

  private:
    // One handler per action, each connected once for its own name; GUPnP answers 401 Invalid
    // Action for any other.
    static void OnBrowse(GUPnPService* service, GUPnPServiceAction* action, gpointer self);
    static void OnGetSearchCapabilities(GUPnPService* service, GUPnPServiceAction* action,
                                        gpointer self);
    static void OnGetSortCapabilities(GUPnPService* service, GUPnPServiceAction* action,
                                      gpointer self);
    static void OnGetSystemUpdateId(GUPnPService* service, GUPnPServiceAction* action,
                                    gpointer self);
    static void OnQueryVariable(GUPnPService* service, const char* variable, GValue* value,
                                gpointer self);

    gupnp::ObjectRef<GUPnPService> service_;
    std::shared_ptr<const ContentDirectory> directory_;
    std::string mediaBaseUrl_;
    uint32_t announcedUpdateId_;
    std::vector<gupnp::SignalConnection> connections_;
};

}  // namespace harmona::mediad
