// Reads one audio file's tags with TagLib.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

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

TrackTags ReadTrackTags(const std::string& path);

// The file name of `path` without its extension ("a/b/Song.mp3" -> "Song").
std::string TitleFromFileName(const std::string& path);

}  // namespace harmona::index
