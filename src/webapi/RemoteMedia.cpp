#include "src/webapi/RemoteMedia.h"

#include <arpa/inet.h>
#include <signal.h>
#include <syslog.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>

#include "common/util/PercentEncoding.h"
#include "platform/cgi/ApplicationRequest.h"
#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "platform/dma/HttpGet.h"
#include "platform/dma/SoapBrowse.h"
#include "platform/plugin/Plugin.h"
#include "src/daemonclient/MediaServerList.h"
#include "src/webapi/ApiError.h"

namespace harmona::webapi {

namespace {

inline constexpr std::string_view kMediaServerPrefix = "mediaserver_";

// The errors, with fixed line numbers that log readers match on.
constexpr ApiError kNoPermission{kStatusForbidden, kSystemSection, kSystemText, 421,
                                 "request_refused"};
constexpr ApiError kUnknownServer{kStatusNotFound, kNotFoundSection, kNotFoundText, 422,
                                  "node_gone"};
constexpr ApiError kObjectInvalid{kStatusBadRequest, kNotFoundSection, kNotFoundText, 423,
                                  "object_invalid"};
constexpr ApiError kBrowseFailed{kStatusBadGateway, kSystemSection, kSystemText, 424,
                                 "media_server_invalid"};
constexpr ApiError kNotATrack{kStatusNotFound, kNotFoundSection, kNotFoundText, 425, "node_gone"};
constexpr ApiError kResourceElsewhere{kStatusForbidden, kSystemSection, kSystemText, 426,
                                      "resource_refused"};
constexpr ApiError kTooLarge{kStatusBadGateway, kSystemSection, kSystemText, 427,
                             "resource_too_large"};
constexpr ApiError kRangeRefused{kStatusRangeNotSatisfiable, kSystemSection, kSystemText, 428,
                                 "range_invalid"};
constexpr ApiError kResourceFailed{kStatusBadGateway, kSystemSection, kSystemText, 429,
                                   "resource_failed"};
constexpr ApiError kTimedOut{kStatusGatewayTimeout, kSystemSection, kSystemText, 430,
                             "media_server_timeout"};
constexpr ApiError kUnreachable{kStatusBadGateway, kSystemSection, kSystemText, 431,
                                "media_server_down"};
constexpr ApiError kNoHttpClient{kStatusServerError, kSystemSection, kSystemText, 432,
                                 "system_error"};

// Two numeric hosts name the same address.
bool SameAddress(const std::string& a, const std::string& b) {
    unsigned char left[sizeof(in6_addr)] = {};
    unsigned char right[sizeof(in6_addr)] = {};
    if (inet_pton(AF_INET, a.c_str(), left) == 1)
        return inet_pton(AF_INET, b.c_str(), right) == 1 && std::memcmp(left, right, 4) == 0;
    return inet_pton(AF_INET6, a.c_str(), left) == 1 &&
           inet_pton(AF_INET6, b.c_str(), right) == 1 &&
           std::memcmp(left, right, sizeof(in6_addr)) == 0;
}

// The resource may be fetched: a network address, the server's own host.
bool IsResourceOfServer(const std::string& res, const std::string& controlUrl) {
    return dma::IsNetworkHostUrl(res) &&
           SameAddress(dma::HttpUrlHost(res), dma::HttpUrlHost(controlUrl));
}

bool HasControlBytes(std::string_view text) {
    for (const char c : text)
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f)
            return true;
    return false;
}

// The browser's Range, when it is a plain byte range list; anything else is not passed on (a
// server then sends the whole resource, as HTTP allows for a Range it ignores).
std::string RangeHeader() {
    const char* range = std::getenv("HTTP_RANGE");
    if (range == nullptr)
        return "";
    const std::string_view value(range);
    if (value.size() < 7 || value.size() > 100 || value.compare(0, 6, "bytes=") != 0 ||
        value.find_first_not_of("0123456789-, ", 6) != std::string_view::npos)
        return "";
    return "Range: " + std::string(value);
}

// The Content-Type passed on: an audio type (or Ogg, or raw bytes) only, so that nothing the
// server sends can be shown as a page of this site.
std::string PassedContentType(std::string_view type) {
    const std::size_t end = type.find(';');
    std::string_view bare = type.substr(0, end);
    while (!bare.empty() && bare.back() == ' ')
        bare.remove_suffix(1);
    std::string lower(bare);
    for (char& c : lower)
        if (c >= 'A' && c <= 'Z')
            c = static_cast<char>(c - 'A' + 'a');
    const bool tokenOnly =
        !lower.empty() && lower.size() <= 64 &&
        lower.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789/.+-_") == std::string::npos;
    if (tokenOnly && (lower.rfind("audio/", 0) == 0 || lower == "application/ogg"))
        return lower;
    return "application/octet-stream";
}

std::optional<unsigned long long> ParseLength(const char* text) {
    const std::string_view value(text);
    if (value.empty() || value.size() > 18 ||
        value.find_first_not_of("0123456789") != std::string_view::npos)
        return std::nullopt;
    return std::strtoull(text, nullptr, 10);
}

struct RelayState {
    bool headPrinted = false;
    bool tooLarge = false;
    bool writeFailed = false;
    long refusedStatus = 0;  // a status other than 200 or 206
    unsigned long long sent = 0;
};

int RelayHead(void* context, const harmona_http_reply_head* head) {
    auto* relay = static_cast<RelayState*>(context);
    if (head->status != 200 && head->status != 206) {
        relay->refusedStatus = head->status;
        return 1;
    }
    const std::optional<unsigned long long> length = ParseLength(head->contentLength);
    if (length && *length > kMaxStreamBytes) {
        relay->tooLarge = true;
        return 1;
    }
    std::printf("Status: %s\r\n", head->status == 206 ? "206 Partial Content" : "200 OK");
    std::printf("Content-Type: %s\r\n", PassedContentType(head->contentType).c_str());
    if (length)
        std::printf("Content-Length: %llu\r\n", *length);
    const std::string_view range(head->contentRange);
    if (head->status == 206 && !range.empty() &&
        range.find_first_not_of("bytes 0123456789-/*") == std::string_view::npos)
        std::printf("Content-Range: %s\r\n", head->contentRange);
    if (std::strcmp(head->acceptRanges, "bytes") == 0)
        std::printf("Accept-Ranges: bytes\r\n");
    std::printf("\r\n");
    relay->headPrinted = true;
    return 0;
}

int RelayBody(void* context, const char* data, size_t size) {
    auto* relay = static_cast<RelayState*>(context);
    if (size > kMaxStreamBytes - relay->sent) {
        relay->tooLarge = true;
        return 1;
    }
    if (std::fwrite(data, 1, size, stdout) != size) {
        relay->writeFailed = true;
        return 1;
    }
    relay->sent += size;
    return 0;
}

// Fetches `res` and passes it on; the exit status.
int Relay(ActionHandler& handler, WebMan& webMan, const std::string& res) {
    const plugin::Plugin http = plugin::Plugin::OpenBesideProgram(dma::kHttpPluginFile);
    auto* get = http.Get<harmona_http_get_fn>(dma::kHttpGetSymbol);
    if (get == nullptr) {
        syslog(LOG_ERR, "remote stream: HTTP plugin unavailable: %s", http.Error().c_str());
        return AnswerError(handler, webMan, kNoHttpClient);
    }
    // The browser may go away at any time: a write then fails instead of ending the program.
    signal(SIGPIPE, SIG_IGN);
    const std::string range = RangeHeader();
    const char* headers[1] = {range.c_str()};
    RelayState relay;
    harmona_http_get_request request{};
    request.url = res.c_str();
    request.headers = headers;
    request.headerCount = range.empty() ? 0 : 1;
    request.connectTimeoutMs = kStreamConnectTimeoutMs;
    request.totalTimeoutMs = kStreamTotalTimeoutMs;
    request.stallTimeoutMs = kStreamStallTimeoutMs;
    request.head = RelayHead;
    request.sink = RelayBody;
    request.context = &relay;
    harmona_http_get_result result{};
    const int failed = get(&request, &result);
    std::fflush(stdout);
    if (relay.headPrinted) {
        if (failed != 0 && !relay.writeFailed)
            syslog(LOG_ERR, "remote stream: %s cut off after %llu bytes: %s", res.c_str(),
                   relay.sent, relay.tooLarge ? "larger than the bound" : result.error);
        return failed == 0 ? 1 : 0;
    }
    if (relay.tooLarge)
        return AnswerError(handler, webMan, kTooLarge);
    if (relay.refusedStatus == 416)
        return AnswerError(handler, webMan, kRangeRefused);
    if (relay.refusedStatus != 0 || result.connected != 0) {
        if (result.timedOut != 0)
            return AnswerError(handler, webMan, kTimedOut);
        syslog(LOG_ERR, "remote stream: %s: status %ld, %s", res.c_str(), result.status,
               result.error);
        return AnswerError(handler, webMan, kResourceFailed);
    }
    if (result.timedOut != 0)
        return AnswerError(handler, webMan, kTimedOut);
    return AnswerError(handler, webMan, kUnreachable);
}

}  // namespace

