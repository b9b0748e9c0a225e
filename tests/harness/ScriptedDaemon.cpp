#include "tests/harness/ScriptedDaemon.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <stdexcept>

namespace harmona::test {

namespace {

// How long the daemon waits for a request's bytes, and for a client to hang up after a "never".
constexpr int kRequestWaitMs = 2000;
constexpr int kHangUpWaitMs = 10000;
constexpr int kSendWaitMs = 2000;

long long MsSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() -
                                                                 start)
        .count();
}

// Waits for `events` on `fd` or for the stop descriptor, at most `timeoutMs`. 1 ready, 0 time-out,
// -1 stopping or error.
int WaitOrStop(int fd, short events, int stopFd, int timeoutMs) {
    pollfd fds[2] = {{fd, events, 0}, {stopFd, POLLIN, 0}};
    const int n = fd >= 0 ? poll(fds, 2, timeoutMs) : poll(fds + 1, 1, timeoutMs);
    if (n < 0)
        return errno == EINTR ? 0 : -1;
    if (fds[1].revents != 0)  // the stop descriptor (polled alone when fd < 0)
        return -1;
    return n > 0 ? 1 : 0;
}

std::string Compact(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

}  // namespace

std::string DaemonRequest::ArgumentArea() const {
    return std::string(reinterpret_cast<const char*>(raw.data()) + 4, kDaemonRequestSize - 4);
}

DaemonAnswer DaemonAnswer::Reply(std::string text, int delayMs) {
    DaemonAnswer answer;
    answer.reply = std::move(text);
    answer.delayMs = delayMs;
    return answer;
}

DaemonAnswer DaemonAnswer::Never() {
    DaemonAnswer answer;
    answer.kind = Kind::never;
    return answer;
}

DaemonAnswer DaemonAnswer::Close(int delayMs) {
    DaemonAnswer answer;
    answer.kind = Kind::close;
    answer.delayMs = delayMs;
    return answer;
}

DaemonAnswer DaemonAnswer::InPieces(std::string text, std::vector<std::size_t> pieces, int gapMs) {
    DaemonAnswer answer;
    answer.reply = std::move(text);
    answer.pieces = std::move(pieces);
    answer.pieceGapMs = gapMs;
    return answer;
}

ScriptedDaemon::ScriptedDaemon(DaemonScript script, DaemonOptions options)
    : script_(std::move(script)), options_(options) {
    unlink(kDaemonSocketPath);
    listenFd_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    stopFd_ = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (listenFd_ < 0 || stopFd_ < 0)
        throw std::runtime_error(std::string("ScriptedDaemon: socket: ") + std::strerror(errno));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::snprintf(address.sun_path, sizeof(address.sun_path), "%s", kDaemonSocketPath);
    if (bind(listenFd_, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0 ||
        listen(listenFd_, options_.backlog) != 0)
        throw std::runtime_error(std::string("ScriptedDaemon: bind/listen ") + kDaemonSocketPath +
                                 ": " + std::strerror(errno));
    thread_ = std::thread([this] { Run(); });
}

ScriptedDaemon::~ScriptedDaemon() {
    const std::uint64_t one = 1;
    if (write(stopFd_, &one, sizeof(one)) != sizeof(one))
        std::perror("ScriptedDaemon: stop");
    if (thread_.joinable())
        thread_.join();
    close(listenFd_);
    close(stopFd_);
    unlink(kDaemonSocketPath);
}

std::vector<DaemonRequest> ScriptedDaemon::Requests() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return requests_;
}

std::vector<std::int32_t> ScriptedDaemon::Commands() const {
    std::vector<std::int32_t> commands;
    for (const DaemonRequest& request : Requests())
        commands.push_back(request.command);
    return commands;
}

int ScriptedDaemon::Connections() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return connections_;
}

bool ScriptedDaemon::Sleep(int ms) {
    if (ms <= 0)
        return true;
    return WaitOrStop(-1, 0, stopFd_, ms) == 0;
}

bool ScriptedDaemon::SendAll(int fd, const char* data, std::size_t size) {
    while (size > 0) {
        const ssize_t n = send(fd, data, size, MSG_NOSIGNAL);
        if (n > 0) {
            data += n;
            size -= static_cast<std::size_t>(n);
            continue;
        }
        if (n < 0 && errno != EAGAIN && errno != EINTR)
            return false;  // the client went away (EPIPE, ECONNRESET): the rest is lost
        if (WaitOrStop(fd, POLLOUT, stopFd_, kSendWaitMs) != 1)
            return false;
    }
    return true;
}

void ScriptedDaemon::Run() {
    for (;;) {
        const int ready = WaitOrStop(options_.accept ? listenFd_ : -1, POLLIN, stopFd_, 1000);
        if (ready < 0)
            return;
        if (ready == 0 || !options_.accept)
            continue;
        const int fd = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
        if (fd < 0)
            continue;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            ++connections_;
        }
        Serve(fd);
        close(fd);
    }
}

