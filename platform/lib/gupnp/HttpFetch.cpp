#include "platform/lib/gupnp/HttpFetch.h"

#include <utility>

namespace harmona::gupnp {
namespace {

constexpr gsize kReadChunk = 16384;

// A one-shot timer or idle call on the thread-default main context, where libsoup completes the
// fetch as well.
guint AttachToThreadDefault(GSource* source, GSourceFunc function, gpointer data) {
    g_source_set_callback(source, function, data, nullptr);
    const guint id = g_source_attach(source, g_main_context_get_thread_default());
    g_source_unref(source);
    return id;
}

void RemoveFromThreadDefault(guint id) {
    GSource* source = g_main_context_find_source_by_id(g_main_context_get_thread_default(), id);
    if (source != nullptr)
        g_source_destroy(source);
}

}  // namespace

// One running fetch. It outlives its fetcher when the fetcher goes first: the cancelled async
// calls still complete on the main context and must find it; `owner` is then null.
struct HttpFetcher::Fetch {
    HttpFetcher* owner = nullptr;
    Done done;
    ObjectRef<SoupMessage> message;
    ObjectRef<GCancellable> cancellable;
    ObjectRef<GInputStream> stream;
    std::string body;
    guint timer = 0;
    bool timedOut = false;
};

HttpFetcher::HttpFetcher(FetchLimits limits) : limits_(limits) {
    const guint seconds = (limits_.timeoutMs + 999) / 1000;
    session_ = ObjectRef<SoupSession>::Adopt(soup_session_new_with_options(
        "timeout", seconds, "idle-timeout", seconds, "max-conns-per-host", 2, "user-agent",
        "harmona-vanuaudiod", nullptr));
    // Descriptions come from the LAN: never through a proxy that the environment may name.
    soup_session_set_proxy_resolver(session_.get(), nullptr);
}

HttpFetcher::~HttpFetcher() {
    for (Fetch* fetch : running_) {
        fetch->owner = nullptr;
        if (fetch->timer != 0)
            RemoveFromThreadDefault(std::exchange(fetch->timer, 0));
        if (!fetch->message) {
            delete fetch;  // no async call of libsoup refers to it
            continue;
        }
        g_cancellable_cancel(fetch->cancellable.get());
    }
    running_.clear();
}

void HttpFetcher::Get(const std::string& url, Done done) {
    auto* fetch = new Fetch;
    fetch->owner = this;
    fetch->done = std::move(done);
    fetch->cancellable = ObjectRef<GCancellable>::Adopt(g_cancellable_new());
    running_.insert(fetch);
    SoupMessage* message = soup_message_new("GET", url.c_str());
    if (message == nullptr) {
        // Reported from the loop, as every other outcome is, so that callers see one path.
        fetch->timer = AttachToThreadDefault(
            g_idle_source_new(),
            [](gpointer data) -> gboolean {
                auto* f = static_cast<Fetch*>(data);
                f->timer = 0;
                f->owner->Finish(f, {false, 0, "", "not a usable URL"});
                return G_SOURCE_REMOVE;
            },
            fetch);
        return;
    }
    fetch->message = ObjectRef<SoupMessage>::Adopt(message);
    soup_message_add_flags(message, SOUP_MESSAGE_NO_REDIRECT);
    fetch->timer = AttachToThreadDefault(g_timeout_source_new(limits_.timeoutMs),
                                         &HttpFetcher::TimedOut, fetch);
    soup_session_send_async(session_.get(), message, G_PRIORITY_DEFAULT, fetch->cancellable.get(),
                            &HttpFetcher::Sent, fetch);
}

gboolean HttpFetcher::TimedOut(gpointer data) {
    auto* fetch = static_cast<Fetch*>(data);
    fetch->timer = 0;
    fetch->timedOut = true;
    g_cancellable_cancel(fetch->cancellable.get());
    return G_SOURCE_REMOVE;
}

void HttpFetcher::Sent(GObject* source, GAsyncResult* result, gpointer data) {
    auto* fetch = static_cast<Fetch*>(data);
    Error error;
    GInputStream* stream = soup_session_send_finish(SOUP_SESSION(source), result, error.out());
    fetch->stream = ObjectRef<GInputStream>::Adopt(stream);
    if (fetch->owner == nullptr) {
        delete fetch;
        return;
    }
    if (stream == nullptr) {
        fetch->owner->Finish(fetch, {false, 0, "",
                                     fetch->timedOut ? "no answer within the time limit"
                                                     : std::string(error.message())});
        return;
    }
    const unsigned status = soup_message_get_status(fetch->message.get());
    if (status != SOUP_STATUS_OK) {
        fetch->owner->Finish(fetch, {false, status, "", "HTTP status " + std::to_string(status)});
        return;
    }
    fetch->owner->ReadMore(fetch);
}

void HttpFetcher::ReadMore(Fetch* fetch) {
    g_input_stream_read_bytes_async(fetch->stream.get(), kReadChunk, G_PRIORITY_DEFAULT,
                                    fetch->cancellable.get(), &HttpFetcher::Read, fetch);
}

void HttpFetcher::Read(GObject* source, GAsyncResult* result, gpointer data) {
    auto* fetch = static_cast<Fetch*>(data);
    Error error;
    GBytes* bytes = g_input_stream_read_bytes_finish(G_INPUT_STREAM(source), result, error.out());
    if (fetch->owner == nullptr) {
        if (bytes != nullptr)
            g_bytes_unref(bytes);
        delete fetch;
        return;
    }
    HttpFetcher& owner = *fetch->owner;
    if (bytes == nullptr) {
        owner.Finish(fetch, {false, SOUP_STATUS_OK, "",
                             fetch->timedOut ? "body not complete within the time limit"
                                             : std::string(error.message())});
        return;
    }
    gsize size = 0;
    const auto* chunk = static_cast<const char*>(g_bytes_get_data(bytes, &size));
    if (size == 0) {
        g_bytes_unref(bytes);
        owner.Finish(fetch, {true, SOUP_STATUS_OK, std::move(fetch->body), ""});
        return;
    }
    if (fetch->body.size() + size > owner.limits_.maxBodyBytes) {
        g_bytes_unref(bytes);
        owner.Finish(fetch,
                     {false, SOUP_STATUS_OK, "",
                      "body longer than " + std::to_string(owner.limits_.maxBodyBytes) + " bytes"});
        return;
    }
    fetch->body.append(chunk, size);
    g_bytes_unref(bytes);
    owner.ReadMore(fetch);
}

void HttpFetcher::Finish(Fetch* fetch, FetchResult result) {
    if (fetch->timer != 0)
        RemoveFromThreadDefault(std::exchange(fetch->timer, 0));
    running_.erase(fetch);
    Done done = std::move(fetch->done);
    // Closing the stream gives the connection back (or drops it when the body was not read).
    if (fetch->stream)
        g_input_stream_close(fetch->stream.get(), nullptr, nullptr);
    delete fetch;
    done(std::move(result));
}

FetchResult HttpFetcher::GetAndWait(const std::string& url, FetchLimits limits) {
    FetchResult outcome;
    bool finished = false;
    {
        HttpFetcher fetcher(limits);
        fetcher.Get(url, [&](FetchResult result) {
            outcome = std::move(result);
            finished = true;
        });
        while (!finished)
            g_main_context_iteration(g_main_context_get_thread_default(), TRUE);
    }
    return outcome;
}

}  // namespace harmona::gupnp
