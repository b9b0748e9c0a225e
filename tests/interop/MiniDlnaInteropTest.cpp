// The browse library (platform/README.md, "Local media server and browse library") against a real
// MiniDLNA, started inside the sandbox on a port of its own over a generated music folder: a few
// hundred tagged tracks in album folders, and one folder of thousands of tracks, so large that
// MiniDLNA cuts its Browse reply at 2 MiB.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <map>
#include <set>
#include <thread>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Service.h"

using namespace harmona::test;

namespace {

constexpr int kPort = 50210;
constexpr int kAlbums = 10;
constexpr int kTracksPerAlbum = 30;
constexpr int kBigFolderTracks = 6000;
const std::string kRoot = "/tmp/dlna";
const std::string kControlUrl = "http://127.0.0.1:" + std::to_string(kPort) + "/ctl/ContentDir";

bool HaveProgram(const char* path) {
    return access(path, X_OK) == 0;
}

// A FLAC file with its Vorbis comment block replaced by `tags` (written here, so that hundreds of
// tagged files need one sox run only). Returns "" when `flac` is not a FLAC stream.
std::string WithVorbisComments(const std::string& flac, const std::vector<std::string>& tags) {
    if (flac.compare(0, 4, "fLaC") != 0)
        return "";
    std::vector<std::pair<int, std::string>> blocks;
    std::size_t at = 4;
    for (bool last = false; !last && at + 4 <= flac.size();) {
        const auto* b = reinterpret_cast<const unsigned char*>(flac.data() + at);
        last = (b[0] & 0x80) != 0;
        const std::size_t length = (std::size_t{b[1]} << 16) | (std::size_t{b[2]} << 8) | b[3];
        blocks.emplace_back(b[0] & 0x7f, flac.substr(at + 4, length));
        at += 4 + length;
    }
    auto le32 = [](std::string& out, std::uint32_t v) {
        for (int i = 0; i < 4; ++i)
            out += static_cast<char>((v >> (8 * i)) & 0xff);
    };
    std::string comment;
    const std::string vendor = "harmona-test";
    le32(comment, vendor.size());
    comment += vendor;
    le32(comment, tags.size());
    for (const std::string& tag : tags) {
        le32(comment, tag.size());
        comment += tag;
    }
    std::vector<std::pair<int, std::string>> rewritten;
    for (auto& block : blocks)
        if (block.first != 4 && block.first != 1)  // drop old comments and padding
            rewritten.push_back(block);
    rewritten.insert(rewritten.begin() + 1, {4, comment});
    std::string out = "fLaC";
    for (std::size_t i = 0; i < rewritten.size(); ++i) {
        const std::string& data = rewritten[i].second;
        out += static_cast<char>((i + 1 == rewritten.size() ? 0x80 : 0) | rewritten[i].first);
        out += static_cast<char>((data.size() >> 16) & 0xff);
        out += static_cast<char>((data.size() >> 8) & 0xff);
        out += static_cast<char>(data.size() & 0xff);
        out += data;
    }
    return out + flac.substr(at);
}

struct Browsed {
    int status = -1;
    std::vector<ItemNode> items;
    bool hasResult = false;
    unsigned long totalMatches = 0;
};

Browsed Browse(const std::string& objectId, unsigned requestedCount = 0) {
    DMABrowse browse(BrowseDirectChildren, kControlUrl);
    browse.objectId = objectId;
    browse.requestedCount = requestedCount;
    Browsed out;
    if (browse.Prepare() != 0)
        return out;
    DMAParser parser;
    out.status = parser.Parse(&browse);
    out.totalMatches = parser.TotalMatches();
    if (const DMAParser::ItemList* items = parser.GetResult()) {
        out.hasResult = true;
        for (const ItemNode* item : *items)
            out.items.push_back(*item);
    }
    return out;
}

const ItemNode* FindTitle(const Browsed& browsed, const std::string& title) {
    for (const ItemNode& item : browsed.items)
        if (item.getValueByKey("title") == title)
            return &item;
    return nullptr;
}

std::string BigTrackName(int n) {
    char name[96];
    std::snprintf(name, sizeof(name), "Track %04d of the very big folder with a long name", n);
    return name;
}

class MiniDlnaInterop : public ::testing::Test {
  protected:
    void SetUp() override {
        if (!HaveProgram("/usr/sbin/minidlnad") || !HaveProgram("/usr/bin/sox"))
            GTEST_FAIL() << "minidlna and sox are needed (scripts/packages.txt)";
        GenerateLibrary();
        StartServer();
    }

