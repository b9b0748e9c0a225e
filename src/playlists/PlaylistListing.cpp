// The playlist listing: one leaf per ordinary playlist of the personal or the shared category.
#include <syslog.h>

#include <cstdio>
#include <cstring>

#include "platform/playlist/PlaylistList.h"
#include "src/handler/HarmonaHandler.h"

namespace {

// The log line's unit name and line number: fixed identifiers that log readers match on, not the
// source line, so they must not follow the code when it moves.
constexpr const char* kLogUnit = "audio";
constexpr int kEnumFailedLine = 642;

constexpr const char* kPlaylistIcon = "3rdparty/Harmona/images/files_class/icon_playlist.png";
constexpr std::size_t kNodeIdSize = 4096;

enum class Category { personal, shared };

}  // namespace

int HarmonaHandler::ListPlaylists(Json::Value& children, const char* category) {
    Json::Value node;
    PLAYLIST_INFO* head = nullptr;
    int result = 0;
    int listed = -1;
    Category which = Category::personal;

    if (std::strcmp(category, "music_personal") == 0) {
        listed = VANUPersonalPlaylistListAll(webMan.GetPreferenceDir().c_str(), &head, 0, 0);
        which = Category::personal;
    } else if (std::strcmp(category, "music_shared") == 0) {
        listed = VANUPlaylistListAll(&head, 0, 0, 0);
        which = Category::shared;
    }

    if (listed >= 0) {
        char id[kNodeIdSize];
        for (const PLAYLIST_INFO* record = head; record != nullptr; record = record->pNext) {
            // Personal playlists are addressed by name, shared ones by number.
            if (which == Category::personal)
                std::snprintf(id, sizeof id, "musiclib_music_personal/playlist/%s", record->szName);
            else
                std::snprintf(id, sizeof id, "musiclib_music_shared/playlist/%lu",
                              static_cast<unsigned long>(record->id));
            FillTreeNode(
                node, id,
                which == Category::personal ? "musiclib_music_personal" : "musiclib_music_shared",
                record->szName, kPlaylistIcon, NODE_LEAF);
            children.append(std::move(node));
        }
        result = 1;
    } else {
        // One message for an unknown category and a failed listing alike.
        syslog(LOG_ERR, "%s:%d Failed to enum user's playlist!", kLogUnit, kEnumFailedLine);
    }

    if (head != nullptr)
        VANUPlayListFree(head);
    return result;
}
