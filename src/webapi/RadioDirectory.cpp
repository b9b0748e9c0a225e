#include "src/webapi/RadioDirectory.h"

#include <syslog.h>

#include <cstdio>
#include <optional>

#include "platform/dma/HttpGet.h"
#include "platform/plugin/Plugin.h"
#include "platform/radio/RadioStations.h"
#include "platform/radio/StationDirectory.h"
#include "platform/system/VanuSystem.h"
#include "src/webapi/ApiError.h"

namespace harmona::webapi {

namespace {

// The errors, with fixed line numbers that log readers match on.
constexpr ApiError kDirectoryUnreachable{kStatusUnavailable, kSystemSection, kSystemText, 401,
                                         "directory_unreachable"};
constexpr ApiError kNotConfigured{kStatusUnavailable, kSystemSection, kSystemText, 411,
                                  "directory_not_configured"};
constexpr ApiError kDirectoryInvalid{kStatusBadGateway, kSystemSection, kSystemText, 412,
                                     "directory_invalid"};
constexpr ApiError kNodeInvalid{kStatusBadRequest, kNotFoundSection, kNotFoundText, 413,
                                "node_invalid"};
constexpr ApiError kStationInvalid{kStatusBadRequest, kNotFoundSection, kNotFoundText, 414,
                                   "station_invalid"};
constexpr ApiError kStationNotFound{kStatusNotFound, kNotFoundSection, kNotFoundText, 415,
                                    "station_not_found"};
constexpr ApiError kStreamInvalid{kStatusBadGateway, kSystemSection, kSystemText, 416,
                                  "stream_invalid"};
constexpr ApiError kNoHttpClient{kStatusServerError, kSystemSection, kSystemText, 417,
                                 "system_error"};

// The longest list URL read from audio.conf.
constexpr int kMaxListUrlBytes = static_cast<int>(radio::kMaxUrlBytes);

enum class FetchOutcome {
    ok,           // a whole 200 reply within the bound
    unreachable,  // no connection, a time limit, or a status other than 200
    tooLarge,     // more than the bound
    noClient,     // the HTTP plugin cannot be loaded
};

struct FetchState {
    std::size_t maxBytes = 0;
    std::string body;
    long status = 0;
    bool tooLarge = false;
};

int FetchHead(void* context, const harmona_http_reply_head* head) {
    auto* state = static_cast<FetchState*>(context);
    state->status = head->status;
    return head->status == 200 ? 0 : 1;
}

int FetchBody(void* context, const char* data, size_t size) {
    auto* state = static_cast<FetchState*>(context);
    if (size > state->maxBytes - state->body.size()) {
        state->tooLarge = true;
        return 1;
    }
    state->body.append(data, size);
    return 0;
}

// GETs `url` (http:// or https://, checked by the caller) within the directory's bounds.
FetchOutcome Fetch(const std::string& url, std::size_t maxBytes, std::string& body) {
    const plugin::Plugin http = plugin::Plugin::OpenBesideProgram(dma::kHttpPluginFile);
    auto* get = http.Get<harmona_http_get_fn>(dma::kHttpGetSymbol);
    if (get == nullptr) {
        syslog(LOG_ERR, "radio directory: HTTP plugin unavailable: %s", http.Error().c_str());
        return FetchOutcome::noClient;
    }
    FetchState state;
    state.maxBytes = maxBytes;
    harmona_http_get_request request{};
    request.url = url.c_str();
    request.connectTimeoutMs = kDirectoryConnectTimeoutMs;
    request.totalTimeoutMs = kDirectoryTotalTimeoutMs;
    request.stallTimeoutMs = kDirectoryStallTimeoutMs;
    request.head = FetchHead;
    request.sink = FetchBody;
    request.context = &state;
    request.allowHttps = 1;
    harmona_http_get_result result{};
    const int failed = get(&request, &result);
    if (state.tooLarge)
        return FetchOutcome::tooLarge;
    if (failed != 0 || state.status != 200) {
        syslog(LOG_WARNING, "radio directory: %s: status %ld, %s", url.c_str(), state.status,
               result.error);
        return FetchOutcome::unreachable;
    }
    body = std::move(state.body);
    return FetchOutcome::ok;
}

// The list URL that audio.conf sets for `node`; nullopt when none is set, or the value is not an
// http:// or https:// URL (logged).
std::optional<std::string> ListUrl(std::string_view node) {
    const char* key = node == kShoutcastNode ? kShoutcastListKey : kRadioIoListKey;
    char buffer[kMaxListUrlBytes + 1] = {};
    const int length = VANUAudioConfGet(key, buffer, sizeof(buffer));
    if (length <= 0)
        return std::nullopt;
    const std::string url(buffer);
    if (length > kMaxListUrlBytes || !radio::IsStationUrl(url)) {
        syslog(LOG_ERR, "radio directory: %s in audio.conf is not an http:// or https:// URL", key);
        return std::nullopt;
    }
    return url;
}

// Fetches and reads the directory's list; answers the error itself (nullopt) when it cannot.
std::optional<radio::DirectoryList> ReadList(ActionHandler& handler, WebMan& webMan,
                                             std::string_view node, std::string& listUrl,
                                             int& answered) {
    const std::optional<std::string> url = ListUrl(node);
    if (!url) {
        answered = AnswerError(handler, webMan, kNotConfigured);
        return std::nullopt;
    }
    listUrl = *url;
    std::string body;
    switch (Fetch(listUrl, kMaxDirectoryListBytes, body)) {
        case FetchOutcome::ok:
            break;
        case FetchOutcome::unreachable:
            answered = AnswerError(handler, webMan, kDirectoryUnreachable);
            return std::nullopt;
        case FetchOutcome::tooLarge:
            syslog(LOG_ERR, "radio directory: %s: the list is larger than %zu bytes",
                   listUrl.c_str(), kMaxDirectoryListBytes);
            answered = AnswerError(handler, webMan, kDirectoryInvalid);
            return std::nullopt;
        case FetchOutcome::noClient:
            answered = AnswerError(handler, webMan, kNoHttpClient);
            return std::nullopt;
    }
    radio::DirectoryList list = radio::ParseDirectoryList(body);
    if (!list.valid) {
        syslog(LOG_ERR, "radio directory: %s: not a station list", listUrl.c_str());
        answered = AnswerError(handler, webMan, kDirectoryInvalid);
        return std::nullopt;
    }
    return list;
}

Json::Value DirectoryRow(std::string_view node, const radio::DirectoryStation& station) {
    Json::Value row(Json::objectValue);
    row["station"] = station.id;
    row["title"] = station.name;
    row["artist"] = station.genre;
    row["album"] = station.bitrate > 0 ? std::to_string(station.bitrate) + " kbit/s" : "";
    row["duration"] = -1;
    row["url"] = "webapi/library.cgi?action=radio_tunein&node=" + std::string(node) +
                 "&station=" + station.id;
    return row;
}

}  // namespace

bool IsDirectoryNode(std::string_view node) {
    return node == kShoutcastNode || node == kRadioIoNode;
}

int ListDirectory(ActionHandler& handler, WebMan& webMan, std::string_view node,
                  Json::Value& reply) {
    std::string listUrl;
    int answered = 0;
    const std::optional<radio::DirectoryList> list =
        ReadList(handler, webMan, node, listUrl, answered);
    if (!list)
        return answered;
    Json::Value& tracks = reply["tracks"];
    tracks = Json::Value(Json::arrayValue);
    for (const radio::DirectoryStation& station : list->stations)
        tracks.append(DirectoryRow(node, station));
    if (list->skipped != 0)
        syslog(LOG_INFO, "radio directory: %s: %zu rows passed over", listUrl.c_str(),
               list->skipped);
    return 1;
}

int ServeTuneIn(ActionHandler& handler, WebMan& webMan) {
    const std::string node = webMan.In("node", "");
    if (!IsDirectoryNode(node))
        return AnswerError(handler, webMan, kNodeInvalid);
    const std::string station = webMan.In("station", "");
    if (!radio::ParseStationId(station))
        return AnswerError(handler, webMan, kStationInvalid);
    std::string listUrl;
    int answered = 0;
    const std::optional<radio::DirectoryList> list =
        ReadList(handler, webMan, node, listUrl, answered);
    if (!list)
        return answered;
    // Only a station the directory lists now is tuned in.
    bool listed = false;
    for (const radio::DirectoryStation& row : list->stations)
        listed = listed || row.id == station;
    if (!listed)
        return AnswerError(handler, webMan, kStationNotFound);
    const std::string tuneInUrl = radio::TuneInUrl(listUrl, list->tuneInBase, station);
    std::string playlist;
    switch (Fetch(tuneInUrl, kMaxPlaylistBytes, playlist)) {
        case FetchOutcome::ok:
            break;
        case FetchOutcome::unreachable:
            return AnswerError(handler, webMan, kDirectoryUnreachable);
        case FetchOutcome::tooLarge:
            syslog(LOG_ERR, "radio directory: %s: the playlist is larger than %zu bytes",
                   tuneInUrl.c_str(), kMaxPlaylistBytes);
            return AnswerError(handler, webMan, kStreamInvalid);
        case FetchOutcome::noClient:
            return AnswerError(handler, webMan, kNoHttpClient);
    }
    const std::optional<std::string> stream = radio::PlaylistStreamUrl(playlist);
    if (!stream) {
        syslog(LOG_ERR, "radio directory: %s: no http:// or https:// File1", tuneInUrl.c_str());
        return AnswerError(handler, webMan, kStreamInvalid);
    }
    // IsStationUrl allows no white space or control characters: the header cannot be split.
    std::printf(
        "Status: 302 Found\r\nLocation: %s\r\nCache-Control: no-store\r\n"
        "Content-Type: text/plain; charset=\"UTF-8\"\r\nContent-Length: 0\r\n\r\n",
        stream->c_str());
    std::fflush(stdout);
    return 1;
}

}  // namespace harmona::webapi
