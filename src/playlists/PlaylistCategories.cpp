// The children of the two playlist categories, personal and shared: a refresh button, a
// new-playlist button where the user may create one, then the category's playlists and smart
// playlists.
#include "src/handler/HarmonaHandler.h"

namespace {

// The line numbers that the error replies carry: fixed identifiers that the browser and log readers
// match on, not source lines, so they must not follow the code when it moves.
constexpr int kPersonalPlaylistListingErrorLine = 364;
constexpr int kPersonalSmartListingErrorLine = 369;
constexpr int kSharedPlaylistListingErrorLine = 399;
constexpr int kSharedSmartListingErrorLine = 404;

constexpr const char* kRefreshIcon = "3rdparty/Harmona/images/button/btn_refresh.png";
constexpr const char* kNewPlaylistIcon = "3rdparty/Harmona/images/button/btn_new_playlist.png";

// What tells the twins apart.
struct CategoryShape {
    const char* refreshId;
    const char* newId;
    const char* category;  // what ListPlaylists and ListSmartPlaylists take
    int listingErrorLine;
    int smartErrorLine;
};

constexpr CategoryShape kPersonal = {
    "musiclib_music_personal_refresh", "musiclib_music_personal_new", "music_personal",
    kPersonalPlaylistListingErrorLine, kPersonalSmartListingErrorLine};
constexpr CategoryShape kShared = {"musiclib_music_shared_refresh", "musiclib_music_shared_new",
                                   "music_shared", kSharedPlaylistListingErrorLine,
                                   kSharedSmartListingErrorLine};

}  // namespace

// The twins share one body; `withNewButton` is the only behavioural difference.
static int AddPlaylistCategory(HarmonaHandler& handler, Json::Value& children,
                               const CategoryShape& shape, bool withNewButton) {
    Json::Value node;
    Json::Value texts = handler.LoadUITexts();

    // The buttons carry an empty parent id, unlike the playlist nodes.
    handler.FillTreeNode(node, shape.refreshId, "", texts["player"]["refresh_btn_title"].asString(),
                         kRefreshIcon, NODE_LEAF);
    children.append(node);
    if (withNewButton) {
        handler.FillTreeNode(node, shape.newId, "", texts["playlist"]["newplaylist"].asString(),
                             kNewPlaylistIcon, NODE_LEAF | NODE_ALLOW_DROP);
        children.append(node);
    }

    if (!handler.ListPlaylists(children, shape.category)) {
        handler.SetError(children, "common", "error_system", shape.listingErrorLine);
        return 0;
    }
    // ListSmartPlaylists always returns 1; the check stays all the same.
    if (!handler.ListSmartPlaylists(children, shape.category)) {
        handler.SetError(children, "common", "error_system", shape.smartErrorLine);
        return 0;
    }
    return 1;
}

int HarmonaHandler::AddPersonalPlaylistCategory(Json::Value& children) {
    return AddPlaylistCategory(*this, children, kPersonal, true);
}

int HarmonaHandler::AddSharedPlaylistCategory(Json::Value& children) {
    return AddPlaylistCategory(*this, children, kShared,
                               (userPermission & PERM_NEW_SHARED_PLAYLIST) != 0);
}
