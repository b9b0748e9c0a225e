#include "tests/harness/IPodFixtures.h"

#include <cinttypes>
#include <cstdio>
#include <stdexcept>

#include "platform/lib/gpod/Database.h"
#include "tests/harness/Fixtures.h"

namespace harmona::test {

std::string IPodDatabasePath(const std::string& mountpoint) {
    return mountpoint + "/iPod_Control/iTunes/iTunesDB";
}

std::vector<std::uint64_t> WriteIPodDatabaseWithIds(const std::string& mountpoint,
                                                    const std::vector<IPodPlaylistEntry>& playlists,
                                                    bool withMaster) {
    // itdb_write needs the iTunes folder; a real iPod has it.
    MakeDirs(mountpoint + "/iPod_Control/iTunes");
    gpod::Database database = gpod::Database::Create(mountpoint.c_str());
    if (!database)
        throw std::runtime_error("itdb_new failed");
    if (withMaster) {
        Itdb_Playlist* master = itdb_playlist_new(kIPodMasterPlaylistName, FALSE);
        itdb_playlist_set_mpl(master);
        itdb_playlist_add(database.Get(), master, -1);
    }
    std::vector<std::uint64_t> ids;
    for (const IPodPlaylistEntry& entry : playlists) {
        Itdb_Playlist* playlist = itdb_playlist_new(entry.name.c_str(), FALSE);
        playlist->id = entry.id;  // itdb_playlist_add gives a zero id a random unique one
        itdb_playlist_add(database.Get(), playlist, -1);
        ids.push_back(playlist->id);
    }
    std::string error;
    if (!database.Write(error))
        throw std::runtime_error("itdb_write " + mountpoint + ": " + error);
    return ids;
}

std::vector<std::uint64_t> WriteIPodDatabase(const std::string& mountpoint,
                                             const std::vector<std::string>& names) {
    std::vector<IPodPlaylistEntry> entries;
    for (const std::string& name : names)
        entries.push_back({name, 0});
    return WriteIPodDatabaseWithIds(mountpoint, entries);
}

void WriteIPodMountpointFile(const std::string& content) {
    WriteFile(kIPodMountpointFile, content);
}

std::vector<std::uint64_t> AttachIPod(const std::vector<std::string>& names,
                                      const std::string& mountpoint) {
    std::vector<std::uint64_t> ids = WriteIPodDatabase(mountpoint, names);
    WriteIPodMountpointFile(mountpoint + "\n");
    return ids;
}

std::string IPodKey(std::uint64_t id) {
    char key[17];
    std::snprintf(key, sizeof(key), "%016" PRIx64, id);
    return key;
}

}  // namespace harmona::test
