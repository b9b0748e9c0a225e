// GUPnP's context manager: one GUPnPContext (an SSDP client bound to one address) per usable
// address of the host's interfaces, created and withdrawn as addresses come and go (netlink on
// Linux). The owner hears of each through two callbacks on the thread-default main context.
#pragma once

#include <libgupnp/gupnp.h>

#include <functional>

#include "platform/lib/gupnp/Object.h"
#include "platform/lib/gupnp/Signal.h"

namespace harmona::gupnp {

// A passive context sends nothing (no announcement, no search, no answer to a search) and still
// serves HTTP. GUPnP makes a context passive when its interface goes down.
void MakeActive(GUPnPContext* context);
void MakePassive(GUPnPContext* context);

class ContextManager {
  public:
    using Handler = std::function<void(GUPnPContext*)>;

    // Follows every interface, or only `interfaceName` when it is not null. IPv4 and IPv6 on an
    // ephemeral port for searches (the multicast port is SSDP's own).
    ContextManager(const char* interfaceName, Handler available, Handler unavailable);
    ~ContextManager() = default;
    ContextManager(const ContextManager&) = delete;
    ContextManager& operator=(const ContextManager&) = delete;

  private:
    static void Available(GUPnPContextManager*, GUPnPContext* context, gpointer data);
    static void Unavailable(GUPnPContextManager*, GUPnPContext* context, gpointer data);

    Handler available_;
    Handler unavailable_;
    ObjectRef<GUPnPContextManager> manager_;
    // Declared after the manager: disconnected before it goes.
    SignalConnection availableSignal_;
    SignalConnection unavailableSignal_;
};

}  // namespace harmona::gupnp
