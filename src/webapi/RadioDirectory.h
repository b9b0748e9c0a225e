// The internet radio directories of library.cgi ("SHOUTcast" and "RadioIO" in the tree): each reads
// the address of its station list from audio.conf, fetches it with the HTTP plugin's bounded GET
// (time limits, no redirect, http:// and https:// only, a size bound) and lists its stations as
// rows the page plays; a row's url tunes in through this server:
//   action=list&node=inetradio_sc|inetradio_rio
//       {"tracks": [{"station": id, "title": name, "artist": genre, "album": "<n> kbit/s",
//                    "duration": -1, "url": "webapi/library.cgi?action=radio_tunein&..."}]}
//   action=radio_tunein&node=<directory node>&station=<digits>
//       302 to the File1 stream URL of the station's PLS playlist, fetched from the directory's
//       own host (the request names only the station id; never a URL)
// docs/library-api.md, "Internet radio", tells the replies and error codes.
#pragma once

#include <json/value.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

inline constexpr std::string_view kShoutcastNode = "inetradio_sc";
inline constexpr std::string_view kRadioIoNode = "inetradio_rio";
inline constexpr std::string_view kTuneInAction = "radio_tunein";

// The audio.conf keys that hold each directory's station list URL.
inline constexpr const char* kShoutcastListKey = "radio_shoutcast_list";
inline constexpr const char* kRadioIoListKey = "radio_radioio_list";

// Bounds of the fetches.
inline constexpr std::size_t kMaxDirectoryListBytes = 4u << 20;
inline constexpr std::size_t kMaxPlaylistBytes = 64u << 10;
inline constexpr long kDirectoryConnectTimeoutMs = 3000;
inline constexpr long kDirectoryStallTimeoutMs = 5000;
inline constexpr long kDirectoryTotalTimeoutMs = 15000;

bool IsDirectoryNode(std::string_view node);

// Fills `reply` with the directory's stations (1), or answers an error (0).
int ListDirectory(ActionHandler& handler, WebMan& webMan, std::string_view node,
                  Json::Value& reply);

// Serves action=radio_tunein; the exit status.
int ServeTuneIn(ActionHandler& handler, WebMan& webMan);

}  // namespace harmona::webapi
