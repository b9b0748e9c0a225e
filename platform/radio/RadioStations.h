// A user's own internet radio stations: a name, a stream URL and a favourite mark each, kept in
// the user's preference directory in the conf syntax (platform/README.md, "Internet radio
// stations"). Every change rewrites the whole file atomically under a lock of the directory, so
// two requests at once never lose a station and a reader never sees half a file.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace harmona::radio {

// The file, inside the user's preference directory.
inline constexpr const char* kStationsFileName = "radio.stations";
inline constexpr std::size_t kMaxNameBytes = 128;
inline constexpr std::size_t kMaxUrlBytes = 2048;
inline constexpr std::size_t kMaxStations = 500;
// Station ids are 1 to 9 decimal digits.
inline constexpr std::size_t kMaxIdDigits = 9;

struct Station {
    std::uint32_t id = 0;
    std::string name;
    std::string url;
    bool favorite = false;
};

enum class ReadStatus { ok, unreadable };

struct StationList {
    ReadStatus status = ReadStatus::unreadable;
    std::vector<Station> stations;  // in file order; a missing file is an empty list
};

// The stations of the file in `preferenceDir`. Sections whose id, name or URL is not valid are
// passed over.
StationList ReadStations(const std::string& preferenceDir);

// The name as it is kept: `name` without leading and trailing white space, when that is 1 to
// kMaxNameBytes bytes of valid UTF-8 without control characters; nullopt otherwise.
std::optional<std::string> CleanStationName(std::string_view name);

// True for an http:// or https:// URL (scheme in any letter case) of at most kMaxUrlBytes
// printable ASCII characters with a host, no user name or password, no white space and none of
// the characters " < > \ ^ ` { | }.
bool IsStationUrl(std::string_view url);

// A station id of a request: 1 to kMaxIdDigits digits, not 0.
std::optional<std::uint32_t> ParseStationId(std::string_view text);

enum class ChangeOutcome {
    ok,
    notFound,    // no station with that id
    full,        // kMaxStations already
    unwritable,  // the directory or file cannot be read or written
};

// Adds a station (name and URL checked by the caller) at the end; `added` gets its id.
ChangeOutcome AddStation(const std::string& preferenceDir, const std::string& name,
                         const std::string& url, Station& added);
ChangeOutcome RemoveStation(const std::string& preferenceDir, std::uint32_t id);
ChangeOutcome SetFavorite(const std::string& preferenceDir, std::uint32_t id, bool favorite);

// The file's text for `stations` (what the changes write).
std::string FormatStations(const std::vector<Station>& stations);

}  // namespace harmona::radio
