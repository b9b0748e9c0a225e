// The iPod category's children: a refresh button, then one leaf per playlist on the attached iPod.
#include <cstdio>
#include <cstring>

#include "platform/ipod/IPodPlaylist.h"
#include "src/handler/HarmonaHandler.h"

namespace {

// The id buffer of a playlist node: "ipod_" and the key, cut to fit.
constexpr std::size_t kIPodIdBufferSize = 4096;

constexpr const char* kIPodRootId = "ipod_root";
constexpr const char* kIPodRefreshId = "ipod_refresh";
constexpr const char* kRefreshButtonIcon = "3rdparty/Harmona/images/button/btn_refresh.png";
constexpr const char* kIPodPlaylistIcon = "3rdparty/Harmona/images/files_class/icon_genmusic.png";

// A record's text field up to its NUL, never past the field.
template <std::size_t Size>
std::string FieldText(const char (&field)[Size]) {
    return std::string(field, strnlen(field, Size));
}

}  // namespace

int HarmonaHandler::AddIPodChildren(Json::Value& children) {
    Json::Value texts = LoadUITexts();
    Json::Value node;
    // The button's pid is empty, so the node has none, like the playlist categories' buttons and
    // unlike the playlists' "ipod_root"; pinned by
    // IPodNodes.AnIPodWithNoPlaylistsGivesTheRefreshButtonAloneWithAnEmptyPid.
    FillTreeNode(node, kIPodRefreshId, "", texts["player"]["refresh_btn_title"].asString(),
                 kRefreshButtonIcon, NODE_LEAF);
    children.append(node);
    // The count does not matter here: no playlist still leaves the refresh button.
    ListIPodPlaylists(children);
    return 1;
}

int HarmonaHandler::ListIPodPlaylists(Json::Value& children) {
    PLAYLIST_INFO* head = nullptr;
    int count = 0;
    if (VANUIPodPlaylistGetAll(&head) == 0) {
        if (head == nullptr)
            return 0;
        Json::Value node;
        char id[kIPodIdBufferSize];
        for (const PLAYLIST_INFO* record = head; record != nullptr; record = record->pNext) {
            std::memset(id, 0, sizeof(id));
            const std::string key = FieldText(record->szKey);
            // Bounded: a key longer than the buffer leaves is cut, never overflowing.
            std::snprintf(id, sizeof(id), "ipod_%s", key.c_str());
            FillTreeNode(node, id, kIPodRootId, FieldText(record->szName), kIPodPlaylistIcon,
                         NODE_LEAF);
            children.append(std::move(node));
            ++count;
        }
    }
    // A failing library may still have left a list behind; it is freed all the same.
    if (head != nullptr)
        VANUPlayListFree(head);
    return count;
}