    void TearDown() override { server_.Stop(SIGTERM, Stack().stopGraceMs); }

    void GenerateLibrary() {
        MakeDirs(kRoot + "/music/big");
        MakeDirs(kRoot + "/db");
        const std::string base = kRoot + "/base.flac";
        const std::string sox = "sox -n -r 8000 -c 1 -b 16 '" + base + "' synth 0.05 sine 440 2>&1";
        ASSERT_EQ(std::system(sox.c_str()), 0);
        const std::string flac = ReadFile(base);
        for (int album = 0; album < kAlbums; ++album) {
            const std::string folder = kRoot + "/music/albums/Album " + std::to_string(album);
            for (int track = 1; track <= kTracksPerAlbum; ++track) {
                const std::string file = WithVorbisComments(
                    flac,
                    {"TITLE=Song " + std::to_string(track) + " of Album " + std::to_string(album),
                     "ARTIST=Artist " + std::to_string(album % 3),
                     "ALBUM=Album " + std::to_string(album),
                     "TRACKNUMBER=" + std::to_string(track)});
                ASSERT_FALSE(file.empty());
                WriteFile(folder + "/track" + std::to_string(track) + ".flac", file);
            }
        }
        // The big folder: one untagged file linked under thousands of names (titles come from
        // them).
        const std::string untagged = kRoot + "/untagged.flac";
        WriteFile(untagged, WithVorbisComments(flac, {}));
        for (int n = 0; n < kBigFolderTracks; ++n) {
            const std::string name = kRoot + "/music/big/" + BigTrackName(n) + ".flac";
            ASSERT_EQ(link(untagged.c_str(), name.c_str()), 0) << name;
        }
    }

    void StartServer() {
        WriteFile(kRoot + "/minidlna.conf", "port=" + std::to_string(kPort) + "\nmedia_dir=A," +
                                                kRoot + "/music\ndb_dir=" + kRoot +
                                                "/db\nlog_dir=" + kRoot +
                                                "\ninotify=no\nnetwork_interface=lo\n"
                                                "friendly_name=harmona-interop\n");
        server_ = Service::Start({"/usr/sbin/minidlnad", "-f", kRoot + "/minidlna.conf", "-P",
                                  kRoot + "/minidlna.pid", "-S", "-R"},
                                 kRoot + "/minidlnad.out");
        ASSERT_TRUE(server_);
    }

    // Waits, bounded, until "All Music" counts every track and the scanner is done: MiniDLNA scans
    // in a child process that goes on writing its database (playlists, then its last updates)
    // after the counts are complete, and a Browse meanwhile may fail its query and answer an empty
    // page.
    bool WaitForScan(int seconds) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
        const std::string expected = std::to_string(kAlbums * kTracksPerAlbum + kBigFolderTracks);
        while (std::chrono::steady_clock::now() < deadline) {
            const Browsed music = Browse("1");
            if (const ItemNode* all = FindTitle(music, "All Music");
                all && all->getValueByKey("childCount") == expected && ScannerDone())
                return true;
            std::this_thread::sleep_for(std::chrono::milliseconds(200));
        }
        return false;
    }

    // The scan has ended (MiniDLNA's log says so) and its scanner process is gone.
    bool ScannerDone() const {
        if (ReadFile(kRoot + "/minidlna.log").find("Finished parsing playlists.") ==
            std::string::npos)
            return false;
        const std::string pid = std::to_string(server_.pid());
        const std::string children = ReadFile("/proc/" + pid + "/task/" + pid + "/children");
        return children.find_first_not_of(" \n") == std::string::npos;
    }

    Service server_;
};

