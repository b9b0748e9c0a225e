// harmona-mediad's descriptions as data files: the program looks for its data folder beside itself
// (where the build puts it), else in the installed place; a file that is missing or broken stops
// the start with a message naming it and exit status 1, before any process is forked or anything is
// served. Each test runs a copy of the real program from a folder of its own.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <thread>

#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

namespace fs = std::filesystem;

constexpr const char* kCopyFolder = "/tmp/mediad-copy";
constexpr const char* kInstalledData = "/var/packages/Harmona/target/share/harmona-mediad";

// The data folder the build put beside the program.
std::string BuiltData() {
    return HARMONA_MEDIAD_DATA_BESIDE;
}

struct ProgramRun {
    bool ended = false;  // within the wait; a program still running was killed
    int exitStatus = -1;
    bool signalled = false;
    std::string error;  // what it wrote to stderr
};

// The copy of the program in kCopyFolder, run until it ends (up to `waitMs`).
ProgramRun RunCopy(int waitMs = 5000) {
    const std::string program = std::string(kCopyFolder) + "/harmona-mediad";
    const std::string errorFile = std::string(kCopyFolder) + "/stderr.txt";
    ProgramRun run;
    const pid_t pid = fork();
    if (pid == 0) {
        if (!freopen(errorFile.c_str(), "w", stderr))
            _exit(126);
        execl(program.c_str(), program.c_str(), "--interface", kInterface,
              static_cast<char*>(nullptr));
        _exit(127);
    }
    int status = 0;
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(waitMs);
    while (!(run.ended = waitpid(pid, &status, WNOHANG) == pid) &&
           std::chrono::steady_clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    if (!run.ended) {
        kill(pid, SIGTERM);
        waitpid(pid, &status, 0);
    }
    run.signalled = WIFSIGNALED(status);
    run.exitStatus = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    run.error = Exists(errorFile) ? ReadFile(errorFile) : "";
    return run;
}

bool LoggedCannotStart(const std::string& naming) {
    for (const LogLine& line : TakeLogLines(200)) {
        if (line.message.find("cannot start: ") != std::string::npos &&
            line.message.find(naming) != std::string::npos)
            return true;
    }
    return false;
}

class DescriptionData : public ::testing::Test {
  protected:
    void SetUp() override {
        fs::create_directories(kCopyFolder);
        fs::copy_file(HARMONA_MEDIAD_PATH, std::string(kCopyFolder) + "/harmona-mediad");
    }
    // The build's data folder copied beside the program copy; its path.
    std::string CopyDataBeside() {
        const std::string data = std::string(kCopyFolder) + "/harmona-mediad-data";
        fs::copy(BuiltData(), data, fs::copy_options::recursive);
        return data;
    }
};

TEST_F(DescriptionData, WithoutAnyDataFolderTheStartStopsNamingTheInstalledTemplate) {
    const ProgramRun run = RunCopy();
    ASSERT_TRUE(run.ended) << "the program served without its descriptions";
    EXPECT_FALSE(run.signalled);
    EXPECT_EQ(run.exitStatus, 1);
    const std::string file = std::string(kInstalledData) + "/description.xml";
    EXPECT_NE(run.error.find("cannot read " + file), std::string::npos) << run.error;
    EXPECT_TRUE(LoggedCannotStart(file));
    EXPECT_FALSE(Exists(kPidFile));
}

TEST_F(DescriptionData, AMissingServiceDescriptionBesideTheProgramIsNamedAndStopsTheStart) {
    const std::string data = CopyDataBeside();
    fs::remove(data + "/services/ConnectionManager.xml");
    // The installed folder is complete: the program still takes the one beside it.
    fs::create_directories(fs::path(kInstalledData).parent_path());
    fs::copy(BuiltData(), kInstalledData, fs::copy_options::recursive);
    const ProgramRun run = RunCopy();
    ASSERT_TRUE(run.ended) << "the program served without a service description";
    EXPECT_EQ(run.exitStatus, 1);
    EXPECT_NE(run.error.find("cannot read " + data + "/services/ConnectionManager.xml"),
              std::string::npos)
        << run.error;
    EXPECT_TRUE(LoggedCannotStart("ConnectionManager.xml"));
    EXPECT_FALSE(Exists(kPidFile));
}

TEST_F(DescriptionData, AServiceDescriptionThatIsNotXmlStopsTheStart) {
    const std::string data = CopyDataBeside();
    WriteFile(data + "/services/ContentDirectory.xml", "<scpd><actionList>");
    const ProgramRun run = RunCopy();
    ASSERT_TRUE(run.ended) << "the program served a broken service description";
    EXPECT_EQ(run.exitStatus, 1);
    EXPECT_NE(run.error.find("ContentDirectory.xml is not well-formed XML"), std::string::npos)
        << run.error;
}

TEST_F(DescriptionData, ATemplateWithoutItsUdnMarkStopsTheStart) {
    const std::string data = CopyDataBeside();
    std::string text = ReadFile(data + "/description.xml");
    const std::size_t mark = text.find("@UDN@");
    ASSERT_NE(mark, std::string::npos);
    text.replace(mark, 5, "uuid:fixed");
    WriteFile(data + "/description.xml", text);
    const ProgramRun run = RunCopy();
    ASSERT_TRUE(run.ended) << "the program served a template without its UDN mark";
    EXPECT_EQ(run.exitStatus, 1);
    EXPECT_NE(run.error.find("must hold @UDN@ exactly once"), std::string::npos) << run.error;
}

TEST_F(DescriptionData, WithNothingBesideItTheProgramServesTheInstalledDescriptions) {
    fs::create_directories(fs::path(kInstalledData).parent_path());
    fs::copy(BuiltData(), kInstalledData, fs::copy_options::recursive);
    const std::string program = std::string(kCopyFolder) + "/harmona-mediad";
    const pid_t pid = fork();
    if (pid == 0) {
        execl(program.c_str(), program.c_str(), "--interface", kInterface,
              static_cast<char*>(nullptr));
        _exit(127);
    }
    bool serving = false;
    for (int i = 0; i < 500 && !serving; ++i) {
        serving = Exists(kPidFile) && std::atol(ReadFile(kPidFile).c_str()) == pid;
        if (!serving)
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    const HttpReply scpd = HttpGet("http://127.0.0.1:50003/ContentDirectory.xml");
    kill(pid, SIGTERM);
    int status = 0;
    waitpid(pid, &status, 0);
    ASSERT_TRUE(serving) << "the program copy did not come up";
    EXPECT_EQ(scpd.status, 200);
    EXPECT_EQ(scpd.body, ReadFile(std::string(kInstalledData) + "/services/ContentDirectory.xml"));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

}  // namespace
}  // namespace harmona::test::mediad
