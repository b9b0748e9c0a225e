// vanuaudiod: the audio daemon's media server discovery and its control socket, which the CGI asks
// for the media server list. Runs in the foreground; logs to the system log (and to standard
// error with --verbose).
//
//   vanuaudiod [--interface NAME] [--socket PATH] [--verbose]
//
// --interface: the network interface for SSDP (default: libupnp's first suitable one; tests on a
// private loopback use "lo"). --socket: the control socket (default /tmp/vanuaudiod.sock, the
// platform's fixed path; other paths only for benchmarks).
//
// The host needs a route for multicast (its default route, or 224.0.0.0/4 on the interface):
// without one, libupnp's M-SEARCH fails with ENETUNREACH and servers are found only by their
// own announcements.
#include <signal.h>
#include <sys/resource.h>
#include <syslog.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "ControlServer.h"
#include "Discovery.h"
#include "PlatformPaths.h"
#include "ServerList.h"

namespace {

struct Arguments {
    const char* interfaceName = nullptr;
    std::string socketPath = harmona::paths::kDaemonSocket;
    bool verbose = false;
};

bool ParseArguments(int argc, char** argv, Arguments& out) {
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (arg == "--interface" && i + 1 < argc)
            out.interfaceName = argv[++i];
        else if (arg == "--socket" && i + 1 < argc)
            out.socketPath = argv[++i];
        else if (arg == "--verbose")
            out.verbose = true;
        else
            return false;
    }
    return true;
}

// SIGTERM and SIGINT are taken through the event loop's signalfd: block them before any thread
// (libupnp's included) starts, so that every thread inherits the mask. SIGPIPE is ignored: a
// client that leaves early must not end the daemon.
void PrepareSignals() {
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    sigaddset(&stopSignals, SIGTERM);
    sigaddset(&stopSignals, SIGINT);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);
    signal(SIGPIPE, SIG_IGN);
}

// Room for many clients at once: the soft limit on descriptors up to the hard one.
void RaiseDescriptorLimit() {
    struct rlimit limit {};
    if (getrlimit(RLIMIT_NOFILE, &limit) == 0 && limit.rlim_cur < limit.rlim_max) {
        limit.rlim_cur = limit.rlim_max;
        setrlimit(RLIMIT_NOFILE, &limit);
    }
}

}  // namespace

int main(int argc, char** argv) {
    Arguments arguments;
    if (!ParseArguments(argc, argv, arguments)) {
        std::fprintf(stderr, "usage: vanuaudiod [--interface NAME] [--socket PATH] [--verbose]\n");
        return 2;
    }
    openlog("vanuaudiod", LOG_PID | (arguments.verbose ? LOG_PERROR : 0), LOG_DAEMON);
    PrepareSignals();
    RaiseDescriptorLimit();

    vanuaudiod::ServerList servers;
    vanuaudiod::DiscoveryOptions discoveryOptions;
    discoveryOptions.interfaceName = arguments.interfaceName;
    vanuaudiod::Discovery discovery(servers, discoveryOptions);

    vanuaudiod::ControlServerOptions serverOptions;
    serverOptions.socketPath = arguments.socketPath;
    vanuaudiod::ControlServer control(
        servers, [&discovery] { discovery.RequestSearch(); }, serverOptions);

    std::string error;
    if (!control.Open(error)) {
        syslog(LOG_ERR, "control socket: %s", error.c_str());
        std::fprintf(stderr, "vanuaudiod: %s\n", error.c_str());
        return 1;
    }
    if (!discovery.Start(error)) {
        syslog(LOG_ERR, "discovery: %s", error.c_str());
        std::fprintf(stderr, "vanuaudiod: %s\n", error.c_str());
        return 1;
    }
    syslog(LOG_INFO, "listening on %s", arguments.socketPath.c_str());
    control.Run();
    syslog(LOG_INFO, "stopping");
    discovery.Stop();
    return 0;
}
