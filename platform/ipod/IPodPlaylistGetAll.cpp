// VANUIPodPlaylistGetAll: the mountpoint file, then the libgpod reader plugin, loaded here and only
// here.
#include "IPodPlaylist.h"
#include "IPodPluginApi.h"
#include "PlatformPaths.h"
#include "Plugin.h"

namespace {

// The plugin's sink: appends one record to the list being built; stops on exhausted memory.
int AppendPlaylist(void* context, const char* name, std::uint64_t id) {
    auto* builder = static_cast<harmona::playlist::PlaylistListBuilder*>(context);
    return builder->Append(0, name, harmona::ipod::FormatIPodKey(id)) ? 0 : -1;
}

}  // namespace

int VANUIPodPlaylistGetAll(PLAYLIST_INFO** head) {
    if (head == nullptr)
        return -1;
    *head = nullptr;

    std::string mountpoint;
    if (!harmona::ipod::ReadMountpoint(harmona::paths::kIPodMountpointFile, mountpoint))
        return -1;

    const harmona::plugin::Plugin reader =
        harmona::plugin::Plugin::OpenBesideProgram(HARMONA_IPOD_PLUGIN_FILE);
    auto* listPlaylists =
        reader.Get<harmona_ipod_list_playlists_fn>(HARMONA_IPOD_LIST_PLAYLISTS_SYMBOL);
    if (listPlaylists == nullptr)
        return -1;

    // The builder frees what it holds when the listing fails half-way.
    harmona::playlist::PlaylistListBuilder builder;
    if (listPlaylists(mountpoint.c_str(), &AppendPlaylist, &builder) != 0)
        return -1;
    *head = builder.Release();
    return 0;
}
