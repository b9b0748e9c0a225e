// Repair of text that is not valid UTF-8, so that every reply is valid UTF-8 JSON.
#pragma once

#include <string>
#include <string_view>

namespace harmona::cgi {

// Length of the well-formed UTF-8 sequence that starts at text[i], or 0 when none does (no
// overlong forms, surrogates or values above U+10FFFF; Unicode table 3-7).
std::size_t Utf8SequenceLength(std::string_view text, std::size_t i);

// True when `text` is well-formed UTF-8 (no overlong forms, surrogates or values above U+10FFFF).
bool IsValidUtf8(std::string_view text);

// Each byte that does not start a well-formed sequence becomes U+FFFD.
std::string RepairUtf8(std::string_view text);

// The longest prefix of `text` of at most `maxBytes` bytes that does not end inside a multi-byte
// sequence, so that a cut never makes valid UTF-8 invalid.
std::string_view CutUtf8(std::string_view text, std::size_t maxBytes);

}  // namespace harmona::cgi
