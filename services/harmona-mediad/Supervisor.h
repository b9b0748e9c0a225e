// The process harmona-mediad starts as (root): it runs no network code. It starts the server's
// child (ServerRole) and the live library's child (LiveLibraryRole), writes the pid file once
// 127.0.0.1 serves, starts either child again, a second after it ended on its own, and on SIGTERM
// or SIGINT removes the pid file and stops both.
#pragma once

#include <signal.h>

#include <utility>

#include "services/harmona-mediad/MediaServer.h"

namespace harmona::mediad {

class Supervisor {
  public:
    explicit Supervisor(MediaServerOptions options) : options_(std::move(options)) {}

    // Runs until one of `stopSignals` (blocked by the caller, with SIGCHLD) arrives; the exit
    // status: non-zero when a child did not end cleanly (a fault, a sanitizer report).
    int Run(const sigset_t& stopSignals);
    // The signal that ended Run.
    int stopSignal() const { return stopSignal_; }

  private:
    MediaServerOptions options_;
    int stopSignal_ = 0;
};

}  // namespace harmona::mediad
