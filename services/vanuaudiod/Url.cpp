#include "services/vanuaudiod/Url.h"

#include <strings.h>

#include <cstdlib>

namespace harmona::vanuaudiod {

bool SplitHttpUrl(const std::string& url, UrlParts& out) {
    static const char kScheme[] = "http://";
    if (url.size() <= sizeof(kScheme) - 1 || strncasecmp(url.c_str(), kScheme, 7) != 0)
        return false;
    const std::size_t authorityStart = 7;
    std::size_t authorityEnd = url.find_first_of("/?#", authorityStart);
    if (authorityEnd == std::string::npos)
        authorityEnd = url.size();
    const std::string authority = url.substr(authorityStart, authorityEnd - authorityStart);
    if (authority.empty() || authority.find('@') != std::string::npos)
        return false;
    std::string portText;
    if (authority[0] == '[') {
        const std::size_t close = authority.find(']');
        if (close == std::string::npos || close == 1)
            return false;
        out.host = authority.substr(1, close - 1);
        if (close + 1 < authority.size()) {
            if (authority[close + 1] != ':')
                return false;
            portText = authority.substr(close + 2);
        }
    } else {
        const std::size_t colon = authority.find(':');
        out.host = authority.substr(0, colon);
        if (colon != std::string::npos)
            portText = authority.substr(colon + 1);
    }
    if (out.host.empty())
        return false;
    out.port = 80;
    if (!portText.empty()) {
        if (portText.size() > 5 || portText.find_first_not_of("0123456789") != std::string::npos)
            return false;
        const long port = std::strtol(portText.c_str(), nullptr, 10);
        if (port <= 0 || port > 65535)
            return false;
        out.port = static_cast<unsigned short>(port);
    }
    out.pathAndQuery = authorityEnd < url.size() ? url.substr(authorityEnd) : "/";
    if (out.pathAndQuery[0] != '/')
        out.pathAndQuery = "/" + out.pathAndQuery;
    const std::size_t fragment = out.pathAndQuery.find('#');
    if (fragment != std::string::npos)
        out.pathAndQuery.resize(fragment);
    return true;
}

}  // namespace harmona::vanuaudiod