bool IsListedNetworkServer(const std::string& controlUrl) {
    if (!dma::IsNetworkHostUrl(controlUrl))
        return false;
    bool listed = false;
    daemonclient::ReadMediaServerList([&](const daemonclient::ListedMediaServer& server) {
        listed = listed || server.controlUrl == controlUrl;
    });
    return listed;
}

long long DurationSeconds(std::string_view text) {
    // H+:MM:SS with optional fraction.
    const std::size_t first = text.find(':');
    const std::size_t second = first == std::string_view::npos ? first : text.find(':', first + 1);
    if (first == 0 || first == std::string_view::npos || second == std::string_view::npos ||
        first > 9 || second != first + 3)
        return -1;
    const std::string_view hours = text.substr(0, first);
    const std::string_view minutes = text.substr(first + 1, 2);
    const std::string_view rest = text.substr(second + 1);
    const std::size_t dot = rest.find('.');
    const std::string_view seconds = rest.substr(0, dot);
    const std::string_view fraction =
        dot == std::string_view::npos ? std::string_view() : rest.substr(dot + 1);
    auto digits = [](std::string_view part) {
        return !part.empty() && part.find_first_not_of("0123456789") == std::string_view::npos;
    };
    if (!digits(hours) || !digits(minutes) || seconds.size() != 2 || !digits(seconds) ||
        (dot != std::string_view::npos && !digits(fraction)))
        return -1;
    const long long whole = std::stoll(std::string(hours)) * 3600 +
                            std::stoll(std::string(minutes)) * 60 +
                            std::stoll(std::string(seconds));
    const bool roundUp = !fraction.empty() && fraction[0] >= '5';
    return whole + (roundUp ? 1 : 0);
}

