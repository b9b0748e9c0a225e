// vanuaudiod: the audio daemon's media server discovery and its control socket, which the CGI asks
// for the media server list. Runs in the foreground; logs to the system log (and to standard
// error with --verbose).
//
//   vanuaudiod [--interface NAME] [--socket PATH] [--verbose]
//
// --interface: the only network interface for SSDP (default: every interface with an address,
// followed as addresses come and go). --socket: the control socket (default /tmp/vanuaudiod.sock,
// the platform's fixed path; other paths only for benchmarks).
//
// The host needs a route for multicast (its default route, or 224.0.0.0/4 on the interface):
// without one, M-SEARCH cannot leave (the log says so once) and servers are found only by their
// own announcements.
#include <grp.h>
#include <signal.h>
#include <sys/resource.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "platform/paths/DaemonAccount.h"
#include "platform/paths/PlatformPaths.h"
#include "services/vanuaudiod/ControlServer.h"
#include "services/vanuaudiod/Discovery.h"
#include "services/vanuaudiod/ServerList.h"

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
// (the discovery thread included) starts, so that every thread inherits the mask. SIGPIPE is
// ignored: a client that leaves early must not end the daemon.
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

// Started as root, the daemon opens its socket as root (for the group and the replacement of a
// stale socket) and then runs as its own account: nothing it does afterwards needs privileges,
// and what it reads comes from strangers on the network. Without that account it does not start.
// Installed, the service manager starts it as the account already; the socket then keeps the
// account's own group, of which the web server's user is a member.
struct Account {
    bool dropPrivileges = false;
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
    gid_t socketGroup = static_cast<gid_t>(-1);
};

bool ChooseAccount(Account& account, std::string& error) {
    if (geteuid() != 0)
        return true;  // unprivileged already: socket as created
    if (!harmona::paths::LookUpDaemonAccount(account.uid, account.gid)) {
        error = std::string("the account ") + harmona::paths::kDaemonUser +
                " does not exist; not running as root or as any other account";
        return false;
    }
    account.dropPrivileges = true;
    const group* web = getgrnam(harmona::paths::kDaemonSocketGroup);
    account.socketGroup = web != nullptr ? web->gr_gid : account.gid;
    if (web == nullptr)
        syslog(LOG_WARNING, "group %s does not exist; the control socket keeps group %u",
               harmona::paths::kDaemonSocketGroup, static_cast<unsigned>(account.gid));
    return true;
}

bool DropPrivileges(const Account& account, std::string& error) {
    if (!account.dropPrivileges)
        return true;
    if (setgroups(0, nullptr) != 0 || setgid(account.gid) != 0 || setuid(account.uid) != 0) {
        error = std::string("cannot drop privileges: ") + std::strerror(errno);
        return false;
    }
    syslog(LOG_INFO, "running as uid %u gid %u", static_cast<unsigned>(account.uid),
           static_cast<unsigned>(account.gid));
    return true;
}

int Fail(const std::string& error) {
    syslog(LOG_ERR, "%s", error.c_str());
    std::fprintf(stderr, "vanuaudiod: %s\n", error.c_str());
    return 1;
}

}  // namespace

int main(int argc, char** argv) {
    Arguments arguments;
    if (argc == 2 && std::strcmp(argv[1], "--help") == 0) {
        std::printf(
            "usage: vanuaudiod [--interface NAME] [--socket PATH] [--verbose]\n"
            "The audio daemon: finds the UPnP media servers on the network (SSDP) and answers the\n"
            "CGI's requests for their list on its control socket (default %s).\n"
            "  --interface NAME  search and listen on this interface only (default: every one)\n"
            "  --socket PATH     the control socket\n"
            "  --verbose         log to standard error too\n"
            "Started as root it changes to the account %s once the socket is open, and does not\n"
            "start when that account is missing. Runs in the foreground until SIGTERM or SIGINT.\n",
            harmona::paths::kDaemonSocket, harmona::paths::kDaemonUser);
        return 0;
    }
    if (!ParseArguments(argc, argv, arguments)) {
        std::fprintf(stderr, "usage: vanuaudiod [--interface NAME] [--socket PATH] [--verbose]\n");
        return 2;
    }
    openlog("vanuaudiod", LOG_PID | (arguments.verbose ? LOG_PERROR : 0), LOG_DAEMON);
    PrepareSignals();
    RaiseDescriptorLimit();

    harmona::vanuaudiod::ServerList servers;
    harmona::vanuaudiod::DiscoveryOptions discoveryOptions;
    discoveryOptions.interfaceName = arguments.interfaceName;
    harmona::vanuaudiod::Discovery discovery(servers, discoveryOptions);

    std::string error;
    Account account;
    if (!ChooseAccount(account, error))
        return Fail(error);
    harmona::vanuaudiod::ControlServerOptions serverOptions;
    serverOptions.socketPath = arguments.socketPath;
    serverOptions.socketOwner = account.uid;
    serverOptions.socketGroup = account.socketGroup;
    harmona::vanuaudiod::ControlServer control(
        servers, [&discovery] { discovery.RequestSearch(); }, serverOptions);

    if (!control.Open(error))
        return Fail("control socket: " + error);
    if (!DropPrivileges(account, error))
        return Fail(error);
    // The kernel took the listener's credentials at listen time, as root: listen again as the
    // account, which is the only one (with root) that the CGI's daemon client trusts.
    if (!control.ListenAsCurrentUser(error))
        return Fail("control socket: " + error);
    // Logged before discovery starts: from here on this thread logs nothing until it stops, so
    // that a slow system log can hold up discovery but never the answers on the socket.
    syslog(LOG_INFO, "listening on %s", arguments.socketPath.c_str());
    discovery.Start();
    control.Run();
    syslog(LOG_INFO, "stopping");
    discovery.Stop();
    return 0;
}
