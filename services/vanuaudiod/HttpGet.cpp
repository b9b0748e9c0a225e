#include "HttpGet.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <strings.h>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace vanuaudiod {
namespace {

using SteadyClock = std::chrono::steady_clock;

// Headers larger than this are refused (a description server has no reason to send more).
constexpr std::size_t kMaxHeaderBytes = 16384;

class Socket {
  public:
    explicit Socket(int fd) : fd_(fd) {}
    ~Socket() {
        if (fd_ >= 0)
            close(fd_);
    }
    Socket(const Socket&) = delete;
    Socket& operator=(const Socket&) = delete;
    int fd() const { return fd_; }

  private:
    int fd_;
};

int RemainingMs(SteadyClock::time_point deadline) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - SteadyClock::now());
    return left.count() > 0 ? static_cast<int>(left.count()) : 0;
}

// Waits for `events` on fd until the deadline. False on time-out or error.
bool WaitFor(int fd, short events, SteadyClock::time_point deadline) {
    for (;;) {
        const int left = RemainingMs(deadline);
        if (left <= 0)
            return false;
        struct pollfd entry {
            fd, events, 0
        };
        const int ready = poll(&entry, 1, left);
        if (ready < 0 && errno == EINTR)
            continue;
        return ready > 0;
    }
}

bool ResolveNumeric(const UrlParts& parts, sockaddr_storage& address, socklen_t& length) {
    std::memset(&address, 0, sizeof(address));
    auto* v4 = reinterpret_cast<sockaddr_in*>(&address);
    if (inet_pton(AF_INET, parts.host.c_str(), &v4->sin_addr) == 1) {
        v4->sin_family = AF_INET;
        v4->sin_port = htons(parts.port);
        length = sizeof(sockaddr_in);
        return true;
    }
    auto* v6 = reinterpret_cast<sockaddr_in6*>(&address);
    std::string host = parts.host;
    const std::size_t zone = host.find('%');
    if (zone != std::string::npos)
        host.resize(zone);  // link-local zone ids are not supported
    if (inet_pton(AF_INET6, host.c_str(), &v6->sin6_addr) == 1) {
        v6->sin6_family = AF_INET6;
        v6->sin6_port = htons(parts.port);
        length = sizeof(sockaddr_in6);
        return true;
    }
    return false;
}

bool SendAll(int fd, const std::string& data, SteadyClock::time_point deadline) {
    std::size_t sent = 0;
    while (sent < data.size()) {
        if (!WaitFor(fd, POLLOUT, deadline))
            return false;
        const ssize_t n = send(fd, data.data() + sent, data.size() - sent, MSG_NOSIGNAL);
        if (n < 0 && (errno == EINTR || errno == EAGAIN))
            continue;
        if (n <= 0)
            return false;
        sent += static_cast<std::size_t>(n);
    }
    return true;
}

// Decodes a chunked body; false when malformed.
bool Dechunk(const std::string& raw, std::string& out) {
    std::size_t pos = 0;
    for (;;) {
        const std::size_t lineEnd = raw.find("\r\n", pos);
        if (lineEnd == std::string::npos)
            return false;
        const std::string sizeText = raw.substr(pos, lineEnd - pos);
        char* end = nullptr;
        errno = 0;
        const unsigned long size = std::strtoul(sizeText.c_str(), &end, 16);
        if (end == sizeText.c_str() || errno != 0)
            return false;
        pos = lineEnd + 2;
        if (size == 0)
            return true;
        if (size > raw.size() - pos)
            return false;
        out.append(raw, pos, size);
        pos += size + 2;  // the chunk's CRLF
        if (pos > raw.size())
            return false;
    }
}

std::string HeaderValue(const std::string& headers, const char* name) {
    const std::size_t nameLength = std::strlen(name);
    std::size_t pos = headers.find("\r\n");
    while (pos != std::string::npos && pos + 2 < headers.size()) {
        const std::size_t start = pos + 2;
        const std::size_t end = headers.find("\r\n", start);
        const std::string line =
            headers.substr(start, end == std::string::npos ? end : end - start);
        if (line.size() > nameLength && line[nameLength] == ':' &&
            strncasecmp(line.c_str(), name, nameLength) == 0) {
            std::size_t valueStart = nameLength + 1;
            while (valueStart < line.size() &&
                   (line[valueStart] == ' ' || line[valueStart] == '\t'))
                ++valueStart;
            std::string value = line.substr(valueStart);
            while (!value.empty() && (value.back() == ' ' || value.back() == '\t'))
                value.pop_back();
            return value;
        }
        pos = end;
    }
    return "";
}

}  // namespace

