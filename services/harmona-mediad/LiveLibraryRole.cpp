#include "services/harmona-mediad/LiveLibraryRole.h"

#include <signal.h>
#include <sys/prctl.h>
#include <syslog.h>
#include <unistd.h>

#include <string>

#include "services/harmona-mediad/LiveLibrary.h"

namespace harmona::mediad {

int RunLiveLibrary(const LiveLibraryOptions& options) {
    const pid_t parent = getppid();
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (getppid() != parent)
        return 0;
    LiveLibrary library(options);
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

}  // namespace harmona::mediad
