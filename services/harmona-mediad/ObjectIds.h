// The media server's object ids. The root "0" and the seven categories the CGI's music library
// node lists are fixed;
// the ids below them are stable across restarts and re-indexing (built from names and paths, not
// from row order) and safe: only ASCII letters, digits and "._~-:/%" ever appear, every other byte
// of a name is percent-encoded, so an id needs no escaping in XML or JSON.
//
// Every object has one parent. A track's own object is "track:N" (N its row id in library.db),
// listed under "music_all"; every other container that lists the track (its folder, its album,
// its genre, "random") shows it as a reference item "<container id>/track:N" whose refID is
// "track:N" and whose parent is that container. Likewise an album has one id per place it is
// listed in: "album:AA/NAME" under "music_album", "artist:AA/NAME" under its album artist
// "artist:AA", "latest:AA/NAME" under "music_latestalbum".
#pragma once

#include <cstdint>
#include <string>

#include "platform/medialib/ObjectIdPart.h"

namespace harmona::mediad {

inline constexpr const char* kRootId = "0";
inline constexpr const char* kAllMusicId = "music_all";
inline constexpr const char* kFoldersId = "music_file";
inline constexpr const char* kAlbumsId = "music_album";
inline constexpr const char* kAlbumArtistsId = "music_aa";
inline constexpr const char* kGenresId = "music_genre";
inline constexpr const char* kRandomId = "random";
inline constexpr const char* kLatestAlbumsId = "music_latestalbum";

enum class ObjectKind { invalid, root, category, folder, album, artist, genre, track, trackIn };

// Where an album container is listed.
enum class AlbumView { albums, artist, latest };

struct ObjectRef {
    ObjectKind kind = ObjectKind::invalid;
    std::string category;     // Category: its id
    std::string folder;       // Folder: path relative to the share, no leading or trailing "/"
    std::string albumArtist;  // Album: the album artist ("" when none); Artist: the name
    std::string name;         // Album: the album; Genre: the genre
    AlbumView albumView = AlbumView::albums;  // Album
    int64_t trackId = 0;                      // Track, TrackIn
    std::string container;                    // TrackIn: the id of the listing container
};

// Percent-encodes every byte outside [A-Za-z0-9._~-], and the reverse (false on a malformed "%"
// sequence): platform/medialib/ObjectIdPart.h.
using medialib::EscapeIdPart;
using medialib::UnescapeIdPart;

std::string FolderId(const std::string& relativePath);  // "folder:" + path, each part escaped
std::string AlbumId(const std::string& albumArtist, const std::string& album);
std::string ArtistId(const std::string& albumArtist);
std::string GenreId(const std::string& genre);
std::string LatestAlbumId(const std::string& albumArtist, const std::string& album);
std::string ArtistAlbumId(const std::string& albumArtist, const std::string& album);
std::string TrackId(int64_t id);
// The id of track `trackId` as listed in container `containerId`: the track's own id in
// "music_all", a reference id anywhere else.
std::string TrackIdIn(const std::string& containerId, int64_t trackId);

// Parses any id the server hands out; kind Invalid for anything else.
ObjectRef ParseObjectId(const std::string& id);

}  // namespace harmona::mediad
