// The random-100 playlist, through the real CGI ("rerandom100") over a real library.db.
#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <map>
#include <set>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"

extern char** environ;

using namespace harmona::test;

namespace {

constexpr const char* kErrorReply =
    "{\"errinfo\":{\"key\":\"error_create_random100\",\"line\":616,\"sec\":\"playlist\"},"
    "\"success\":false}\n";

std::string RandomFile(const std::string& user) {
    return "/tmp/==DynaRandom100==." + user;
}

class Random100Playlist : public ::testing::Test {
  protected:
    void SetUp() override { StandardFixture(); }
};

// The EXTINF text that a generated track must have.
std::string ExtinfOf(const TrackRow& track) {
    return std::to_string((track.durationMs + 500) / 1000) + "," + track.artist + " - " +
           track.title;
}

// Checks that `file` is a whole playlist of `count` distinct tracks of the generated library of
// `libraryCount` tracks, each entry matching its track; returns the track numbers.
std::set<std::int64_t> ExpectGeneratedPlaylist(const std::string& text, std::size_t count,
                                               std::int64_t libraryCount) {
    const M3uFile file = ParseExtendedM3u(text);
    EXPECT_TRUE(file.valid) << text.substr(0, 500);
    EXPECT_EQ(file.entries.size(), count);
    std::set<std::int64_t> numbers;
    for (const M3uEntry& entry : file.entries) {
        const std::size_t at = entry.path.rfind("/Track ");
        EXPECT_NE(at, std::string::npos) << entry.path;
        if (at == std::string::npos)
            continue;
        const std::int64_t n = std::stoll(entry.path.substr(at + 7));
        EXPECT_GE(n, 1);
        EXPECT_LE(n, libraryCount);
        const TrackRow track = GeneratedTrack(n);
        EXPECT_EQ(entry.path, track.path);
        EXPECT_EQ(entry.extinf, ExtinfOf(track));
        numbers.insert(n);
    }
    EXPECT_EQ(numbers.size(), file.entries.size()) << "a track was drawn twice";
    return numbers;
}

TEST_F(Random100Playlist, GuestGetsTheFileNamedWithTheUserNameAsItIs) {
    WriteUsersConf({{"guest", {"8", ""}}, {"Guest", {"8", ""}}});
    MakeGeneratedLibrary(30);
    for (const std::string user : {"guest", "Guest"}) {
        const CgiResult r = Get("action=rerandom100", user);
        ASSERT_TRUE(r.exited) << r.errors;
        EXPECT_EQ(r.exitStatus, 1);
        EXPECT_EQ(r.Header("Content-Type"), "text/plain; charset=\"UTF-8\"");
        EXPECT_EQ(r.body, "{\"success\":true}\n");
        EXPECT_TRUE(Exists(RandomFile(user))) << user;
    }
    EXPECT_NE(ReadFile(RandomFile("guest")), "");
}

TEST_F(Random100Playlist, SuccessfulDrawIsAPlainSuccessReplyOf100DistinctTracksOf1000) {
    MakeGeneratedLibrary(1000);
    const CgiResult r = Get("action=rerandom100");
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    EXPECT_EQ(r.errors, "");  // nothing on standard error (a sanitizer build reports there)
    EXPECT_TRUE(r.log.empty());
    ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 100, 1000);
    struct stat st {};
    ASSERT_EQ(lstat(RandomFile("admin").c_str(), &st), 0);
    EXPECT_TRUE(S_ISREG(st.st_mode));
    EXPECT_EQ(st.st_mode & 07777, 0600u);
}

TEST_F(Random100Playlist, EveryRequestDrawsAgain) {
    MakeGeneratedLibrary(1000);
    std::set<std::set<std::int64_t>> draws;
    for (int i = 0; i < 3; ++i) {
        ASSERT_EQ(Get("action=rerandom100").body, "{\"success\":true}\n");
        draws.insert(ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 100, 1000));
    }
    EXPECT_EQ(draws.size(), 3u);  // three equal draws of 100 of 1000 would be a broken generator
}

TEST_F(Random100Playlist, LibraryOf30GivesAll30) {
    MakeGeneratedLibrary(30);
    const CgiResult r = Get("action=rerandom100");
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    EXPECT_EQ(ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 30, 30).size(), 30u);
}

TEST_F(Random100Playlist, FailedDrawGivesExactlyOneErrorReply) {
    // Missing library.
    CgiResult r = Get("action=rerandom100");
    ASSERT_TRUE(r.exited);
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, kErrorReply);
    EXPECT_EQ(r.errors, "");
    EXPECT_TRUE(r.log.empty());
    EXPECT_FALSE(Exists(RandomFile("admin")));

    // A library without a track.
    MakeLibraryDb({}, {{1, "a playlist is no track"}});
    r = Get("action=rerandom100");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, kErrorReply);
    EXPECT_FALSE(Exists(RandomFile("admin")));
}

TEST_F(Random100Playlist, LibraryThatIsNotADatabaseGivesTheError) {
    WriteFile("/var/packages/Harmona/var/library.db", std::string(8192, '\x5a'));
    const CgiResult r = Get("action=rerandom100");
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, kErrorReply);
}

