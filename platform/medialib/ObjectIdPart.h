// One part of a local media server object id ("album:<artist>/<album>", "folder:<a>/<b>"): every
// byte outside [A-Za-z0-9._~-] percent-encoded with upper-case hex. The media server writes its ids
// so and library.cgi builds the same ids from library.db, so the two must encode alike.
#pragma once

#include <string>
#include <string_view>

#include "common/util/PercentEncoding.h"

namespace harmona::medialib {

inline std::string EscapeIdPart(std::string_view text) {
    return util::PercentEncode(text);
}

// The reverse; false on a malformed "%" sequence.
inline bool UnescapeIdPart(std::string_view text, std::string* out) {
    return util::PercentDecode(text, out);
}

}  // namespace harmona::medialib
