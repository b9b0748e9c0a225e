// The memory one request may take, and the address-space limit that enforces it.
//
// A storage server has 1 to 4 GB and serves several requests, the media server and the indexer at
// once: one request gets at most kRequestMemoryBytes. The readers of everything a request lists
// refuse inputs that would take more (PlaylistRecord.h, VanuAudioUtils.h, DMAParser.h,
// LocalizedStringParser.h), each with a log line and its builder's usual failure; the address-space
// limit set at start-up catches whatever slips through. docs/memory.md gives the measurements
// behind the figures.
#pragma once

#include <cstddef>

namespace harmona::cgi {

inline constexpr std::size_t kRequestMemoryBytes = std::size_t{512} << 20;

// Limits the process's address space (RLIMIT_AS) to kRequestMemoryBytes; a lower limit already in
// place stays. An allocation beyond it fails (std::bad_alloc, or a library's out-of-memory result)
// instead of pushing the whole server into swap. Sanitizer builds (HARMONA_SANITIZE) reserve
// terabytes of address space for their shadow memory and set no limit.
void LimitRequestMemory();

// What the program does when an allocation failed all the same: one log line, and no reply (the
// web server answers 500 for a CGI that printed nothing).
void LogRequestOutOfMemory();

// The start-up every CGI program of the application shares: limits the memory first thing, then
// runs `serve` (which makes the request's handler and returns its exit status). A failed
// allocation ends the request with LogRequestOutOfMemory and exit status 0; the handler has been
// destroyed before that, and the reply is printed last, so nothing of it was written.
int ServeWithinRequestMemory(int (*serve)());

}  // namespace harmona::cgi
