// DIDL-Lite text (ContentDirectory:1 Result), written by hand for speed: a Browse writes each track
// and container it returns straight from the library view's compact values.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace harmona::mediad {

inline constexpr const char* kMusicTrackClass = "object.item.audioItem.musicTrack";

// The document's start (with the namespaces every object uses) and end; no XML declaration.
inline constexpr std::string_view kDidlBegin =
    "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
    "xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
    "xmlns:upnp=\"urn:schemas-upnp-org:metadata-1-0/upnp/\" "
    "xmlns:dlna=\"urn:schemas-dlna-org:metadata-1-0/\">";
inline constexpr std::string_view kDidlEnd = "</DIDL-Lite>";

// A music track as a reply writes it (LibraryView keeps these values compact).
struct TrackFields {
    int64_t id = 0;  // names its res ("<id>[.<streamExtension>]") and its art
    std::string_view title, artist, album, genre;
    int64_t year = 0, trackNo = 0, durationMs = 0, size = -1;
    std::string_view protocolInfo;     // escaped
    std::string_view streamExtension;  // "" for a stream name of the id alone
    std::string_view artExtension;     // "jpg" or "png"; "" when it has no art
};

// Appends a music track's children of <item>, from <dc:title> to </res>, its media URLs under
// `mediaBase`.
void AppendTrackItemBody(std::string& out, const TrackFields& track, std::string_view mediaBase);

// A container as a reply writes it.
struct ContainerFields {
    std::string_view id, parentId, title, upnpClass, artist;
    int64_t childCount = 0, year = 0;
    int64_t artTrack = 0;           // its art is the art of this track
    std::string_view artExtension;  // "jpg" or "png"; "" when it has no art
};

// Appends the whole <container> element, childCount included, its art URL under `mediaBase`.
void AppendContainer(std::string& out, const ContainerFields& container,
                     std::string_view mediaBase);

// Appends the start tag <item id=.. parentID=.. [refID=..] restricted="1">; the ids must be plain
// (object ids are: see ObjectIds.h).
void AppendItemStart(std::string& out, std::string_view id, std::string_view parentId,
                     std::string_view refId);
inline constexpr std::string_view kItemEnd = "</item>";

// dc:date of a year: "YYYY-01-01"; "" for a year outside 1 to 9999.
std::string DateOfYear(int64_t year);

// The escaped protocolInfo of a res: "http-get:*:<mime>:<fourth field>".
std::string ProtocolInfo(const std::string& mimeType, const std::string& dlnaFeatures);

// "H:MM:SS.mmm" as res@duration wants it.
std::string FormatDuration(int64_t milliseconds);

}  // namespace harmona::mediad
