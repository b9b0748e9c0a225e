// The libgpod side of the iPod library, built as a MODULE plugin: loading it brings libgpod, GLib
// and their dependencies into the process, which only the requests that read the iPod pay for.
#include "platform/ipod/IPodPluginApi.h"
#include "platform/lib/gpod/Database.h"

extern "C" __attribute__((visibility("default"))) int harmona_ipod_list_playlists_v1(
    const char* mountpoint, harmona_ipod_playlist_sink sink, void* context) {
    if (mountpoint == nullptr || sink == nullptr)
        return -1;
    std::string error;
    const harmona::gpod::Database database = harmona::gpod::Database::Parse(mountpoint, error);
    if (!database)
        return -1;
    // The database's own order; the master playlist (the whole library) is not a playlist of the
    // tree.
    for (GList* link = database.Get()->playlists; link != nullptr; link = link->next) {
        auto* playlist = static_cast<Itdb_Playlist*>(link->data);
        if (playlist == nullptr || itdb_playlist_is_mpl(playlist))
            continue;
        const char* name = playlist->name != nullptr ? playlist->name : "";
        if (sink(context, name, playlist->id) != 0)
            return -1;
    }
    return 0;
}

// Checked at compile time: the exported function has the type that the loader expects.
[[maybe_unused]] static harmona_ipod_list_playlists_fn* const kTypeCheck =
    &harmona_ipod_list_playlists_v1;
