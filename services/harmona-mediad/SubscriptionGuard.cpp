#include "services/harmona-mediad/SubscriptionGuard.h"

#include <syslog.h>

#include <cstdlib>
#include <cstring>
#include <string>

namespace harmona::mediad {
namespace {

constexpr auto kDefaultLease = std::chrono::seconds(300);

// "http://host:port/path" -> "host" (brackets of an IPv6 literal removed); "" when malformed.
std::string HostOfCallback(const std::string& url) {
    GUri* uri = g_uri_parse(url.c_str(), G_URI_FLAGS_NONE, nullptr);
    if (uri == nullptr)
        return "";
    std::string host;
    if (g_strcmp0(g_uri_get_scheme(uri), "http") == 0 && g_uri_get_host(uri) != nullptr)
        host = g_uri_get_host(uri);
    g_uri_unref(uri);
    return host;
}

// "Second-1800" -> 1800 s; anything else the lease GUPnP grants.
std::chrono::seconds LeaseOf(const char* timeout) {
    if (timeout != nullptr && std::strncmp(timeout, "Second-", 7) == 0) {
        const long seconds = std::atol(timeout + 7);
        if (seconds > 0 && seconds < 86400)
            return std::chrono::seconds(seconds);
    }
    return kDefaultLease;
}

bool IsMethod(SoupServerMessage* message, const char* method) {
    return std::strcmp(soup_server_message_get_method(message), method) == 0;
}

}  // namespace

bool CallbacksNameThePeer(const std::string& callbackHeader, const std::string& peer) {
    std::size_t count = 0;
    std::size_t at = 0;
    while ((at = callbackHeader.find('<', at)) != std::string::npos) {
        const std::size_t end = callbackHeader.find('>', at);
        if (end == std::string::npos)
            return false;
        const std::string host = HostOfCallback(callbackHeader.substr(at + 1, end - at - 1));
        if (host.empty() || host != peer)
            return false;
        ++count;
        at = end + 1;
    }
    return count > 0 && !peer.empty();
}

SubscriptionGuard::SubscriptionGuard(GUPnPContext* context)
    : where_(gssdp_client_get_host_ip(GSSDP_CLIENT(context)) != nullptr
                 ? gssdp_client_get_host_ip(GSSDP_CLIENT(context))
                 : "?") {
    SoupServer* server = gupnp_context_get_server(context);
    requestRead_ =
        gupnp::SignalConnection(server, "request-read", G_CALLBACK(&OnRequestRead), this);
    requestFinished_ =
        gupnp::SignalConnection(server, "request-finished", G_CALLBACK(&OnRequestFinished), this);
}

std::size_t SubscriptionGuard::active() {
    ForgetExpired();
    return subscriptions_.size();
}

std::size_t SubscriptionGuard::activeOf(const std::string& peer) {
    ForgetExpired();
    std::size_t count = 0;
    for (const auto& [sid, lease] : subscriptions_)
        count += lease.peer == peer ? 1 : 0;
    return count;
}

void SubscriptionGuard::ForgetExpired() {
    const auto now = std::chrono::steady_clock::now();
    for (auto it = subscriptions_.begin(); it != subscriptions_.end();) {
        if (it->second.until <= now)
            it = subscriptions_.erase(it);
        else
            ++it;
    }
}

// Runs after the request is read and before any handler: a status set here ends the request
// with that status, GUPnP's handler is not called.
void SubscriptionGuard::OnRequestRead(SoupServer*, SoupServerMessage* message, gpointer self) {
    auto* me = static_cast<SubscriptionGuard*>(self);
    if (!IsMethod(message, "SUBSCRIBE"))
        return;
    SoupMessageHeaders* headers = soup_server_message_get_request_headers(message);
    const char* callback = soup_message_headers_get_one(headers, "Callback");
    if (callback == nullptr || soup_message_headers_get_one(headers, "SID") != nullptr)
        return;  // a renewal, or a malformed request GUPnP answers itself
    const char* peer = soup_server_message_get_remote_host(message);
    const std::string peerText = peer != nullptr ? peer : "";
    if (!CallbacksNameThePeer(callback, peerText)) {
        syslog(LOG_WARNING,
               "refused a subscription on %s from %s: callback %.200s is not the "
               "subscriber's own address",
               me->where_.c_str(), peerText.c_str(), callback);
        soup_server_message_set_status(message, SOUP_STATUS_PRECONDITION_FAILED,
                                       "Callback must name the subscriber's own address");
        return;
    }
    if (me->active() >= kMaxSubscriptions) {
        syslog(LOG_WARNING, "refused a subscription on %s from %s: %zu subscriptions active",
               me->where_.c_str(), peerText.c_str(), kMaxSubscriptions);
        soup_server_message_set_status(message, SOUP_STATUS_SERVICE_UNAVAILABLE,
                                       "Too many subscriptions");
        return;
    }
    const bool loopback = peerText.rfind("127.", 0) == 0 || peerText == "::1";
    if (!loopback && me->activeOf(peerText) >= kMaxSubscriptionsPerPeer) {
        syslog(LOG_WARNING, "refused a subscription on %s from %s: it holds %zu already",
               me->where_.c_str(), peerText.c_str(), kMaxSubscriptionsPerPeer);
        soup_server_message_set_status(message, SOUP_STATUS_SERVICE_UNAVAILABLE,
                                       "Too many subscriptions from this host");
    }
}

// Keeps the count of what GUPnP granted: new and renewed leases, and ended ones.
void SubscriptionGuard::OnRequestFinished(SoupServer*, SoupServerMessage* message, gpointer self) {
    auto* me = static_cast<SubscriptionGuard*>(self);
    const bool subscribe = IsMethod(message, "SUBSCRIBE");
    if (!subscribe && !IsMethod(message, "UNSUBSCRIBE"))
        return;
    if (soup_server_message_get_status(message) != SOUP_STATUS_OK)
        return;
    if (subscribe) {
        SoupMessageHeaders* response = soup_server_message_get_response_headers(message);
        const char* sid = soup_message_headers_get_one(response, "SID");
        const char* peer = soup_server_message_get_remote_host(message);
        if (sid != nullptr)
            me->subscriptions_[sid] =
                Lease{std::chrono::steady_clock::now() +
                          LeaseOf(soup_message_headers_get_one(response, "Timeout")),
                      peer != nullptr ? peer : ""};
    } else {
        const char* sid =
            soup_message_headers_get_one(soup_server_message_get_request_headers(message), "SID");
        if (sid != nullptr)
            me->subscriptions_.erase(sid);
    }
}

// --- RequestBodyLimit ----------------------------------------------------------------------------

RequestBodyLimit::RequestBodyLimit(GUPnPContext* context) {
    requestStarted_ = gupnp::SignalConnection(gupnp_context_get_server(context), "request-started",
                                              G_CALLBACK(&OnRequestStarted), this);
}

void RequestBodyLimit::OnRequestStarted(SoupServer*, SoupServerMessage* message, gpointer) {
    // No pointer to this object goes with the message: a request may outlive it.
    g_signal_connect(message, "got-headers", G_CALLBACK(&OnGotHeaders), nullptr);
}

void RequestBodyLimit::OnGotHeaders(SoupServerMessage* message, gpointer) {
    SoupMessageHeaders* headers = soup_server_message_get_request_headers(message);
    const SoupEncoding encoding = soup_message_headers_get_encoding(headers);
    const goffset length = encoding == SOUP_ENCODING_CONTENT_LENGTH
                               ? soup_message_headers_get_content_length(headers)
                               : 0;
    const bool fetch = IsMethod(message, "GET") || IsMethod(message, "HEAD");
    guint status = SOUP_STATUS_NONE;
    if (encoding == SOUP_ENCODING_CHUNKED)
        status = fetch ? SOUP_STATUS_BAD_REQUEST : SOUP_STATUS_LENGTH_REQUIRED;
    else if (fetch && length > 0)
        status = SOUP_STATUS_BAD_REQUEST;
    else if (length > kMaxRequestBodyBytes)
        status = SOUP_STATUS_REQUEST_ENTITY_TOO_LARGE;
    if (status == SOUP_STATUS_NONE)
        return;
    const char* peer = soup_server_message_get_remote_host(message);
    syslog(LOG_WARNING, "refused a %s request of %s from %s: body of %s bytes (%u)",
           soup_server_message_get_method(message),
           g_uri_get_path(soup_server_message_get_uri(message)), peer != nullptr ? peer : "?",
           encoding == SOUP_ENCODING_CHUNKED ? "unstated" : std::to_string(length).c_str(), status);
    // The answer is written here and the connection closed, so that not one byte of the body is
    // read (libsoup would read it all before answering).
    GIOStream* stream = soup_server_message_steal_connection(message);
    if (stream == nullptr)
        return;
    const std::string answer = "HTTP/1.1 " + std::to_string(status) + " " +
                               soup_status_get_phrase(status) +
                               "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n";
    g_output_stream_write_all(g_io_stream_get_output_stream(stream), answer.data(), answer.size(),
                              nullptr, nullptr, nullptr);
    g_io_stream_close(stream, nullptr, nullptr);
    g_object_unref(stream);
}

}  // namespace harmona::mediad
