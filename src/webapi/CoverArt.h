// The library's albums and cover images as the page shows them, from library.db:
//   action=albums&node=<node>     the albums of a tree node, each with its year, track count and
//                                 cover: node "musiclib_music_album" or
//                                 "musiclib_music_latestalbum" (every album, under that view's node
//                                 ids) or an album artist's node "musiclib_artist:<name>" (that
//                                 artist's albums, and all its tracks as the rows of a list, album
//                                 by album)
//   action=covers&streams=<ids>   the cover image of each of 1 to 200 tracks (stream ids,
//                                 comma-separated): {"covers": {"<stream id>": URL or null}}
// Albums are grouped as the local media server groups them (album name and album artist, else the
// track's artist), so that their node ids are those of the tree. A cover is the same-origin path
// "media/art/<track id>.<jpg|png>", which the web server passes to the local media server behind
// the same login; a track or an album without a cover image has none (null).
#pragma once

#include <string_view>

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

inline constexpr std::string_view kAlbumsAction = "albums";
inline constexpr std::string_view kCoversAction = "covers";
// At most this many stream ids in one covers request.
inline constexpr std::size_t kMaxCoverStreams = 200;
// At most this many tracks of an artist in one reply (as many as a listing of a container holds).
inline constexpr std::size_t kMaxArtistTracks = 10000;

bool IsCoverArtAction(std::string_view action);
// Serves "albums" or "covers"; the exit status (1 for a served request).
int ServeCoverArtAction(ActionHandler& handler, WebMan& webMan, std::string_view action);

}  // namespace harmona::webapi
