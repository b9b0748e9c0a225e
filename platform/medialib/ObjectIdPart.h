// One part of a local media server object id ("album:<artist>/<album>", "folder:<a>/<b>"): every
// byte outside [A-Za-z0-9._~-] percent-encoded with upper-case hex. The media server writes its ids
// so and library.cgi builds the same ids from library.db, so the two must encode alike.
#pragma once

#include <string>
#include <string_view>

namespace harmona::medialib {

inline std::string EscapeIdPart(std::string_view text) {
    static constexpr char kHex[] = "0123456789ABCDEF";
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        const bool unreserved = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
                                (c >= '0' && c <= '9') || c == '.' || c == '_' || c == '~' ||
                                c == '-';
        if (unreserved) {
            out += c;
        } else {
            out += '%';
            out += kHex[byte >> 4];
            out += kHex[byte & 15];
        }
    }
    return out;
}

}  // namespace harmona::medialib
