#include "services/harmona-mediad/ContentDirectoryService.h"

#include <cstdlib>
#include <memory>
#include <string>
#include <utility>

#include "common/util/Number.h"
#include "platform/lib/gupnp/MainLoop.h"
#include "platform/lib/gupnp/ServiceAction.h"

namespace harmona::mediad {
namespace {

bool ParseUnsigned(const std::string& text, uint32_t* value) {
    std::string digits = text;
    digits.erase(0, digits.find_first_not_of(" \t\r\n"));
    digits.erase(digits.find_last_not_of(" \t\r\n") + 1);
    int64_t parsed = 0;
    if (digits.size() > 10 || !util::ParseDecimalDigits(digits, parsed) || parsed > 0xffffffffLL)
        return false;
    *value = static_cast<uint32_t>(parsed);
    return true;
}

// The Browse arguments; false when one is missing or malformed (the client gets 402).
bool ReadBrowseArgs(const gupnp::ServiceAction& action, BrowseArgs* args) {
    const auto objectId = action.Argument("ObjectID");
    const auto flag = action.Argument("BrowseFlag");
    if (!objectId || !flag || (*flag != "BrowseMetadata" && *flag != "BrowseDirectChildren"))
        return false;
    args->objectId = *objectId;
    args->metadata = *flag == "BrowseMetadata";
    args->sortCriteria = action.Argument("SortCriteria").value_or("");
    const auto start = action.Argument("StartingIndex");
    const auto count = action.Argument("RequestedCount");
    return (!start || ParseUnsigned(*start, &args->startingIndex)) &&
           (!count || ParseUnsigned(*count, &args->requestedCount));
}

// The answer to a Browse, back on the main loop.
void AnswerBrowse(gupnp::ServiceAction& action, const BrowseResult& result) {
    if (result.error != 0) {
        action.ReturnError(result.error, result.errorText);
        return;
    }
    action.SetString("Result", result.didl);
    action.SetUnsigned("NumberReturned", result.numberReturned);
    action.SetUnsigned("TotalMatches", result.totalMatches);
    action.SetUnsigned("UpdateID", result.updateId);
    action.ReturnSuccess();
}

void Browse(const std::shared_ptr<const ContentDirectory>& directory,
            const std::string& mediaBaseUrl, gupnp::ServiceAction&& action) {
    BrowseArgs args;
    args.mediaBaseUrl = mediaBaseUrl;
    if (!ReadBrowseArgs(action, &args)) {
        action.ReturnError(kErrorInvalidArgs, "Invalid Args");
        return;
    }
    // A Browse may load a changed library or write a large reply: never on the main loop.
    auto call = std::make_shared<std::pair<gupnp::ServiceAction, BrowseResult>>(std::move(action),
                                                                                BrowseResult{});
    gupnp::RunInThread(
        [directory, args = std::move(args), call] { call->second = directory->Browse(args); },
        [call] { AnswerBrowse(call->first, call->second); });
}

// GetSystemUpdateID answers the library as it is now, which may need a load: in a thread too.
void GetSystemUpdateId(const std::shared_ptr<const ContentDirectory>& directory,
                       gupnp::ServiceAction&& action) {
    auto call = std::make_shared<std::pair<gupnp::ServiceAction, uint32_t>>(std::move(action), 0);
    gupnp::RunInThread([directory, call] { call->second = directory->SystemUpdateId(); },
                       [call] {
                           call->first.SetUnsigned("Id", call->second);
                           call->first.ReturnSuccess();
                       });
}

}  // namespace

ContentDirectoryService::ContentDirectoryService(GUPnPService* service,
                                                 std::shared_ptr<const ContentDirectory> directory,
                                                 std::string mediaBaseUrl)
    : service_(gupnp::ObjectRef<GUPnPService>::Share(service)),
      directory_(std::move(directory)),
      mediaBaseUrl_(std::move(mediaBaseUrl)),
      announcedUpdateId_(directory_->LoadedSystemUpdateId()) {
    const struct {
        const char* signal;
        GCallback handler;
    } actions[] = {
        {"action-invoked::Browse", G_CALLBACK(&OnBrowse)},
        {"action-invoked::GetSearchCapabilities", G_CALLBACK(&OnGetSearchCapabilities)},
        {"action-invoked::GetSortCapabilities", G_CALLBACK(&OnGetSortCapabilities)},
        {"action-invoked::GetSystemUpdateID", G_CALLBACK(&OnGetSystemUpdateId)},
    };
    for (const auto& action : actions)
        connections_.emplace_back(service, action.signal, action.handler, this);
    connections_.emplace_back(service, "query-variable", G_CALLBACK(&OnQueryVariable), this);
}

void ContentDirectoryService::OnBrowse(GUPnPService*, GUPnPServiceAction* invoked, gpointer self) {
    auto* me = static_cast<ContentDirectoryService*>(self);
    Browse(me->directory_, me->mediaBaseUrl_, gupnp::ServiceAction(invoked));
}

void ContentDirectoryService::OnGetSearchCapabilities(GUPnPService*, GUPnPServiceAction* invoked,
                                                      gpointer) {
    gupnp::ServiceAction action(invoked);
    action.SetString("SearchCaps", kSearchCapabilities);
    action.ReturnSuccess();
}

void ContentDirectoryService::OnGetSortCapabilities(GUPnPService*, GUPnPServiceAction* invoked,
                                                    gpointer) {
    gupnp::ServiceAction action(invoked);
    action.SetString("SortCaps", kSortCapabilities);
    action.ReturnSuccess();
}

void ContentDirectoryService::OnGetSystemUpdateId(GUPnPService*, GUPnPServiceAction* invoked,
                                                  gpointer self) {
    auto* me = static_cast<ContentDirectoryService*>(self);
    GetSystemUpdateId(me->directory_, gupnp::ServiceAction(invoked));
}

void ContentDirectoryService::OnQueryVariable(GUPnPService*, const char* variable, GValue* value,
                                              gpointer self) {
    auto* me = static_cast<ContentDirectoryService*>(self);
    const std::string name = variable != nullptr ? variable : "";
    if (name == "SystemUpdateID") {
        g_value_init(value, G_TYPE_UINT);
        g_value_set_uint(value, me->directory_->LoadedSystemUpdateId());
    } else if (name == "ContainerUpdateIDs") {
        g_value_init(value, G_TYPE_STRING);
        g_value_set_string(value, me->directory_->LoadedContainerUpdateIds().c_str());
    }
}

void ContentDirectoryService::NotifyIfChanged() {
    const uint32_t updateId = directory_->LoadedSystemUpdateId();
    if (updateId == announcedUpdateId_)
        return;
    announcedUpdateId_ = updateId;
    const std::string containers = directory_->LoadedContainerUpdateIds();
    // GUPnP sends each variable in a NOTIFY of its own unless notifications are frozen: frozen,
    // a subscriber hears one change as one event with both values.
    gupnp_service_freeze_notify(service_.get());
    gupnp_service_notify(service_.get(), "SystemUpdateID", G_TYPE_UINT, updateId,
                         "ContainerUpdateIDs", G_TYPE_STRING, containers.c_str(), nullptr);
    gupnp_service_thaw_notify(service_.get());
}

}  // namespace harmona::mediad
