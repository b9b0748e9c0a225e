// Bounded HTTP GETs on libsoup 3, for documents that strangers on the network serve (device
// descriptions): a time limit for the whole exchange, a bound on the body, no redirects, no
// proxy, and a callback on the thread-default main context once the fetch ends.
#pragma once

#include <gio/gio.h>
#include <libsoup/soup.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <set>
#include <string>

#include "platform/lib/gupnp/Object.h"

namespace harmona::gupnp {

struct FetchResult {
    bool ok = false;  // a whole 200 reply within the bounds
    unsigned status = 0;
    std::string body;
    std::string error;  // why it failed, for the log
};

struct FetchLimits {
    unsigned timeoutMs = 3000;          // connect, request and whole body
    std::size_t maxBodyBytes = 262144;  // a longer body fails the fetch
};

class HttpFetcher {
  public:
    using Done = std::function<void(FetchResult)>;

    explicit HttpFetcher(FetchLimits limits);
    // Cancels the fetches still running; their callbacks are not called.
    ~HttpFetcher();
    HttpFetcher(const HttpFetcher&) = delete;
    HttpFetcher& operator=(const HttpFetcher&) = delete;

    // Starts a GET of `url`; `done` runs later on the thread-default main context (also for a URL
    // that libsoup refuses).
    void Get(const std::string& url, Done done);

    // Fetches running now.
    std::size_t running() const { return running_.size(); }

    // Runs the thread-default main context until the fetch of `url` ends (for tools and tests
    // that have no loop of their own).
    static FetchResult GetAndWait(const std::string& url, FetchLimits limits);

  private:
    struct Fetch;
    void Finish(Fetch* fetch, FetchResult result);
    static void Sent(GObject* source, GAsyncResult* result, gpointer data);
    static void Read(GObject* source, GAsyncResult* result, gpointer data);
    static gboolean TimedOut(gpointer data);
    void ReadMore(Fetch* fetch);

    FetchLimits limits_;
    ObjectRef<SoupSession> session_;
    std::set<Fetch*> running_;
};

}  // namespace harmona::gupnp
