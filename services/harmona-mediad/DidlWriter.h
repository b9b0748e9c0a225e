// DIDL-Lite documents (ContentDirectory:1 Result) written with pugixml, so that every text and
// attribute is escaped properly.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace harmona::mediad {

inline constexpr const char* kMusicTrackClass = "object.item.audioItem.musicTrack";

struct DidlObject {
    bool container = false;
    std::string id, parentId, title, upnpClass;
    int64_t childCount = -1;  // containers: written when >= 0
    std::string artist, album, genre;
    // Items only.
    int64_t trackNo = 0, durationMs = 0;
    std::string resUrl, mimeType;
};

// The whole DIDL-Lite document, without an XML declaration. Text that is not valid UTF-8 is
// repaired and control characters that XML 1.0 forbids become spaces.
std::string WriteDidl(const std::vector<DidlObject>& objects);

// "H:MM:SS.mmm" as res@duration wants it.
std::string FormatDuration(int64_t milliseconds);

}  // namespace harmona::mediad
