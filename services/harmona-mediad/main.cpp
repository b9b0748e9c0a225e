// harmona-mediad: the storage server's local UPnP media server over library.db.
//   harmona-mediad [--interface NAME] [--friendly-name NAME]
// It serves ContentDirectory:1 on 127.0.0.1:50003 (the CGI's endpoint) and on the LAN (every
// interface, or only NAME) on port 50003.
//
// Three processes. The one started (Supervisor) writes /run/vanu/service/3.pid (service 3 of the
// system's service list is this server) once 127.0.0.1 serves, and removes it on SIGTERM or
// SIGINT; it runs no network code. The server itself (ServerRole) runs in a child that says
// byebye on SIGTERM; the live library (LiveLibraryRole), which keeps library.db in step with the
// share, runs in a second child. The supervisor starts either child again if it ever ends on its
// own. Installed, the service manager starts it as the library's account ("harmona"), with the
// folder for its descriptions in RUNTIME_DIRECTORY; started as root, the server's child changes to
// that account before it answers any request. Without the account it does not start at all.
//
// The device and service descriptions are data files (DeviceDescription.h): the folder
// harmona-mediad-data beside this program when it is there, else the installed one. A missing or
// unreadable file stops the start with a message and exit status 1.
#include <signal.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/medialib/MediaFiles.h"
#include "platform/paths/DaemonAccount.h"
#include "platform/paths/PlatformPaths.h"
#include "services/harmona-mediad/DeviceDescription.h"
#include "services/harmona-mediad/MediaServer.h"
#include "services/harmona-mediad/Supervisor.h"

namespace {

// Where the descriptions of this run are written: below the folder the service manager made for
// this service (the first of RUNTIME_DIRECTORY) when there is one, else below /run.
std::string DescriptionRunFolder() {
    const std::string id = std::to_string(getpid());
    const char* runtime = std::getenv("RUNTIME_DIRECTORY");
    if (runtime != nullptr && runtime[0] == '/') {
        const std::string first(runtime, std::strcspn(runtime, ":"));
        return first + "/descriptions." + id;
    }
    return "/run/harmona-mediad." + id;
}

void PrintHelp() {
    std::printf(
        "usage: harmona-mediad [--interface NAME] [--friendly-name NAME]\n"
        "The storage server's local UPnP media server over the music library (library.db).\n"
        "Serves ContentDirectory:1 on 127.0.0.1:50003 and on the LAN (every interface, or only\n"
        "the one --interface names), keeps the library in step with the audio share and logs to\n"
        "the system log. Control points list it by --friendly-name (at most 64 bytes of\n"
        "printable UTF-8), by default \"Harmona Music Library (<host name>)\".\n"
        "Runs in the foreground until SIGTERM or SIGINT.\n");
}

}  // namespace

int main(int argc, char** argv) {
    harmona::mediad::MediaServerOptions options;
    std::string friendlyName;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--help") == 0) {
            PrintHelp();
            return 0;
        }
        if (std::strcmp(argv[i], "--interface") == 0 && i + 1 < argc) {
            options.interfaceName = argv[++i];
        } else if (std::strcmp(argv[i], "--friendly-name") == 0 && i + 1 < argc) {
            friendlyName = argv[++i];
        } else {
            std::fprintf(stderr, "usage: %s [--interface NAME] [--friendly-name NAME]\n", argv[0]);
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
    std::string error;
    if (geteuid() == 0) {
        uid_t uid = 0;
        gid_t gid = 0;
        if (!harmona::paths::LookUpAccount(harmona::paths::kLibraryUser, uid, gid)) {
            error = std::string("the account ") + harmona::paths::kLibraryUser +
                    " does not exist; not serving as root or as any other account";
            syslog(LOG_ERR, "cannot start: %s", error.c_str());
            std::fprintf(stderr, "harmona-mediad: %s\n", error.c_str());
            return 1;
        }
    }
    const std::string runFolder = DescriptionRunFolder();
    if (!harmona::mediad::PrepareDescriptions(
            harmona::mediad::DescriptionDataFolder(), runFolder, harmona::mediad::MakeUdn(),
            harmona::mediad::ChosenFriendlyName(friendlyName), options.descriptions, error)) {
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
