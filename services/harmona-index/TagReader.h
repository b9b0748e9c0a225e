// Reads one audio file's tags with TagLib.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include <sys/types.h>

namespace harmona::index {

// A tag value is cut to this many bytes (on a UTF-8 character boundary) when read: a display text
// needs no more, and a file with a 5 MB title must not make every reply that lists it huge.
inline constexpr std::size_t kMaxTagBytes = 1024;

struct TrackTags {
    std::string title;  // never empty: the file name without its extension when the tag has none
    std::string artist, album, albumArtist, genre;
    int64_t year = 0, trackNo = 0, discNo = 0, durationMs = 0;
    bool broken = false;  // TagLib could not read the file: only the title (file name) is set
};

// The file the walk saw: its device and inode.
struct FileIdentity {
    dev_t device = 0;
    ino_t inode = 0;
};

// The tags of `path` read through one descriptor, opened without following a symbolic link and
// checked to be the regular file `seen` (the walk's fstatat): a file swapped for a link, a FIFO or
// another file between the walk and the read gives `broken` tags by file name and sets `swapped`,
// never the tags of what the path names now.
TrackTags ReadTrackTagsOf(const std::string& path, const FileIdentity& seen, bool& swapped);

// The file name of `path` without its extension ("a/b/Song.mp3" -> "Song").
std::string TitleFromFileName(const std::string& path);

}  // namespace harmona::index
