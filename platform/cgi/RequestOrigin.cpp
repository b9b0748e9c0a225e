#include "platform/cgi/RequestOrigin.h"

#include <strings.h>

#include <string>
#include <string_view>

namespace harmona::cgi {
namespace {

// Letters folded to lower case; nothing else changes.
std::string Lowered(std::string_view text) {
    std::string lowered(text);
    for (char& c : lowered) {
        if (c >= 'A' && c <= 'Z')
            c = static_cast<char>(c - 'A' + 'a');
    }
    return lowered;
}

// `authority` without a trailing `defaultPort` (":80", ":443").
std::string WithoutDefaultPort(std::string authority, std::string_view defaultPort) {
    if (authority.size() > defaultPort.size() &&
        authority.compare(authority.size() - defaultPort.size(), defaultPort.size(), defaultPort) ==
            0)
        authority.resize(authority.size() - defaultPort.size());
    return authority;
}

bool OriginNamesHost(std::string_view origin, std::string_view host) {
    std::string_view defaultPort;
    const std::string lowered = Lowered(origin);
    std::string_view rest = lowered;
    if (rest.substr(0, 7) == "http://") {
        rest.remove_prefix(7);
        defaultPort = ":80";
    } else if (rest.substr(0, 8) == "https://") {
        rest.remove_prefix(8);
        defaultPort = ":443";
    } else {
        return false;
    }
    if (rest.empty() || host.empty())
        return false;
    return WithoutDefaultPort(std::string(rest), defaultPort) ==
           WithoutDefaultPort(Lowered(host), defaultPort);
}

}  // namespace

bool IsCrossSiteRequest(const char* secFetchSite, const char* origin, const char* host) {
    // Only this very origin, or the user's own navigation ("none"), may act: "same-site" is any
    // other port or subdomain of the host's site, which may run pages nobody here vetted.
    if (secFetchSite != nullptr && strcasecmp(secFetchSite, "same-origin") != 0 &&
        strcasecmp(secFetchSite, "none") != 0)
        return true;
    if (origin == nullptr)
        return false;
    return !OriginNamesHost(origin, host != nullptr ? host : "");
}

}  // namespace harmona::cgi
