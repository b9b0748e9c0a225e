// The private world every test runs in: a mount and network namespace of its own (we are root),
// with fresh tmpfs over the program's fixed roots, loopback up, and the system log caught at
// /dev/log. Nothing a test writes reaches the real machine.
#pragma once

#include <string>
#include <vector>

namespace harmona::test {

// The program's fixed roots (platform/README.md, "Fixed paths"); each gets a fresh tmpfs for
// every test.
const std::vector<std::string>& SandboxRoots();

// Enters the namespaces once per process; aborts the process with a clear message when that is not
// possible (not root, no unshare). Paths under a root that the test needs (the build and source
// trees, when they lie under /tmp) stay visible through bind mounts.
void EnterSandbox();

// Fresh, empty tmpfs over every root and a new system log catcher; called before every test.
void ResetSandbox();

// One line the program sent to the system log.
struct LogLine {
    int priority = -1;    // the syslog priority (facility | level) as sent
    std::string message;  // the text after the "tag: " prefix
    std::string raw;      // the datagram as received
};

// Lines logged since the last call (or the last reset); waits up to `settleMs` for late datagrams.
std::vector<LogLine> TakeLogLines(int settleMs = 0);

// The descriptor of the /dev/log catcher socket (for poll loops that drain it while a child runs).
int SyslogSocket();

// Reads whatever datagrams are queued now into the pending list; never blocks.
void DrainSyslog();

}  // namespace harmona::test
