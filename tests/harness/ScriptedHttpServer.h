// A scripted HTTP server for tests, on 127.0.0.1:<port> in a thread of the test process: it records
// every request and answers each one from a script. Made for the ContentDirectory of the local
// media server (127.0.0.1:50003, /ContentDirectory/control; platform/README.md, "Local media
// server and browse library"), with helpers that write SOAP replies and DIDL-Lite, and a
// ContentTree that serves a whole container tree with paging.
//
// Use:
//   ScriptedHttpServer server;                 // port 50003
//   ContentTree tree;                          // or server.Enqueue(reply) / SetResponder(...)
//   tree.AddContainer("0", "music_album", "Albums");
//   tree.AddItem("music_album", "a1", "Song");
//   server.ServeTree(tree, /*pageCap=*/50);
//   ASSERT_TRUE(server.Start());
//   ... run the CGI ...
//   server.Requests()[0].objectId == "music_album"
//
// Each connection gets one reply and is then closed ("Connection: close"). Replies can be delayed,
// dribbled in small pieces, never ended, or padded to any size without holding it in memory.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace harmona::test {

// One request as the server received it.
struct RecordedRequest {
    std::string method;
    std::string target;  // the request target, e.g. "/ContentDirectory/control"
    std::vector<std::pair<std::string, std::string>> headers;
    std::string body;
    // The Browse arguments, when the body is a SOAP Browse (found by local name, unescaped).
    bool isBrowse = false;
    std::string objectId;
    std::string browseFlag;
    std::string filter;
    std::string sortCriteria;
    long startingIndex = -1;
    long requestedCount = -1;
    // What happened to the reply.
    std::size_t bytesSent = 0;       // reply bytes written (headers included)
    bool clientClosedEarly = false;  // the client went away before the reply was complete

    // The first header of that name (case-insensitive), "" when absent.
    std::string Header(const std::string& name) const;
};

// One scripted reply.
struct ScriptedReply {
    int status = 200;
    std::string reason = "OK";
    std::string contentType = "text/xml; charset=\"utf-8\"";
    std::string body;
    // Bytes of padding sent after `body` (generated on the fly, never held in memory).
    std::size_t paddingBytes = 0;
    char paddingByte = ' ';
    bool sendContentLength = true;
    int delayMs = 0;                 // wait this long before the status line
    std::size_t dribbleBytes = 0;    // > 0: send the body in pieces this large...
    int dribbleIntervalMs = 0;       // ...with this pause between pieces
    bool neverEnd = false;           // after the body, keep sending paddingByte (dribbled) forever
    bool closeWithoutReply = false;  // close the connection without writing anything
};

using Responder = std::function<ScriptedReply(const RecordedRequest&)>;

// SOAP and DIDL-Lite writers.
struct DidlObject {
    bool container = true;
    std::string id;
    std::string parentId;
    std::string title;
    std::string
        upnpClass;  // empty: object.container.storageFolder or object.item.audioItem.musicTrack
    long childCount = -1;  // -1: no childCount attribute
    std::string artist;
    std::string album;
    std::string res;
};
// A container, and an item with its `res` ("" for none), below `parentId`.
DidlObject DidlContainer(const std::string& parentId, const std::string& id,
                         const std::string& title);
DidlObject DidlItem(const std::string& parentId, const std::string& id, const std::string& title,
                    const std::string& res);
std::string DidlLite(const std::vector<DidlObject>& objects);
// A BrowseResponse envelope around `didl` (escaped into Result). With `withResult` false the
// Result element is left out.
std::string BrowseResponseBody(const std::string& didl, unsigned long numberReturned,
                               unsigned long totalMatches, bool withResult = true);
std::string SoapFaultBody(int upnpErrorCode, const std::string& description);
// A 200 reply carrying that body.
ScriptedReply Reply(const std::string& body, int status = 200);

// A container tree served by BrowseDirectChildren (StartingIndex/RequestedCount honoured, pages
// capped at `pageCap` objects when it is > 0, like MiniDLNA's reply size limit). Unknown object ids
// get UPnP error 701 (a SOAP fault with HTTP 500).
class ContentTree {
  public:
    void AddContainer(const std::string& parentId, const std::string& id, const std::string& title);
    void AddItem(const std::string& parentId, const std::string& id, const std::string& title);
    // Adds any object; its parentId decides where.
    void Add(const DidlObject& object);
    // `count` items "<prefix><n>" titled "Track <n>" below `parentId` (and the container when new).
    void AddManyItems(const std::string& parentId, std::size_t count, const std::string& prefix);
    const std::vector<DidlObject>& Children(const std::string& id) const;
    bool Has(const std::string& id) const { return children_.count(id) != 0; }

    ScriptedReply Answer(const RecordedRequest& request, unsigned long pageCap = 0) const;

  private:
    std::map<std::string, std::vector<DidlObject>> children_;
};

class ScriptedHttpServer {
  public:
    // Listens on `address` (an IPv4 address of this namespace), port `port`.
    explicit ScriptedHttpServer(std::uint16_t port = 50003, std::string address = "127.0.0.1");
    ~ScriptedHttpServer();
    ScriptedHttpServer(const ScriptedHttpServer&) = delete;
    ScriptedHttpServer& operator=(const ScriptedHttpServer&) = delete;

    // Listens and starts the thread; false when the port cannot be bound.
    bool Start();
    // Ends the thread; a reply being sent is cut off. Called by the destructor.
    void Stop();

    // Queued replies answer the next requests in order; when the queue is empty the responder
    // answers (default: 404).
    void Enqueue(ScriptedReply reply);
    void SetResponder(Responder responder);
    // Answers from `tree` (a copy is kept).
    void ServeTree(const ContentTree& tree, unsigned long pageCap = 0);

    std::vector<RecordedRequest> Requests() const;
    std::uint16_t Port() const { return port_; }

  private:
    void Run();
    void Serve(int connection);
    bool SendAll(int connection, const char* data, std::size_t size, RecordedRequest& record);
    bool Pause(int ms);  // false when stopping
    ScriptedReply NextReply(const RecordedRequest& request);

    std::uint16_t port_;
    std::string address_;
    int listener_ = -1;
    int stopPipe_[2] = {-1, -1};
    std::thread thread_;
    mutable std::mutex mutex_;
    std::deque<ScriptedReply> queue_;
    Responder responder_;
    std::vector<RecordedRequest> requests_;
};

}  // namespace harmona::test
