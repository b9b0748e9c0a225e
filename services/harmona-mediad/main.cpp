// harmona-mediad: the storage server's local UPnP media server over library.db.
//   harmona-mediad [--interface NAME]
// It serves ContentDirectory:1 on 127.0.0.1:50003 (the CGI's endpoint) and on the LAN (every
// interface, or only NAME) on port 50003.
//
// Three processes. The one started (root) writes /run/vanu/service/3.pid (service 3 of the
// system's service list is this server) once 127.0.0.1 serves, and removes it on SIGTERM or
// SIGINT; it runs no network code. The server itself runs in a child that gives up root before
// it answers any request (user "nobody") and says byebye on SIGTERM; the live library, which
// keeps library.db in step with the share, runs in a second child as root. The parent starts
// either child again if it ever ends on its own.
#include <fcntl.h>
#include <grp.h>
#include <poll.h>
#include <pwd.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "common/io/ChildProcess.h"
#include "common/io/FileDescriptor.h"
#include "platform/lib/gupnp/MainLoop.h"
#include "platform/medialib/MediaFiles.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-mediad/DeviceDescription.h"
#include "services/harmona-mediad/LiveLibrary.h"
#include "services/harmona-mediad/MediaServer.h"

namespace {

constexpr int kServiceNumber = harmona::paths::kLocalMediaServerService;
constexpr const char* kUnprivilegedUser = "nobody";
constexpr uid_t kFallbackUid = 65534;
constexpr gid_t kFallbackGid = 65534;
constexpr int kReadyWaitMs = 10000;
constexpr int kStopWaitMs = 10000;
constexpr int kRestartDelayMs = 1000;
// Time for the byebye set to leave before the server exits.
constexpr unsigned kByeByeMs = 500;

std::string PidFilePath() {
    return std::string(harmona::paths::kServicePidDir) + std::to_string(kServiceNumber) + ".pid";
}

void MakeDirs(const std::string& dir) {
    for (std::size_t i = 1; i <= dir.size(); ++i) {
        if (i == dir.size() || dir[i] == '/')
            mkdir(dir.substr(0, i).c_str(), 0755);
    }
}

// Written whole under a temporary name and renamed, so that a reader never sees half a pid.
bool WritePidFile() {
    MakeDirs(harmona::paths::kServicePidDir);
    const std::string path = PidFilePath();
    const std::string temporary = path + ".tmp";
    unlink(temporary.c_str());
    harmona::io::FileDescriptor fd(
        open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!fd)
        return false;
    const std::string text = std::to_string(getpid()) + "\n";
    const bool written =
        write(fd.Get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
    if (!fd.Close() || !written || rename(temporary.c_str(), path.c_str()) != 0) {
        unlink(temporary.c_str());
        return false;
    }
    return true;
}

// Removes the pid file only while it still names this process.
void RemovePidFile() {
    const std::string path = PidFilePath();
    char buffer[32] = {};
    const harmona::io::FileDescriptor fd(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (!fd)
        return;
    const ssize_t got = read(fd.Get(), buffer, sizeof(buffer) - 1);
    if (got > 0 && std::atol(buffer) == static_cast<long>(getpid()))
        unlink(path.c_str());
}

// --- The server (child) -------------------------------------------------------------------------

// Gives up root for good: supplementary groups, group, user. False when a step fails (the server
// must not go on as root then).
bool DropRoot() {
    if (geteuid() != 0)
        return true;  // started unprivileged already (a developer's run)
    uid_t uid = kFallbackUid;
    gid_t gid = kFallbackGid;
    if (const passwd* user = getpwnam(kUnprivilegedUser)) {
        uid = user->pw_uid;
        gid = user->pw_gid;
    }
    if (setgroups(0, nullptr) != 0 || setgid(gid) != 0 || setuid(uid) != 0)
        return false;
    return setuid(0) != 0;  // root must be gone for good
}

int RunServer(const harmona::mediad::MediaServerOptions& options, int readyFd) {
    sigset_t none;
    sigemptyset(&none);
    pthread_sigmask(SIG_SETMASK, &none, nullptr);
    const pid_t parent = getppid();
    // No user session here: keep GIO from looking for dconf in root's home after the drop.
    setenv("GSETTINGS_BACKEND", "memory", 1);
    setenv("GIO_USE_VFS", "local", 1);
    if (!DropRoot()) {
        syslog(LOG_ERR, "cannot change to user %s; not serving as root", kUnprivilegedUser);
        return 1;
    }
    // The server ends with the process that keeps its pid file, however that one ends. Set after
    // the change of user, which clears it.
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (getppid() != parent)
        return 0;
    harmona::gupnp::MainLoop loop;
    harmona::mediad::MediaServer server(options);
    harmona::gupnp::Source byeByeDone;
    auto stop = [&] {
        server.SayByeBye();
        byeByeDone = harmona::gupnp::Source::Timeout(kByeByeMs, [&] {
            loop.Quit();
            return false;
        });
        return false;
    };
    harmona::gupnp::Source term = harmona::gupnp::Source::UnixSignal(SIGTERM, stop);
    harmona::gupnp::Source interrupt = harmona::gupnp::Source::UnixSignal(SIGINT, stop);
    server.Start([readyFd] {
        const char ready = 'r';
        if (write(readyFd, &ready, 1) != 1)
            syslog(LOG_WARNING, "cannot tell the parent that the server is ready");
    });
    loop.Run();
    return 0;
}

// --- The supervisor (parent) --------------------------------------------------------------------

// A child of the supervisor, and for the server the read end of the pipe on which it says that it
// serves 127.0.0.1. The child's work ends with std::exit, not _exit, so that its exit handlers
// (the sanitizers' leak check among them) run as in any process that ends.
struct Child {
    harmona::io::ChildProcess process;
    harmona::io::FileDescriptor ready;
};

Child StartServer(const harmona::mediad::MediaServerOptions& options) {
    Child child;
    child.process = harmona::io::ChildProcess::Start(
        [&options](int readyFd) -> int { std::exit(RunServer(options, readyFd)); }, child.ready);
    return child;
}

// Waits up to `ms` for the child to say it serves 127.0.0.1.
bool WaitReady(const Child& child, int ms) {
    pollfd pfd{child.ready.Get(), POLLIN, 0};
    char byte = 0;
    return poll(&pfd, 1, ms) > 0 && read(child.ready.Get(), &byte, 1) == 1;
}

// --- The live library (child) -------------------------------------------------------------------

// Keeps library.db in step with the share until SIGTERM. It runs as root in a process of its own:
// it writes library.db, which the unprivileged server only reads, and the supervisor that forks
// the children stays single-threaded (a fork beside a running thread could copy a lock it held).
int RunLiveLibrary(const harmona::mediad::MediaServerOptions& options) {
    const pid_t parent = getppid();
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (getppid() != parent)
        return 0;
    harmona::mediad::LiveLibraryOptions live;
    live.sharePath = options.sharePath;
    live.dbPath = options.dbPath;
    harmona::mediad::LiveLibrary library(live);
    std::string error;
    if (!library.Start(error)) {
        // Not worth restarting for: without inotify the library is as the last indexer run left it.
        syslog(LOG_ERR, "the library will not follow the share: %s", error.c_str());
    }
    // SIGTERM and SIGINT are blocked here, as in the supervisor: they arrive through sigwait only.
    sigset_t stop;
    sigemptyset(&stop);
    sigaddset(&stop, SIGTERM);
    sigaddset(&stop, SIGINT);
    int received = 0;
    while (sigwait(&stop, &received) != 0) {
    }
    library.Stop();
    return 0;
}

Child StartLiveLibrary(const harmona::mediad::MediaServerOptions& options) {
    Child child;
    child.process = harmona::io::ChildProcess::Start(
        [&options](int) -> int { std::exit(RunLiveLibrary(options)); }, child.ready);
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

int main(int argc, char** argv) {
    harmona::mediad::MediaServerOptions options;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--interface") == 0 && i + 1 < argc) {
            options.interfaceName = argv[++i];
        } else {
            std::fprintf(stderr, "usage: %s [--interface NAME]\n", argv[0]);
            return 2;
        }
    }
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGTERM);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGCHLD);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    signal(SIGPIPE, SIG_IGN);
    openlog("harmona-mediad", LOG_PID, LOG_DAEMON);

