// Reads a DIDL-Lite document (a Browse Result) with pugixml into plain records, and checks that
// text is XML 1.0 character data throughout, as strict parsers on the network demand.
#pragma once

#include <string>
#include <vector>

namespace harmona::test::mediad {

struct DidlObjectRecord {
    bool container = false;
    std::string id, parentId, refId, title, upnpClass;
    long childCount = -1;
    std::string creator, artist, album, genre, date, albumArtUri, trackNumber;
    std::string res, protocolInfo, size, duration;
};

struct DidlDocument {
    bool parsed = false;
    std::string error;
    std::vector<DidlObjectRecord> objects;
};

DidlDocument ParseDidl(const std::string& didl);

// Every code point is one that XML 1.0 allows (tab, LF, CR, U+0020..U+D7FF, U+E000..U+FFFD,
// U+10000..U+10FFFF), the text is well-formed UTF-8, and none is a Unicode non-character.
bool IsStrictXmlText(const std::string& text);

// libxml2 (the parser under GUPnP-AV and many renderers) in its strict mode: true when the
// document is well-formed XML 1.0; otherwise false with libxml2's first message in `error`.
bool ParsesStrictlyWithLibxml2(const std::string& didl, std::string* error);

// The objects GUPnP-AV's DIDL-Lite parser (what GUPnP control points use) reports, and every
// message libxml2 gave while it parsed (GUPnP-AV parses in recovery mode, so a document it
// had to repair still yields objects; `messages` tells).
struct GupnpAvDocument {
    bool parsed = false;
    std::string messages;
    std::vector<DidlObjectRecord> objects;  // id, parentId, refId, title, upnpClass
};
GupnpAvDocument ParseWithGupnpAv(const std::string& didl);

}  // namespace harmona::test::mediad
