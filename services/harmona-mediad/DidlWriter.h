// DIDL-Lite text (ContentDirectory:1 Result), written by hand for speed: every value is escaped
// once, when the library is loaded, and a Browse only concatenates the pieces.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace harmona::mediad {

inline constexpr const char* kMusicTrackClass = "object.item.audioItem.musicTrack";

// The document's start (with the namespaces every object uses) and end; no XML declaration.
inline constexpr std::string_view kDidlBegin =
    "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
    "xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
    "xmlns:upnp=\"urn:schemas-upnp-org:metadata-1-0/upnp/\" "
    "xmlns:dlna=\"urn:schemas-dlna-org:metadata-1-0/\">";
inline constexpr std::string_view kDidlEnd = "</DIDL-Lite>";

// Stands, in a pre-written piece, where the server's media base URL goes
// ("http://host:port/media/"), so that one piece serves every address the server answers on. Never
// part of escaped text.
inline constexpr char kMediaBaseMark = '\x01';

struct DidlObject {
    bool container = false;
    std::string id, parentId, refId, title, upnpClass;
    int64_t childCount = -1;  // containers: written when >= 0
    std::string artist, album, genre, date;
    // Items only.
    int64_t trackNo = 0, durationMs = 0, size = -1;
    std::string resPath;       // the res URL after the media base
    std::string artPath;       // the album art URL after the media base, "" when none
    std::string mimeType;      // of the res
    std::string dlnaFeatures;  // the protocolInfo's fourth field, "*" when empty
};

// Appends `text` as XML 1.0 character data, fit for an element or a double-quoted attribute: the
// five special characters and tab, LF and CR as references; bytes that are not UTF-8 become
// U+FFFD; other C0 controls become spaces; the non-characters (U+FFFE, U+FFFF, U+FDD0..U+FDEF and
// the last two code points of every plane) are dropped, since strict XML parsers reject or choke
// on them.
void AppendXmlText(std::string& out, std::string_view text);
std::string XmlText(std::string_view text);

// The whole element of `object` (<container> or <item>), media URLs marked with kMediaBaseMark.
std::string DidlElement(const DidlObject& object);

// An item's children, from <dc:title> to </res>, media URLs marked with kMediaBaseMark; the
// start tag, which names the item's id and parent, is written per listing (AppendItem).
std::string DidlItemBody(const DidlObject& object);

// Appends <item id=.. parentID=.. [refID=..] restricted="1">body</item>; the ids must be plain
// (object ids are: see ObjectIds.h); kMediaBaseMark in `body` becomes `mediaBase`.
void AppendItem(std::string& out, std::string_view id, std::string_view parentId,
                std::string_view refId, std::string_view body, std::string_view mediaBase);

// Appends `piece` with every kMediaBaseMark replaced by `mediaBase`.
void AppendWithMediaBase(std::string& out, std::string_view piece, std::string_view mediaBase);

// The whole DIDL-Lite document of `objects`.
std::string WriteDidl(const std::vector<DidlObject>& objects, std::string_view mediaBase);

// "H:MM:SS.mmm" as res@duration wants it.
std::string FormatDuration(int64_t milliseconds);

}  // namespace harmona::mediad