    options.dbPath = harmona::paths::kLibraryDb;
    options.sharePath = harmona::medialib::AudioSharePath();
    options.descriptionFolder = "/run/harmona-mediad." + std::to_string(getpid());
    std::string error;
    if (!harmona::mediad::WriteDescriptionFolder(options.descriptionFolder,
                                                 harmona::mediad::MakeUdn(), error)) {
        syslog(LOG_ERR, "cannot start: %s", error.c_str());
        std::fprintf(stderr, "harmona-mediad: %s\n", error.c_str());
        return 1;
    }

    Child server = StartServer(options);
    bool pidWritten = false;
    if (server.process && WaitReady(server, kReadyWaitMs))
        pidWritten = WritePidFile();
    if (!pidWritten)
        syslog(LOG_WARNING, "127.0.0.1 not served yet; the pid file waits for it");
    syslog(LOG_INFO, "serving %s", options.sharePath.c_str());
    Child liveLibrary = StartLiveLibrary(options);

    int received = 0;
    for (;;) {
        if (!pidWritten && server.process && WaitReady(server, 0))
            pidWritten = WritePidFile();
        timespec tick{0, 200 * 1000 * 1000};
        siginfo_t info{};
        received = sigtimedwait(&signals, &info, &tick);
        if (received == SIGTERM || received == SIGINT)
            break;
        RestartIfEnded(server, "server", [&] { return StartServer(options); });
        RestartIfEnded(liveLibrary, "live library", [&] { return StartLiveLibrary(options); });
    }
    RemovePidFile();
    const int liveStatus = liveLibrary.process.Stop(kStopWaitMs);
    const int status = server.process.Stop(kStopWaitMs);
    harmona::mediad::RemoveDescriptionFolder(options.descriptionFolder);
    syslog(LOG_INFO, "stopped by signal %d", received);
    // A process that did not end cleanly (a fault, a sanitizer report) makes the stop fail too.
    return status == 0 && liveStatus == 0 ? 0 : 1;
}