TEST_F(MiniDlnaInterop, BrowsesFromTheRootDownToEveryTrack) {
    // MiniDLNA scans the 6,000 files in about 3 s on an idle machine; under a parallel build and
    // test run it once took over 40 s, so the wait leaves room below the test's 300 s limit.
    ASSERT_TRUE(WaitForScan(200)) << ReadFile(kRoot + "/minidlnad.out");

    // Root: the standard containers, Music among them.
    const Browsed root = Browse("0");
    ASSERT_EQ(root.status, 0);
    const ItemNode* music = FindTitle(root, "Music");
    const ItemNode* folders = FindTitle(root, "Browse Folders");
    ASSERT_NE(music, nullptr);
    ASSERT_NE(folders, nullptr);
    for (const ItemNode& item : root.items) {
        EXPECT_TRUE(item.isContainer);
        EXPECT_EQ(item.getValueByKey("parentID"), "0");
    }

    // Music > Album: one container per album tag, each with its tracks.
    const Browsed musicChildren = Browse(music->getValueByKey("id"));
    const ItemNode* albumCategory = FindTitle(musicChildren, "Album");
    ASSERT_NE(albumCategory, nullptr);
    const Browsed albums = Browse(albumCategory->getValueByKey("id"));
    ASSERT_EQ(albums.status, 0);
    ASSERT_EQ(albums.items.size(), static_cast<std::size_t>(kAlbums));
    std::set<std::string> albumTitles;
    for (const ItemNode& album : albums.items) {
        albumTitles.insert(album.getValueByKey("title"));
        EXPECT_EQ(album.getValueByKey("parentID"), albumCategory->getValueByKey("id"));
        EXPECT_EQ(album.getValueByKey("childCount"), std::to_string(kTracksPerAlbum));
        const Browsed tracks = Browse(album.getValueByKey("id"));
        ASSERT_EQ(tracks.status, 0);
        ASSERT_EQ(tracks.items.size(), static_cast<std::size_t>(kTracksPerAlbum))
            << album.getValueByKey("title");
        std::set<std::string> titles, ids;
        for (const ItemNode& track : tracks.items) {
            EXPECT_FALSE(track.isContainer);
            EXPECT_EQ(track.getValueByKey("parentID"), album.getValueByKey("id"));
            EXPECT_EQ(track.getValueByKey("album"), album.getValueByKey("title"));
            EXPECT_EQ(track.getValueByKey("class"), "object.item.audioItem.musicTrack");
            EXPECT_EQ(track.getValueByKey("res").rfind("http://", 0), 0u)
                << track.getValueByKey("res");
            titles.insert(track.getValueByKey("title"));
            ids.insert(track.getValueByKey("id"));
        }
        EXPECT_EQ(ids.size(), static_cast<std::size_t>(kTracksPerAlbum));
        const std::string albumTitle = album.getValueByKey("title");
        const std::string albumNumber = albumTitle.substr(albumTitle.rfind(' ') + 1);
        for (int n = 1; n <= kTracksPerAlbum; ++n)
            EXPECT_EQ(titles.count("Song " + std::to_string(n) + " of Album " + albumNumber), 1u);
    }
    for (int a = 0; a < kAlbums; ++a)
        EXPECT_EQ(albumTitles.count("Album " + std::to_string(a)), 1u);

    // Browse Folders > big: MiniDLNA cuts one reply at 2 MiB; the library still yields every track.
    const Browsed top = Browse(folders->getValueByKey("id"));
    const ItemNode* big = FindTitle(top, "big");
    ASSERT_NE(big, nullptr);
    EXPECT_EQ(big->getValueByKey("childCount"), std::to_string(kBigFolderTracks));
    const Browsed onePage = Browse(big->getValueByKey("id"), kBigFolderTracks);
    ASSERT_EQ(onePage.status, 0);
    EXPECT_EQ(onePage.totalMatches, static_cast<unsigned long>(kBigFolderTracks));
    EXPECT_GT(onePage.items.size(), 0u);
    EXPECT_LT(onePage.items.size(), static_cast<std::size_t>(kBigFolderTracks))
        << "MiniDLNA did not cut its reply: make the folder larger";
    std::printf("MiniDLNA answered %zu of %d objects in one reply\n", onePage.items.size(),
                kBigFolderTracks);
    const Browsed all = Browse(big->getValueByKey("id"));
    ASSERT_EQ(all.status, 0);
    ASSERT_EQ(all.items.size(), static_cast<std::size_t>(kBigFolderTracks));
    std::set<std::string> titles, ids;
    for (const ItemNode& track : all.items) {
        EXPECT_EQ(track.getValueByKey("parentID"), big->getValueByKey("id"));
        titles.insert(track.getValueByKey("title"));
        ids.insert(track.getValueByKey("id"));
    }
    EXPECT_EQ(ids.size(), static_cast<std::size_t>(kBigFolderTracks));
    for (int n = 0; n < kBigFolderTracks; ++n)
        ASSERT_EQ(titles.count(BigTrackName(n)), 1u) << BigTrackName(n);

    // All Music: every track of the library, complete.
    const ItemNode* allMusic = FindTitle(musicChildren, "All Music");
    ASSERT_NE(allMusic, nullptr);
    const Browsed everything = Browse(allMusic->getValueByKey("id"));
    ASSERT_EQ(everything.status, 0);
    EXPECT_EQ(everything.items.size(),
              static_cast<std::size_t>(kAlbums * kTracksPerAlbum + kBigFolderTracks));
}

}  // namespace
