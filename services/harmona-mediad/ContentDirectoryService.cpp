#include "ContentDirectoryService.h"

#include <gio/gio.h>

#include <cstdlib>
#include <memory>
#include <string>

#include "gupnp/ServiceAction.h"

namespace harmona::mediad {
namespace {

constexpr int kErrorInvalidAction = 401;

bool ParseUnsigned(const std::string& text, uint32_t* value) {
    std::string digits = text;
    digits.erase(0, digits.find_first_not_of(" \t\r\n"));
    digits.erase(digits.find_last_not_of(" \t\r\n") + 1);
    if (digits.empty() || digits.size() > 10 ||
        digits.find_first_not_of("0123456789") != std::string::npos)
        return false;
    const unsigned long long parsed = std::strtoull(digits.c_str(), nullptr, 10);
    if (parsed > 0xffffffffULL)
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

// One Browse on its way through the thread pool.
struct BrowseJob {
    std::shared_ptr<const ContentDirectory> directory;
    BrowseArgs args;
    BrowseResult result;
    gupnp::ServiceAction action;
};

void RunBrowse(GTask* task, gpointer, gpointer data, GCancellable*) {
    auto* job = static_cast<BrowseJob*>(data);
    job->result = job->directory->Browse(job->args);  // thread-safe: a connection of its own
    g_task_return_boolean(task, TRUE);
}

// Back in the main loop: the answer.
void FinishBrowse(GObject*, GAsyncResult*, gpointer data) {
    std::unique_ptr<BrowseJob> job(static_cast<BrowseJob*>(data));
    const BrowseResult& result = job->result;
    if (result.error != 0) {
        job->action.ReturnError(result.error, result.errorText);
        return;
    }
    job->action.SetString("Result", result.didl);
    job->action.SetUnsigned("NumberReturned", result.numberReturned);
    job->action.SetUnsigned("TotalMatches", result.totalMatches);
    job->action.SetUnsigned("UpdateID", result.updateId);
    job->action.ReturnSuccess();
}

void Browse(const std::shared_ptr<const ContentDirectory>& directory,
            gupnp::ServiceAction&& action) {
    BrowseArgs args;
    if (!ReadBrowseArgs(action, &args)) {
        action.ReturnError(kErrorInvalidArgs, "Invalid Args");
        return;
    }
    auto* job = new BrowseJob{directory, std::move(args), {}, std::move(action)};
    GTask* task = g_task_new(nullptr, nullptr, &FinishBrowse, job);
    g_task_set_task_data(task, job, nullptr);
    g_task_run_in_thread(task, &RunBrowse);
    g_object_unref(task);
}

// The containers whose content moved: the root stands for the whole library, since a rescan may
// touch any category.
std::string ContainerUpdateIds(uint32_t systemUpdateId) {
    return "0," + std::to_string(systemUpdateId);
}

}  // namespace

ContentDirectoryService::ContentDirectoryService(GUPnPService* service,
                                                 std::shared_ptr<const ContentDirectory> directory)
    : service_(gupnp::ObjectRef<GUPnPService>::Share(service)),
      directory_(std::move(directory)),
      announcedUpdateId_(directory_->SystemUpdateId()) {
    // GUPnP answers 401 itself unless a handler is connected for the action's own detail.
    for (const char* action :
         {"action-invoked::Browse", "action-invoked::GetSearchCapabilities",
          "action-invoked::GetSortCapabilities", "action-invoked::GetSystemUpdateID"})
        connections_.emplace_back(service, action, G_CALLBACK(&OnAction), this);
    connections_.emplace_back(service, "query-variable", G_CALLBACK(&OnQueryVariable), this);
}

void ContentDirectoryService::OnAction(GUPnPService*, GUPnPServiceAction* invoked, gpointer self) {
    auto* me = static_cast<ContentDirectoryService*>(self);
    gupnp::ServiceAction action(invoked);
    const std::string name = action.name() != nullptr ? action.name() : "";
    if (name == "Browse") {
        Browse(me->directory_, std::move(action));
    } else if (name == "GetSearchCapabilities") {
        action.SetString("SearchCaps", kSearchCapabilities);
        action.ReturnSuccess();
    } else if (name == "GetSortCapabilities") {
        action.SetString("SortCaps", kSortCapabilities);
        action.ReturnSuccess();
    } else if (name == "GetSystemUpdateID") {
        action.SetUnsigned("Id", me->directory_->SystemUpdateId());
        action.ReturnSuccess();
    } else {
        action.ReturnError(kErrorInvalidAction, "Invalid Action");
    }
}

void ContentDirectoryService::OnQueryVariable(GUPnPService*, const char* variable, GValue* value,
                                              gpointer self) {
    auto* me = static_cast<ContentDirectoryService*>(self);
    const std::string name = variable != nullptr ? variable : "";
    if (name == "SystemUpdateID") {
        g_value_init(value, G_TYPE_UINT);
        g_value_set_uint(value, me->directory_->SystemUpdateId());
    } else if (name == "ContainerUpdateIDs") {
        g_value_init(value, G_TYPE_STRING);
        g_value_set_string(value, "");
    }
}

void ContentDirectoryService::NotifyIfChanged() {
    const uint32_t updateId = directory_->SystemUpdateId();
    if (updateId == announcedUpdateId_)
        return;
    announcedUpdateId_ = updateId;
    const std::string containers = ContainerUpdateIds(updateId);
    gupnp_service_notify(service_.get(), "SystemUpdateID", G_TYPE_UINT, updateId,
                         "ContainerUpdateIDs", G_TYPE_STRING, containers.c_str(), nullptr);
}

}  // namespace harmona::mediad
