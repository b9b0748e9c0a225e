// A station directory on the network in the legacy XML station-list format:
//   <stationlist>
//     <tunein base="/sbin/tunein-station.pls"/>
//     <station name="Jazz FM" mt="audio/mpeg" id="1234" br="128" genre="Jazz" lc="12"/>
//   </stationlist>
// and the tune-in: a GET of <scheme>://<directory host><tunein base>?id=<id> answers a PLS
// playlist whose File1= is the station's stream URL. Only parsing and URL building live here; the
// fetches are the caller's (platform/README.md, "Internet radio directories").
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace harmona::radio {

// The most stations taken from one list; the rest are passed over.
inline constexpr std::size_t kMaxDirectoryStations = 500;
// A name or genre longer than this is cut (at a character boundary).
inline constexpr std::size_t kMaxDirectoryTextBytes = 128;
// The tune-in path when the list names none.
inline constexpr const char* kDefaultTuneInBase = "/sbin/tunein-station.pls";
inline constexpr std::size_t kMaxTuneInBaseBytes = 256;

struct DirectoryStation {
    std::string id;     // 1 to 9 digits, not 0
    std::string name;   // cleaned: valid UTF-8, no control characters, 1 to 128 bytes
    std::string genre;  // cleaned as the name, may be empty
    long bitrate = 0;   // kbit/s, 0 when the list gives none or no number of 1 to 99999
};

struct DirectoryList {
    bool valid = false;      // the text is a <stationlist> document
    std::string tuneInBase;  // a checked absolute path, kDefaultTuneInBase when none is given
    std::vector<DirectoryStation> stations;  // in list order, at most kMaxDirectoryStations
    std::size_t skipped = 0;                 // rows passed over: no valid id or name, a repeated id
};

// Reads a station list. Rows whose id is not 1 to 9 digits, whose name is not valid UTF-8 or
// empty once cleaned, or whose id came before are passed over; control characters in a name or
// genre become spaces, and both are cut to kMaxDirectoryTextBytes. A tune-in base that is not a
// plain absolute path (starting with one "/", printable ASCII without "?", "#", "\" or
// white space, at most kMaxTuneInBaseBytes) makes the list invalid.
DirectoryList ParseDirectoryList(std::string_view xml);

// A name or genre of the list as it is shown (see above); nullopt for text that is not UTF-8.
std::optional<std::string> CleanDirectoryText(std::string_view text);

// "<scheme>://<authority>" of an http:// or https:// URL (IsStationUrl); "" for any other text.
std::string UrlOrigin(std::string_view url);

// The tune-in URL of station `id` (digits, checked by the caller) of the directory whose list is
// at `listUrl`: the list's own scheme and host, `tuneInBase`, "?id=" and the id.
std::string TuneInUrl(std::string_view listUrl, std::string_view tuneInBase, std::string_view id);

// The File1 entry of a PLS playlist when it is an http:// or https:// stream URL (IsStationUrl);
// nullopt when the playlist has none or names anything else (file:, javascript:, ...).
std::optional<std::string> PlaylistStreamUrl(std::string_view pls);

}  // namespace harmona::radio
