#include "services/vanuaudiod/ControlServer.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace harmona::vanuaudiod {
namespace {

using SteadyClock = std::chrono::steady_clock;

bool FillAddress(const std::string& path, sockaddr_un& address) {
    std::memset(&address, 0, sizeof(address));
    address.sun_family = AF_UNIX;
    if (path.empty() || path.size() >= sizeof(address.sun_path))
        return false;
    std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
    return true;
}

// Whether a daemon answers on `path` now (a stale file refuses the connection).
bool SomeoneListens(const sockaddr_un& address) {
    const harmona::io::FileDescriptor probe(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    return probe &&
           connect(probe.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0;
}

}  // namespace

ControlServer::ControlServer(ServerList& servers, std::function<void()> startSearch,
                             ControlServerOptions options)
    : servers_(servers), startSearch_(std::move(startSearch)), options_(std::move(options)) {}

ControlServer::~ControlServer() {
    if (listenFd_) {
        listenFd_.Reset();
        RemoveSocketFile();
    }
}

bool ControlServer::ListenAsCurrentUser(std::string& error) {
    if (listen(listenFd_.Get(), SOMAXCONN) != 0) {
        error = std::string("listen: ") + std::strerror(errno);
        return false;
    }
    return true;
}

bool ControlServer::Open(std::string& error) {
    sockaddr_un address;
    if (!FillAddress(options_.socketPath, address)) {
        error = "socket path too long or empty";
        return false;
    }
    if (!ClearTheWay(address, error))
        return false;
    listenFd_ =
        harmona::io::FileDescriptor(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    if (!listenFd_) {
        error = std::string("socket: ") + std::strerror(errno);
        return false;
    }
    // Bind with a closed umask and open up afterwards with chmod, so the mode is exactly ours.
    const mode_t previous = umask(0177);
    const int bound = bind(listenFd_.Get(), reinterpret_cast<sockaddr*>(&address), sizeof(address));
    umask(previous);
    if (bound != 0) {
        error = "bind " + options_.socketPath + ": " + std::strerror(errno);
        listenFd_.Reset();
        return false;
    }
    struct stat own {};
    if (stat(options_.socketPath.c_str(), &own) == 0) {
        socketDev_ = own.st_dev;
        socketIno_ = own.st_ino;
    }
    // Owned by the daemon's account (which removes it at exit), in the web server's group.
    // Nothing to change when both are "as created" (a daemon started as its account, whose
    // confinement may refuse the chown calls altogether).
    const bool keepOwner = options_.socketOwner == static_cast<uid_t>(-1) &&
                           options_.socketGroup == static_cast<gid_t>(-1);
    if ((!keepOwner &&
         lchown(options_.socketPath.c_str(), options_.socketOwner, options_.socketGroup) != 0) ||
        chmod(options_.socketPath.c_str(), options_.socketMode) != 0 ||
        listen(listenFd_.Get(), SOMAXCONN) != 0) {
        error = std::string("chown/chmod/listen: ") + std::strerror(errno);
        return false;
    }
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    sigaddset(&stopSignals, SIGTERM);
    sigaddset(&stopSignals, SIGINT);
    signalFd_ = harmona::io::FileDescriptor(signalfd(-1, &stopSignals, SFD_NONBLOCK | SFD_CLOEXEC));
    stopFd_ = harmona::io::FileDescriptor(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC));
    epollFd_ = harmona::io::FileDescriptor(epoll_create1(EPOLL_CLOEXEC));
    if (!signalFd_ || !stopFd_ || !epollFd_) {
        error = std::string("signalfd/eventfd/epoll: ") + std::strerror(errno);
        return false;
    }
    for (int fd : {listenFd_.Get(), signalFd_.Get(), stopFd_.Get()}) {
        epoll_event event{};
        event.events = EPOLLIN;
        event.data.fd = fd;
        if (epoll_ctl(epollFd_.Get(), EPOLL_CTL_ADD, fd, &event) != 0) {
            error = std::string("epoll_ctl: ") + std::strerror(errno);
            return false;
        }
    }
    return true;
}

bool ControlServer::ClearTheWay(const sockaddr_un& address, std::string& error) {
    struct stat existing {};
    if (lstat(options_.socketPath.c_str(), &existing) != 0)
        return true;
    if (!S_ISSOCK(existing.st_mode)) {
        error = options_.socketPath + " exists and is not a socket; not replacing it";
        return false;
    }
    // In a world-writable folder anybody may have put it there first: only a socket of the
    // daemon's own account (or root's) is ours to replace.
    const uid_t owner =
        options_.socketOwner != static_cast<uid_t>(-1) ? options_.socketOwner : geteuid();
    if (existing.st_uid != owner && existing.st_uid != 0) {
        error = options_.socketPath + " is owned by uid " + std::to_string(existing.st_uid) +
                ", not by the daemon's account; not replacing it";
        return false;
    }
    if (SomeoneListens(address)) {
        error = "another daemon is listening on " + options_.socketPath;
        return false;
    }
    // Stale (its daemon died): safe to replace.
    if (unlink(options_.socketPath.c_str()) != 0 && errno != ENOENT) {
        error = "cannot remove stale " + options_.socketPath + ": " + std::strerror(errno);
        return false;
    }
    return true;
}

void ControlServer::RequestStop() {
    const uint64_t one = 1;
    if (stopFd_)
        (void)!write(stopFd_.Get(), &one, sizeof(one));
}

void ControlServer::Run() {
    epoll_event events[64];
    for (;;) {
        const int ready = epoll_wait(epollFd_.Get(), events, 64, NextTimeoutMs());
        if (ready < 0 && errno != EINTR) {
            syslog(LOG_ERR, "epoll_wait: %m");
            return;
        }
        for (int i = 0; i < ready; ++i) {
            const int fd = events[i].data.fd;
            if (fd == signalFd_.Get() || fd == stopFd_.Get())
                return;
            if (fd == listenFd_.Get())
                Accept();
            else
                Readable(fd);
        }
        ExpireClients();
    }
}

void ControlServer::Accept() {
    for (;;) {
        harmona::io::FileDescriptor connection(
            accept4(listenFd_.Get(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
        const int fd = connection.Get();
        if (!connection) {
            if (errno == EINTR || errno == ECONNABORTED)
                continue;
            if (errno != EAGAIN && errno != EWOULDBLOCK)
                syslog(LOG_ERR, "accept: %m");
            return;
        }
        uid_t uid = 0;
        if (clients_.size() >= options_.maxClients || !AdmitPeer(fd, uid))
            continue;  // closed when `connection` goes: the client sees no hang
        epoll_event event{};
        event.events = EPOLLIN | EPOLLRDHUP;
        event.data.fd = fd;
        if (epoll_ctl(epollFd_.Get(), EPOLL_CTL_ADD, fd, &event) != 0)
            continue;
        Client& client = clients_[fd];
        client.connection = std::move(connection);
        client.received = 0;
        client.uid = uid;
        ++clientsPerUser_[uid];
        client.deadline = SteadyClock::now() + std::chrono::milliseconds(options_.requestTimeoutMs);
    }
}

bool ControlServer::AdmitPeer(int fd, uid_t& uid) {
    ucred peer{};
    socklen_t length = sizeof(peer);
    if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &length) != 0)
        return false;
    uid = peer.uid;
    const auto found = clientsPerUser_.find(uid);
    return found == clientsPerUser_.end() || found->second < options_.maxClientsPerUser;
}

void ControlServer::Readable(int fd) {
    auto found = clients_.find(fd);
    if (found == clients_.end())
        return;
    Client& client = found->second;
    while (client.received < kRequestSize) {
        const ssize_t n =
            recv(fd, client.record + client.received, kRequestSize - client.received, 0);
        if (n > 0) {
            client.received += static_cast<std::size_t>(n);
            continue;
        }
        if (n < 0 && errno == EINTR)
            continue;
        if (n < 0 && (errno == EAGAIN || errno == EWOULDBLOCK))
            return;  // more later, within the deadline
        // End of stream (or error) before a whole record: a short request.
        Finish(fd, ErrorReply("short request"));
        return;
    }
    // A whole record. Bytes beyond it mean the client does not speak our protocol.
    char extra;
    const ssize_t more = recv(fd, &extra, 1, MSG_PEEK | MSG_DONTWAIT);
    if (more > 0) {
        Finish(fd, ErrorReply("oversized request"));
        return;
    }
    Request request;
    if (!ParseRequest(client.record, kRequestSize, request)) {
        Finish(fd, ErrorReply("bad request"));
        return;
    }
    bool startSearch = false;
    const ServerSnapshot snapshot = servers_.Snapshot();
    const std::string reply = Answer(request, *snapshot, startSearch);
    Finish(fd, reply);
    if (startSearch)
        startSearch_();
}

void ControlServer::Finish(int fd, const std::string& reply) {
    // One write, as the CGI's daemon client reads once. The reply is at most
    // paths::kDaemonMaxReplySize bytes and the connection is fresh, so a UNIX socket's send buffer
    // takes it whole; a peer that already left just loses it.
    const ssize_t written = send(fd, reply.data(), reply.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (written >= 0 && static_cast<std::size_t>(written) != reply.size())
        syslog(LOG_ERR, "reply cut: %zd of %zu bytes", written, reply.size());
    Drop(fd);
}

void ControlServer::Drop(int fd) {
    epoll_ctl(epollFd_.Get(), EPOLL_CTL_DEL, fd, nullptr);
    const auto found = clients_.find(fd);
    if (found == clients_.end())
        return;  // every descriptor handed to Drop is a client's, which erase closes
    const auto count = clientsPerUser_.find(found->second.uid);
    if (count != clientsPerUser_.end() && --count->second == 0)
        clientsPerUser_.erase(count);
    clients_.erase(found);
}

void ControlServer::ExpireClients() {
    const auto now = SteadyClock::now();
    std::vector<int> late;
    for (const auto& [fd, client] : clients_) {
        if (client.deadline <= now)
            late.push_back(fd);
    }
    for (int fd : late)
        Finish(fd, ErrorReply("request timed out"));
}

int ControlServer::NextTimeoutMs() const {
    if (clients_.empty())
        return -1;
    auto earliest = SteadyClock::time_point::max();
    for (const auto& [fd, client] : clients_)
        earliest = std::min(earliest, client.deadline);
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(earliest - SteadyClock::now());
    return left.count() > 0 ? static_cast<int>(left.count()) + 1 : 0;
}

void ControlServer::RemoveSocketFile() {
    // Only our own socket file: another daemon may have replaced it meanwhile.
    struct stat current {};
    if (stat(options_.socketPath.c_str(), &current) == 0 && current.st_dev == socketDev_ &&
        current.st_ino == socketIno_)
        unlink(options_.socketPath.c_str());
}

}  // namespace harmona::vanuaudiod
