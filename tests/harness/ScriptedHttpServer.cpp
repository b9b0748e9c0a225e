#include "tests/harness/ScriptedHttpServer.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <strings.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <pugixml.hpp>
#include <utility>

#include "common/util/XmlEscape.h"

namespace harmona::test {

namespace {

constexpr std::size_t kMaxRequestBytes = 16 * 1024 * 1024;

const char* LocalName(const char* name) {
    const char* colon = std::strrchr(name, ':');
    return colon != nullptr ? colon + 1 : name;
}

pugi::xml_node FindByLocalName(pugi::xml_node root, const char* local) {
    return root.find_node([local](pugi::xml_node n) {
        return n.type() == pugi::node_element && std::strcmp(LocalName(n.name()), local) == 0;
    });
}

void ParseBrowse(RecordedRequest& r) {
    pugi::xml_document doc;
    if (!doc.load_buffer(r.body.data(), r.body.size()))
        return;
    const pugi::xml_node browse = FindByLocalName(doc, "Browse");
    if (!browse)
        return;
    r.isBrowse = true;
    auto text = [&](const char* name) {
        return std::string(FindByLocalName(browse, name).text().get());
    };
    r.objectId = text("ObjectID");
    r.browseFlag = text("BrowseFlag");
    r.filter = text("Filter");
    r.sortCriteria = text("SortCriteria");
    const pugi::xml_node start = FindByLocalName(browse, "StartingIndex");
    const pugi::xml_node count = FindByLocalName(browse, "RequestedCount");
    if (start)
        r.startingIndex = start.text().as_llong(-1);
    if (count)
        r.requestedCount = count.text().as_llong(-1);
}

std::string Trim(const std::string& s) {
    const std::size_t a = s.find_first_not_of(" \t");
    if (a == std::string::npos)
        return "";
    return s.substr(a, s.find_last_not_of(" \t\r") - a + 1);
}

}  // namespace

std::string RecordedRequest::Header(const std::string& name) const {
    for (const auto& [key, value] : headers)
        if (strcasecmp(key.c_str(), name.c_str()) == 0)
            return value;
    return "";
}

std::string DidlLite(const std::vector<DidlObject>& objects) {
    std::string out =
        "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
        "xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
        "xmlns:upnp=\"urn:schemas-upnp-org:metadata-1-0/upnp/\">";
    for (const DidlObject& o : objects) {
        const char* element = o.container ? "container" : "item";
        out += "<";
        out += element;
        out += " id=\"" + util::EscapeMarkup(o.id) + "\" parentID=\"" +
               util::EscapeMarkup(o.parentId) + "\" restricted=\"1\"";
        if (o.childCount >= 0)
            out += " childCount=\"" + std::to_string(o.childCount) + "\"";
        out += "><dc:title>" + util::EscapeMarkup(o.title) + "</dc:title><upnp:class>";
        out += util::EscapeMarkup(!o.upnpClass.empty() ? o.upnpClass
                                  : o.container        ? "object.container.storageFolder"
                                                       : "object.item.audioItem.musicTrack");
        out += "</upnp:class>";
        if (!o.artist.empty())
            out += "<upnp:artist>" + util::EscapeMarkup(o.artist) + "</upnp:artist>";
        if (!o.album.empty())
            out += "<upnp:album>" + util::EscapeMarkup(o.album) + "</upnp:album>";
        if (!o.res.empty())
            out += "<res protocolInfo=\"http-get:*:audio/mpeg:*\">" + util::EscapeMarkup(o.res) +
                   "</res>";
        out += "</";
        out += element;
        out += ">";
    }
    out += "</DIDL-Lite>";
    return out;
}

std::string BrowseResponseBody(const std::string& didl, unsigned long numberReturned,
                               unsigned long totalMatches, bool withResult) {
    std::string out =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?>\r\n"
        "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
        "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body>"
        "<u:BrowseResponse xmlns:u=\"urn:schemas-upnp-org:service:ContentDirectory:1\">";
    if (withResult)
        out += "<Result>" + util::EscapeMarkup(didl) + "</Result>";
    out += "<NumberReturned>" + std::to_string(numberReturned) + "</NumberReturned>";
    out += "<TotalMatches>" + std::to_string(totalMatches) + "</TotalMatches>";
    out += "<UpdateID>1</UpdateID></u:BrowseResponse></s:Body></s:Envelope>\r\n";
    return out;
}

std::string SoapFaultBody(int upnpErrorCode, const std::string& description) {
    return "<?xml version=\"1.0\" encoding=\"utf-8\"?>\r\n"
           "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
           "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body><s:Fault>"
           "<faultcode>s:Client</faultcode><faultstring>UPnPError</faultstring><detail>"
           "<UPnPError xmlns=\"urn:schemas-upnp-org:control-1-0\"><errorCode>" +
           std::to_string(upnpErrorCode) + "</errorCode><errorDescription>" +
           util::EscapeMarkup(description) +
           "</errorDescription></UPnPError></detail></s:Fault></s:Body></s:Envelope>\r\n";
}

ScriptedReply Reply(const std::string& body, int status) {
    ScriptedReply reply;
    reply.status = status;
    reply.reason = status == 200 ? "OK" : "Scripted";
    reply.body = body;
    return reply;
}

DidlObject DidlContainer(const std::string& parentId, const std::string& id,
                         const std::string& title) {
    DidlObject container;
    container.container = true;
    container.id = id;
    container.parentId = parentId;
    container.title = title;
    return container;
}

DidlObject DidlItem(const std::string& parentId, const std::string& id, const std::string& title,
                    const std::string& res) {
    DidlObject item = DidlContainer(parentId, id, title);
    item.container = false;
    item.res = res;
    return item;
}

void ContentTree::AddContainer(const std::string& parentId, const std::string& id,
                               const std::string& title) {
    Add(DidlContainer(parentId, id, title));
    children_[id];  // exists, possibly empty
}

void ContentTree::AddItem(const std::string& parentId, const std::string& id,
                          const std::string& title) {
    Add(DidlItem(parentId, id, title, "http://127.0.0.1:50003/media/" + id + ".mp3"));
}

void ContentTree::Add(const DidlObject& object) {
    children_[object.parentId].push_back(object);
}

void ContentTree::AddManyItems(const std::string& parentId, std::size_t count,
                               const std::string& prefix) {
    std::vector<DidlObject>& list = children_[parentId];
    list.reserve(list.size() + count);
    for (std::size_t n = 0; n < count; ++n) {
        list.push_back(
            DidlItem(parentId, prefix + std::to_string(n), "Track " + std::to_string(n), ""));
    }
}

const std::vector<DidlObject>& ContentTree::Children(const std::string& id) const {
    static const std::vector<DidlObject> none;
    const auto it = children_.find(id);
    return it == children_.end() ? none : it->second;
}

ScriptedReply ContentTree::Answer(const RecordedRequest& request, unsigned long pageCap) const {
    if (!request.isBrowse || request.browseFlag != "BrowseDirectChildren")
        return Reply(SoapFaultBody(402, "Invalid Args"), 500);
    const auto it = children_.find(request.objectId);
    if (it == children_.end())
        return Reply(SoapFaultBody(701, "No such object"), 500);
    const std::vector<DidlObject>& all = it->second;
    const std::size_t start =
        std::min<std::size_t>(request.startingIndex < 0 ? 0 : request.startingIndex, all.size());
    std::size_t count = all.size() - start;
    if (request.requestedCount > 0)
        count = std::min<std::size_t>(count, static_cast<std::size_t>(request.requestedCount));
    if (pageCap > 0)
        count = std::min<std::size_t>(count, pageCap);
    const std::vector<DidlObject> page(all.begin() + start, all.begin() + start + count);
    return Reply(BrowseResponseBody(DidlLite(page), count, all.size()));
}

ScriptedHttpServer::ScriptedHttpServer(std::uint16_t port, std::string address)
    : port_(port), address_(std::move(address)) {}

ScriptedHttpServer::~ScriptedHttpServer() {
    Stop();
}

bool ScriptedHttpServer::Start() {
    listener_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (listener_ < 0)
        return false;
    const int one = 1;
    setsockopt(listener_, SOL_SOCKET, SO_REUSEADDR, &one, sizeof(one));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port_);
    if (inet_pton(AF_INET, address_.c_str(), &address.sin_addr) != 1 ||
        bind(listener_, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0 ||
        listen(listener_, 64) != 0 || pipe2(stopPipe_, O_CLOEXEC) != 0) {
        close(listener_);
        listener_ = -1;
        return false;
    }
    thread_ = std::thread([this] { Run(); });
    return true;
}

void ScriptedHttpServer::Stop() {
    if (thread_.joinable()) {
        (void)!write(stopPipe_[1], "x", 1);
        thread_.join();
    }
    for (int* fd : {&listener_, &stopPipe_[0], &stopPipe_[1]}) {
        if (*fd >= 0)
            close(*fd);
        *fd = -1;
    }
}

void ScriptedHttpServer::Enqueue(ScriptedReply reply) {
    std::lock_guard<std::mutex> lock(mutex_);
    queue_.push_back(std::move(reply));
}

void ScriptedHttpServer::SetResponder(Responder responder) {
    std::lock_guard<std::mutex> lock(mutex_);
    responder_ = std::move(responder);
}

void ScriptedHttpServer::ServeTree(const ContentTree& tree, unsigned long pageCap) {
    SetResponder([tree, pageCap](const RecordedRequest& r) { return tree.Answer(r, pageCap); });
}

std::vector<RecordedRequest> ScriptedHttpServer::Requests() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return requests_;
}

