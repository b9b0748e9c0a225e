// Refresh action: the iPod's or a playlist category's children again, in a success reply.
#include "src/tree/Refresh.h"

#include <cstring>

#include "src/handler/HarmonaHandler.h"

namespace harmona::tree {
namespace {

bool Is(const char* target, const char* name) {
    return target != nullptr && std::strcmp(target, name) == 0;
}

}  // namespace

const RefreshListers& DefaultRefreshListers() {
    static const RefreshListers listers = {
        [](HarmonaHandler& h, Json::Value& items) { return h.ListIPodPlaylists(items); },
        [](HarmonaHandler& h, Json::Value& items, const char* category) {
            return h.ListPlaylists(items, category);
        },
        [](HarmonaHandler& h, Json::Value& items, const char* category) {
            return h.ListSmartPlaylists(items, category);
        },
    };
    return listers;
}

void RefreshNodeWith(HarmonaHandler& handler, const char* target, const RefreshListers& listers) {
    Json::Value reply;
    Json::Value items;
    // An absent target is answered like an unknown one: an empty reply.
    const char* category = Is(target, "personal") ? "music_personal"
                           : Is(target, "shared") ? "music_shared"
                                                  : nullptr;
    if (Is(target, "ipod")) {
        listers.iPodPlaylists(handler,
                              items);  // its result is ignored: the iPod listing cannot fail here
        reply["items"] = std::move(items);
        handler.SetSuccess(reply, true);
    } else if (category != nullptr) {
        if (listers.playlists(handler, items, category) == 0 ||
            listers.smartPlaylists(handler, items, category) == 0) {
            handler.SetError(reply, "common", "error_system", __LINE__);
        } else {
            reply["items"] = std::move(items);
            handler.SetSuccess(reply, true);
        }
    }
    handler.PrintResponse(std::move(reply), kReplyContentType);
}

}  // namespace harmona::tree

void HarmonaHandler::RefreshNode(const char* target) {
    harmona::tree::RefreshNodeWith(*this, target, harmona::tree::DefaultRefreshListers());
}
