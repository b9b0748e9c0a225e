// The networks a test gives the UPnP programs, written once: a veth pair with both ends in the
// test's namespace (the shell side's veth_pair in tests/harness/stack.sh, which the running system
// uses too), and a peer network, a second namespace linked to the test's own by a veth pair (a
// second "host" on an Ethernet-like link, so that SSDP multicast and byebye travel as on a LAN).
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "tests/harness/Service.h"

namespace harmona::test {

// Two veth ends `a` (addressA/24) and `b` (addressB/24), both in this namespace, up, IPv6 off,
// multicast routed through `a`, packets between the ends accepted although both addresses are
// local. Nothing when `a` exists already. False (and a failed test) when the link cannot be made.
bool VethPair(const std::string& a, const std::string& addressA, const std::string& b,
              const std::string& addressB);

// The test's host on the peer link, and the peer's.
inline constexpr const char* kHostAddress = "10.77.0.1";
inline constexpr const char* kHostInterface = "va";
inline constexpr const char* kPeerAddress = "10.77.0.2";
inline constexpr const char* kPeerInterface = "vb";

// The veth link between this test's namespace (va, 10.77.0.1/24 and the further addresses
// 10.77.0.11 to .17) and a second namespace held by a sleeping child (vb, 10.77.0.2/24). Both
// ends up, IPv6 duplicate address detection off (the link-local address is usable at once), and
// a route for multicast on each side.
class PeerNetwork {
  public:
    PeerNetwork();  // fails the test (ADD_FAILURE) when the link cannot be made
    ~PeerNetwork();
    PeerNetwork(const PeerNetwork&) = delete;
    PeerNetwork& operator=(const PeerNetwork&) = delete;
    // The link is up on both sides.
    explicit operator bool() const { return ok_; }
    // Runs a program on the peer host.
    Service SpawnOnPeer(const std::vector<std::string>& argv, const std::string& logPath);
    // A process in the peer host's network namespace (/proc/<pid>/ns/net), for sockets of its
    // own there.
    pid_t PeerPid() const { return holder_.pid(); }
    // Removes the link (both ends: this host's interface is gone, as a NIC not yet probed or a
    // USB adapter unplugged), and makes it again as the constructor did; false (and a failed test)
    // when a command fails. The peer's side is ready first: `peerReady`, when given, runs once
    // the peer has its address on the link and before this host's interface has one (what is
    // already on the LAN when a host's interface arrives).
    bool Unlink();
    bool Link(const std::function<void()>& peerReady = nullptr);
    // Runs a shell command on the peer host (its network: `ip link set vb down`, ...); a failure
    // fails the test.
    bool RunOnPeer(const std::string& command);

  private:
    io::ChildProcess holder_;
    int holdFd_ = -1;  // the holder exits when this closes
    bool ok_ = false;
};

// Runs a shell command (ip, ...); a failure fails the test.
bool RunCommand(const std::string& command);

}  // namespace harmona::test