ScriptedReply ScriptedHttpServer::NextReply(const RecordedRequest& request) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!queue_.empty()) {
        ScriptedReply reply = std::move(queue_.front());
        queue_.pop_front();
        return reply;
    }
    if (responder_)
        return responder_(request);
    ScriptedReply notFound = Reply("not found", 404);
    notFound.contentType = "text/plain";
    return notFound;
}

bool ScriptedHttpServer::Pause(int ms) {
    pollfd fd{stopPipe_[0], POLLIN, 0};
    return poll(&fd, 1, ms) == 0;
}

void ScriptedHttpServer::Run() {
    for (;;) {
        pollfd fds[2] = {{listener_, POLLIN, 0}, {stopPipe_[0], POLLIN, 0}};
        if (poll(fds, 2, -1) < 0 && errno != EINTR)
            return;
        if (fds[1].revents != 0)
            return;
        if (fds[0].revents & POLLIN) {
            const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
            if (connection >= 0) {
                Serve(connection);
                close(connection);
            }
        }
    }
}

bool ScriptedHttpServer::SendAll(int connection, const char* data, std::size_t size,
                                 RecordedRequest& record) {
    while (size > 0) {
        pollfd fds[2] = {{connection, POLLOUT, 0}, {stopPipe_[0], POLLIN, 0}};
        if (poll(fds, 2, 30000) <= 0 || fds[1].revents != 0)
            return false;
        const ssize_t n = send(connection, data, size, MSG_NOSIGNAL);
        if (n <= 0) {
            record.clientClosedEarly = true;
            return false;
        }
        record.bytesSent += static_cast<std::size_t>(n);
        data += n;
        size -= static_cast<std::size_t>(n);
    }
    return true;
}

