// Vets GENA subscriptions before GUPnP sees them, on one context's HTTP server. GUPnP already
// refuses callbacks outside the context's network segment; on top of that a new subscription is
// accepted only when every callback URL names the subscriber's own address (so that no host can
// make this server send NOTIFY requests to a third party, or to a service that listens on
// loopback only), and only while fewer than kMaxSubscriptions are active on the context.
#pragma once

#include <libgupnp/gupnp.h>
#include <libsoup/soup.h>

#include <chrono>
#include <map>
#include <string>

#include "platform/lib/gupnp/Signal.h"

namespace harmona::mediad {

inline constexpr std::size_t kMaxSubscriptions = 32;

// True when every "<http://host[:port]/path>" of a GENA Callback header names `peer` as host, and
// there is at least one.
bool CallbacksNameThePeer(const std::string& callbackHeader, const std::string& peer);

class SubscriptionGuard {
  public:
    explicit SubscriptionGuard(GUPnPContext* context);
    SubscriptionGuard(const SubscriptionGuard&) = delete;
    SubscriptionGuard& operator=(const SubscriptionGuard&) = delete;

    std::size_t active();

  private:
    static void OnRequestRead(SoupServer* server, SoupServerMessage* message, gpointer self);
    static void OnRequestFinished(SoupServer* server, SoupServerMessage* message, gpointer self);
    void ForgetExpired();

    std::string where_;  // the context's address, for the log
    // SID -> when the subscription lapses unless renewed.
    std::map<std::string, std::chrono::steady_clock::time_point> subscriptions_;
    gupnp::SignalConnection requestRead_;
    gupnp::SignalConnection requestFinished_;
};

}  // namespace harmona::mediad
