// harmona-mediad: the storage server's local UPnP media server over library.db.
//   harmona-mediad [--interface NAME]
// It serves ContentDirectory:1 on 127.0.0.1:50003 (the CGI's endpoint) and on the LAN (every
// interface, or only NAME) on port 50003.
//
// Three processes. The one started (root, Supervisor) writes /run/vanu/service/3.pid (service 3 of
// the system's service list is this server) once 127.0.0.1 serves, and removes it on SIGTERM or
// SIGINT; it runs no network code. The server itself (ServerRole) runs in a child that gives up
// root before it answers any request (user "nobody") and says byebye on SIGTERM; the live library
// (LiveLibraryRole), which keeps library.db in step with the share, runs in a second child as
// root. The supervisor starts either child again if it ever ends on its own.
//
// The device and service descriptions are data files (DeviceDescription.h): the folder
// harmona-mediad-data beside this program when it is there, else the installed one. A missing or
// unreadable file stops the start with a message and exit status 1.
#include <signal.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "platform/medialib/MediaFiles.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-mediad/DeviceDescription.h"
#include "services/harmona-mediad/MediaServer.h"
#include "services/harmona-mediad/Supervisor.h"

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
    const std::string runFolder = "/run/harmona-mediad." + std::to_string(getpid());
    std::string error;
    if (!harmona::mediad::PrepareDescriptions(harmona::mediad::DescriptionDataFolder(), runFolder,
                                              harmona::mediad::MakeUdn(), options.descriptions,
                                              error)) {
        harmona::mediad::RemoveDescriptionFolder(runFolder);
        syslog(LOG_ERR, "cannot start: %s", error.c_str());
        std::fprintf(stderr, "harmona-mediad: %s\n", error.c_str());
        return 1;
    }

    harmona::mediad::Supervisor supervisor(options);
    const int status = supervisor.Run(signals);
    harmona::mediad::RemoveDescriptionFolder(runFolder);
    syslog(LOG_INFO, "stopped by signal %d", supervisor.stopSignal());
    return status;
}
