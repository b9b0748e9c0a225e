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

}  // namespace harmona::test::mediad
