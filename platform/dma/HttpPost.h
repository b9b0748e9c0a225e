// The small C interface of the HTTP plugin (libharmona_http_plugin.so). The plugin holds every use
// of libcurl, so that only the requests that browse the media server load libcurl and its TLS
// stack; DMAParser loads it with harmona::plugin::Plugin when it sends a request.
#pragma once

#include <stddef.h>

extern "C" {

// Receives the reply body piece by piece; a nonzero result aborts the transfer at once.
typedef int (*harmona_http_sink)(void* context, const char* data, size_t size);

// Told, once and before the first piece, the body's size announced by Content-Length; a reply
// without one is not announced. A hint only: the announced size is not trusted.
typedef void (*harmona_http_expect)(void* context, unsigned long long size);

struct harmona_http_post_request {
    const char* url;             // absolute http:// URL
    const char* const* headers;  // extra request header lines ("Name: value")
    size_t headerCount;
    const char* body;
    size_t bodySize;
    long connectTimeoutMs;  // no connection within this: failure
    long totalTimeoutMs;    // no whole reply within this: failure
    harmona_http_sink sink;
    void* sinkContext;
    harmona_http_expect expect;  // may be null; gets sinkContext
};

struct harmona_http_post_result {
    long status;      // the HTTP status, 0 when none arrived
    int aborted;      // the sink aborted the transfer
    char error[256];  // why the transfer failed, NUL-terminated
};

// Sends the POST and streams the reply body to the sink. 0 when a whole reply arrived (whatever its
// status), nonzero on any failure (no connection, time limit, aborted by the sink, ...).
typedef int harmona_http_post_fn(const harmona_http_post_request* request,
                                 harmona_http_post_result* result);
int harmona_http_post(const harmona_http_post_request* request, harmona_http_post_result* result);

}  // extern "C"

namespace harmona::dma {
inline constexpr const char* kHttpPluginFile = "libharmona_http_plugin.so";
inline constexpr const char* kHttpPostSymbol = "harmona_http_post";
}  // namespace harmona::dma
