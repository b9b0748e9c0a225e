#include "tests/tree/TreeFixture.h"

#include <sys/wait.h>
#include <unistd.h>

#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/PlaylistFixtures.h"

namespace harmona::test {

void WriteLibraryServicePid(bool running) {
    pid_t pid = getpid();
    if (!running) {
        // A process that has ended: its pid names no running process (until reused, which the
        // short test cannot see happen).
        pid = fork();
        if (pid == 0)
            _exit(0);
        waitpid(pid, nullptr, 0);
    }
    WriteFile("/run/vanu/service/3.pid", std::to_string(pid) + "\n");
}

TreeFixture::TreeFixture(const TreeWorld& world) : world_(world) {
    InstallTexts();
    AddUser(world.user, world.permission, world.language);
    WriteLibraryServicePid(world.serviceRunning);
    if (world.share)
        MakeDirs("/volume1/music");
    for (const std::string& name : world.personal)
        WritePersonalPlaylistFile(world.user, name + ".m3u");
    if (!world.personalSmart.empty())
        WriteSmartPlaylistFile(UserSmartPlaylistFile(world.user), world.personalSmart);
    std::vector<SharedPlaylistRow> rows;
    std::int64_t id = 7;
    for (const std::string& name : world.shared) {
        rows.push_back({id, name});
        id -= 4;
    }
    MakeLibraryDb({}, rows);
    if (!world.sharedSmart.empty())
        WriteSmartPlaylistFile(kSharedSmartPlaylistFile, world.sharedSmart);
    if (world.ipod)
        ipodIds_ = AttachIPod(world.ipodPlaylists);
    if (world.daemon)
        daemon_ = std::make_unique<ScriptedDaemon>(
            ServeMediaServers(MakeMediaServers(world.mediaServers)));
    if (!world.personalListable)
        WriteFile(PersonalPlaylistDir(world.user), "not a folder");
}

TreeWorld WorldWithUnlistablePersonalPlaylists() {
    TreeWorld world;
    world.personal = {};
    world.personalSmart = {};
    world.personalListable = false;
    return world;
}

std::vector<std::string> Ids(const Json::Value& nodes) {
    std::vector<std::string> ids;
    if (!nodes.isArray())
        return ids;
    for (const Json::Value& node : nodes)
        ids.push_back(node["id"].asString());
    return ids;
}

}  // namespace harmona::test
