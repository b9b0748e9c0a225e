// Percent-encoding of one part of a URL or an id: every byte outside the unreserved characters
// [A-Za-z0-9._~-] written as "%" and two upper-case hex digits, and its strict reverse. The media
// server's object ids and the query values that library.cgi writes into its own paths use it.
// (Form values, where "+" is a space and a bad escape is kept, are read by platform/cgi.)
#pragma once

#include <string>
#include <string_view>

#include "common/util/HexDigit.h"

namespace harmona::util {

constexpr bool IsUnreservedUrlByte(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '.' ||
           c == '_' || c == '~' || c == '-';
}

inline std::string PercentEncode(std::string_view text) {
    static constexpr char kHex[] = "0123456789ABCDEF";
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        if (IsUnreservedUrlByte(c)) {
            out += c;
        } else {
            const auto byte = static_cast<unsigned char>(c);
            out += '%';
            out += kHex[byte >> 4];
            out += kHex[byte & 15];
        }
    }
    return out;
}

// `text` with every "%XX" (either case) as its byte, into `out`; false when a "%" is not followed
// by two hex digits. Any other byte stands for itself.
inline bool PercentDecode(std::string_view text, std::string* out) {
    out->clear();
    out->reserve(text.size());
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '%') {
            out->push_back(text[i]);
            continue;
        }
        if (i + 2 >= text.size())
            return false;
        const int byte = HexByteValue(text[i + 1], text[i + 2]);
        if (byte < 0)
            return false;
        out->push_back(static_cast<char>(byte));
        i += 2;
    }
    return true;
}

}  // namespace harmona::util
