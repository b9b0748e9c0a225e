#include "tests/harness/CgiRunner.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <memory>
#include <sstream>

#ifndef HARMONA_CGI_PATH
#error "HARMONA_CGI_PATH must name the built audiotree.cgi"
#endif
#ifndef HARMONA_LIBRARY_CGI_PATH
#error "HARMONA_LIBRARY_CGI_PATH must name the built library.cgi"
#endif

namespace harmona::test {
namespace {

using Clock = std::chrono::steady_clock;

void SetNonBlocking(int fd) {
    fcntl(fd, F_SETFL, fcntl(fd, F_GETFL) | O_NONBLOCK);
}

std::vector<std::string> BuildEnvironment(const CgiRequest& r) {
    std::vector<std::string> env = {
        "GATEWAY_INTERFACE=CGI/1.1",
        "SERVER_PROTOCOL=HTTP/1.1",
        "SERVER_SOFTWARE=harmona-test",
        "SERVER_NAME=localhost",
        "SERVER_PORT=80",
        "REMOTE_ADDR=127.0.0.1",
        "SCRIPT_NAME=/webapi/audiotree.cgi",
        "PATH=/usr/bin:/bin",
        "REQUEST_METHOD=" + r.method,
        "QUERY_STRING=" + r.queryString,
    };
    if (r.hasRemoteUser)
        env.push_back("REMOTE_USER=" + r.remoteUser);
    if (!r.contentType.empty())
        env.push_back("CONTENT_TYPE=" + r.contentType);
    if (r.hasContentLength)
        env.push_back("CONTENT_LENGTH=" + r.contentLength);
    else if (!r.body.empty())
        env.push_back("CONTENT_LENGTH=" + std::to_string(r.body.size()));
    if (!r.acceptLanguage.empty())
        env.push_back("HTTP_ACCEPT_LANGUAGE=" + r.acceptLanguage);
    // Sanitizer settings reach the child so that a report fails the run the same way.
    for (const char* name : {"ASAN_OPTIONS", "UBSAN_OPTIONS", "LSAN_OPTIONS"}) {
        if (const char* value = getenv(name))
            env.push_back(std::string(name) + "=" + value);
    }
    for (const auto& [name, value] : r.extraEnv)
        env.push_back(name + "=" + value);
    return env;
}

void SplitReply(CgiResult& result, bool parseJson) {
    const std::string& out = result.output;
    std::size_t end = out.find("\r\n\r\n");
    std::size_t skip = 4;
    const std::size_t lf = out.find("\n\n");
    if (lf != std::string::npos && (end == std::string::npos || lf < end)) {
        end = lf;
        skip = 2;
    }
    if (end == std::string::npos) {
        result.body = out;
        return;
    }
    result.headerEnded = true;
    std::istringstream lines(out.substr(0, end));
    std::string line;
    while (std::getline(lines, line)) {
        if (!line.empty() && line.back() == '\r')
            line.pop_back();
        const std::size_t colon = line.find(':');
        if (colon == std::string::npos)
            continue;
        std::string value = line.substr(colon + 1);
        while (!value.empty() && value.front() == ' ')
            value.erase(0, 1);
        result.headers.emplace_back(line.substr(0, colon), value);
    }
    result.body = out.substr(end + skip);
    if (parseJson)
        result.jsonOk = ParseJson(result.body, result.json);
}

}  // namespace

std::string CgiResult::Header(const std::string& name) const {
    for (const auto& [key, value] : headers) {
        if (strcasecmp(key.c_str(), name.c_str()) == 0)
            return value;
    }
    return "";
}

std::vector<std::string> CgiResult::LogMessages() const {
    std::vector<std::string> messages;
    for (const LogLine& line : log)
        messages.push_back(line.message);
    return messages;
}

std::string CgiProgram() {
    return HARMONA_CGI_PATH;
}

std::string LibraryCgiProgram() {
    return HARMONA_LIBRARY_CGI_PATH;
}

bool ParseJson(const std::string& text, Json::Value& out) {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    std::string errors;
    out = Json::Value();
    return reader->parse(text.data(), text.data() + text.size(), &out, &errors);
}

CgiResult RunCgi(const CgiRequest& request) {
    CgiResult result;
    TakeLogLines();  // only this run's lines count
    signal(SIGPIPE, SIG_IGN);
    const std::string program = request.program.empty() ? CgiProgram() : request.program;
    const std::vector<std::string> env = BuildEnvironment(request);

    int in[2], out[2], err[2];
    if (pipe2(in, O_CLOEXEC) != 0 || pipe2(out, O_CLOEXEC) != 0 || pipe2(err, O_CLOEXEC) != 0) {
        result.errors = std::string("pipe: ") + std::strerror(errno);
        return result;
    }
    const auto start = Clock::now();
    const pid_t pid = fork();
    if (pid == 0) {
        // The test process ignores SIGPIPE (a CGI may exit before reading its body); a web server
        // starts the program with default dispositions.
        signal(SIGPIPE, SIG_DFL);
        dup2(in[0], 0);
        dup2(out[1], 1);
        dup2(err[1], 2);
        std::vector<char*> envp;
        for (const std::string& e : env)
            envp.push_back(const_cast<char*>(e.c_str()));
        envp.push_back(nullptr);
        char* argv[] = {const_cast<char*>(program.c_str()), nullptr};
        execve(program.c_str(), argv, envp.data());
        _exit(127);
    }
    close(in[0]);
    close(out[1]);
    close(err[1]);
    SetNonBlocking(in[1]);
    SetNonBlocking(out[0]);
    SetNonBlocking(err[0]);

    std::size_t written = 0;
    int heldStdin = -1;
    int inFd = in[1];
    if (request.body.empty()) {
        close(inFd);
        inFd = -1;
    }
    bool outOpen = true, errOpen = true;
    const auto deadline = start + std::chrono::milliseconds(request.timeoutMs);
    char buffer[65536];
    while (outOpen || errOpen) {
        const auto now = Clock::now();
        if (now >= deadline) {
            result.timedOut = true;
            break;
        }
        const int waitMs =
            static_cast<int>(
                std::chrono::duration_cast<std::chrono::milliseconds>(deadline - now).count()) +
            1;
        struct pollfd fds[4];
        int n = 0;
        const int outIdx = n;
        fds[n++] = {outOpen ? out[0] : -1, POLLIN, 0};
        const int errIdx = n;
        fds[n++] = {errOpen ? err[0] : -1, POLLIN, 0};
        const int logIdx = n;
        fds[n++] = {SyslogSocket(), POLLIN, 0};
        const int inIdx = n;
        fds[n++] = {inFd, POLLOUT, 0};
        if (poll(fds, n, waitMs) < 0 && errno != EINTR)
            break;
        if (fds[logIdx].revents & POLLIN)
            DrainSyslog();
        if (inFd >= 0 && (fds[inIdx].revents & (POLLOUT | POLLERR | POLLHUP))) {
            const ssize_t w =
                write(inFd, request.body.data() + written, request.body.size() - written);
            if (w > 0)
                written += static_cast<std::size_t>(w);
            if (w < 0 && errno != EAGAIN)
                written = request.body.size();  // reader gone
            if (written >= request.body.size()) {
                if (!request.keepStdinOpen)
                    close(inFd);
                else
                    heldStdin = inFd;
                inFd = -1;
            }
        }
        for (auto [idx, fd, open, sink] : {std::tuple{outIdx, out[0], &outOpen, &result.output},
                                           std::tuple{errIdx, err[0], &errOpen, &result.errors}}) {
            if (!*open || !(fds[idx].revents & (POLLIN | POLLHUP | POLLERR)))
                continue;
            const ssize_t r = read(fd, buffer, sizeof(buffer));
            if (r > 0)
                sink->append(buffer, static_cast<std::size_t>(r));
            else if (r == 0 || errno != EAGAIN)
                *open = false;
        }
    }
    if (inFd >= 0)
        close(inFd);
    if (heldStdin >= 0)
        close(heldStdin);
    int status = 0;
    struct rusage usage {};
    if (result.timedOut) {
        kill(pid, SIGKILL);
        wait4(pid, &status, 0, &usage);
    } else {
        // Both pipes closed; the process is ending. Wait for it within what is left of the limit.
        for (;;) {
            const pid_t w = wait4(pid, &status, WNOHANG, &usage);
            if (w == pid)
                break;
            if (Clock::now() >= deadline) {
                result.timedOut = true;
                kill(pid, SIGKILL);
                wait4(pid, &status, 0, &usage);
                break;
            }
            usleep(1000);
        }
    }
    close(out[0]);
    close(err[0]);
    result.peakRssKb = usage.ru_maxrss;
    result.wallMs = std::chrono::duration<double, std::milli>(Clock::now() - start).count();
    if (!result.timedOut && WIFEXITED(status)) {
        result.exited = true;
        result.exitStatus = WEXITSTATUS(status);
    } else if (WIFSIGNALED(status)) {
        result.signal = WTERMSIG(status);
    }
    result.log = TakeLogLines();
    SplitReply(result, request.parseJson);
    // A sanitizer report from the program fails the test that ran it, whatever it asserts.
    if (result.errors.find("Sanitizer") != std::string::npos ||
        result.errors.find("runtime error:") != std::string::npos)
        ADD_FAILURE() << "the CGI printed a sanitizer report:\n" << result.errors;
    return result;
}

CgiResult Get(const std::string& queryString, const std::string& user) {
    CgiRequest request;
    request.queryString = queryString;
    request.remoteUser = user;
    return RunCgi(request);
}

namespace {

CgiRequest PostRequest(const std::string& body, const std::string& contentType) {
    CgiRequest request;
    request.method = "POST";
    request.contentType = contentType;
    request.body = body;
    return request;
}

}  // namespace

CgiResult Post(const std::string& body, const std::string& queryString, const std::string& user) {
    CgiRequest request = PostRequest(body, "application/x-www-form-urlencoded; charset=UTF-8");
    request.queryString = queryString;
    request.remoteUser = user;
    return RunCgi(request);
}

void ExpectNoReply(const CgiResult& r) {
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 0);
    EXPECT_EQ(r.output, "");
}

CgiRequest FormPostWithLength(const std::string& body, const std::string& contentLength) {
    CgiRequest request = PostRequest(body, "application/x-www-form-urlencoded");
    request.hasContentLength = true;
    request.contentLength = contentLength;
    return request;
}

std::string UrlEncode(const std::string& text) {
    static const char* hex = "0123456789ABCDEF";
    std::string out;
    for (unsigned char c : text) {
        if (std::isalnum(c) || c == '-' || c == '_' || c == '.' || c == '~') {
            out.push_back(static_cast<char>(c));
        } else {
            out.push_back('%');
            out.push_back(hex[c >> 4]);
            out.push_back(hex[c & 15]);
        }
    }
    return out;
}

std::string Query(const std::vector<std::pair<std::string, std::string>>& params) {
    std::string query;
    for (const auto& [name, value] : params) {
        if (!query.empty())
            query.push_back('&');
        query += UrlEncode(name) + "=" + UrlEncode(value);
    }
    return query;
}

}  // namespace harmona::test
