// Playlists made and changed from the page, and smart playlists listed and edited: the actions of
// library.cgi that change a user's or the shared playlists (docs/library-api.md, "Making and
// changing playlists"). Every change is a POST of a bounded body; names and values are checked
// before anything is touched; files are replaced atomically and library.db is changed in one
// transaction.
#pragma once

#include <string_view>

namespace harmona::webapi {

// plcreate, pladd, plremove, plmove, plrename, pldelete.
bool IsPlaylistEditAction(std::string_view action);
// smartget, smartsave, smartdelete.
bool IsSmartPlaylistAction(std::string_view action);
// "musiclib_music_personal/smart/<name>" and "musiclib_music_shared/smart/<name>".
bool IsSmartPlaylistNode(std::string_view node);

// The longest request body a change takes (10,000 stream ids fit).
inline constexpr long kMaxChangeBodyBytes = 256 * 1024;

}  // namespace harmona::webapi
