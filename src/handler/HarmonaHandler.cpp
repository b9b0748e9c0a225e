// Request entry: authorizes the caller, reads the permission bits and dispatches on `action`.
#include "src/handler/HarmonaHandler.h"

#include <cstring>

#include "platform/cgi/ApplicationRequest.h"

HarmonaHandler::HarmonaHandler() : userPermission(0) {}

HarmonaHandler::~HarmonaHandler() = default;

int HarmonaHandler::Process() {
    const harmona::cgi::AdmittedRequest admitted = harmona::cgi::AdmitApplicationRequest(webMan);
    userPermission = admitted.permission;
    if (admitted.admission != harmona::cgi::Admission::admitted)
        return 0;  // a refused caller has had its reply; one without permission gets none

    const char* action = webMan.In("action", nullptr);
    if (action == nullptr)
        return 0;

    // The actions are tested in this order; every comparison is exact.
    if (std::strcmp(action, "gettreenode") == 0) {
        const char* node = webMan.In("node", nullptr);
        if (node == nullptr)
            return 0;
        const int built =
            std::strcmp(node, "audiotree_root") == 0 ? BuildRootTree() : GetChildNodes(node);
        return built != 0 ? 1 : 0;
    }
    if (std::strcmp(action, "refresh") == 0) {
        // "refresh" does not test that target is present; an absent target goes to RefreshNode,
        // which answers it like an unknown target: an empty reply.
        const char* target = webMan.In("target", nullptr);
        if (target != nullptr && std::strcmp(target, "mediaserver") == 0)
            RefreshMediaServers();
        else
            RefreshNode(target);
        return 1;  // whatever the builder did
    }
    if (std::strcmp(action, "rerandom100") == 0) {
        CreateRandom100Playlist();  // prints its own reply
        return 1;
    }
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    if (std::strcmp(action, "avoid_timeout") == 0) {
        PrintResponse(reply, kReplyContentType);
        return 1;
    }
    // Any other action: the browser sees success, the exit status records the fault.
    PrintResponse(reply, kReplyContentType);
    return 0;
}
