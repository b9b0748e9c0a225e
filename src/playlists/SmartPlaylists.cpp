// The smart playlist listing: one leaf per smart playlist of the personal or the shared category,
// sorted by name ignoring case.
#include "src/playlists/SmartPlaylists.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/VanuAudioUtils.h"
#include "platform/system/VanuSystem.h"
#include "src/handler/HarmonaHandler.h"

namespace {

constexpr const char* kSmartIcon = "3rdparty/Harmona/images/files_class/icon_smartpls.png";
constexpr std::size_t kNodeIdSize = 4096;

}  // namespace

int HarmonaHandler::ListSmartPlaylists(Json::Value& children, const char* category) {
    std::vector<std::string> names;
    Json::Value node;
    int total = 0;
    const char* idFormat = nullptr;
    const char* pid = nullptr;

    if (std::strcmp(category, "music_personal") == 0) {
        const std::string path = webMan.GetPreferenceDir() + harmona::paths::kPlaylistsFolder +
                                 harmona::paths::kSmartPlaylistFile;
        if (!CORXFileExist(path.c_str()))
            return 1;
        names = VanuAudioUtils::SmartPLSEnum(0, 0, total, path.c_str());
        idFormat = "musiclib_music_personal/smart/%s";
        pid = "musiclib_music_personal";
    } else if (std::strcmp(category, "music_shared") == 0) {
        names = VanuAudioUtils::SmartPLSEnum(0, 0, total, nullptr);
        idFormat = "musiclib_music_shared/smart/%s";
        pid = "musiclib_music_shared";
    } else {
        return 1;  // an unknown category lists nothing and is no error
    }

    // Every enumerated name gives one node; names equal ignoring case keep their order.
    std::stable_sort(names.begin(), names.end(), SmartPlaylistNameOrder());

    char id[kNodeIdSize];
    for (const std::string& name : names) {
        std::snprintf(id, sizeof id, idFormat, name.c_str());
        FillTreeNode(node, id, pid, name, kSmartIcon, NODE_LEAF);
        children.append(std::move(node));
    }
    return 1;
}
