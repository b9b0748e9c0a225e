// The networks a test gives the UPnP programs, written once: a veth pair with both ends in the
// test's namespace (the shell side's veth_pair in tests/harness/stack.sh, which the running system
// uses too), and a peer network, a second namespace linked to the test's own by a veth pair (a
// second "host" on an Ethernet-like link, so that SSDP multicast and byebye travel as on a LAN).
#pragma once

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

  private:
    io::ChildProcess holder_;
    int holdFd_ = -1;  // the holder exits when this closes
    bool ok_ = false;
};

// Runs a shell command (ip, ...); a failure fails the test.
bool RunCommand(const std::string& command);

}  // namespace harmona::test
