#include "services/harmona-mediad/Supervisor.h"

#include <poll.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdlib>
#include <string>

#include "common/io/ChildProcess.h"
#include "common/io/FileDescriptor.h"
#include "services/harmona-mediad/LiveLibraryRole.h"
#include "services/harmona-mediad/PidFile.h"
#include "services/harmona-mediad/ServerRole.h"

namespace harmona::mediad {
namespace {

constexpr int kReadyWaitMs = 10000;
constexpr int kStopWaitMs = 10000;
constexpr int kRestartDelayMs = 1000;

// A child of the supervisor, and for the server the read end of the pipe on which it says that it
// serves 127.0.0.1. The child's work ends with std::exit, not _exit, so that its exit handlers
// (the sanitizers' leak check among them) run as in any process that ends.
struct Child {
    io::ChildProcess process;
    io::FileDescriptor ready;
};

Child StartServer(const MediaServerOptions& options) {
    Child child;
    child.process = io::ChildProcess::Start(
        [&options](int readyFd) -> int { std::exit(RunServer(options, readyFd)); }, child.ready);
    return child;
}

// Waits up to `ms` for the child to say it serves 127.0.0.1.
bool WaitReady(const Child& child, int ms) {
    pollfd pfd{child.ready.Get(), POLLIN, 0};
    char byte = 0;
    return poll(&pfd, 1, ms) > 0 && read(child.ready.Get(), &byte, 1) == 1;
}

Child StartLiveLibrary(const MediaServerOptions& options) {
    LiveLibraryOptions live;
    live.sharePath = options.sharePath;
    live.dbPath = options.dbPath;
    Child child;
    child.process = io::ChildProcess::Start(
        [&live](int) -> int { std::exit(RunLiveLibrary(live)); }, child.ready);
    child.ready.Reset();  // it says nothing when ready
    return child;
}

// Starts `child` again when it ended on its own (or never started), a second after it ended.
template <typename Start>
void RestartIfEnded(Child& child, const char* what, Start start) {
    int status = 0;
    if (child.process.HasEnded(status)) {
        syslog(LOG_ERR, "the %s process ended (status %d); starting it again", what, status);
        child = {};
        usleep(kRestartDelayMs * 1000);
    }
    if (!child.process)
        child = start();
}

}  // namespace

int Supervisor::Run(const sigset_t& stopSignals) {
    const std::string pidFile = PidFilePath();
    Child server = StartServer(options_);
    bool pidWritten = false;
    if (server.process && WaitReady(server, kReadyWaitMs))
        pidWritten = WritePidFile(pidFile);
    if (!pidWritten)
        syslog(LOG_WARNING, "127.0.0.1 not served yet; the pid file waits for it");
    syslog(LOG_INFO, "serving %s", options_.sharePath.c_str());
    Child liveLibrary = StartLiveLibrary(options_);

    for (;;) {
        if (!pidWritten && server.process && WaitReady(server, 0))
            pidWritten = WritePidFile(pidFile);
        timespec tick{0, 200 * 1000 * 1000};
        siginfo_t info{};
        stopSignal_ = sigtimedwait(&stopSignals, &info, &tick);
        if (stopSignal_ == SIGTERM || stopSignal_ == SIGINT)
            break;
        RestartIfEnded(server, "server", [&] { return StartServer(options_); });
        RestartIfEnded(liveLibrary, "live library", [&] { return StartLiveLibrary(options_); });
    }
    RemovePidFile(pidFile);
    const int liveStatus = liveLibrary.process.Stop(kStopWaitMs);
    const int status = server.process.Stop(kStopWaitMs);
    return status == 0 && liveStatus == 0 ? 0 : 1;
}

}  // namespace harmona::mediad
