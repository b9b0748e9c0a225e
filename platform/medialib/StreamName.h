// The name of a library track between the programs: the local media server serves the track's file
// as "/media/<stream name>" and writes that URL into the res of its item; the listening page plays
// it through the web server, which passes only such names on (web/lighttpd.conf); library.cgi
// hands out stream names and reads them back. Every side writes and reads them here.
//
// A stream name is the track id, 1 to 18 decimal digits (any more could overflow), then "." and
// the extension of the track's file in lower case, when that extension is 1 to
// kMaxStreamExtensionLength lower-case ASCII letters or digits; a file without such an extension
// is named by its id alone. Nothing else is a stream name.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/medialib/MediaFiles.h"

namespace harmona::medialib {

// The path below which the local media server serves the library's files.
inline constexpr std::string_view kMediaUrlPath = "/media/";

inline constexpr std::size_t kMaxStreamIdDigits = 18;
// The longest extension a stream name carries: that of the longest audio file type. The indexer
// takes only those types, so the name of every indexed track carries its file's extension, and a
// longer one could not name a track of the library.
inline constexpr std::size_t kMaxStreamExtensionLength = LongestAudioExtension();

struct StreamName {
    std::int64_t trackId = 0;
    std::string extension;  // "" when the name is the id alone
};

// The track id and extension of a stream name; nullopt for anything else.
std::optional<StreamName> ParseStreamName(std::string_view name);

// The extension that the stream name of a file at `path` carries: its extension in lower case when
// the rule admits it, else "".
std::string StreamExtensionOf(const std::string& path);

// The stream name of track `trackId` stored at `path`; nullopt for a negative id (no name can
// carry it, so such a track is never offered for playing).
std::optional<std::string> StreamNameOf(std::int64_t trackId, const std::string& path);

// The track id in a res URL of the local media server ("http://<its address>/media/<stream
// name>"); nullopt for any other URL. The server names itself by the address it announces on the
// network, so only the path counts.
std::optional<std::int64_t> TrackIdOfLocalResource(std::string_view url);

}  // namespace harmona::medialib
