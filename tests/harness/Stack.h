// The whole running system in the test's sandbox, in one call: the sample share written and
// indexed, harmona-mediad, vanuaudiod and lighttpd started and answering. It is brought up by
// scripts/system-inside, the same shell side that scripts/demo, the browser tests and the
// benchmarks use, so ports, paths and readiness are the same everywhere (tests/harness/stack.sh).
#pragma once

#include <atomic>
#include <string>
#include <thread>

#include "tests/harness/Service.h"

namespace harmona::test {

struct SystemOptions {
    unsigned short webPort = 0;  // 0: the default port (stack.sh)
    int sampleTracks = 24;       // about how many tracks the sample share holds
    std::string password = "secret";
};

class RunningSystem {
  public:
    RunningSystem() = default;
    ~RunningSystem() { Stop(); }
    RunningSystem(const RunningSystem&) = delete;
    RunningSystem& operator=(const RunningSystem&) = delete;

    // Brings the system up and waits until its page answers (up to 120 s: the sample share is
    // made first). False, with a failed test holding the system's output, when it does not come up.
    bool Start(const SystemOptions& options = {});

    // SIGTERM to the system, which stops its services in order (each SIGTERM, then SIGKILL after
    // the grace time); SIGKILL to whatever is left after that. The system's exit status (130: it
    // stopped on the signal), -1 when it had to be killed or was not running.
    int Stop();

    std::string Url() const { return "http://127.0.0.1:" + std::to_string(port_) + "/"; }
    unsigned short Port() const { return port_; }
    std::string User() const { return "demo"; }
    std::string Password() const { return password_; }
    // The system's own output (set-up steps and the services' start).
    std::string Output() const;

  private:
    Service system_;
    unsigned short port_ = 0;
    std::string password_;
    std::atomic<bool> draining_{false};
    std::thread drain_;
};

// The build tree the tests were built in (the programs the system installs).
std::string BuildDir();

}  // namespace harmona::test
