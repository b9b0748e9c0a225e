// HarmonaHandler: the one handler class of the audio tree CGI (spec Part 1.1). Its builders are
// non-virtual members returning 1 for success and 0 for failure; each lives in the source unit of
// its Part (grep the name).
#pragma once

#include <json/value.h>

#include <string>

#include "ActionHandler.h"

// Node flags of the tree node record (Part 1.2).
enum : unsigned int {
    NODE_ALLOW_DRAG = 1,
    NODE_ALLOW_DROP = 2,
    NODE_DRAGGABLE = 4,
    NODE_EXPANDED = 8,
    NODE_LEAF = 16,
};

// The user's audio permission bits (Part 1.1).
enum : int {
    PERM_IPOD = 1,
    PERM_NEW_SHARED_PLAYLIST = 4,
    PERM_MEDIA_SERVER = 8,
};

// The content type of every reply (Part 1.1).
inline constexpr const char* kReplyContentType = "text/plain; charset=\"UTF-8\"";

class HarmonaHandler : public ActionHandler {
  public:
    HarmonaHandler();
    ~HarmonaHandler() override;

    // Part 1.1: authorizes, reads the permission bits and dispatches `action`.
    int Process() override;

    // Part 1.2: writes the tree node attributes into `node`.
    void FillTreeNode(Json::Value& node, const std::string& id, const std::string& pid,
                      const std::string& text, const std::string& icon, unsigned int flags);

    // Part 1.3: the UI texts of the request's language.
    Json::Value LoadUITexts();

    // Part 2.1: root tree.
    int BuildRootTree();
    bool HasIPodDirectory();
    bool IsLibraryServiceRunning();

    // Part 2.2: child node routing.
    int GetChildNodes(const char* nodeId);

    // Part 2.3: refresh action.
    void RefreshNode(const char* target);

    // Part 3.1: music library subtree.
    int GetMusicLibraryNodes(Json::Value& children, const char* objectId);

    // Part 3.2: media server list.
    int GetMediaServerNodes(Json::Value& children);
    int AppendMediaServers(Json::Value& children);
    void RefreshMediaServers();

    // Part 4.1: playlist category nodes.
    int AddPersonalPlaylistCategory(Json::Value& children);
    int AddSharedPlaylistCategory(Json::Value& children);

    // Part 4.2: playlist listing.
    int ListPlaylists(Json::Value& children, const char* category);

    // Part 4.3: smart playlists.
    int ListSmartPlaylists(Json::Value& children, const char* category);

    // Part 4.4: random-100 playlist.
    void CreateRandom100Playlist();

    // Part 5.1: iPod nodes.
    int AddIPodChildren(Json::Value& children);
    int ListIPodPlaylists(Json::Value& children);

    // Part 5.2: internet radio nodes.
    int AddRadioChildren(Json::Value& children);

    // The user's audio permission bits; 0 until Process has read them (Part 1.1).
    int userPermission;
};
