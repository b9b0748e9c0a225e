// The media server list: a scan button, then one leaf per UPnP media server that the audio daemon
// knows of (src/daemonclient/MediaServerList.h reads them page by page over its control socket).
#include <cstdio>
#include <cstring>
#include <string>

#include "src/daemonclient/MediaServerList.h"
#include "src/handler/HarmonaHandler.h"

namespace {

constexpr const char* kRootId = "mediaserver_root";
constexpr const char* kScanButtonId = "mediaserver_refresh";
constexpr const char* kScanButtonIcon = "3rdparty/Harmona/images/button/btn_search_dms.png";
constexpr const char* kServerIcon = "3rdparty/Harmona/images/files_class/icon_mediaserver.png";

// The node id buffer.
constexpr int kNodeIdSize = 1024;

// A member of an object, or null for anything else (a non-object would make jsoncpp throw).
const Json::Value& Member(const Json::Value& value, const char* name) {
    static const Json::Value null;
    if (!value.isObject())
        return null;
    const Json::Value* member = value.find(name, name + std::strlen(name));
    return member != nullptr ? *member : null;
}

}  // namespace

int HarmonaHandler::GetMediaServerNodes(Json::Value& children) {
    const Json::Value texts = LoadUITexts();
    const Json::Value& label = Member(Member(texts, "common"), "btn_scan_dms");
    Json::Value node;
    FillTreeNode(node, kScanButtonId, "", label.isString() ? label.asString() : std::string(),
                 kScanButtonIcon, NODE_LEAF);
    children.append(node);
    AppendMediaServers(children);
    return 1;
}

int HarmonaHandler::AppendMediaServers(Json::Value& children) {
    Json::Value node;
    return harmona::daemonclient::ReadMediaServerList(
        [&](const harmona::daemonclient::ListedMediaServer& server) {
            char id[kNodeIdSize];
            std::snprintf(id, sizeof(id), "mediaserver_%s", server.controlUrl.c_str());
            FillTreeNode(node, id, kRootId, server.text, kServerIcon, NODE_LEAF);
            children.append(std::move(node));
        });
}

void HarmonaHandler::RefreshMediaServers() {
    Json::Value reply;
    Json::Value items;
    AppendMediaServers(items);
    reply["items"] = std::move(items);
    SetSuccess(reply, true);
    PrintResponse(std::move(reply), kReplyContentType);
}
