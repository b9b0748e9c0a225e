#include "services/harmona-mediad/ConnectionManagerService.h"

#include <string>

#include "platform/lib/gupnp/ServiceAction.h"
#include "platform/medialib/MediaFiles.h"

namespace harmona::mediad {
namespace {

constexpr int kErrorInvalidConnection = 706;

// Every MIME type of the library's audio file types (platform/medialib/MediaFiles.h).
const std::string kSourceProtocolList = medialib::SourceProtocolInfo();
const char* const kSourceProtocols = kSourceProtocolList.c_str();

void CurrentConnectionInfo(gupnp::ServiceAction& action) {
    if (action.Argument("ConnectionID").value_or("") != "0") {
        action.ReturnError(kErrorInvalidConnection, "Invalid connection reference");
        return;
    }
    action.SetString("RcsID", "-1");
    action.SetString("AVTransportID", "-1");
    action.SetString("ProtocolInfo", "");
    action.SetString("PeerConnectionManager", "");
    action.SetString("PeerConnectionID", "-1");
    action.SetString("Direction", "Output");
    action.SetString("Status", "OK");
    action.ReturnSuccess();
}

}  // namespace

ConnectionManagerService::ConnectionManagerService(GUPnPService* service)
    : service_(gupnp::ObjectRef<GUPnPService>::Share(service)) {
    const struct {
        const char* signal;
        GCallback handler;
    } actions[] = {
        {"action-invoked::GetProtocolInfo", G_CALLBACK(&OnGetProtocolInfo)},
        {"action-invoked::GetCurrentConnectionIDs", G_CALLBACK(&OnGetCurrentConnectionIds)},
        {"action-invoked::GetCurrentConnectionInfo", G_CALLBACK(&OnGetCurrentConnectionInfo)},
    };
    for (const auto& action : actions)
        connections_.emplace_back(service, action.signal, action.handler, this);
    connections_.emplace_back(service, "query-variable", G_CALLBACK(&OnQueryVariable), this);
}

void ConnectionManagerService::OnGetProtocolInfo(GUPnPService*, GUPnPServiceAction* invoked,
                                                 gpointer) {
    gupnp::ServiceAction action(invoked);
    action.SetString("Source", kSourceProtocols);
    action.SetString("Sink", "");
    action.ReturnSuccess();
}

void ConnectionManagerService::OnGetCurrentConnectionIds(GUPnPService*, GUPnPServiceAction* invoked,
                                                         gpointer) {
    gupnp::ServiceAction action(invoked);
    action.SetString("ConnectionIDs", "0");
    action.ReturnSuccess();
}

void ConnectionManagerService::OnGetCurrentConnectionInfo(GUPnPService*,
                                                          GUPnPServiceAction* invoked, gpointer) {
    gupnp::ServiceAction action(invoked);
    CurrentConnectionInfo(action);
}

void ConnectionManagerService::OnQueryVariable(GUPnPService*, const char* variable, GValue* value,
                                               gpointer) {
    const std::string name = variable != nullptr ? variable : "";
    g_value_init(value, G_TYPE_STRING);
    if (name == "SourceProtocolInfo")
        g_value_set_string(value, kSourceProtocols);
    else if (name == "CurrentConnectionIDs")
        g_value_set_string(value, "0");
    else
        g_value_set_string(value, "");
}

}  // namespace harmona::mediad
