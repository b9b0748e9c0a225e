// Absolute http URLs as SSDP locations and device descriptions carry them: split into host, port
// and path, without any name lookup.
#pragma once

#include <string>

namespace harmona::vanuaudiod {

struct UrlParts {
    std::string host;  // without brackets for IPv6 literals
    unsigned short port = 80;
    std::string pathAndQuery;  // "/" when the URL has none
};

// Splits an absolute "http://host[:port][/path]" URL. False for anything else (other schemes,
// user info, empty or malformed host or port).
bool SplitHttpUrl(const std::string& url, UrlParts& out);

}  // namespace harmona::vanuaudiod
