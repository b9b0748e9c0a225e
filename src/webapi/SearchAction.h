// The library search of library.cgi:
//   action=search&q=<what the user typed>
// answers {"success": true, "query": q, "tracks": [track rows as action=list gives them],
// "albums": [{"node", "title", "artist", "tracks"}], "artists": [{"node", "title", "albums"}],
// "more": {"tracks", "albums", "artists"}}: each word of q begins a word of what is found, all
// words must be found, and each group holds at most LibrarySearch.h's limit. An album's and an
// artist's "node" is the tree node that action=list lists. A q of more than 200 bytes or 8 words,
// or not UTF-8, is a 400 "request_invalid"; a library.db that cannot be read or has no search
// index yet is a 503 "library_unavailable".
#pragma once

#include <string_view>

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

inline constexpr std::string_view kSearchAction = "search";

// Serves action=search for an admitted user; the exit status.
int ServeSearch(ActionHandler& handler, WebMan& webMan);

}  // namespace harmona::webapi
