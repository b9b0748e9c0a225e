// Makes the media server reachable at 127.0.0.1 on its port. libupnp 1.8 binds its HTTP server to
// the advertised interface's address only, and it refuses the loopback interface, but the CGI
// connects to the fixed http://127.0.0.1:50003/ContentDirectory/control.
// The relay listens on 127.0.0.1:<port> and forwards each connection, byte for byte, to the
// interface address on the same port, where libupnp answers it.
#pragma once

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <set>
#include <string>
#include <thread>

namespace harmona::mediad {

class LoopbackRelay {
  public:
    // Connections relayed at once; more wait in the listen queue.
    static constexpr int kMaxConnections = 64;
    // A connection with no byte either way for this long is closed.
    static constexpr int kIdleTimeoutMs = 120000;

    LoopbackRelay() = default;
    ~LoopbackRelay() { Stop(); }
    LoopbackRelay(const LoopbackRelay&) = delete;
    LoopbackRelay& operator=(const LoopbackRelay&) = delete;

    // Listens on 127.0.0.1:`port` and forwards to `upstreamAddress`:`port` (IPv4 text).
    bool Start(unsigned short port, const std::string& upstreamAddress, std::string* error);
    // Stops accepting, ends the open connections and waits for their threads.
    void Stop();

  private:
    void AcceptLoop();
    void Relay(int client);

    int listenFd_ = -1;
    int wakeFds_[2] = {-1, -1};  // written by Stop() to end every poll
    unsigned short port_ = 0;
    std::string upstream_;
    std::thread acceptor_;
    std::mutex mutex_;
    std::condition_variable idle_;
    int active_ = 0;
};

}  // namespace harmona::mediad
