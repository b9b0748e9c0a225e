// ConnectionManager:1 on a GUPnP service: a source of the library's audio formats over HTTP GET,
// with the one implicit connection (id 0) that servers without PrepareForConnection have.
#pragma once

#include <libgupnp/gupnp.h>

#include <vector>

#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"

namespace harmona::mediad {

class ConnectionManagerService {
  public:
    explicit ConnectionManagerService(GUPnPService* service);
    ConnectionManagerService(const ConnectionManagerService&) = delete;
    ConnectionManagerService& operator=(const ConnectionManagerService&) = delete;

  private:
    // One handler per action, each connected once for its own name; GUPnP answers 401 Invalid
    // Action for any other.
    static void OnGetProtocolInfo(GUPnPService* service, GUPnPServiceAction* action, gpointer self);
    static void OnGetCurrentConnectionIds(GUPnPService* service, GUPnPServiceAction* action,
                                          gpointer self);
    static void OnGetCurrentConnectionInfo(GUPnPService* service, GUPnPServiceAction* action,
                                           gpointer self);
    static void OnQueryVariable(GUPnPService* service, const char* variable, GValue* value,
                                gpointer self);

    gupnp::ObjectRef<GUPnPService> service_;
    std::vector<gupnp::SignalConnection> connections_;
};

}  // namespace harmona::mediad
