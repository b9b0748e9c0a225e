// The GET of the HTTP plugin (libharmona_http_plugin.so, beside the POST of HttpPost.h): fetches
// one media resource and hands its reply over as it arrives, status and headers first, then the
// body piece by piece, so that a caller can pass a resource of any size on in bounded memory.
#pragma once

#include <stddef.h>

#include "platform/dma/HttpPost.h"

extern "C" {

// Told, once and before the first piece of the body (or at the end when the body is empty), the
// reply's status and the headers that a caller passes on; each header value is "" when absent,
// NUL-terminated and cut to its buffer. A nonzero result aborts the transfer at once.
struct harmona_http_reply_head {
    long status;
    char contentType[128];
    char contentLength[32];
    char contentRange[96];
    char acceptRanges[32];
};
typedef int (*harmona_http_head)(void* context, const harmona_http_reply_head* head);

struct harmona_http_get_request {
    const char* url;             // absolute http:// URL (https:// too with allowHttps)
    const char* const* headers;  // extra request header lines ("Name: value")
    size_t headerCount;
    long connectTimeoutMs;   // no connection within this: failure
    long totalTimeoutMs;     // no whole reply within this: failure
    long stallTimeoutMs;     // no byte at all for this long: failure
    harmona_http_head head;  // called once, before the body
    harmona_http_sink sink;  // the body, piece by piece (HttpPost.h)
    void* context;           // passed to head and sink
    int allowHttps;  // nonzero: https:// URLs too (certificates checked); 0: plain HTTP only
};

struct harmona_http_get_result {
    long status;      // the HTTP status, 0 when none arrived
    int aborted;      // head or sink aborted the transfer
    int timedOut;     // a time limit ended the transfer
    int connected;    // a connection was made
    char error[256];  // why the transfer failed, NUL-terminated
};

// Sends the GET (plain HTTP unless allowHttps, no redirect, no proxy) and streams the reply. 0 when
// a whole reply arrived (whatever its status), nonzero on any failure.
typedef int harmona_http_get_fn(const harmona_http_get_request* request,
                                harmona_http_get_result* result);
int harmona_http_get(const harmona_http_get_request* request, harmona_http_get_result* result);

}  // extern "C"

namespace harmona::dma {
inline constexpr const char* kHttpGetSymbol = "harmona_http_get";
}  // namespace harmona::dma
