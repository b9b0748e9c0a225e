// harmona-mediad seen by real UPnP clients from Debian: a GUPnP-AV control point in Python
// (gupnp_av_control_point.py) and GSSDP's gssdp-discover, both on loopback in the test's
// private network namespace.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <string>

#include "tests/mediad/MediadTestKit.h"

namespace harmona::test::mediad {
namespace {

struct CommandRun {
    int exitStatus = -1;
    std::string output;
};

CommandRun RunCommand(const std::string& command) {
    CommandRun run;
    FILE* pipe = popen((command + " 2>&1").c_str(), "r");
    if (pipe == nullptr)
        return run;
    char buffer[4096];
    std::size_t got = 0;
    while ((got = fread(buffer, 1, sizeof(buffer), pipe)) > 0)
        run.output.append(buffer, got);
    const int status = pclose(pipe);
    run.exitStatus = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return run;
}

class RealControlPoints : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(IndexStandardShare());
        // SSDP on loopback: the interface must carry multicast.
        ASSERT_EQ(std::system("ip link set lo multicast on"), 0);
        ASSERT_TRUE(server_.Start()) << "harmona-mediad did not come up";
    }
    ServerProcess server_;
};

// The new file is copied into the share and nothing else is done: the server's live library
// indexes it, and the subscriber hears of the change.
TEST_F(RealControlPoints, AGupnpAvControlPointBrowsesPagesFetchesAndHearsOfANewFile) {
    const std::string command = std::string("timeout 150 /usr/bin/python3 ") +
                                HARMONA_CONTROL_POINT_SCRIPT + " --interface lo --add '" + kShare +
                                "/loose.ogg' '" + kShare + "/New/added.ogg'";
    const CommandRun run = RunCommand(command);
    EXPECT_EQ(run.exitStatus, 0) << run.output;
    EXPECT_NE(run.output.find("found Harmona Music Library"), std::string::npos) << run.output;
    EXPECT_NE(run.output.find("range fetched from http://127.0.0.1:50003/media/"),
              std::string::npos)
        << run.output;
    EXPECT_NE(run.output.find("SystemUpdateID event"), std::string::npos) << run.output;
}

TEST_F(RealControlPoints, GssdpDiscoverFindsTheServerOnLoopback) {
    const CommandRun run = RunCommand("timeout 20 gssdp-discover -i lo -n 4 -t " +
                                      std::string("urn:schemas-upnp-org:device:MediaServer:1"));
    EXPECT_NE(run.output.find("http://127.0.0.1:50003/"), std::string::npos) << run.output;
    EXPECT_NE(run.output.find("urn:schemas-upnp-org:device:MediaServer:1"), std::string::npos);
}

}  // namespace
}  // namespace harmona::test::mediad
