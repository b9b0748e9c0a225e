#include "tests/harness/Stack.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>

#include "common/io/FileDescriptor.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"

#ifndef HARMONA_BINARY_DIR
#error "HARMONA_BINARY_DIR must name the build tree"
#endif

namespace harmona::test {
namespace {

constexpr const char* kOutput = "/tmp/system-inside.log";
constexpr int kStartTimeoutMs = 120000;

}  // namespace

std::string BuildDir() {
    return HARMONA_BINARY_DIR;
}

std::string RunningSystem::Output() const {
    return ReadFile(kOutput);
}

bool RunningSystem::Start(const SystemOptions& options) {
    port_ = options.webPort != 0 ? options.webPort : Stack().defaultWebPort;
    password_ = options.password;
    int ready[2];
    if (pipe2(ready, O_CLOEXEC) != 0) {
        ADD_FAILURE() << "pipe";
        return false;
    }
    io::FileDescriptor readEnd(ready[0]);
    io::FileDescriptor writeEnd(ready[1]);
    // The fixed roots are the sandbox's fresh tmpfs already (HARMONA_SANDBOXED).
    system_ = Service::Start(
        {"env", "HARMONA_SANDBOXED=1", "HARMONA_READY_FD=" + std::to_string(writeEnd.Get()),
         "HARMONA_WEB_PORT=" + std::to_string(port_), "HARMONA_DEMO_PASSWORD=" + password_,
         "HARMONA_SAMPLE_TRACKS=" + std::to_string(options.sampleTracks), "bash",
         SourceDir() + "/scripts/system-inside", SourceDir(), BuildDir(), "serve"},
        kOutput, 0, writeEnd.Get());
    writeEnd.Reset();
    // The services log to the sandbox's socket all the while; a full socket would stall them.
    draining_ = true;
    drain_ = std::thread([this] {
        while (draining_) {
            DrainSyslog();
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
        }
    });
    std::string said;
    const bool up = system_.WaitUntilReady(
        [&] {
            pollfd entry{readEnd.Get(), POLLIN, 0};
            if (poll(&entry, 1, 0) == 1) {
                char buffer[64];
                const ssize_t n = read(readEnd.Get(), buffer, sizeof(buffer));
                if (n > 0)
                    said.append(buffer, static_cast<std::size_t>(n));
            }
            return said.find("ready\n") != std::string::npos;
        },
        kStartTimeoutMs);
    if (!up)
        ADD_FAILURE() << "the system did not come up:\n" << Output();
    return up;
}

int RunningSystem::Stop() {
    int status = -1;
    if (system_) {
        // Its services stop one after the other, each within the grace time.
        status = system_.Stop(SIGTERM, 4 * Stack().stopGraceMs);
    }
    if (drain_.joinable()) {
        draining_ = false;
        drain_.join();
    }
    return status >= 0 && WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace harmona::test
