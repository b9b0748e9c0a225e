#include "tests/harness/Service.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <map>
#include <thread>

#include "tests/harness/Sandbox.h"

#ifndef HARMONA_SOURCE_DIR
#error "HARMONA_SOURCE_DIR must name the source tree"
#endif

namespace harmona::test {

int ElapsedMs(std::chrono::steady_clock::time_point since) {
    return static_cast<int>(std::chrono::duration_cast<std::chrono::milliseconds>(
                                std::chrono::steady_clock::now() - since)
                                .count());
}

namespace {

using SteadyClock = std::chrono::steady_clock;

// The NAME=value lines of stack.sh.
std::map<std::string, std::string> ReadStackValues() {
    std::map<std::string, std::string> values;
    std::ifstream in(SourceDir() + "/tests/harness/stack.sh");
    std::string line;
    while (std::getline(in, line)) {
        const std::size_t equals = line.find('=');
        if (line.empty() || line[0] < 'A' || line[0] > 'Z' || equals == std::string::npos)
            continue;
        values[line.substr(0, equals)] = line.substr(equals + 1);
    }
    return values;
}

// A wait status for an exit status from ChildProcess (-1: it did not exit by itself).
int WaitStatusOf(int exitStatus) {
    return exitStatus < 0 ? -1 : (exitStatus & 0xff) << 8;
}

}  // namespace

std::string SourceDir() {
    return HARMONA_SOURCE_DIR;
}

const StackSettings& Stack() {
    static const StackSettings settings = [] {
        const std::map<std::string, std::string> v = ReadStackValues();
        auto text = [&](const char* name) {
            const auto found = v.find(name);
            if (found == v.end()) {
                std::fprintf(stderr, "test kit: %s is missing from tests/harness/stack.sh\n", name);
                std::abort();
            }
            return found->second;
        };
        auto number = [&](const char* name) { return std::atoi(text(name).c_str()); };
        StackSettings s;
        s.mediadPort = static_cast<unsigned short>(number("HARMONA_MEDIAD_PORT"));
        s.mediadPidFile = text("HARMONA_MEDIAD_PID_FILE");
        s.daemonSocket = text("HARMONA_DAEMON_SOCKET");
        s.appDir = text("HARMONA_APP_DIR");
        s.stateDir = text("HARMONA_STACK_STATE");
        s.link = text("HARMONA_STACK_LINK");
        s.linkPeer = text("HARMONA_STACK_LINK_PEER");
        s.linkAddress = text("HARMONA_LINK_ADDRESS");
        s.linkPeerAddress = text("HARMONA_LINK_PEER_ADDRESS");
        s.defaultWebPort = static_cast<unsigned short>(number("HARMONA_DEFAULT_WEB_PORT"));
        s.readyTimeoutMs = number("HARMONA_READY_TIMEOUT_MS");
        s.stopGraceMs = number("HARMONA_STOP_GRACE_MS");
        return s;
    }();
    return settings;
}

Service Service::Start(const std::vector<std::string>& argv, const std::string& logPath,
                       pid_t netnsOf, int keepFd) {
    // Everything the child needs is prepared here: in a forked child of a threaded test only
    // async-signal-safe calls may run until exec.
    std::vector<char*> args;
    for (const std::string& arg : argv)
        args.push_back(const_cast<char*>(arg.c_str()));
    args.push_back(nullptr);
    const std::string netnsPath = "/proc/" + std::to_string(netnsOf) + "/ns/net";
    const char* netns = netnsOf > 0 ? netnsPath.c_str() : nullptr;
    const char* log = logPath.c_str();
    Service service;
    io::FileDescriptor unused;
    service.child_ = io::ChildProcess::Start(
        [&](int) -> int {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            if (netns != nullptr) {
                const int ns = open(netns, O_RDONLY | O_CLOEXEC);
                if (ns < 0 || setns(ns, CLONE_NEWNET) != 0)
                    return 126;
            }
            const int out = open(log, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
            if (out >= 0) {
                dup2(out, 1);
                dup2(out, 2);
            }
            const int null = open("/dev/null", O_RDONLY);
            if (null >= 0)
                dup2(null, 0);
            if (keepFd >= 0)
                fcntl(keepFd, F_SETFD, 0);
            sigset_t none;
            sigemptyset(&none);
            sigprocmask(SIG_SETMASK, &none, nullptr);
            signal(SIGPIPE, SIG_DFL);
            execvp(args[0], args.data());
            return 127;
        },
        unused);
    EXPECT_TRUE(service) << "could not start " << argv[0];
    return service;
}

bool Service::WaitUntilReady(const std::function<bool()>& ready, int timeoutMs) {
    const auto start = SteadyClock::now();
    for (;;) {
        DrainSyslog();
        if (ready())
            return true;
        int status = 0;
        if (!child_ || child_.HasEnded(status) || ElapsedMs(start) >= timeoutMs)
            return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}

bool Service::WaitExit(int timeoutMs, int& status) {
    if (!child_)
        return false;
    const auto start = SteadyClock::now();
    for (;;) {
        int exitStatus = -1;
        if (child_.HasEnded(exitStatus)) {
            status = WaitStatusOf(exitStatus);
            return true;
        }
        if (ElapsedMs(start) >= timeoutMs)
            return false;
        // A program that logs while it stops must not wait on the sandbox's unread log socket.
        DrainSyslog();
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

int Service::Stop(int signal, int graceMs) {
    if (!child_)
        return -1;
    kill(child_.pid(), signal);
    int status = -1;
    if (WaitExit(graceMs, status))
        return status;
    child_.Kill();
    return -1;
}

bool Listening(const std::string& address, unsigned short port) {
    const int s = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (s < 0)
        return false;
    sockaddr_in to{};
    to.sin_family = AF_INET;
    to.sin_port = htons(port);
    inet_pton(AF_INET, address.c_str(), &to.sin_addr);
    const bool connected = connect(s, reinterpret_cast<sockaddr*>(&to), sizeof(to)) == 0;
    close(s);
    return connected;
}

bool UnixSocketAnswers(const std::string& path) {
    const int s = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (s < 0)
        return false;
    sockaddr_un to{};
    to.sun_family = AF_UNIX;
    std::snprintf(to.sun_path, sizeof(to.sun_path), "%s", path.c_str());
    const bool connected = connect(s, reinterpret_cast<sockaddr*>(&to), sizeof(to)) == 0;
    close(s);
    return connected;
}

bool PidFileNames(const std::string& pidFile, pid_t pid) {
    std::ifstream in(pidFile);
    long number = 0;
    return in >> number && number == pid;
}

}  // namespace harmona::test
