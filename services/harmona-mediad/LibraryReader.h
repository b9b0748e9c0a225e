// Reading library.db for the library view: every track row in id order, each text value cut to
// the bytes a reply may carry and kept in one block of text, and the update id of that state of the
// library. One read transaction, so that the rows and the update id belong together. The file
// paths, the largest part of a row, are not kept: what the view needs of them (the file type, the
// art's type, the folder) is taken from each path as it is read.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace harmona::mediad {

// A piece of a block of text: of LibraryRows::text, or of a LibraryView's text.
struct TextRef {
    uint32_t offset = 0, size = 0;
};

// The art of a track: its cover image, served as "art/<id>.jpg" or ".png".
enum class TrackArt : uint8_t { none, jpg, png };

// The art of the cover image at `path`: png by its extension, else jpg.
TrackArt ArtOfImagePath(std::string_view path);

struct LibraryRow {
    int64_t id = 0;
    TextRef title, artist, album, albumArtist, genre;  // into LibraryRows::text
    int64_t year = 0, trackNo = 0, discNo = 0, durationMs = 0, added = 0, size = -1;
    uint32_t fileType = 0;          // into LibraryRows::typePaths
    TrackArt art = TrackArt::none;  // of its folder's cover image
};

struct LibraryRows {
    uint32_t updateId = 0;
    std::vector<LibraryRow> rows;
    std::string text;  // the text of every row, one piece after the other
    // One path of each file type (by its extension, letter case aside), the first in id order:
    // what the type's fields are worked out from.
    std::vector<std::string> typePaths;
    std::string_view Text(TextRef ref) const {
        return std::string_view(text).substr(ref.offset, ref.size);
    }
};

// Called with every row (its index in LibraryRows::rows) and its path, in the order of the paths'
// bytes, once all rows are read.
using PathVisitor = std::function<void(uint32_t row, std::string_view path)>;

// Reads library.db at `dbPath` into `out`, and its paths in their order into `inPathOrder`, read
// from library.db's path index one at a time; a missing file is an empty library (update id 0).
// False when the file exists but cannot be read.
bool ReadLibraryRows(const std::string& dbPath, LibraryRows& out, const PathVisitor& inPathOrder);

}  // namespace harmona::mediad
