#include "common/util/Number.h"

namespace harmona::util {

bool ParseDecimalDigits(std::string_view text, int64_t& value) {
    constexpr std::size_t kMaxDigits = 18;  // 10^18 - 1 < 2^63
    if (text.empty() || text.size() > kMaxDigits)
        return false;
    int64_t parsed = 0;
    for (const char c : text) {
        if (c < '0' || c > '9')
            return false;
        parsed = parsed * 10 + (c - '0');
    }
    value = parsed;
    return true;
}

}  // namespace harmona::util
