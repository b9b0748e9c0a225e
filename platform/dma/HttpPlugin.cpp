// The HTTP plugin: one POST with libcurl, with the time limits and the streaming reply of
// HttpPost.h, and one GET of a media resource (HttpGet.h). Built as a MODULE and loaded on demand
// (see HttpPost.h for why). The GET speaks HTTPS only when its caller allows it.
#include <cstdio>
#include <cstring>

#include "platform/dma/HttpGet.h"
#include "platform/dma/HttpPost.h"
#include "platform/lib/curl/Easy.h"

namespace {

// libcurl set up for one request: initialised in this order, cleaned up in the reverse.
struct Session {
    harmona::curl::GlobalInit global;
    harmona::curl::Easy easy;
    harmona::curl::StringList headers;

    // Why no request can be made; nullptr when it can.
    const char* Failure() const {
        if (!global)
            return "curl_global_init failed";
        if (!easy)
            return "curl_easy_init failed";
        return nullptr;
    }
};

// The options every request shares, each of which matters for a hostile or slow server: only
// plain HTTP, never a redirect, never a proxy from the environment, no signals (SIGALRM for DNS
// time-outs would disturb the CGI), the time limits, the caller's header lines and where the body
// goes. False when libcurl refused one.
template <typename Request, typename State>
bool ConfigureShared(Session& session, const Request* request, curl_write_callback write,
                     State* state) {
    harmona::curl::Easy& easy = session.easy;
    bool ok = true;
    ok &= easy.SetOption(CURLOPT_URL, request->url) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_PROTOCOLS_STR, "http") == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_FOLLOWLOCATION, 0L) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_NOPROXY, "*") == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_NOSIGNAL, 1L) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_CONNECTTIMEOUT_MS, request->connectTimeoutMs) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_TIMEOUT_MS, request->totalTimeoutMs) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_WRITEFUNCTION, write) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_WRITEDATA, state) == CURLE_OK;
    for (size_t i = 0; i < request->headerCount; ++i)
        ok &= session.headers.Append(request->headers[i]);
    return ok;
}

template <typename Result>
void SetError(Result* result, const char* text) {
    std::snprintf(result->error, sizeof(result->error), "%s", text);
}

struct SinkState {
    const harmona_http_post_request* request;
    const harmona::curl::Easy* easy;
    bool aborted = false;
    bool announced = false;
};

// Passes the Content-Length on, once, so that the receiver can size its buffer in one step.
void AnnounceSize(SinkState& state) {
    state.announced = true;
    curl_off_t length = -1;
    if (state.request->expect != nullptr &&
        state.easy->GetInfo(CURLINFO_CONTENT_LENGTH_DOWNLOAD_T, &length) == CURLE_OK && length >= 0)
        state.request->expect(state.request->sinkContext, static_cast<unsigned long long>(length));
}

size_t WriteToSink(char* data, size_t size, size_t count, void* context) {
    auto* state = static_cast<SinkState*>(context);
    const size_t bytes = size * count;
    if (!state->announced)
        AnnounceSize(*state);
    if (state->request->sink(state->request->sinkContext, data, bytes) != 0) {
        state->aborted = true;
        return 0;  // anything other than `bytes` makes libcurl abort with CURLE_WRITE_ERROR
    }
    return bytes;
}

// The POST's own options: its body, sent at once.
bool Configure(Session& session, const harmona_http_post_request* request, SinkState& state) {
    harmona::curl::Easy& easy = session.easy;
    bool ok = ConfigureShared(session, request, WriteToSink, &state);
    ok &= easy.SetOption(CURLOPT_POST, 1L) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_POSTFIELDS, request->body) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request->bodySize)) ==
          CURLE_OK;
    // libcurl would wait up to a second for "100 Continue" on a large body; servers rarely send it.
    ok &= session.headers.Append("Expect:");
    ok &= easy.SetOption(CURLOPT_HTTPHEADER, session.headers.Get()) == CURLE_OK;
    return ok;
}

}  // namespace

extern "C" __attribute__((visibility("default"))) int harmona_http_post(
    const harmona_http_post_request* request, harmona_http_post_result* result) {
    if (result == nullptr)
        return -1;
    result->status = 0;
    result->aborted = 0;
    result->error[0] = '\0';
    if (request == nullptr || request->url == nullptr || request->sink == nullptr ||
        (request->body == nullptr && request->bodySize != 0)) {
        SetError(result, "bad request");
        return -1;
    }
    Session session;
    if (const char* failure = session.Failure()) {
        SetError(result, failure);
        return -1;
    }
    harmona::curl::Easy& easy = session.easy;
    SinkState state{request, &easy};
    if (!Configure(session, request, state)) {
        SetError(result, "curl refused an option");
        return -1;
    }
    const CURLcode code = easy.Perform();
    result->status = easy.ResponseCode();
    result->aborted = state.aborted ? 1 : 0;
    if (code != CURLE_OK) {
        SetError(result, curl_easy_strerror(code));
        return -1;
    }
    return 0;
}

