// The audio share and the audio file types, as the indexer and the media server see them.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace harmona::medialib {

// An audio file type of the library: the extension (lower case, without the dot) and the MIME type
// the file is served as.
struct AudioType {
    const char* extension;
    const char* mime;
};
// The audio file types: what the indexer takes, what the player takes by default, and the MIME
// types the local media server offers (its SourceProtocolInfo lists each MIME type once, in this
// order).
inline constexpr AudioType kAudioTypes[] = {
    {"mp3", "audio/mpeg"},  {"mp1", "audio/mpeg"},          {"mp2", "audio/mpeg"},
    {"mpa", "audio/mpeg"},  {"m4a", "audio/mp4"},           {"m4b", "audio/mp4"},
    {"m4p", "audio/mp4"},   {"aac", "audio/aac"},           {"ogg", "audio/ogg"},
    {"flac", "audio/flac"}, {"wav", "audio/wav"},           {"aif", "audio/aiff"},
    {"aiff", "audio/aiff"}, {"wma", "audio/x-ms-wma"},      {"ac3", "audio/ac3"},
    {"ape", "audio/x-ape"}, {"ra", "audio/x-pn-realaudio"}, {"ram", "audio/x-pn-realaudio"},
};

// The length of the longest extension of kAudioTypes.
constexpr std::size_t LongestAudioExtension() {
    std::size_t longest = 0;
    for (const AudioType& type : kAudioTypes) {
        const std::size_t length = std::char_traits<char>::length(type.extension);
        longest = length > longest ? length : longest;
    }
    return longest;
}

// The audio share: audio_share_path of audio.conf, else /volume1/music;
// without a trailing "/".
std::string AudioSharePath();

// Whether `extension` (without the dot, any letter case) is one of the audio file types: the
// types the player takes by default, each with its MIME type below.
bool IsAudioExtension(std::string_view extension);

// Whether the indexer takes the file: its extension is an audio file type (what the tree's
// IsSupportedAudioFile accepts with selector 1 for a local path).
bool IsIndexableAudioFile(const std::string& path);

// The MIME type served for a file, by its extension (any letter case);
// "application/octet-stream" for an unknown one.
const char* MimeTypeOfPath(const std::string& path);

// The DLNA media format profile (DLNA.ORG_PN) of a file, where its type fixes one: "MP3" for an
// MP3 file (MPEG-1 layer 3, the profile of nearly every MP3 in a music library); nullptr when the
// profile would depend on more than the file type (bit rate, container), so none is claimed.
const char* DlnaProfileOfPath(const std::string& path);

// The fourth field of the file's protocolInfo, which is also the value of the
// contentFeatures.dlna.org header when the file is served: the profile where known, byte seeking
// (DLNA.ORG_OP=01: the server answers Range requests), not transcoded (DLNA.ORG_CI=0), and the
// flags of a streamed audio file (DLNA 1.5, streaming and background transfer, connection
// stalling).
std::string DlnaContentFeatures(const std::string& path);

// The protocolInfo list of everything the local media server serves (its ConnectionManager's
// SourceProtocolInfo): "http-get:*:<MIME type>:*" for each MIME type of kAudioTypes, once each, in
// table order, joined by ",".
std::string SourceProtocolInfo();

// The extension of the path's file name in lower case, without the dot; "" when none.
std::string LowerExtension(const std::string& path);

}  // namespace harmona::medialib
