#include "platform/lib/gupnp/ContextManager.h"

#include <utility>

namespace harmona::gupnp {

void MakeActive(GUPnPContext* context) {
    if (!gssdp_client_get_active(GSSDP_CLIENT(context)))
        g_object_set(context, "active", TRUE, nullptr);
}

void MakePassive(GUPnPContext* context) {
    if (gssdp_client_get_active(GSSDP_CLIENT(context)))
        g_object_set(context, "active", FALSE, nullptr);
}

ContextManager::ContextManager(const char* interfaceName, Handler available, Handler unavailable)
    : available_(std::move(available)), unavailable_(std::move(unavailable)) {
    manager_ = ObjectRef<GUPnPContextManager>::Adopt(
        gupnp_context_manager_create_full(GSSDP_UDA_VERSION_1_0, G_SOCKET_FAMILY_INVALID, 0));
    if (interfaceName != nullptr) {
        GUPnPContextFilter* filter = gupnp_context_manager_get_context_filter(manager_.get());
        gupnp_context_filter_add_entry(filter, interfaceName);
        gupnp_context_filter_set_enabled(filter, TRUE);
    }
    // The contexts are announced from the main loop (an idle source of the manager), so the
    // handlers connected here hear of the addresses present at start as well.
    availableSignal_ = SignalConnection(manager_.get(), "context-available",
                                        G_CALLBACK(&ContextManager::Available), this);
    unavailableSignal_ = SignalConnection(manager_.get(), "context-unavailable",
                                          G_CALLBACK(&ContextManager::Unavailable), this);
}

void ContextManager::Available(GUPnPContextManager*, GUPnPContext* context, gpointer data) {
    // GUPnP makes a context passive (it sends nothing, not even searches) when its interface goes
    // down, and hands the same context back when the interface is up again without making it
    // active: without this the interface stays silent for good after a link down and up.
    MakeActive(context);
    static_cast<ContextManager*>(data)->available_(context);
}

void ContextManager::Unavailable(GUPnPContextManager*, GUPnPContext* context, gpointer data) {
    static_cast<ContextManager*>(data)->unavailable_(context);
}

}  // namespace harmona::gupnp
