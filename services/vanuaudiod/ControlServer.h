// The control socket: one event loop on one thread that
// accepts clients, gathers each one's 8196-byte record with a time limit, answers it with one
// write and closes. Every socket is non-blocking, so no client can hold up another, and the
// answers come from the server list's snapshot, so discovery work never delays them.
#pragma once

#include <sys/types.h>
#include <sys/un.h>

#include <chrono>
#include <functional>
#include <string>
#include <unordered_map>

#include "common/io/FileDescriptor.h"
#include "services/vanuaudiod/Protocol.h"
#include "services/vanuaudiod/ServerList.h"

namespace harmona::vanuaudiod {

struct ControlServerOptions {
    std::string socketPath;
    mode_t socketMode = 0660;  // owner and group: the web server's CGI user is in the group
    uid_t socketOwner = static_cast<uid_t>(-1);  // -1: as created
    gid_t socketGroup = static_cast<gid_t>(-1);  // -1: as created
    int requestTimeoutMs = 2000;                 // to send the whole record
    std::size_t maxClients = 2048;       // more at once are closed at once (within RLIMIT_NOFILE)
    std::size_t maxClientsPerUser = 64;  // per peer uid, so that no local user starves the CGI
};

class ControlServer {
  public:
    ControlServer(ServerList& servers, std::function<void()> startSearch,
                  ControlServerOptions options);
    ~ControlServer();
    ControlServer(const ControlServer&) = delete;
    ControlServer& operator=(const ControlServer&) = delete;

    // Creates the socket (replacing a stale one of its own; refusing to take over a live daemon's,
    // a socket of another user or a file that is not a socket) and the event loop's descriptors.
    // False with `error` set.
    bool Open(std::string& error);

    // Listens again, so that the credentials a client reads from the socket (SO_PEERCRED, which
    // the kernel takes at listen time) are this process's current ones: called after a change of
    // user, the clients see the daemon's account and not root. False with `error` set.
    bool ListenAsCurrentUser(std::string& error);

    // Runs until SIGTERM or SIGINT arrives (the caller blocks them in every thread first) or
    // RequestStop() is called.
    void Run();
    void RequestStop();

  private:
    struct Client {
        harmona::io::FileDescriptor connection;  // the map's key is its number
        unsigned char record[kRequestSize];
        std::size_t received = 0;
        std::chrono::steady_clock::time_point deadline;
        uid_t uid = 0;
    };
    void Accept();
    void Readable(int fd);
    void Finish(int fd, const std::string& reply);
    void Drop(int fd);
    void ExpireClients();
    int NextTimeoutMs() const;
    void RemoveSocketFile();
    bool ClearTheWay(const sockaddr_un& address, std::string& error);
    bool AdmitPeer(int fd, uid_t& uid);

    ServerList& servers_;
    std::function<void()> startSearch_;
    ControlServerOptions options_;
    harmona::io::FileDescriptor listenFd_;
    harmona::io::FileDescriptor epollFd_;
    harmona::io::FileDescriptor signalFd_;
    harmona::io::FileDescriptor stopFd_;  // eventfd for RequestStop
    dev_t socketDev_ = 0;
    ino_t socketIno_ = 0;
    std::unordered_map<int, Client> clients_;
    std::unordered_map<uid_t, std::size_t> clientsPerUser_;
};

}  // namespace harmona::vanuaudiod
