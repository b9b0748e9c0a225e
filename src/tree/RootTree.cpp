// Root tree: the top-level categories, each with its children, in one reply.
#include <json/value.h>
#include <sys/stat.h>

#include <vector>

#include "platform/paths/PlatformPaths.h"
#include "platform/system/VanuSystem.h"
#include "src/handler/HarmonaHandler.h"

namespace harmona::tree {

// The platform's number of the service the library categories depend on (the local media server).
constexpr int kLibraryService = paths::kLocalMediaServerService;

namespace {

// The line number that the error reply of a failing category carries: a fixed identifier that the
// browser and log readers match on, not the source line, so it must not follow the code when it
// moves.
constexpr int kCategoryErrorLine = 106;

// Every category node hides its icon this way: a blank image and a hiding icon class.
constexpr const char* kBlankIcon = "3rdparty/Harmona/images/s.gif";
constexpr const char* kHiddenIconClass = "x-tree-hide-icon";

// When a root category is shown: library categories when a music share exists and the local media
// server runs, the iPod when its directory exists and the user may use it, the media servers when
// the user may see them, radio always.
enum class RootCondition { library, ipod, always, mediaServer };

using ChildBuilder = int (*)(HarmonaHandler& handler, Json::Value& children);

struct RootCategory {
    const char* id;
    const char* textSection;
    const char* textKey;
    RootCondition condition;
    ChildBuilder build;
    const char* errorSection;
    const char* errorKey;
    bool expanded;
};

// The six categories in reply order.
const std::vector<RootCategory>& RootCategories() {
    static const std::vector<RootCategory> categories = {
        {"musiclib_root", "playlist", "music_library", RootCondition::library,
         [](HarmonaHandler& h, Json::Value& c) { return h.GetMusicLibraryNodes(c, "root"); },
         "error", "Could not get the entry", true},
        {"musiclib_music_personal", "playlist", "personal_playlist", RootCondition::library,
         [](HarmonaHandler& h, Json::Value& c) { return h.AddPersonalPlaylistCategory(c); },
         "common", "error_system", false},
        {"musiclib_music_shared", "playlist", "shared_playlist", RootCondition::library,
         [](HarmonaHandler& h, Json::Value& c) { return h.AddSharedPlaylistCategory(c); }, "common",
         "error_system", false},
        {"ipod_root", "player", "player_source_ipod", RootCondition::ipod,
         [](HarmonaHandler& h, Json::Value& c) { return h.AddIPodChildren(c); }, "common",
         "error_system", false},
        {"inetradio_root", "radio", "radio", RootCondition::always,
         [](HarmonaHandler& h, Json::Value& c) { return h.AddRadioChildren(c); }, "common",
         "error_system", true},
        {"mediaserver_root", "common", "player_source_dms", RootCondition::mediaServer,
         [](HarmonaHandler& h, Json::Value& c) { return h.GetMediaServerNodes(c); }, "common",
         "error_system", false},
    };
    return categories;
}

int BuildRootTree(HarmonaHandler& handler) {
    Json::Value reply;
    const Json::Value texts = handler.LoadUITexts();  // first, whatever categories will be shown

    // Both calls are made, service status first; one result governs the three library categories.
    const bool serviceRunning = handler.IsLibraryServiceRunning();
    const bool libraryShown = VANUAudioHasShare() != 0 && serviceRunning;
    bool ipodChecked = false;
    bool ipodShown = false;

    for (const RootCategory& category : RootCategories()) {
        bool shown = true;
        switch (category.condition) {
            case RootCondition::library:
                shown = libraryShown;
                break;
            case RootCondition::ipod:
                // HasIPodDirectory is called once, whatever the permission bits: the
                // directory is tested before the permission.
                if (!ipodChecked) {
                    ipodShown = handler.HasIPodDirectory();
                    ipodChecked = true;
                }
                shown = ipodShown && (handler.userPermission & PERM_IPOD) != 0;
                break;
            case RootCondition::always:
                break;
            case RootCondition::mediaServer:
                shown = (handler.userPermission & PERM_MEDIA_SERVER) != 0;
                break;
        }
        if (!shown)
            continue;

        Json::Value node;
        Json::Value children;
        handler.FillTreeNode(node, category.id, "",
                             texts[category.textSection][category.textKey].asString(), kBlankIcon,
                             0);
        node["iconCls"] = kHiddenIconClass;
        if (category.build(handler, children) == 0) {
            handler.SetError(reply, category.errorSection, category.errorKey, kCategoryErrorLine);
            handler.PrintResponse(reply, kReplyContentType);
            return 0;
        }
        node["children"] = std::move(children);
        if (category.expanded)
            node["expanded"] = true;
        reply.append(std::move(node));
    }
    handler.PrintResponse(std::move(reply), kReplyContentType);
    return 1;
}

}  // namespace
}  // namespace harmona::tree

int HarmonaHandler::BuildRootTree() {
    return harmona::tree::BuildRootTree(*this);
}

bool HarmonaHandler::HasIPodDirectory() {
    struct stat st {};
    if (stat(harmona::paths::kIPodDirectory, &st) != 0)
        return false;
    return (st.st_mode & S_IFMT) == S_IFDIR;
}

bool HarmonaHandler::IsLibraryServiceRunning() {
    return VANUServiceStatusGet(harmona::tree::kLibraryService) > 0;
}