bool SplitHttpUrl(const std::string& url, UrlParts& out) {
    static const char kScheme[] = "http://";
    if (url.size() <= sizeof(kScheme) - 1 || strncasecmp(url.c_str(), kScheme, 7) != 0)
        return false;
    const std::size_t authorityStart = 7;
    std::size_t authorityEnd = url.find_first_of("/?#", authorityStart);
    if (authorityEnd == std::string::npos)
        authorityEnd = url.size();
    const std::string authority = url.substr(authorityStart, authorityEnd - authorityStart);
    if (authority.empty() || authority.find('@') != std::string::npos)
        return false;
    std::string portText;
    if (authority[0] == '[') {
        const std::size_t close = authority.find(']');
        if (close == std::string::npos || close == 1)
            return false;
        out.host = authority.substr(1, close - 1);
        if (close + 1 < authority.size()) {
            if (authority[close + 1] != ':')
                return false;
            portText = authority.substr(close + 2);
        }
    } else {
        const std::size_t colon = authority.find(':');
        out.host = authority.substr(0, colon);
        if (colon != std::string::npos)
            portText = authority.substr(colon + 1);
    }
    if (out.host.empty())
        return false;
    out.port = 80;
    if (!portText.empty()) {
        if (portText.size() > 5 || portText.find_first_not_of("0123456789") != std::string::npos)
            return false;
        const long port = std::strtol(portText.c_str(), nullptr, 10);
        if (port <= 0 || port > 65535)
            return false;
        out.port = static_cast<unsigned short>(port);
    }
    out.pathAndQuery = authorityEnd < url.size() ? url.substr(authorityEnd) : "/";
    if (out.pathAndQuery[0] != '/')
        out.pathAndQuery = "/" + out.pathAndQuery;
    const std::size_t fragment = out.pathAndQuery.find('#');
    if (fragment != std::string::npos)
        out.pathAndQuery.resize(fragment);
    return true;
}

HttpResult HttpGet(const std::string& url, int timeoutMs, std::size_t maxBody) {
    HttpResult result;
    const auto deadline = SteadyClock::now() + std::chrono::milliseconds(timeoutMs);
    UrlParts parts;
    if (!SplitHttpUrl(url, parts)) {
        result.error = "not an http URL with a numeric host";
        return result;
    }
    sockaddr_storage address;
    socklen_t addressLength = 0;
    if (!ResolveNumeric(parts, address, addressLength)) {
        result.error = "host is not a numeric address";
        return result;
    }
    Socket socket_(socket(address.ss_family, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    if (socket_.fd() < 0) {
        result.error = std::string("socket: ") + std::strerror(errno);
        return result;
    }
    if (connect(socket_.fd(), reinterpret_cast<sockaddr*>(&address), addressLength) != 0 &&
        errno != EINPROGRESS) {
        result.error = std::string("connect: ") + std::strerror(errno);
        return result;
    }
    if (!WaitFor(socket_.fd(), POLLOUT, deadline)) {
        result.error = "connect timed out";
        return result;
    }
    int soError = 0;
    socklen_t soLength = sizeof(soError);
    getsockopt(socket_.fd(), SOL_SOCKET, SO_ERROR, &soError, &soLength);
    if (soError != 0) {
        result.error = std::string("connect: ") + std::strerror(soError);
        return result;
    }
    const bool v6 = address.ss_family == AF_INET6;
    const std::string hostHeader =
        (v6 ? "[" + parts.host + "]" : parts.host) + ":" + std::to_string(parts.port);
    const std::string request = "GET " + parts.pathAndQuery + " HTTP/1.0\r\nHost: " + hostHeader +
                                "\r\nConnection: close\r\nUser-Agent: vanuaudiod\r\n\r\n";
    if (!SendAll(socket_.fd(), request, deadline)) {
        result.error = "send failed or timed out";
        return result;
    }
    // Read until the server closes (HTTP/1.0, Connection: close), within the bounds.
    std::string raw;
    const std::size_t limit = kMaxHeaderBytes + maxBody;
    char chunk[8192];
    for (;;) {
        if (!WaitFor(socket_.fd(), POLLIN, deadline)) {
            result.error = "reply timed out";
            return result;
        }
        const ssize_t n = recv(socket_.fd(), chunk, sizeof(chunk), 0);
        if (n < 0 && (errno == EINTR || errno == EAGAIN))
            continue;
        if (n < 0) {
            result.error = std::string("recv: ") + std::strerror(errno);
            return result;
        }
        if (n == 0)
            break;
        raw.append(chunk, static_cast<std::size_t>(n));
        if (raw.size() > limit) {
            result.error = "reply too large";
            return result;
        }
    }
    const std::size_t headerEnd = raw.find("\r\n\r\n");
    if (headerEnd == std::string::npos || headerEnd > kMaxHeaderBytes) {
        result.error = "no complete header";
        return result;
    }
    const std::string headers = raw.substr(0, headerEnd);
    int major = 0;
    int minor = 0;
    if (std::sscanf(headers.c_str(), "HTTP/%d.%d %d", &major, &minor, &result.status) != 3) {
        result.error = "not an HTTP reply";
        return result;
    }
    if (result.status != 200) {
        result.error = "HTTP status " + std::to_string(result.status);
        return result;
    }
    std::string body = raw.substr(headerEnd + 4);
    if (strcasecmp(HeaderValue(headers, "Transfer-Encoding").c_str(), "chunked") == 0) {
        std::string decoded;
        if (!Dechunk(body, decoded)) {
            result.error = "bad chunked body";
            return result;
        }
        body = std::move(decoded);
    } else {
        const std::string length = HeaderValue(headers, "Content-Length");
        if (!length.empty() && length.find_first_not_of("0123456789") == std::string::npos &&
            std::strtoull(length.c_str(), nullptr, 10) > body.size()) {
            result.error = "body shorter than Content-Length";
            return result;
        }
    }
    if (body.size() > maxBody) {
        result.error = "body too large";
        return result;
    }
    result.body = std::move(body);
    result.ok = true;
    return result;
}

}  // namespace vanuaudiod
