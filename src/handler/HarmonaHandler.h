// HarmonaHandler: the one handler class of the audio tree CGI. Its builders are non-virtual
// members returning 1 for success and 0 for failure; each lives in the source file of its part of
// the tree (grep the name).
#pragma once

#include <json/value.h>

#include <string>

#include "platform/cgi/ActionHandler.h"
#include "platform/cgi/ApplicationRequest.h"

// Node flags of the tree node record: each sets the boolean attribute of the same name.
enum : unsigned int {
    NODE_ALLOW_DRAG = 1,
    NODE_ALLOW_DROP = 2,
    NODE_DRAGGABLE = 4,
    NODE_EXPANDED = 8,
    NODE_LEAF = 16,
};

// The user's audio permission bits (platform/README.md, "Requests, users and permissions").
enum : int {
    PERM_IPOD = harmona::cgi::kPermissionIPod,
    PERM_NEW_SHARED_PLAYLIST = harmona::cgi::kPermissionNewSharedPlaylist,
    PERM_MEDIA_SERVER = harmona::cgi::kPermissionMediaServer,
};

// The content type of every reply.
inline constexpr const char* kReplyContentType = "text/plain; charset=\"UTF-8\"";

class HarmonaHandler : public ActionHandler {
  public:
    HarmonaHandler();
    ~HarmonaHandler() override;

    // Authorizes, reads the permission bits and dispatches `action`; the result is the exit status.
    int Process() override;

    // Writes the tree node attributes into `node`.
    void FillTreeNode(Json::Value& node, const std::string& id, const std::string& pid,
                      const std::string& text, const std::string& icon, unsigned int flags);

    // The UI texts of the request's language.
    Json::Value LoadUITexts();

    // Root tree: the top-level categories with their children.
    int BuildRootTree();
    bool HasIPodDirectory();
    bool IsLibraryServiceRunning();

    // Child node routing: the children of a node that the browser expands.
    int GetChildNodes(const char* nodeId);

    // Refresh action: the iPod's or a playlist category's children again.
    void RefreshNode(const char* target);

    // Music library subtree: its categories, and containers browsed on the local media server.
    int GetMusicLibraryNodes(Json::Value& children, const char* objectId);

    // Media server list, from the audio daemon.
    int GetMediaServerNodes(Json::Value& children);
    int AppendMediaServers(Json::Value& children);
    void RefreshMediaServers();

    // Children of the personal and shared playlist categories.
    int AddPersonalPlaylistCategory(Json::Value& children);
    int AddSharedPlaylistCategory(Json::Value& children);

    // Playlist listing.
    int ListPlaylists(Json::Value& children, const char* category);

    // Smart playlist listing.
    int ListSmartPlaylists(Json::Value& children, const char* category);

    // Random-100 playlist.
    void CreateRandom100Playlist();

    // iPod nodes.
    int AddIPodChildren(Json::Value& children);
    int ListIPodPlaylists(Json::Value& children);

    // Internet radio nodes.
    int AddRadioChildren(Json::Value& children);

    // The user's audio permission bits; 0 until Process has read them.
    int userPermission;
};
