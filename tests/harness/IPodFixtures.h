// Real iPod databases for tests, written with libgpod itself (itdb_new, itdb_playlist_add,
// itdb_write), and the mountpoint file that attaches them (platform/README.md, "iPod"). Linked
// through the separate library harmona_testkit_ipod, so that only the test programs that use it
// load libgpod.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace harmona::test {

inline constexpr const char* kIPodDirectory = "/usr/vanu/etc/audio/ipod/";
inline constexpr const char* kIPodMountpointFile = "/usr/vanu/etc/audio/ipod/mountpoint";
// Inside the sandbox's fresh /tmp.
inline constexpr const char* kDefaultIPodMountpoint = "/tmp/ipod";
// The name of the master playlist that every written database holds (never listed by the tree).
inline constexpr const char* kIPodMasterPlaylistName = "iPod Master Library";

struct IPodPlaylistEntry {
    std::string name;
    std::uint64_t id = 0;  // 0: libgpod picks a random unique id
};

// Writes <mountpoint>/iPod_Control/iTunes/iTunesDB with the master playlist first (unless
// `withMaster` is false) and then `playlists` in the given order. Returns the playlists' 64-bit ids
// in that order (the master's not included). Throws std::runtime_error when libgpod fails.
std::vector<std::uint64_t> WriteIPodDatabaseWithIds(const std::string& mountpoint,
                                                    const std::vector<IPodPlaylistEntry>& playlists,
                                                    bool withMaster = true);
std::vector<std::uint64_t> WriteIPodDatabase(const std::string& mountpoint,
                                             const std::vector<std::string>& names);

// The database file that WriteIPodDatabase writes.
std::string IPodDatabasePath(const std::string& mountpoint);

// Writes the mountpoint file with `content` exactly as given (the device manager's part).
void WriteIPodMountpointFile(const std::string& content);

// An attached iPod: a database with `names` at `mountpoint` and the mountpoint file naming it.
// Returns the playlists' ids in order.
std::vector<std::uint64_t> AttachIPod(const std::vector<std::string>& names,
                                      const std::string& mountpoint = kDefaultIPodMountpoint);

// A playlist's key in the iPod library: the id as 16 lowercase hexadecimal digits.
std::string IPodKey(std::uint64_t id);

}  // namespace harmona::test
