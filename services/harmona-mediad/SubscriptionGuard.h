// Vets GENA subscriptions before GUPnP sees them, on one context's HTTP server. GUPnP already
// refuses callbacks outside the context's network segment; on top of that a new subscription is
// accepted only when every callback URL names the subscriber's own address (so that no host can
// make this server send NOTIFY requests to a third party, or to a service that listens on
// loopback only), and only while fewer than kMaxSubscriptions are active on the context and fewer
// than kMaxSubscriptionsPerPeer of the same LAN host.
#pragma once

#include <libgupnp/gupnp.h>
#include <libsoup/soup.h>

#include <chrono>
#include <map>
#include <string>

#include "platform/lib/gupnp/Signal.h"

namespace harmona::mediad {

inline constexpr std::size_t kMaxSubscriptions = 32;
// One LAN host may hold no more than this many of them, so that it cannot take them all. Loopback
// (this host's own programs) is bounded by kMaxSubscriptions alone.
inline constexpr std::size_t kMaxSubscriptionsPerPeer = 8;

// True when every "<http://host[:port]/path>" of a GENA Callback header names `peer` as host, and
// there is at least one.
bool CallbacksNameThePeer(const std::string& callbackHeader, const std::string& peer);

class SubscriptionGuard {
  public:
    explicit SubscriptionGuard(GUPnPContext* context);
    SubscriptionGuard(const SubscriptionGuard&) = delete;
    SubscriptionGuard& operator=(const SubscriptionGuard&) = delete;

    std::size_t active();
    std::size_t activeOf(const std::string& peer);

  private:
    static void OnRequestRead(SoupServer* server, SoupServerMessage* message, gpointer self);
    static void OnRequestFinished(SoupServer* server, SoupServerMessage* message, gpointer self);
    void ForgetExpired();

    std::string where_;  // the context's address, for the log
    struct Lease {
        std::chrono::steady_clock::time_point until;  // when it lapses unless renewed
        std::string peer;                             // the subscriber's address
    };
    std::map<std::string, Lease> subscriptions_;  // by SID
    gupnp::SignalConnection requestRead_;
    gupnp::SignalConnection requestFinished_;
};

// Bounds what one request may make this server read, on one context's HTTP server, judged from
// the request's headers before any of its body is read: a SOAP action or a subscription is a few
// kilobytes, so a body larger than kMaxRequestBodyBytes is answered 413, a body whose size is not
// given up front (chunked) 411, and a GET or HEAD with a body 400; the connection is closed after
// that answer, without reading the body.
inline constexpr long long kMaxRequestBodyBytes = 256 * 1024;

class RequestBodyLimit {
  public:
    explicit RequestBodyLimit(GUPnPContext* context);
    RequestBodyLimit(const RequestBodyLimit&) = delete;
    RequestBodyLimit& operator=(const RequestBodyLimit&) = delete;

  private:
    static void OnRequestStarted(SoupServer* server, SoupServerMessage* message, gpointer self);
    static void OnGotHeaders(SoupServerMessage* message, gpointer self);

    gupnp::SignalConnection requestStarted_;
};

}  // namespace harmona::mediad
