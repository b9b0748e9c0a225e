// A scripted audio daemon in place of vanuaudiod (platform/README.md, "Audio daemon"), for tests
// inside the sandbox. It listens on /tmp/vanuaudiod.sock in a thread of the test process, so
// both in-process daemon clients and the real CGI (a child process in the same namespaces) reach
// it. It records every request record as received (all 8196 bytes) and answers each from a script:
// a reply text, after a delay, in pieces, oversized, not JSON, never, or by closing without answer.
//
//   ScriptedDaemon daemon([](const DaemonRequest& r) {
//       return r.command == 14 ? DaemonAnswer::Reply("{\"success\": true}")
//                              : DaemonAnswer::Never();
//   });
//   ... run the program ...
//   EXPECT_EQ(daemon.Requests().size(), 2u);
//
// ServeMediaServers(servers) is the script of a daemon that holds a list of media servers and pages
// it like the real one (command 14, command 16 "offset count"); MakeMediaServers(n) makes n of
// them. Create the daemon inside a test (after the sandbox's reset) and let it go out of scope
// before the test ends; its destructor stops the thread and removes the socket file.
#pragma once

#include <json/json.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace harmona::test {

inline constexpr const char* kDaemonSocketPath = "/tmp/vanuaudiod.sock";
inline constexpr std::size_t kDaemonRequestSize = 8196;

// One request as the daemon received it.
struct DaemonRequest {
    std::array<unsigned char, kDaemonRequestSize> raw{};  // the bytes received, zero beyond `size`
    std::size_t size = 0;       // bytes received before the client stopped sending (8196 expected)
    std::int32_t command = -1;  // bytes 0-3 in native byte order (valid when size >= 4)
    std::string arguments;      // bytes 4-8195 up to the first NUL
    bool argumentsTerminated = false;  // a NUL occurs within bytes 4-8195
    std::chrono::steady_clock::time_point receivedAt;

    // The argument area (bytes 4-8195) as received, all 8192 bytes.
    std::string ArgumentArea() const;
};

// How the daemon answers one request.
struct DaemonAnswer {
    enum class Kind {
        reply,  // send `reply` (after `delayMs`), then close
        never,  // keep the connection open without answering until the client closes it
        close,  // close the connection without answering (after `delayMs`)
    };
    Kind kind = Kind::reply;
    std::string reply;  // the bytes to send (may hold NULs, may be large)
    int delayMs = 0;    // wait this long after the request before answering or closing
    // When not empty: send the reply in pieces of these sizes (the rest, if any, as a last piece),
    // waiting `pieceGapMs` between pieces.
    std::vector<std::size_t> pieces;
    int pieceGapMs = 0;

    static DaemonAnswer Reply(std::string text, int delayMs = 0);
    static DaemonAnswer Never();
    static DaemonAnswer Close(int delayMs = 0);
    static DaemonAnswer InPieces(std::string text, std::vector<std::size_t> pieces, int gapMs);
};

using DaemonScript = std::function<DaemonAnswer(const DaemonRequest&)>;

struct DaemonOptions {
    // False: listen but never accept, so connections stay in the listen queue unanswered.
    bool accept = true;
    int backlog = 16;
};

class ScriptedDaemon {
  public:
    explicit ScriptedDaemon(DaemonScript script, DaemonOptions options = {});
    ~ScriptedDaemon();
    ScriptedDaemon(const ScriptedDaemon&) = delete;
    ScriptedDaemon& operator=(const ScriptedDaemon&) = delete;

    // Every request received so far, in order.
    std::vector<DaemonRequest> Requests() const;
    // The commands of Requests(), in order.
    std::vector<std::int32_t> Commands() const;
    // Connections accepted so far (a client that sent nothing still counts here).
    int Connections() const;

  private:
    void Run();
    void Serve(int fd);
    bool Sleep(int ms);  // false when stopping
    bool SendAll(int fd, const char* data, std::size_t size);

    DaemonScript script_;
    DaemonOptions options_;
    int listenFd_ = -1;
    int stopFd_ = -1;  // eventfd, readable when the daemon stops
    mutable std::mutex mutex_;
    std::vector<DaemonRequest> requests_;
    int connections_ = 0;
    std::thread thread_;
};

// A media server as the daemon lists it; a null member is left out of its JSON element.
struct MediaServer {
    Json::Value controlUrl;  // usually a string; any JSON value for faulty daemons
    Json::Value friendlyName;
    Json::Value ip;
};

// n servers: control_url "http://10.0.0.<i>:8200/ctl/<i>", friendly_name "Server <i>", ip
// "10.0.0.<i>", for i from 1 to n.
std::vector<MediaServer> MakeMediaServers(int n);

// The JSON element of one server ({"control_url", "friendly_name", "ip"}, null members left out).
Json::Value MediaServerElement(const MediaServer& server);

// The reply to command 16 "offset count": {"success": true, "list": [...], "total": N}.
std::string MediaServerPage(const std::vector<MediaServer>& servers, int offset, int count);

// The script of a daemon holding `servers`, answering as the real one does:
// 14 -> {"success": true}; 16 "offset count" -> MediaServerPage; any other code ->
// {"success": false, "error": "unsupported"}.
DaemonScript ServeMediaServers(std::vector<MediaServer> servers);

}  // namespace harmona::test