namespace {

struct GetState {
    const harmona_http_get_request* request;
    harmona::curl::Easy* easy;
    bool headTold = false;
    bool aborted = false;
};

// Copies the last value of header `name` of the final reply into `buffer` ("" when absent).
void CopyHeader(harmona::curl::Easy& easy, const char* name, char* buffer, size_t size) {
    buffer[0] = '\0';
    curl_header* header = nullptr;
    if (curl_easy_header(easy.Get(), name, 0, CURLH_HEADER, -1, &header) == CURLHE_OK &&
        header != nullptr && header->value != nullptr)
        std::snprintf(buffer, size, "%s", header->value);
}

// Tells the caller the status and headers, once; false when the caller aborts.
bool TellHead(GetState& state) {
    if (state.headTold)
        return true;
    state.headTold = true;
    harmona_http_reply_head head{};
    head.status = state.easy->ResponseCode();
    CopyHeader(*state.easy, "Content-Type", head.contentType, sizeof(head.contentType));
    CopyHeader(*state.easy, "Content-Length", head.contentLength, sizeof(head.contentLength));
    CopyHeader(*state.easy, "Content-Range", head.contentRange, sizeof(head.contentRange));
    CopyHeader(*state.easy, "Accept-Ranges", head.acceptRanges, sizeof(head.acceptRanges));
    if (state.request->head(state.request->context, &head) != 0) {
        state.aborted = true;
        return false;
    }
    return true;
}

size_t WriteBody(char* data, size_t size, size_t count, void* context) {
    auto* state = static_cast<GetState*>(context);
    const size_t bytes = size * count;
    if (!TellHead(*state))
        return 0;
    if (state->request->sink(state->request->context, data, bytes) != 0) {
        state->aborted = true;
        return 0;
    }
    return bytes;
}

// The GET's own options: the body passed on as the server sends it (no decoding, no cookies), and
// a stall limit.
bool ConfigureGet(Session& session, const harmona_http_get_request* request, GetState& state) {
    harmona::curl::Easy& easy = session.easy;
    bool ok = ConfigureShared(session, request, WriteBody, &state);
    // A radio directory's list may be on https; a media server's resources never are.
    if (request->allowHttps != 0)
        ok &= easy.SetOption(CURLOPT_PROTOCOLS_STR, "http,https") == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_HTTPGET, 1L) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_HTTP_CONTENT_DECODING, 0L) == CURLE_OK;
    // Less than one byte a second for the stall time: the server hangs.
    const long stallSeconds = request->stallTimeoutMs > 999 ? request->stallTimeoutMs / 1000 : 1;
    ok &= easy.SetOption(CURLOPT_LOW_SPEED_LIMIT, 1L) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_LOW_SPEED_TIME, stallSeconds) == CURLE_OK;
    ok &= easy.SetOption(CURLOPT_HTTPHEADER, session.headers.Get()) == CURLE_OK;
    return ok;
}

}  // namespace

extern "C" __attribute__((visibility("default"))) int harmona_http_get(
    const harmona_http_get_request* request, harmona_http_get_result* result) {
    if (result == nullptr)
        return -1;
    *result = harmona_http_get_result{};
    if (request == nullptr || request->url == nullptr || request->sink == nullptr ||
        request->head == nullptr) {
        SetError(result, "bad request");
        return -1;
    }
    Session session;
    if (const char* failure = session.Failure()) {
        SetError(result, failure);
        return -1;
    }
    harmona::curl::Easy& easy = session.easy;
    GetState state{request, &easy};
    if (!ConfigureGet(session, request, state)) {
        SetError(result, "curl refused an option");
        return -1;
    }
    CURLcode code = easy.Perform();
    // A whole reply without a body: the head is still told.
    if (code == CURLE_OK && !TellHead(state))
        code = CURLE_WRITE_ERROR;
    result->status = easy.ResponseCode();
    result->aborted = state.aborted ? 1 : 0;
    result->timedOut = code == CURLE_OPERATION_TIMEDOUT ? 1 : 0;
    curl_off_t connectTime = 0;
    result->connected =
        easy.GetInfo(CURLINFO_CONNECT_TIME_T, &connectTime) == CURLE_OK && connectTime > 0 ? 1 : 0;
    if (code != CURLE_OK) {
        SetError(result, curl_easy_strerror(code));
        return -1;
    }
    return 0;
}
