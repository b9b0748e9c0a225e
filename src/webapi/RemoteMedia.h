// The tracks of a media server on the network, and their playing through this server.
//
// A track of such a server is listed only when its resource (the first res URL its Browse gave)
// lies on the server's own host; the page plays it as
//   webapi/library.cgi?action=remote_stream&node=mediaserver_<control URL>&object=<item id>
// which browses that item's metadata on the server again, and fetches the res URL of that answer
// (never a URL from the request), only while the audio daemon lists the server at a numeric
// network address and only on that address. The body goes on to the browser piece by piece, Range
// passed on, within a size and time bound (kMaxStreamBytes, the limits below).
#pragma once

#include <json/value.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/cgi/ActionHandler.h"
#include "platform/dma/ItemNode.h"

namespace harmona::webapi {

inline constexpr std::string_view kRemoteStreamAction = "remote_stream";

// A resource larger than this is refused when its length is announced, and cut off when it is not.
inline constexpr unsigned long long kMaxStreamBytes = 512ull << 20;
inline constexpr long kStreamConnectTimeoutMs = 2000;
// No byte for this long: the server hangs.
inline constexpr long kStreamStallTimeoutMs = 10000;
inline constexpr long kStreamTotalTimeoutMs = 30L * 60 * 1000;
// The longest object id a request may name.
inline constexpr std::size_t kMaxObjectIdBytes = 1024;

// True when `controlUrl` is a server that the audio daemon lists right now and it names another
// machine by a numeric address (dma::IsNetworkHostUrl).
bool IsListedNetworkServer(const std::string& controlUrl);

// Appends `item` as a track row to `tracks` when its resource is on the host of `controlUrl`;
// false (nothing appended) otherwise. `node` is the server's tree node id.
bool AppendRemoteTrack(const std::string& node, const std::string& controlUrl, const ItemNode& item,
                       Json::Value& tracks);

// "H+:MM:SS[.F+]" (a res duration) in whole seconds, rounded; -1 when it is not one.
long long DurationSeconds(std::string_view text);

// Serves action=remote_stream; the exit status.
int ServeRemoteStream(ActionHandler& handler, WebMan& webMan, int permission);

}  // namespace harmona::webapi