void ScriptedHttpServer::Serve(int connection) {
    // Read the head, then exactly Content-Length bytes of body.
    std::string data;
    std::size_t headEnd = std::string::npos;
    std::size_t contentLength = 0;
    char buffer[65536];
    for (;;) {
        if (headEnd != std::string::npos && data.size() >= headEnd + 4 + contentLength)
            break;
        pollfd fds[2] = {{connection, POLLIN, 0}, {stopPipe_[0], POLLIN, 0}};
        if (poll(fds, 2, 10000) <= 0 || fds[1].revents != 0)
            return;
        const ssize_t n = recv(connection, buffer, sizeof(buffer), 0);
        if (n <= 0 || data.size() + static_cast<std::size_t>(n) > kMaxRequestBytes)
            return;
        data.append(buffer, static_cast<std::size_t>(n));
        if (headEnd == std::string::npos &&
            (headEnd = data.find("\r\n\r\n")) != std::string::npos) {
            const std::string head = data.substr(0, headEnd);
            std::size_t lineStart = head.find("\r\n");
            while (lineStart != std::string::npos) {
                const std::size_t lineEnd = head.find("\r\n", lineStart + 2);
                const std::string line = head.substr(lineStart + 2, lineEnd == std::string::npos
                                                                        ? std::string::npos
                                                                        : lineEnd - lineStart - 2);
                const std::size_t colon = line.find(':');
                if (colon != std::string::npos &&
                    strcasecmp(Trim(line.substr(0, colon)).c_str(), "Content-Length") == 0)
                    contentLength = std::strtoul(line.c_str() + colon + 1, nullptr, 10);
                lineStart = lineEnd;
            }
        }
    }
    RecordedRequest record;
    const std::string head = data.substr(0, headEnd);
    const std::size_t firstLineEnd = head.find("\r\n");
    const std::string requestLine = head.substr(0, firstLineEnd);
    const std::size_t sp1 = requestLine.find(' ');
    const std::size_t sp2 = requestLine.find(' ', sp1 + 1);
    record.method = requestLine.substr(0, sp1);
    record.target = requestLine.substr(sp1 + 1, sp2 - sp1 - 1);
    std::size_t lineStart = firstLineEnd;
    while (lineStart != std::string::npos) {
        const std::size_t lineEnd = head.find("\r\n", lineStart + 2);
        const std::string line =
            head.substr(lineStart + 2,
                        lineEnd == std::string::npos ? std::string::npos : lineEnd - lineStart - 2);
        const std::size_t colon = line.find(':');
        if (colon != std::string::npos)
            record.headers.emplace_back(Trim(line.substr(0, colon)), Trim(line.substr(colon + 1)));
        lineStart = lineEnd;
    }
    record.body = data.substr(headEnd + 4, contentLength);
    ParseBrowse(record);

    const ScriptedReply reply = NextReply(record);
    const std::size_t recordIndex = [&] {
        std::lock_guard<std::mutex> lock(mutex_);
        requests_.push_back(record);
        return requests_.size() - 1;
    }();
    auto finish = [&] {
        std::lock_guard<std::mutex> lock(mutex_);
        requests_[recordIndex].bytesSent = record.bytesSent;
        requests_[recordIndex].clientClosedEarly = record.clientClosedEarly;
    };
    if (reply.closeWithoutReply)
        return finish();
    if (reply.delayMs > 0 && !Pause(reply.delayMs))
        return finish();

    std::string headers = "HTTP/1.1 " + std::to_string(reply.status) + " " + reply.reason + "\r\n";
    headers += "Content-Type: " + reply.contentType + "\r\n";
    const std::size_t total = reply.body.size() + reply.paddingBytes;
    if (reply.sendContentLength)
        headers +=
            "Content-Length: " + std::to_string(reply.neverEnd ? total + (1ull << 40) : total) +
            "\r\n";
    headers += "Connection: close\r\nServer: ScriptedHttpServer\r\n\r\n";
    if (!SendAll(connection, headers.data(), headers.size(), record))
        return finish();

    // The body, in dribbles when asked; then the padding, generated piecewise.
    const std::size_t piece = reply.dribbleBytes > 0 ? reply.dribbleBytes : 1 << 20;
    for (std::size_t at = 0; at < reply.body.size(); at += piece) {
        if (at > 0 && reply.dribbleIntervalMs > 0 && !Pause(reply.dribbleIntervalMs))
            return finish();
        if (!SendAll(connection, reply.body.data() + at, std::min(piece, reply.body.size() - at),
                     record))
            return finish();
    }
    const std::string padding(std::min<std::size_t>(piece, 1 << 20), reply.paddingByte);
    for (std::size_t left = reply.paddingBytes; left > 0;) {
        const std::size_t n = std::min(left, padding.size());
        if (reply.dribbleIntervalMs > 0 && !Pause(reply.dribbleIntervalMs))
            return finish();
        if (!SendAll(connection, padding.data(), n, record))
            return finish();
        left -= n;
    }
    while (reply.neverEnd) {
        if (!Pause(reply.dribbleIntervalMs > 0 ? reply.dribbleIntervalMs : 1000))
            return finish();
        if (!SendAll(connection, padding.data(), std::min<std::size_t>(padding.size(), piece),
                     record))
            return finish();
    }
    // Wait until the client closes (or a moment passes), so that nothing it has not read is reset.
    shutdown(connection, SHUT_WR);
    pollfd fds[2] = {{connection, POLLIN, 0}, {stopPipe_[0], POLLIN, 0}};
    poll(fds, 2, 2000);
    finish();
}

}  // namespace harmona::test
