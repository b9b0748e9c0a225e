#include "platform/cgi/CgiParams.h"

#include <poll.h>
#include <strings.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>

#include "common/util/HexDigit.h"

namespace harmona::cgi {

std::string DecodeComponent(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (std::size_t i = 0; i < text.size(); ++i) {
        char c = text[i];
        if (c == '+') {
            c = ' ';
        } else if (c == '%' && i + 2 < text.size()) {
            const int byte = util::HexByteValue(text[i + 1], text[i + 2]);
            if (byte >= 0) {
                c = static_cast<char>(byte);
                i += 2;
            }
        }
        if (c == '\0')
            break;  // a value ends at its first decoded NUL byte
        out.push_back(c);
    }
    return out;
}

void DecodeForm(std::string_view text, ParamList& out) {
    while (!text.empty()) {
        const std::size_t amp = text.find('&');
        const std::string_view piece = text.substr(0, amp);
        text = amp == std::string_view::npos ? std::string_view() : text.substr(amp + 1);
        if (piece.empty())
            continue;
        const std::size_t eq = piece.find('=');
        if (eq == std::string_view::npos)
            out.emplace_back(DecodeComponent(piece), std::string());
        else
            out.emplace_back(DecodeComponent(piece.substr(0, eq)),
                             DecodeComponent(piece.substr(eq + 1)));
    }
}

bool IsFormContentType(const char* contentType) {
    if (contentType == nullptr)
        return false;
    std::string_view type(contentType);
    type = type.substr(0, type.find(';'));
    while (!type.empty() && (type.front() == ' ' || type.front() == '\t'))
        type.remove_prefix(1);
    while (!type.empty() && (type.back() == ' ' || type.back() == '\t'))
        type.remove_suffix(1);
    constexpr std::string_view kForm = "application/x-www-form-urlencoded";
    return type.size() == kForm.size() && strncasecmp(type.data(), kForm.data(), kForm.size()) == 0;
}

long ParseContentLength(const char* text) {
    if (text == nullptr || *text == '\0')
        return -1;
    long value = 0;
    for (const char* p = text; *p != '\0'; ++p) {
        if (*p < '0' || *p > '9')
            return -1;
        value = value * 10 + (*p - '0');
        if (value > static_cast<long>(kMaxBodyBytes))
            return -1;
    }
    return value;
}

std::string ReadBody(int fd, std::size_t length, int timeoutMs) {
    using Clock = std::chrono::steady_clock;
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeoutMs);
    std::string body(length, '\0');
    std::size_t got = 0;
    while (got < length) {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
        if (left.count() <= 0)
            break;
        struct pollfd pfd = {fd, POLLIN, 0};
        const int ready = poll(&pfd, 1, static_cast<int>(left.count()));
        if (ready < 0 && errno == EINTR)
            continue;
        if (ready <= 0)
            break;
        const ssize_t n = read(fd, body.data() + got, length - got);
        if (n < 0 && (errno == EINTR || errno == EAGAIN))
            continue;
        if (n <= 0)
            break;
        got += static_cast<std::size_t>(n);
    }
    body.resize(got);
    return body;
}

}  // namespace harmona::cgi
