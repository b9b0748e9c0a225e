#include "tests/harness/Network.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <cstdlib>

namespace harmona::test {

bool RunCommand(const std::string& command) {
    const int status = std::system(command.c_str());
    if (status != 0)
        ADD_FAILURE() << "command failed (" << status << "): " << command;
    return status == 0;
}

bool VethPair(const std::string& a, const std::string& addressA, const std::string& b,
              const std::string& addressB) {
    // The names and addresses are the kit's own: no quoting needed.
    return RunCommand("bash -c '. " + SourceDir() +
                      "/tests/harness/stack.sh && set -e && veth_pair " + a + " " + addressA + " " +
                      b + " " + addressB + "'");
}

PeerNetwork::PeerNetwork() {
    // The holder: a child in a new network namespace that lives until we close our end of `hold`.
    int hold[2];
    if (pipe2(hold, O_CLOEXEC) != 0) {
        ADD_FAILURE() << "pipe";
        return;
    }
    io::FileDescriptor ready;
    holder_ = io::ChildProcess::Start(
        [&](int readyFd) -> int {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            close(hold[1]);  // else our own copy would keep the pipe open forever
            const char status = unshare(CLONE_NEWNET) == 0 ? 'y' : 'n';
            (void)!write(readyFd, &status, 1);
            char byte;
            (void)!read(hold[0], &byte, 1);  // returns when the test closes its end
            return 0;
        },
        ready);
    close(hold[0]);
    holdFd_ = hold[1];
    char status = 'n';
    pollfd entry{ready.Get(), POLLIN, 0};
    if (!holder_ || poll(&entry, 1, 5000) != 1 || read(ready.Get(), &status, 1) != 1 ||
        status != 'y') {
        ADD_FAILURE() << "could not make the peer's network namespace";
        return;
    }
    ok_ = Link();
}

bool PeerNetwork::Link(const std::function<void()>& peerReady) {
    const std::string peer = std::to_string(holder_.pid());
    if (!RunCommand("ip link add va type veth peer name vb netns " + peer) ||
        !RunCommand("nsenter -t " + peer +
                    " -n sh -c 'echo 0 > /proc/sys/net/ipv6/conf/vb/accept_dad && ip link set lo "
                    "up && ip addr add 10.77.0.2/24 dev vb && ip link set vb up && ip route add "
                    "224.0.0.0/4 dev vb'"))
        return false;
    if (peerReady)
        peerReady();
    return RunCommand("echo 0 > /proc/sys/net/ipv6/conf/va/accept_dad") &&
           RunCommand("ip addr add 10.77.0.1/24 dev va && ip link set va up") &&
           // More addresses of this host, for scripted servers beyond what one address may
           // announce.
           RunCommand("for n in 11 12 13 14 15 16 17; do ip addr add 10.77.0.$n/24 dev va; done") &&
           // A route for multicast, as a LAN host has with its default route (without one the
           // daemon warns).
           RunCommand("ip route add 224.0.0.0/4 dev va");
}

bool PeerNetwork::Unlink() {
    return RunCommand("ip link del va");
}

bool PeerNetwork::RunOnPeer(const std::string& command) {
    // The tests' commands hold no single quotes.
    return RunCommand("nsenter -t " + std::to_string(holder_.pid()) + " -n sh -c '" + command +
                      "'");
}

PeerNetwork::~PeerNetwork() {
    if (holdFd_ >= 0)
        close(holdFd_);
    // The holder ends once its pipe closes; the namespace goes with its last process, and the veth
    // pair with it.
    holder_.Stop(2000);
}

Service PeerNetwork::SpawnOnPeer(const std::vector<std::string>& argv, const std::string& logPath) {
    return Service::Start(argv, logPath, holder_.pid());
}

}  // namespace harmona::test
