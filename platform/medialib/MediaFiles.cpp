#include "platform/medialib/MediaFiles.h"

#include <strings.h>

#include <cctype>
#include <cstring>
#include <iterator>

#include "platform/paths/PlatformPaths.h"
#include "platform/system/VanuSystem.h"

namespace harmona::medialib {
namespace {

// DLNA.ORG_FLAGS: DLNA 1.5 (0x00100000), connection stalling (0x00200000), background
// (0x00400000) and streaming (0x01000000) transfer modes; 24 reserved hex digits follow.
constexpr const char* kDlnaAudioFlags = "01700000000000000000000000000000";

// The entry of an extension (without the dot, any letter case); nullptr when it is no audio type.
const AudioType* FindAudioType(std::string_view extension) {
    for (const AudioType& entry : kAudioTypes) {
        if (extension.size() == std::strlen(entry.extension) &&
            strncasecmp(extension.data(), entry.extension, extension.size()) == 0)
            return &entry;
    }
    return nullptr;
}

}  // namespace

std::string AudioSharePath() {
    char buffer[4096];
    std::string share = VANUAudioConfGet("audio_share_path", buffer, sizeof(buffer)) > 0
                            ? std::string(buffer)
                            : std::string(paths::kDefaultAudioShare);
    while (share.size() > 1 && share.back() == '/')
        share.pop_back();
    return share;
}

bool IsAudioExtension(std::string_view extension) {
    return FindAudioType(extension) != nullptr;
}

bool IsIndexableAudioFile(const std::string& path) {
    return IsAudioExtension(LowerExtension(path));
}

std::string SourceProtocolInfo() {
    std::string list;
    for (std::size_t i = 0; i < std::size(kAudioTypes); ++i) {
        const std::string_view mime = kAudioTypes[i].mime;
        bool listed = false;
        for (std::size_t j = 0; j < i && !listed; ++j)
            listed = mime == kAudioTypes[j].mime;
        if (listed)
            continue;
        if (!list.empty())
            list += ",";
        list += "http-get:*:" + std::string(mime) + ":*";
    }
    return list;
}

std::string LowerExtension(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    const std::size_t dot = path.rfind('.');
    if (dot == std::string::npos || (slash != std::string::npos && dot < slash))
        return {};
    std::string extension = path.substr(dot + 1);
    for (char& c : extension)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return extension;
}

const char* MimeTypeOfPath(const std::string& path) {
    const AudioType* type = FindAudioType(LowerExtension(path));
    return type != nullptr ? type->mime : "application/octet-stream";
}

const char* DlnaProfileOfPath(const std::string& path) {
    return LowerExtension(path) == "mp3" ? "MP3" : nullptr;
}

std::string DlnaContentFeatures(const std::string& path) {
    std::string features;
    if (const char* profile = DlnaProfileOfPath(path))
        features = std::string("DLNA.ORG_PN=") + profile + ";";
    return features + "DLNA.ORG_OP=01;DLNA.ORG_CI=0;DLNA.ORG_FLAGS=" + kDlnaAudioFlags;
}

}  // namespace harmona::medialib
