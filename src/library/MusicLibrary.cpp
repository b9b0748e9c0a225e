// The music library subtree: the category nodes under "musiclib_root", and the containers of a
// category, browsed on the local media server.
#include <cstring>
#include <memory>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "platform/paths/PlatformPaths.h"
#include "src/handler/HarmonaHandler.h"

namespace {

// One row of the category table: node id, text key (section "common"), icon file, thumbnail.
struct MusicLibraryCategory {
    const char* nodeId;
    const char* textKey;
    const char* iconFile;
    const char* thumbnail;  // part of the table, never emitted: a tree node has no such attribute
};

// The category table, in reply order, ended by a row whose id is null.
const MusicLibraryCategory MusicLibraryCategories[] = {
    {"musiclib_music_all", "class_music_allmusic", "icon_genmusic.png",
     "3rdparty/Harmona/images/thumb/thumb_genmusic.png"},
    {"musiclib_music_file", "class_music_userfile", "icon_gencategory.png",
     "3rdparty/Harmona/images/thumb/thumb_gencategory.png"},
    {"musiclib_music_album", "class_music_album", "icon_class_album.png",
     "3rdparty/Harmona/images/thumb/thumb_class_album.png"},
    {"musiclib_music_aa", "class_music_artist", "icon_class_artist.png",
     "3rdparty/Harmona/images/thumb/thumb_class_artist.png"},
    {"musiclib_music_genre", "class_music_genre", "icon_class_genre.png",
     "3rdparty/Harmona/images/thumb/thumb_class_genre.png"},
    {"musiclib_random", "random_playlist", "icon_class_random100.png",
     "3rdparty/Harmona/images/thumb/thumb_class_random100.png"},
    {"musiclib_music_latestalbum", "class_music_latestalbum", "icon_class_latestalbum.png",
     "3rdparty/Harmona/images/thumb/thumb_class_latestalbum.png"},
    {nullptr, nullptr, nullptr, nullptr},
};

constexpr const char* kIconDirectory = "3rdparty/Harmona/images/files_class/";
constexpr const char* kContainerIcon = "3rdparty/Harmona/images/files_class/icon_container.png";
constexpr const char* kCategoryParentId = "musiclib";
constexpr const char* kBrowsedIdPrefix = "musiclib_";

}  // namespace

int HarmonaHandler::GetMusicLibraryNodes(Json::Value& children, const char* objectId) {
    DMAParser parser;
    Json::Value node;
    // Loaded on every call, also when no text is needed.
    const Json::Value texts = LoadUITexts();

    if (std::strcmp(objectId, "root") == 0) {
        for (const MusicLibraryCategory* row = MusicLibraryCategories; row->nodeId != nullptr;
             ++row) {
            FillTreeNode(node, row->nodeId, kCategoryParentId,
                         texts["common"][row->textKey].asString(),
                         std::string(kIconDirectory) + row->iconFile, NODE_LEAF);
            children.append(node);
        }
        return 1;
    }

    const std::string parentId = std::string(kBrowsedIdPrefix) + objectId;
    // The browse object is deleted through its virtual destructor on every way out.
    const std::unique_ptr<DMABrowse> browse(
        new DMABrowse(BrowseDirectChildren, harmona::paths::kLocalMediaServerControlUrl));
    browse->objectId = objectId;
    if (browse->Prepare() != 0)
        return 0;
    if (parser.Parse(browse.get()) != 0)
        return 0;

    const DMAParser::ItemList* items = parser.GetResult();
    if (items == nullptr) {
        // No result: the reply is one nested empty array, which the page reads as an empty folder.
        children.append(Json::Value(Json::arrayValue));
        return 1;
    }
    for (const ItemNode* item : *items) {
        FillTreeNode(node, kBrowsedIdPrefix + item->getValueByKey("id"), parentId,
                     item->getValueByKey("title"), kContainerIcon, NODE_LEAF);
        // Moved rather than copied: the array stores the same node, and FillTreeNode rebuilds the
        // emptied work node for the next item (tens of thousands of items make the copy count).
        children.append(std::move(node));
    }
    return 1;
}