bool AppendRemoteTrack(const std::string& node, const std::string& controlUrl, const ItemNode& item,
                       Json::Value& tracks) {
    if (item.isContainer || !IsResourceOfServer(item.getValueByKey("res"), controlUrl))
        return false;
    const std::string id = item.getValueByKey("id");
    if (id.empty() || id.size() > kMaxObjectIdBytes || HasControlBytes(id))
        return false;
    Json::Value row(Json::objectValue);
    row["title"] = item.getValueByKey("title");
    row["artist"] = item.getValueByKey("artist");
    row["album"] = item.getValueByKey("album");
    row["duration"] = static_cast<Json::Int64>(DurationSeconds(item.getValueByKey("duration")));
    row["url"] = "webapi/library.cgi?action=" + std::string(kRemoteStreamAction) +
                 "&node=" + util::PercentEncode(node) + "&object=" + util::PercentEncode(id);
    tracks.append(std::move(row));
    return true;
}

int ServeRemoteStream(ActionHandler& handler, WebMan& webMan, int permission) {
    if ((permission & cgi::kPermissionMediaServer) == 0)
        return AnswerError(handler, webMan, kNoPermission);
    const std::string node = webMan.In("node", "");
    if (node.compare(0, kMediaServerPrefix.size(), kMediaServerPrefix) != 0)
        return AnswerError(handler, webMan, kUnknownServer);
    const std::string controlUrl = node.substr(kMediaServerPrefix.size());
    if (!IsListedNetworkServer(controlUrl))
        return AnswerError(handler, webMan, kUnknownServer);
    const std::string object = webMan.In("object", "");
    if (object.empty() || object.size() > kMaxObjectIdBytes || HasControlBytes(object))
        return AnswerError(handler, webMan, kObjectInvalid);

    // The item as the server describes it now: its resource comes from this answer only.
    DMABrowse browse(BrowseMetadata, controlUrl);
    browse.objectId = object;
    DMAParser parser;
    if (browse.Prepare() != 0 || parser.Parse(&browse) != 0) {
        syslog(LOG_ERR, "remote stream: metadata of %s on %s: %s", object.c_str(),
               controlUrl.c_str(), parser.Error().c_str());
        return AnswerError(handler, webMan, kBrowseFailed);
    }
    const DMAParser::ItemList* items = parser.GetResult();
    if (items == nullptr || items->size() != 1 || items->front()->isContainer ||
        items->front()->getValueByKey("id") != object)
        return AnswerError(handler, webMan, kNotATrack);
    const std::string res = items->front()->getValueByKey("res");
    if (!IsResourceOfServer(res, controlUrl)) {
        syslog(LOG_ERR, "remote stream: %s of %s names a resource elsewhere, not fetched",
               object.c_str(), controlUrl.c_str());
        return AnswerError(handler, webMan, kResourceElsewhere);
    }
    return Relay(handler, webMan, res);
}

}  // namespace harmona::webapi
