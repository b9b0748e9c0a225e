// Refresh action: the iPod's or a playlist category's children again, in a success reply.
#include <json/value.h>

#include <cstring>

#include "src/handler/HarmonaHandler.h"

namespace harmona::tree {
namespace {

// The line number that the error reply of a failing listing carries: a fixed identifier that the
// browser and log readers match on, not the source line, so it must not follow the code when it
// moves.
constexpr int kListingErrorLine = 30;

bool Is(const char* target, const char* name) {
    return target != nullptr && std::strcmp(target, name) == 0;
}

void RefreshNode(HarmonaHandler& handler, const char* target) {
    Json::Value reply;
    Json::Value items;
    // An absent target is answered like an unknown one: an empty reply.
    const char* category = Is(target, "personal") ? "music_personal"
                           : Is(target, "shared") ? "music_shared"
                                                  : nullptr;
    if (Is(target, "ipod")) {
        handler.ListIPodPlaylists(
            items);  // its result is ignored: the iPod listing cannot fail here
        reply["items"] = std::move(items);
        handler.SetSuccess(reply, true);
    } else if (category != nullptr) {
        if (handler.ListPlaylists(items, category) == 0 ||
            handler.ListSmartPlaylists(items, category) == 0) {
            handler.SetError(reply, "common", "error_system", kListingErrorLine);
        } else {
            reply["items"] = std::move(items);
            handler.SetSuccess(reply, true);
        }
    }
    handler.PrintResponse(std::move(reply), kReplyContentType);
}

}  // namespace
}  // namespace harmona::tree

void HarmonaHandler::RefreshNode(const char* target) {
    harmona::tree::RefreshNode(*this, target);
}
