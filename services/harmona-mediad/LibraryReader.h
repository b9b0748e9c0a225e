// Reading library.db for the library view: every track row in id order, each text value cut to
// the bytes a reply may carry, and the update id of that state of the library. One read
// transaction, so that the rows and the update id belong together.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace harmona::mediad {

struct LibraryRow {
    int64_t id = 0;
    std::string path, title, artist, album, albumArtist, genre, artPath;
    int64_t year = 0, trackNo = 0, discNo = 0, durationMs = 0, added = 0, size = -1;
};

struct LibraryRows {
    uint32_t updateId = 0;
    std::vector<LibraryRow> rows;
};

// Reads library.db at `dbPath` into `out`; a missing file is an empty library (update id 0).
// False when the file exists but cannot be read.
bool ReadLibraryRows(const std::string& dbPath, LibraryRows& out);

}  // namespace harmona::mediad
