#include "src/webapi/ServiceProbe.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "platform/paths/PlatformPaths.h"
#include "src/daemonclient/AudioDaemon.h"

namespace harmona::webapi {
namespace {

constexpr int kConnectMs = 2000;
constexpr char kProbeRequest[] = "GET / HTTP/1.0\r\nHost: 127.0.0.1\r\n\r\n";

// Waits for `events` on `fd` up to `ms`; true when they came.
bool WaitFor(int fd, short events, int ms) {
    pollfd watch{fd, events, 0};
    int result = 0;
    do {
        result = poll(&watch, 1, ms);
    } while (result < 0 && errno == EINTR);
    return result > 0 && (watch.revents & (events | POLLERR | POLLHUP)) != 0;
}

}  // namespace

ServiceState ProbeLocalMediaServer(long answerMs) {
    io::FileDescriptor fd(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    if (!fd)
        return ServiceState::down;
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(paths::kLocalMediaServerPort);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (connect(fd.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        if (errno != EINPROGRESS)
            return ServiceState::down;
        if (!WaitFor(fd.Get(), POLLOUT, kConnectMs))
            return ServiceState::notAnswering;
        int error = 0;
        socklen_t size = sizeof(error);
        if (getsockopt(fd.Get(), SOL_SOCKET, SO_ERROR, &error, &size) != 0 || error != 0)
            return error == ETIMEDOUT ? ServiceState::notAnswering : ServiceState::down;
    }
    if (send(fd.Get(), kProbeRequest, sizeof(kProbeRequest) - 1, MSG_NOSIGNAL) < 0)
        return ServiceState::down;
    if (!WaitFor(fd.Get(), POLLIN, static_cast<int>(answerMs)))
        return ServiceState::notAnswering;
    char byte = 0;
    const ssize_t got = recv(fd.Get(), &byte, 1, 0);
    // Closed at once without a word: a listener that is no HTTP server of ours, or one going away.
    return got == 1 ? ServiceState::running : ServiceState::down;
}

ServiceState ProbeAudioDaemon() {
    struct stat info {};
    if (lstat(paths::kDaemonSocket, &info) != 0 || !S_ISSOCK(info.st_mode))
        return ServiceState::down;
    io::FileDescriptor fd(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    if (!fd)
        return ServiceState::down;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::snprintf(address.sun_path, sizeof(address.sun_path), "%s", paths::kDaemonSocket);
    if (connect(fd.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0)
        // A full listen queue: the daemon is there but does not accept.
        return errno == EAGAIN ? ServiceState::notAnswering : ServiceState::down;
    fd.Reset();
    // The daemon accepts: does it answer? The client's own exchange (half a second).
    return AudioDaemonPrepareMediaServerList() == 0 ? ServiceState::running
                                                    : ServiceState::notAnswering;
}

}  // namespace harmona::webapi
