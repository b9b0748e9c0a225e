// The record sizes and command codes of the exchange between the CGI's daemon client
// (src/daemonclient) and the audio daemon (services/vanuaudiod) over the control socket
// (platform/README.md, "Audio daemon"). Both sides take them from here.
#pragma once

#include <cstddef>
#include <cstdint>

namespace harmona::paths {

// One request: a record of the command code (a 32-bit integer in the host's byte order) and the
// NUL-terminated argument text in an area of fixed size.
inline constexpr std::size_t kDaemonCommandSize = sizeof(std::int32_t);
inline constexpr std::size_t kDaemonArgumentSize = 8192;
inline constexpr std::size_t kDaemonRequestSize = kDaemonCommandSize + kDaemonArgumentSize;

// The client reads the media server list's reply once into a buffer of this size, which must end
// with a NUL: the daemon's reply is at most one byte shorter.
inline constexpr std::size_t kDaemonListReplyBufferSize = 40960;
inline constexpr std::size_t kDaemonMaxReplySize = kDaemonListReplyBufferSize - 1;
// The servers the client asks for in one page of the list; the daemon bounds what one element may
// carry so that a page of this many always fits in kDaemonMaxReplySize.
inline constexpr int kDaemonListPageSize = 10;

inline constexpr std::int32_t kDaemonCommandPrepareMediaServerList = 14;
inline constexpr std::int32_t kDaemonCommandGetMediaServerList = 16;

}  // namespace harmona::paths
