// A text without the blanks at either end, as a view into it: the one trim of every reader of
// conf lines, header values, names and playlists.
#pragma once

#include <string_view>

namespace harmona::util {

// Space and tab: the blanks inside one line.
inline constexpr std::string_view kLineBlanks = " \t";
// Every ASCII white space, line ends included.
inline constexpr std::string_view kAsciiWhiteSpace = " \t\r\n\v\f";

inline std::string_view Trim(std::string_view text, std::string_view blanks = kLineBlanks) {
    const std::size_t first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos)
        return {};
    const std::size_t last = text.find_last_not_of(blanks);
    return text.substr(first, last - first + 1);
}

}  // namespace harmona::util
