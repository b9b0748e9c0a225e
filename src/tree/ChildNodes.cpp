// Child node routing: the children of a node that the browser expands, by the family of its id.
#include <cstring>
#include <string_view>
#include <utility>

#include "src/handler/HarmonaHandler.h"

namespace {

// The id family of the music library's nodes ("musiclib_<object id>").
constexpr std::string_view kMusicLibraryFamily = "musiclib";

}  // namespace

int HarmonaHandler::GetChildNodes(const char* nodeId) {
    Json::Value reply;
    int result = 0;
    const char* underscore = std::strchr(nodeId, '_');
    // No underscore, or nothing after it: a malformed id, answered with the empty reply.
    if (underscore != nullptr && underscore[1] != '\0') {
        if (std::strncmp(nodeId, kMusicLibraryFamily.data(), kMusicLibraryFamily.size()) == 0)
            result = GetMusicLibraryNodes(reply, underscore + 1) != 0 ? 1 : 0;
        else
            result = 1;  // other families come inline with the root tree or through "refresh"
    }
    // Passed by value, moved: a list of thousands of nodes is not copied once more.
    PrintResponse(std::move(reply), kReplyContentType);
    return result;
}
