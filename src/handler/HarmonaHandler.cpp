// Part 1.1: request entry and action dispatch.
#include "HarmonaHandler.h"

#include <cstring>

#include "AudioUsers.h"

HarmonaHandler::HarmonaHandler() : userPermission(0) {}

HarmonaHandler::~HarmonaHandler() = default;

int HarmonaHandler::Process() {
    if (!webMan.IsAuthorized(nullptr, 3, static_cast<tag_cgi_position>(3)))
        return 0;
    webMan.LoadIn();
    userPermission = AudioUsers::GetUserPermission(webMan.GetLoginUserName());
    if (userPermission == 0)
        return 0;

    const char* action = webMan.In("action", nullptr);
    if (action == nullptr)
        return 0;

    // The builders of "gettreenode", "refresh" and "rerandom100" are connected here as their Parts
    // land (spec, Order of building); until then those actions are unknown actions.
    if (std::strcmp(action, "refresh") == 0) {
        const char* target = webMan.In("target", nullptr);
        if (target != nullptr && std::strcmp(target, "mediaserver") == 0)
            RefreshMediaServers();
        // Any other target (absent too): RefreshNode(target) of Part 2.3, connected when it lands.
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
