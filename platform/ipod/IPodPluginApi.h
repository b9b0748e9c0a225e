// The C interface between harmona_ipod and its libgpod plugin (libharmona_ipod_plugin.so). The
// version is part of the symbol's name, so that a stale plugin is refused rather than misread.
#pragma once

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define HARMONA_IPOD_PLUGIN_FILE "libharmona_ipod_plugin.so"
#define HARMONA_IPOD_LIST_PLAYLISTS_SYMBOL "harmona_ipod_list_playlists_v1"

// Receives one playlist: its name (UTF-8, NUL-terminated, never null) and its 64-bit id. Returns 0
// to go on, anything else to stop the listing (which then fails).
typedef int (*harmona_ipod_playlist_sink)(void* context, const char* name, uint64_t id);

// Reads the database of the iPod mounted at `mountpoint` and hands every playlist except the master
// playlist to `sink`, in database order. Returns 0 when the database was read and every playlist
// handed over, -1 when the database cannot be read, an argument is null or the sink stopped.
typedef int harmona_ipod_list_playlists_fn(const char* mountpoint, harmona_ipod_playlist_sink sink,
                                           void* context);

#ifdef __cplusplus
}
#endif
