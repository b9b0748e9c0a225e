// Reading library.db for the library view: every track row in id order, each text value cut to
// the bytes a reply may carry and kept in one block of text, and the update id of that state of the
// library. One read transaction, so that the rows and the update id belong together.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace harmona::mediad {

// A piece of a block of text: of LibraryRows::text, or of a LibraryView's text.
struct TextRef {
    uint32_t offset = 0, size = 0;
};

struct LibraryRow {
    int64_t id = 0;
    TextRef path, title, artist, album, albumArtist, genre, artPath;  // into LibraryRows::text
    int64_t year = 0, trackNo = 0, discNo = 0, durationMs = 0, added = 0, size = -1;
};

struct LibraryRows {
    uint32_t updateId = 0;
    std::vector<LibraryRow> rows;
    std::string text;  // the text of every row, one piece after the other
    std::string_view Text(TextRef ref) const {
        return std::string_view(text).substr(ref.offset, ref.size);
    }
};

// Reads library.db at `dbPath` into `out`; a missing file is an empty library (update id 0).
// False when the file exists but cannot be read.
bool ReadLibraryRows(const std::string& dbPath, LibraryRows& out);

}  // namespace harmona::mediad
