// The live library's child process: keeps library.db in step with the share until SIGTERM. It
// runs as root in a process of its own: it writes library.db, which the unprivileged server only
// reads, and the supervisor that forks the children stays single-threaded (a fork beside a
// running thread could copy a lock it held).
#pragma once

#include "services/harmona-mediad/LiveLibrary.h"

namespace harmona::mediad {

// The whole life of the live library's process; its exit status. SIGTERM and SIGINT must be
// blocked (as the supervisor has them): they arrive through sigwait only.
int RunLiveLibrary(const LiveLibraryOptions& options);

}  // namespace harmona::mediad
