#include "LoopbackRelay.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>

namespace harmona::mediad {
namespace {

bool WriteAll(int fd, const char* data, size_t size) {
    while (size > 0) {
        const ssize_t written = send(fd, data, size, MSG_NOSIGNAL);
        if (written < 0 && errno == EINTR)
            continue;
        if (written <= 0)
            return false;
        data += written;
        size -= static_cast<size_t>(written);
    }
    return true;
}

int ConnectUpstream(const std::string& address, unsigned short port) {
    const int fd = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0)
        return -1;
    sockaddr_in target{};
    target.sin_family = AF_INET;
    target.sin_port = htons(port);
    if (inet_pton(AF_INET, address.c_str(), &target.sin_addr) != 1 ||
        connect(fd, reinterpret_cast<sockaddr*>(&target), sizeof(target)) != 0) {
        close(fd);
        return -1;
    }
    return fd;
}

}  // namespace

bool LoopbackRelay::Start(unsigned short port, const std::string& upstreamAddress,
                          std::string* error) {
    Stop();
    port_ = port;
    upstream_ = upstreamAddress;
    listenFd_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int on = 1;
    sockaddr_in local{};
    local.sin_family = AF_INET;
    local.sin_port = htons(port);
    local.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (listenFd_ < 0 || setsockopt(listenFd_, SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on)) != 0 ||
        bind(listenFd_, reinterpret_cast<sockaddr*>(&local), sizeof(local)) != 0 ||
        listen(listenFd_, 64) != 0 || pipe2(wakeFds_, O_CLOEXEC) != 0) {
        *error = "cannot listen on 127.0.0.1:" + std::to_string(port) + ": " + strerror(errno);
        Stop();
        return false;
    }
    acceptor_ = std::thread([this] { AcceptLoop(); });
    return true;
}

void LoopbackRelay::Stop() {
    if (wakeFds_[1] >= 0) {
        const char byte = 1;
        (void)!write(wakeFds_[1], &byte, 1);  // the pipe stays readable: every poll wakes
    }
    if (acceptor_.joinable())
        acceptor_.join();
    {
        std::unique_lock<std::mutex> lock(mutex_);
        idle_.wait_for(lock, std::chrono::seconds(5), [this] { return active_ == 0; });
    }
    if (listenFd_ >= 0)
        close(listenFd_);
    listenFd_ = -1;
    // Only when every connection thread has gone do the wake descriptors close.
    std::unique_lock<std::mutex> lock(mutex_);
    if (active_ == 0) {
        for (int& fd : wakeFds_) {
            if (fd >= 0)
                close(fd);
            fd = -1;
        }
    }
}

void LoopbackRelay::AcceptLoop() {
    for (;;) {
        pollfd fds[2] = {{listenFd_, POLLIN, 0}, {wakeFds_[0], POLLIN, 0}};
        if (poll(fds, 2, -1) < 0) {
            if (errno == EINTR)
                continue;
            return;
        }
        if (fds[1].revents != 0)
            return;
        const int client = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC);
        if (client < 0)
            continue;
        std::unique_lock<std::mutex> lock(mutex_);
        if (active_ >= kMaxConnections) {
            close(client);
            continue;
        }
        ++active_;
        std::thread([this, client] { Relay(client); }).detach();
    }
}

void LoopbackRelay::Relay(int client) {
    const int upstream = ConnectUpstream(upstream_, port_);
    if (upstream >= 0) {
        char buffer[65536];
        bool open[2] = {true, true};  // client -> upstream, upstream -> client
        while (open[0] || open[1]) {
            pollfd fds[3] = {{client, static_cast<short>(open[0] ? POLLIN : 0), 0},
                             {upstream, static_cast<short>(open[1] ? POLLIN : 0), 0},
                             {wakeFds_[0], POLLIN, 0}};
            const int ready = poll(fds, 3, kIdleTimeoutMs);
            if (ready < 0 && errno == EINTR)
                continue;
            if (ready <= 0 || fds[2].revents != 0)
                break;
            for (int side = 0; side < 2; ++side) {
                if (!open[side] || fds[side].revents == 0)
                    continue;
                const int from = side == 0 ? client : upstream;
                const int to = side == 0 ? upstream : client;
                const ssize_t got = recv(from, buffer, sizeof(buffer), 0);
                if (got > 0 && WriteAll(to, buffer, static_cast<size_t>(got)))
                    continue;
                if (got < 0 && errno == EINTR)
                    continue;
                open[side] = false;
                shutdown(to, SHUT_WR);  // pass the end of one direction on
            }
        }
        close(upstream);
    }
    close(client);
    std::lock_guard<std::mutex> lock(mutex_);
    --active_;
    idle_.notify_all();
}

}  // namespace harmona::mediad
