// Whole numbers read from text that nobody vouches for (URLs, ids, SOAP arguments).
#pragma once

#include <cstdint>
#include <string_view>

namespace harmona::util {

// `text` as a number of 1 to 18 decimal digits and nothing else (no sign, no white space), so
// that it cannot overflow; false for anything else.
bool ParseDecimalDigits(std::string_view text, int64_t& value);

}  // namespace harmona::util
