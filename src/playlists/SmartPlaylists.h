// The order of smart playlist names in the listing.
#pragma once

#include <strings.h>

#include <string>

// Name a goes before name b when strcasecmp(a, b) < 0: ASCII letters folded to lower case, then
// byte order. Names equal ignoring case are tied; the listing sorts stably, so tied names keep
// their enumeration order and none is merged away (Jazz and jazz both give nodes).
struct SmartPlaylistNameOrder {
    bool operator()(const std::string& a, const std::string& b) const {
        return strcasecmp(a.c_str(), b.c_str()) < 0;
    }
};
