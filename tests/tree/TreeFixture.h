// Real fixtures for every child builder of the root tree at once: UI texts, a user, the library
// service and the audio share, personal and shared playlists and smart playlists (real files and a
// real SQLite library.db), an iPod database written with libgpod, and a scripted audio daemon.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/ScriptedDaemon.h"

namespace harmona::test {

struct TreeWorld {
    std::string user = "admin";
    int permission = 1 | 4 | 8;
    std::string language;        // users.conf language; empty: none
    bool serviceRunning = true;  // /run/vanu/service/3.pid names a running process
    bool share = true;           // /volume1/music exists
    bool ipod = true;            // an iPod is attached (directory, mountpoint file, database)
    std::vector<std::string> personal = {"Road trip", "Morning"};        // .m3u files
    std::vector<std::string> personalSmart = {"rock", "Jazz", "blues"};  // smart.playlist sections
    // false: a file takes the path of the user's playlists folder, so that listing the personal
    // playlists fails (personal and personalSmart must be empty then).
    bool personalListable = true;
    std::vector<std::string> shared = {"Party", "Chill"};  // library.db rows (ids 7, 3)
    std::vector<std::string> sharedSmart = {"Top rated"};
    std::vector<std::string> ipodPlaylists = {"Gym", "Sleep"};
    int mediaServers = 3;
    bool daemon = true;
};

// The standard world but for the personal playlists: none, and a listing of them that fails.
TreeWorld WorldWithUnlistablePersonalPlaylists();

// Writes the world into the sandbox; keeps the scripted daemon running while the object lives.
class TreeFixture {
  public:
    explicit TreeFixture(const TreeWorld& world);
    const TreeWorld& World() const { return world_; }
    const std::vector<std::uint64_t>& IPodIds() const { return ipodIds_; }
    ScriptedDaemon* Daemon() { return daemon_.get(); }

  private:
    TreeWorld world_;
    std::vector<std::uint64_t> ipodIds_;
    std::unique_ptr<ScriptedDaemon> daemon_;
};

// Writes a pid file for service 3 naming a running (this) or an ended process.
void WriteLibraryServicePid(bool running);

// The ids of a node array, in order.
std::vector<std::string> Ids(const Json::Value& nodes);

}  // namespace harmona::test
