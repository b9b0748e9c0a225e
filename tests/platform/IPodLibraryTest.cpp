// The iPod library (VANUIPodPlaylistGetAll; platform/README.md, "iPod") over real iPod databases,
// and its plugin called directly.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <utility>
#include <vector>

#include "platform/ipod/IPodPlaylist.h"
#include "platform/ipod/IPodPluginApi.h"
#include "platform/plugin/Plugin.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"

using namespace harmona::test;

namespace {

struct Entry {
    std::string name;
    std::string key;
    bool operator==(const Entry& other) const { return name == other.name && key == other.key; }
};

// Calls the library; the list is copied out and freed.
int GetAll(std::vector<Entry>& entries, bool* headWasNull = nullptr) {
    PLAYLIST_INFO* head = reinterpret_cast<PLAYLIST_INFO*>(0x1);  // must be overwritten
    const int result = VANUIPodPlaylistGetAll(&head);
    if (headWasNull != nullptr)
        *headWasNull = head == nullptr;
    entries.clear();
    if (head == reinterpret_cast<PLAYLIST_INFO*>(0x1))
        return -99;
    for (const PLAYLIST_INFO* record = head; record != nullptr; record = record->pNext)
        entries.push_back({record->szName, record->szKey});
    VANUPlayListFree(head);
    return result;
}

std::string MountpointOf(const std::string& content) {
    WriteIPodMountpointFile(content);
    std::string mountpoint = "unchanged";
    if (!harmona::ipod::ReadMountpoint(kIPodMountpointFile, mountpoint))
        return mountpoint.empty() ? "<refused>" : "<refused, not cleared>";
    return mountpoint;
}

TEST(IPodLibrary, ListsPlaylistsInDatabaseOrderWithoutTheMaster) {
    const auto ids = AttachIPod({"Road trip", "Abendmusik & <Jazz>", "Workout"});
    std::vector<Entry> entries;
    ASSERT_EQ(GetAll(entries), 0);
    const std::vector<Entry> expected = {{"Road trip", IPodKey(ids[0])},
                                         {"Abendmusik & <Jazz>", IPodKey(ids[1])},
                                         {"Workout", IPodKey(ids[2])}};
    EXPECT_EQ(entries, expected);
    for (const Entry& entry : entries) {
        ASSERT_EQ(entry.key.size(), 16u);
        EXPECT_EQ(entry.key.find_first_not_of("0123456789abcdef"), std::string::npos);
    }
}

TEST(IPodLibrary, NoPlaylistGivesZeroAndANullHead) {
    AttachIPod({});
    std::vector<Entry> entries;
    bool headWasNull = false;
    EXPECT_EQ(GetAll(entries, &headWasNull), 0);
    EXPECT_TRUE(headWasNull);
}

TEST(IPodLibrary, ADatabaseWithoutAMasterPlaylistListsEveryPlaylist) {
    const auto ids = WriteIPodDatabaseWithIds(kDefaultIPodMountpoint, {{"One", 1}, {"Two", 2}},
                                              /*withMaster=*/false);
    WriteIPodMountpointFile(std::string(kDefaultIPodMountpoint) + "\n");
    std::vector<Entry> entries;
    ASSERT_EQ(GetAll(entries), 0);
    const std::vector<Entry> expected = {{"One", "0000000000000001"}, {"Two", "0000000000000002"}};
    EXPECT_EQ(entries, expected);
}

TEST(IPodLibrary, FailuresGiveMinusOneAndANullHead) {
    std::vector<Entry> entries;
    bool headWasNull = false;
    // No mountpoint file at all (no iPod attached).
    EXPECT_EQ(GetAll(entries, &headWasNull), -1);
    EXPECT_TRUE(headWasNull);
    // The mountpoint names a folder without a database.
    MakeDirs("/tmp/empty-ipod/iPod_Control/iTunes");
    WriteIPodMountpointFile("/tmp/empty-ipod\n");
    headWasNull = false;
    EXPECT_EQ(GetAll(entries, &headWasNull), -1);
    EXPECT_TRUE(headWasNull);
    // A database that is not one.
    WriteFile("/tmp/empty-ipod/iPod_Control/iTunes/iTunesDB", "mhbd but not really a database");
    headWasNull = false;
    EXPECT_EQ(GetAll(entries, &headWasNull), -1);
    EXPECT_TRUE(headWasNull);
}

TEST(IPodLibrary, TheMountpointIsTheFirstLineAndMustBeAbsolute) {
    EXPECT_EQ(MountpointOf("/media/ipod\n/other\n"), "/media/ipod");
    EXPECT_EQ(MountpointOf("/media/ipod"), "/media/ipod");
    EXPECT_EQ(MountpointOf("/media/ipod\r\n"), "/media/ipod");
    EXPECT_EQ(MountpointOf("/media/my ipod \n"), "/media/my ipod ");
    EXPECT_EQ(MountpointOf("/"), "/");
    EXPECT_EQ(MountpointOf("media/ipod\n"), "<refused>");
    EXPECT_EQ(MountpointOf("./ipod\n"), "<refused>");
    EXPECT_EQ(MountpointOf(" /media/ipod\n"), "<refused>");
    EXPECT_EQ(MountpointOf("\n/media/ipod\n"), "<refused>");
    EXPECT_EQ(MountpointOf(""), "<refused>");
    EXPECT_EQ(MountpointOf(std::string("/media/ip\0od\n", 13)), "<refused>");
}

TEST(IPodLibrary, TheMountpointLineIsReadWithinItsBound) {
    const std::string longest = "/" + std::string(harmona::ipod::kMaxMountpointBytes - 1, 'd');
    EXPECT_EQ(MountpointOf(longest + "\n"), longest);
    EXPECT_EQ(MountpointOf(longest), longest);
    EXPECT_EQ(MountpointOf(longest + "\r\n"), longest);
    EXPECT_EQ(MountpointOf(longest + "d\n"), "<refused>");
    EXPECT_EQ(MountpointOf(longest + "d"), "<refused>");
    EXPECT_EQ(MountpointOf(longest + "d\r\n"), "<refused>");
    EXPECT_EQ(MountpointOf(longest + "\r"), longest);
    EXPECT_EQ(MountpointOf(longest + std::string(100000, 'd')), "<refused>");
}

TEST(IPodLibrary, OnlyARegularMountpointFileIsRead) {
    std::string mountpoint;
    EXPECT_FALSE(harmona::ipod::ReadMountpoint(kIPodMountpointFile, mountpoint));  // missing
    MakeDirs(kIPodMountpointFile);
    EXPECT_FALSE(harmona::ipod::ReadMountpoint(kIPodMountpointFile, mountpoint));  // a folder
    ASSERT_EQ(rmdir(kIPodMountpointFile), 0);
    // A FIFO without a writer would block a plain open: it is refused at once instead.
    ASSERT_EQ(mkfifo(kIPodMountpointFile, 0644), 0);
    EXPECT_FALSE(harmona::ipod::ReadMountpoint(kIPodMountpointFile, mountpoint));
    std::vector<Entry> entries;
    EXPECT_EQ(GetAll(entries), -1);
}

TEST(IPodLibrary, AMountpointFileThroughASymbolicLinkIsFollowed) {
    const auto ids = AttachIPod({"Linked"});
    WriteFile("/usr/vanu/elsewhere", std::string(kDefaultIPodMountpoint) + "\n");
    ASSERT_EQ(unlink(kIPodMountpointFile), 0);
    ASSERT_EQ(symlink("/usr/vanu/elsewhere", kIPodMountpointFile), 0);
    std::vector<Entry> entries;
    ASSERT_EQ(GetAll(entries), 0);
    EXPECT_EQ(entries, (std::vector<Entry>{{"Linked", IPodKey(ids[0])}}));
}

TEST(IPodLibrary, NamesAreCutTo254BytesOnACharacterBoundary) {
    std::string twoByte;
    for (int i = 0; i < 150; ++i)
        twoByte += "é";  // 300 bytes; 254 is a boundary
    std::string fourByte = "ab";
    for (int i = 0; i < 75; ++i)
        fourByte += "🎵";  // 302 bytes; 254 = 2 + 4 * 63, a boundary
    std::string threeByte = "a";
    for (int i = 0; i < 100; ++i)
        threeByte += "€";  // 301 bytes; 254 would split: 253 kept
    AttachIPod({twoByte, fourByte, threeByte});
    std::vector<Entry> entries;
    ASSERT_EQ(GetAll(entries), 0);
    ASSERT_EQ(entries.size(), 3u);
    EXPECT_EQ(entries[0].name, twoByte.substr(0, 254));
    EXPECT_EQ(entries[1].name, fourByte.substr(0, 254));
    EXPECT_EQ(entries[2].name, threeByte.substr(0, 253));
}

TEST(IPodLibrary, ThePluginLoadsAndListsDirectly) {
    const auto ids = AttachIPod({"Direct", "Call"});
    const harmona::plugin::Plugin plugin =
        harmona::plugin::Plugin::OpenBesideProgram(HARMONA_IPOD_PLUGIN_FILE);
    ASSERT_TRUE(plugin) << plugin.Error();
    auto* list = plugin.Get<harmona_ipod_list_playlists_fn>(HARMONA_IPOD_LIST_PLAYLISTS_SYMBOL);
    ASSERT_NE(list, nullptr);

    std::vector<std::pair<std::string, std::uint64_t>> seen;
    auto collect = [](void* context, const char* name, std::uint64_t id) {
        static_cast<decltype(seen)*>(context)->emplace_back(name, id);
        return 0;
    };
    EXPECT_EQ(list(kDefaultIPodMountpoint, collect, &seen), 0);
    EXPECT_EQ(seen, (decltype(seen){{"Direct", ids[0]}, {"Call", ids[1]}}));

    // A sink that stops fails the listing; null arguments are refused.
    int calls = 0;
    auto stop = [](void* context, const char*, std::uint64_t) {
        ++*static_cast<int*>(context);
        return 1;
    };
    EXPECT_EQ(list(kDefaultIPodMountpoint, stop, &calls), -1);
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(list(nullptr, collect, &seen), -1);
    EXPECT_EQ(list(kDefaultIPodMountpoint, nullptr, nullptr), -1);
    EXPECT_EQ(list("/tmp/no-such-ipod", collect, &seen), -1);
}

// Hides the plugin from this process only (our own mount namespace): an empty file is mounted over
// it for the test's duration.
class PluginHidden {
  public:
    PluginHidden() : path_(harmona::plugin::ProgramDirectory() + HARMONA_IPOD_PLUGIN_FILE) {
        WriteFile("/tmp/empty-plugin.so", "");
        mounted_ = mount("/tmp/empty-plugin.so", path_.c_str(), nullptr, MS_BIND, nullptr) == 0;
    }
    ~PluginHidden() {
        if (mounted_)
            umount2(path_.c_str(), MNT_DETACH);
    }
    bool Mounted() const { return mounted_; }

  private:
    std::string path_;
    bool mounted_ = false;
};

TEST(IPodLibrary, AMissingPluginIsAFailure) {
    AttachIPod({"Unreadable without its reader"});
    {
        PluginHidden hidden;
        ASSERT_TRUE(hidden.Mounted());
        std::vector<Entry> entries;
        bool headWasNull = false;
        EXPECT_EQ(GetAll(entries, &headWasNull), -1);
        EXPECT_TRUE(headWasNull);
    }
    std::vector<Entry> entries;
    EXPECT_EQ(GetAll(entries), 0) << "the plugin is back once the mount is gone";
    EXPECT_EQ(entries.size(), 1u);
}

}  // namespace
