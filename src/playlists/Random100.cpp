// The rerandom100 action: makes the user's random-100 playlist afresh and answers success or an
// error reply.
#include <cstdio>

#include "platform/paths/PlatformPaths.h"
#include "platform/playlist/AudioFile.h"
#include "src/handler/HarmonaHandler.h"

namespace {

constexpr int kRandomSongCount = 100;
// The error reply's line number: a fixed identifier that the browser and log readers match on, not
// the source line, so it must not follow the code when it moves.
constexpr int kCreateRandomErrorLine = 616;
constexpr std::size_t kPathSize = 4096;

}  // namespace

void HarmonaHandler::CreateRandom100Playlist() {
    Json::Value reply;
    char path[kPathSize] = {};
    // The user name goes in as it is; the platform's login check already forbids "/" in it.
    std::snprintf(path, sizeof path, "%s%s", harmona::paths::kRandom100Prefix,
                  webMan.GetLoginUserName().c_str());

    if (AudioFile::PlaylistRandomCreate(path, kRandomSongCount))
        SetSuccess(reply, true);
    else
        SetError(reply, "playlist", "error_create_random100", kCreateRandomErrorLine);
    PrintResponse(reply, kReplyContentType);
}
