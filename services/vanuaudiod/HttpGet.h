// A small HTTP/1.0 GET for device descriptions: numeric hosts only (the location of an SSDP
// announcement carries the device's address; no name lookup that could block without a bound),
// one connection, a time limit for the whole exchange and a bound on the body's size.
#pragma once

#include <cstddef>
#include <string>

namespace vanuaudiod {

struct UrlParts {
    std::string host;  // without brackets for IPv6 literals
    unsigned short port = 80;
    std::string pathAndQuery;  // "/" when the URL has none
};

// Splits an absolute "http://host[:port][/path]" URL. False for anything else (other schemes,
// user info, empty or malformed host or port).
bool SplitHttpUrl(const std::string& url, UrlParts& out);

struct HttpResult {
    bool ok = false;
    int status = 0;
    std::string body;
    std::string error;  // why it failed, for the log
};

// GETs `url`; ok only for a whole 200 reply whose body is at most `maxBody` bytes, received
// within `timeoutMs` in all.
HttpResult HttpGet(const std::string& url, int timeoutMs, std::size_t maxBody);

}  // namespace vanuaudiod
