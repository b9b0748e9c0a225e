// The lookup of one personal playlist by its name (ReadPersonalPlaylist): only a regular file of
// the user's own playlists folder is read, whatever the name or the folder holds.
#include <gtest/gtest.h>

#include <sys/stat.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "platform/playlist/PlaylistList.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

using namespace harmona;
using playlist::PlaylistFileStatus;

namespace {

constexpr const char* kShare = "/volume1/music";

class PersonalPlaylistLookup : public ::testing::Test {
  protected:
    void SetUp() override {
        prefDir_ = test::PreferenceDir("anna");
        folder_ = test::PersonalPlaylistDir("anna");
        test::MakeDirs(folder_);
    }
    playlist::PlaylistFileEntries Read(const std::string& name) {
        return playlist::ReadPersonalPlaylist(prefDir_.c_str(), name, kShare);
    }
    std::string prefDir_;
    std::string folder_;
};

}  // namespace

TEST_F(PersonalPlaylistLookup, APlaylistIsFoundByItsListedNameInAnyCaseOfItsEnding) {
    test::WriteFile(folder_ + "/Road Trip.M3U8", "#EXTM3U\n/volume1/music/a.mp3\nb.mp3\n");
    const playlist::PlaylistFileEntries entries = Read("Road Trip");
    ASSERT_EQ(entries.status, PlaylistFileStatus::ok);
    EXPECT_EQ(entries.paths,
              (std::vector<std::string>{"/volume1/music/a.mp3", "/volume1/music/b.mp3"}));
    EXPECT_EQ(Read("Road Trip.M3U8").status, PlaylistFileStatus::missing);
    EXPECT_EQ(Read("road trip").status, PlaylistFileStatus::missing);
}

TEST_F(PersonalPlaylistLookup, OfTwoFilesOfOneNameTheFirstInByteOrderIsRead) {
    test::WriteFile(folder_ + "/Mix.m3u8", "/volume1/music/second.mp3\n");
    test::WriteFile(folder_ + "/Mix.M3U", "/volume1/music/first.mp3\n");
    const playlist::PlaylistFileEntries entries = Read("Mix");
    ASSERT_EQ(entries.status, PlaylistFileStatus::ok);
    EXPECT_EQ(entries.paths, std::vector<std::string>{"/volume1/music/first.mp3"});
}

TEST_F(PersonalPlaylistLookup, AMissingPlaylistOrFolderOrAnEmptyNameIsMissing) {
    EXPECT_EQ(Read("Absent").status, PlaylistFileStatus::missing);
    EXPECT_EQ(Read("").status, PlaylistFileStatus::missing);
    EXPECT_EQ(
        playlist::ReadPersonalPlaylist(test::PreferenceDir("nobody-here").c_str(), "A", kShare)
            .status,
        PlaylistFileStatus::missing);
    EXPECT_EQ(playlist::ReadPersonalPlaylist(nullptr, "A", kShare).status,
              PlaylistFileStatus::missing);
}

TEST_F(PersonalPlaylistLookup, ANameWithASlashNeverLeavesTheFolder) {
    test::WriteFile(prefDir_ + "/outside.m3u", "/volume1/music/a.mp3\n");
    test::WriteFile(test::PersonalPlaylistDir("other") + "/Theirs.m3u", "/volume1/music/a.mp3\n");
    test::MakeDirs(folder_ + "/sub");
    test::WriteFile(folder_ + "/sub/Inner.m3u", "/volume1/music/a.mp3\n");
    for (const char* name :
         {"../outside", "../../other/playlists/Theirs", "sub/Inner", "/x", "./Inner"})
        EXPECT_EQ(Read(name).status, PlaylistFileStatus::missing) << name;
}

TEST_F(PersonalPlaylistLookup, ALinkAFifoOrAFolderOfThatNameIsUnusableAndNeverWaitedFor) {
    test::WriteFile("/volume1/elsewhere.m3u", "/volume1/music/a.mp3\n");
    ASSERT_EQ(symlink("/volume1/elsewhere.m3u", (folder_ + "/Linked.m3u").c_str()), 0);
    ASSERT_EQ(mkfifo((folder_ + "/Fifo.m3u").c_str(), 0644), 0);
    test::MakeDirs(folder_ + "/Folder.m3u");
    for (const char* name : {"Linked", "Fifo", "Folder"}) {
        const playlist::PlaylistFileEntries entries = Read(name);
        EXPECT_EQ(entries.status, PlaylistFileStatus::unusable) << name;
        EXPECT_TRUE(entries.paths.empty()) << name;
    }
}

TEST_F(PersonalPlaylistLookup, APlaylistsFolderThatIsALinkIsNotRead) {
    const std::string elsewhere = test::PersonalPlaylistDir("other");
    test::WriteFile(elsewhere + "/Theirs.m3u", "/volume1/music/a.mp3\n");
    ASSERT_EQ(rmdir(folder_.c_str()), 0);
    ASSERT_EQ(symlink(elsewhere.c_str(), folder_.c_str()), 0);
    EXPECT_EQ(Read("Theirs").status, PlaylistFileStatus::missing);
}

TEST_F(PersonalPlaylistLookup, ATooLargePlaylistIsRefused) {
    std::string many;
    for (int n = 0; n <= 10000; ++n)
        many += "/volume1/music/a.mp3\n";
    test::WriteFile(folder_ + "/Many.m3u", many);
    EXPECT_EQ(Read("Many").status, PlaylistFileStatus::tooLarge);
}