TEST_F(Random100Playlist, ErrorTextIsLookedUpInTheUserLanguage) {
    // The envelope names the section and key; the browser looks the text up. The pair exists in
    // the shipped tables.
    const CgiResult r = Get("action=rerandom100");
    ASSERT_TRUE(r.jsonOk);
    EXPECT_EQ(r.json["errinfo"]["sec"].asString(), "playlist");
    EXPECT_EQ(r.json["errinfo"]["key"].asString(), "error_create_random100");
    EXPECT_NE(ReadFile("/var/packages/Harmona/target/app/texts/enu/strings")
                  .find("error_create_random100="),
              std::string::npos);
}

TEST_F(Random100Playlist, DatabaseLockedByAWriterForASecondStillGivesAPlaylist) {
    MakeGeneratedLibrary(200);
    DatabaseWriterLock writer(kLibraryDb, 1000);
    ASSERT_TRUE(writer.Locked());
    const CgiResult r = Get("action=rerandom100");
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    EXPECT_GE(r.wallMs, 500);  // it did wait for the writer
    ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 100, 200);
}

// Starts the real CGI for a rerandom100 request of "admin" without waiting for it.
pid_t StartRerandom(const std::string& program) {
    std::vector<std::string> env = {"GATEWAY_INTERFACE=CGI/1.1", "REQUEST_METHOD=GET",
                                    "QUERY_STRING=action=rerandom100", "REMOTE_USER=admin",
                                    "PATH=/usr/bin:/bin"};
    std::vector<char*> envp;
    for (std::string& e : env)
        envp.push_back(e.data());
    envp.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    std::string path = program;
    char* argv[] = {path.data(), nullptr};
    pid_t pid = -1;
    const int failed = posix_spawn(&pid, path.c_str(), &actions, nullptr, argv, envp.data());
    posix_spawn_file_actions_destroy(&actions);
    return failed == 0 ? pid : -1;
}

TEST_F(Random100Playlist, TwoConcurrentRequestsLeaveOneWholePlaylist) {
    MakeGeneratedLibrary(1000);
    for (int round = 0; round < 5; ++round) {
        const pid_t first = StartRerandom(CgiProgram());
        const pid_t second = StartRerandom(CgiProgram());
        ASSERT_GT(first, 0);
        ASSERT_GT(second, 0);
        int status = 0;
        ASSERT_EQ(waitpid(first, &status, 0), first);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1);
        ASSERT_EQ(waitpid(second, &status, 0), second);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1);
        ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 100, 1000);
    }
    // Nothing but the playlist is left beside it.
    std::vector<std::string> names;
    DIR* tmp = opendir("/tmp");
    ASSERT_NE(tmp, nullptr);
    while (dirent* entry = readdir(tmp))
        if (std::string(entry->d_name).find("DynaRandom100") != std::string::npos)
            names.push_back(entry->d_name);
    closedir(tmp);
    EXPECT_EQ(names, std::vector<std::string>{"==DynaRandom100==.admin"});
}

TEST_F(Random100Playlist, SymbolicLinkPlantedAtThePathIsReplacedAndItsTargetUntouched) {
    MakeGeneratedLibrary(50);
    WriteFile("/tmp/precious", "do not overwrite\n", 0644);
    ASSERT_EQ(symlink("/tmp/precious", RandomFile("admin").c_str()), 0);
    const CgiResult r = Get("action=rerandom100");
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    EXPECT_EQ(ReadFile("/tmp/precious"), "do not overwrite\n");
    struct stat st {};
    ASSERT_EQ(lstat(RandomFile("admin").c_str(), &st), 0);
    EXPECT_TRUE(S_ISREG(st.st_mode));
    ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 50, 50);
}

TEST_F(Random100Playlist, DanglingSymbolicLinkCreatesNothingAtItsTarget) {
    MakeGeneratedLibrary(10);
    MakeDirs("/run/elsewhere");
    ASSERT_EQ(symlink("/run/elsewhere/planted", RandomFile("admin").c_str()), 0);
    EXPECT_EQ(Get("action=rerandom100").body, "{\"success\":true}\n");
    EXPECT_FALSE(Exists("/run/elsewhere/planted"));
    ExpectGeneratedPlaylist(ReadFile(RandomFile("admin")), 10, 10);
}

TEST_F(Random100Playlist, FolderAtThePathGivesTheErrorAndNoLeftovers) {
    MakeGeneratedLibrary(10);
    MakeDirs(RandomFile("admin"));
    WriteFile(RandomFile("admin") + "/inside", "x");
    EXPECT_EQ(Get("action=rerandom100").body, kErrorReply);
    EXPECT_EQ(ReadFile(RandomFile("admin") + "/inside"), "x");
    DIR* tmp = opendir("/tmp");
    ASSERT_NE(tmp, nullptr);
    std::vector<std::string> names;
    while (dirent* entry = readdir(tmp))
        if (std::string(entry->d_name).find("DynaRandom100") != std::string::npos)
            names.push_back(entry->d_name);
    closedir(tmp);
    EXPECT_EQ(names, std::vector<std::string>{"==DynaRandom100==.admin"});  // only the folder
}

}  // namespace
