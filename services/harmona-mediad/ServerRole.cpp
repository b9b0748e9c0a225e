#include "services/harmona-mediad/ServerRole.h"

#include <malloc.h>
#include <signal.h>
#include <sys/prctl.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdlib>
#include <string>

#include "platform/lib/gupnp/MainLoop.h"
#include "services/harmona-mediad/Privileges.h"

namespace harmona::mediad {
namespace {

// Time for the byebye set to leave before the server exits.
constexpr unsigned kByeByeMs = 500;

// A reply of a large container is built in blocks of several MiB (the DIDL-Lite, its escaped SOAP
// envelope, the HTTP body). Blocks from this size up are mapped for themselves and given back to
// the system when freed. Left to itself, glibc raises the threshold to the largest block freed so
// far (up to 32 MiB); such blocks then come from the heap and arenas of the threads, which keep
// the freed space: about 100 MiB more resident after a few whole-list fetches of 100,000 tracks.
constexpr int kMmapThresholdBytes = 1 << 20;

}  // namespace

int RunServer(const MediaServerOptions& options, int readyFd) {
    sigset_t none;
    sigemptyset(&none);
    pthread_sigmask(SIG_SETMASK, &none, nullptr);
    const pid_t parent = getppid();
    mallopt(M_MMAP_THRESHOLD, kMmapThresholdBytes);
    // No user session here: keep GIO from looking for dconf in root's home after the drop.
    setenv("GSETTINGS_BACKEND", "memory", 1);
    setenv("GIO_USE_VFS", "local", 1);
    std::string error;
    if (!DropRoot(error)) {
        syslog(LOG_ERR, "cannot start: %s", error.c_str());
        return 1;
    }
    // The server ends with the process that keeps its pid file, however that one ends. Set after
    // the change of user, which clears it.
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (getppid() != parent)
        return 0;
    gupnp::MainLoop loop;
    MediaServer server(options);
    gupnp::Source byeByeDone;
    auto stop = [&] {
        server.SayByeBye();
        byeByeDone = gupnp::Source::Timeout(kByeByeMs, [&] {
            loop.Quit();
            return false;
        });
        return false;
    };
    gupnp::Source term = gupnp::Source::UnixSignal(SIGTERM, stop);
    gupnp::Source interrupt = gupnp::Source::UnixSignal(SIGINT, stop);
    server.Start([readyFd] {
        const char ready = 'r';
        if (write(readyFd, &ready, 1) != 1)
            syslog(LOG_WARNING, "cannot tell the parent that the server is ready");
    });
    loop.Run();
    return 0;
}

}  // namespace harmona::mediad