void ScriptedDaemon::Serve(int fd) {
    // The request: up to 8196 bytes, as long as the client keeps sending.
    DaemonRequest request;
    const auto start = std::chrono::steady_clock::now();
    while (request.size < kDaemonRequestSize) {
        const long long left = kRequestWaitMs - MsSince(start);
        if (left <= 0 || WaitOrStop(fd, POLLIN, stopFd_, static_cast<int>(left)) != 1)
            break;
        const ssize_t n =
            read(fd, request.raw.data() + request.size, kDaemonRequestSize - request.size);
        if (n <= 0 && !(n < 0 && (errno == EAGAIN || errno == EINTR)))
            break;
        if (n > 0)
            request.size += static_cast<std::size_t>(n);
    }
    if (request.size == 0)
        return;
    request.receivedAt = std::chrono::steady_clock::now();
    if (request.size >= 4)
        std::memcpy(&request.command, request.raw.data(), sizeof(request.command));
    const char* area = reinterpret_cast<const char*>(request.raw.data()) + 4;
    const void* nul = std::memchr(area, '\0', kDaemonRequestSize - 4);
    request.argumentsTerminated = nul != nullptr && request.size > 4;
    request.arguments = nul != nullptr ? std::string(area, static_cast<const char*>(nul))
                                       : std::string(area, kDaemonRequestSize - 4);
    {
        std::lock_guard<std::mutex> lock(mutex_);
        requests_.push_back(request);
    }

    const DaemonAnswer answer = script_(request);
    switch (answer.kind) {
        case DaemonAnswer::Kind::never: {
            // Hold the connection until the client hangs up (read gives 0) or the daemon stops.
            const auto holdStart = std::chrono::steady_clock::now();
            char sink[4096];
            for (;;) {
                const long long left = kHangUpWaitMs - MsSince(holdStart);
                if (left <= 0 || WaitOrStop(fd, POLLIN, stopFd_, static_cast<int>(left)) != 1)
                    return;
                const ssize_t n = read(fd, sink, sizeof(sink));
                if (n == 0 || (n < 0 && errno != EAGAIN && errno != EINTR))
                    return;
            }
        }
        case DaemonAnswer::Kind::close:
            Sleep(answer.delayMs);
            return;
        case DaemonAnswer::Kind::reply:
            break;
    }
    if (!Sleep(answer.delayMs))
        return;
    const char* data = answer.reply.data();
    std::size_t left = answer.reply.size();
    for (std::size_t i = 0; i < answer.pieces.size() && left > 0; ++i) {
        const std::size_t piece = std::min(answer.pieces[i], left);
        if (!SendAll(fd, data, piece))
            return;
        data += piece;
        left -= piece;
        if (left > 0 && !Sleep(answer.pieceGapMs))
            return;
    }
    if (left > 0)
        SendAll(fd, data, left);
}

std::vector<MediaServer> MakeMediaServers(int n) {
    std::vector<MediaServer> servers;
    for (int i = 1; i <= n; ++i) {
        const std::string number = std::to_string(i);
        servers.push_back({"http://10.0.0." + number + ":8200/ctl/" + number, "Server " + number,
                           "10.0.0." + number});
    }
    return servers;
}

Json::Value MediaServerElement(const MediaServer& server) {
    Json::Value element(Json::objectValue);
    if (!server.controlUrl.isNull())
        element["control_url"] = server.controlUrl;
    if (!server.friendlyName.isNull())
        element["friendly_name"] = server.friendlyName;
    if (!server.ip.isNull())
        element["ip"] = server.ip;
    return element;
}

std::string MediaServerPage(const std::vector<MediaServer>& servers, int offset, int count) {
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    Json::Value list(Json::arrayValue);
    const long long total = static_cast<long long>(servers.size());
    const long long first = offset < 0 ? 0 : offset;
    const long long end = std::min(total, first + (count < 0 ? 0 : count));
    for (long long i = first; i < end; ++i)
        list.append(MediaServerElement(servers[static_cast<std::size_t>(i)]));
    reply["list"] = list;
    reply["total"] = static_cast<Json::Int64>(total);
    return Compact(reply);
}

DaemonScript ServeMediaServers(std::vector<MediaServer> servers) {
    return [servers = std::move(servers)](const DaemonRequest& request) {
        if (request.command == 14)
            return DaemonAnswer::Reply("{\"success\": true}");
        if (request.command == 16) {
            int offset = 0;
            int count = 0;
            if (std::sscanf(request.arguments.c_str(), "%d %d", &offset, &count) == 2)
                return DaemonAnswer::Reply(MediaServerPage(servers, offset, count));
        }
        return DaemonAnswer::Reply("{\"success\": false, \"error\": \"unsupported\"}");
    };
}

}  // namespace harmona::test
