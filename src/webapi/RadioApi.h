// The internet radio nodes of library.cgi: the user's own stations ("User Defined") and the
// favourites among them as rows the page plays, the changes to them, and the directory sources.
//   action=list&node=inetradio_userdefined      the user's stations, in the order they were added
//   action=list&node=inetradio_favorite         those marked as favourites
//   action=list&node=inetradio_sc|inetradio_rio the stations of a directory on the network
//   action=radio_tunein&node=&station=          302 to a directory station's stream
//                                               (both in RadioDirectory.h)
//   POST action=radio_add&name=&url=            adds a station; {"station": row}
//   POST action=radio_remove&station=<id>       removes one
//   POST action=radio_favorite&station=<id>&favorite=1|0
// A station row: {"station": id, "title": name, "url": stream URL, "favorite", "artist": "",
// "album": "", "duration": -1}. The page plays "url" itself: the stream goes from the station to
// the browser, never through this server.
#pragma once

#include <json/value.h>

#include <string>
#include <string_view>

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

bool IsRadioNode(std::string_view node);
// Fills `reply` with the node's stations (1), or answers an error (0).
int ListRadioNode(ActionHandler& handler, WebMan& webMan, const std::string& node,
                  Json::Value& reply);

bool IsRadioAction(std::string_view action);
// Serves one of the radio actions; the exit status.
int ServeRadioAction(ActionHandler& handler, WebMan& webMan, std::string_view action);

}  // namespace harmona::webapi
