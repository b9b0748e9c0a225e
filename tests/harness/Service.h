// One way for a test to start a program that keeps running (our services, the peers a test talks
// to): a child process in the test's namespace (or in another network namespace), its output in a
// log file, a readiness wait that ends early when the program exits, and a bounded stop (a signal,
// then SIGKILL after a grace time). A service the test forgets is killed and reaped when its owner
// goes. The CGIs, which run per request, go through CgiRunner.h instead.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

#include "common/io/ChildProcess.h"

namespace harmona::test {

// Milliseconds since `since` on the steady clock: the budget of every bounded wait in the kit.
int ElapsedMs(std::chrono::steady_clock::time_point since);

// The running system's ports, paths and times, shared with the shell side
// (tests/harness/stack.sh, whose NAME=value lines they are read from).
struct StackSettings {
    unsigned short mediadPort = 0;
    std::string mediadPidFile;
    std::string daemonSocket;
    std::string appDir;
    std::string stateDir;
    std::string link, linkPeer, linkAddress, linkPeerAddress;
    unsigned short defaultWebPort = 0;
    int readyTimeoutMs = 0;
    int stopGraceMs = 0;
};
const StackSettings& Stack();

// The source tree's shell side of the kit (tests/harness/stack.sh) and scripts/.
std::string SourceDir();

class Service {
  public:
    Service() = default;
    // Owns a child that the test forked itself: killed and reaped with its owner.
    explicit Service(pid_t forked) : child_(io::ChildProcess::Adopt(forked)) {}
    Service(Service&&) noexcept = default;
    Service& operator=(Service&&) noexcept = default;
    Service(const Service&) = delete;
    Service& operator=(const Service&) = delete;

    // Starts argv[0] (looked up in PATH) with `argv`, standard input from /dev/null, standard
    // output and error appended to `logPath`, in this network namespace or in the one of process
    // `netnsOf` when it is > 0. `keepFd`, when >= 0, stays open in the program. An empty service
    // (and a failed test) when it cannot be started.
    static Service Start(const std::vector<std::string>& argv, const std::string& logPath,
                         pid_t netnsOf = 0, int keepFd = -1);

    // A program was started and has not been seen ending.
    explicit operator bool() const { return static_cast<bool>(child_); }
    pid_t pid() const { return child_.pid(); }

    // Polls `ready` until it holds (true), the program ends or `timeoutMs` passes (false). The
    // sandbox's log socket is drained meanwhile: a program that logs while it starts must not wait
    // on it.
    bool WaitUntilReady(const std::function<bool()>& ready, int timeoutMs);

    // Waits up to `timeoutMs` for the program to end by itself; true, with its wait status, when
    // it did.
    bool WaitExit(int timeoutMs, int& status);

    // Sends `signal` and waits up to `graceMs` for the end; SIGKILL after that. The wait status
    // (as waitpid gives it: WIFEXITED and WEXITSTATUS apply), -1 when nothing was running or it
    // had to be killed.
    int Stop(int signal, int graceMs);

  private:
    io::ChildProcess child_;
};

// Readiness checks.
// Something accepts TCP connections on address:port.
bool Listening(const std::string& address, unsigned short port);
// A process accepts connections on the Unix stream socket at `path`.
bool UnixSocketAnswers(const std::string& path);
// `pidFile` holds the number `pid`.
bool PidFileNames(const std::string& pidFile, pid_t pid);

}  // namespace harmona::test
