// UTF-8 checking, repair and cutting, for every text that comes from outside (tags, file names,
// requests, the network) and must leave as valid UTF-8.
#pragma once

#include <string>
#include <string_view>

namespace harmona::util {

// U+FFFD REPLACEMENT CHARACTER, which stands for each byte that starts no well-formed sequence.
inline constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";

// Length of the well-formed UTF-8 sequence that starts at text[i], or 0 when none does (no
// overlong forms, surrogates or values above U+10FFFF; Unicode table 3-7).
std::size_t Utf8SequenceLength(std::string_view text, std::size_t i);

// The code point of the well-formed sequence of `length` bytes at text[i] (as
// Utf8SequenceLength measured it).
char32_t DecodeUtf8(std::string_view text, std::size_t i, std::size_t length);

// True when `text` is well-formed UTF-8 (no overlong forms, surrogates or values above U+10FFFF).
bool IsValidUtf8(std::string_view text);

// Each byte that does not start a well-formed sequence becomes U+FFFD.
std::string RepairUtf8(std::string_view text);

// The longest prefix of `text` of at most `maxBytes` bytes that does not end inside a multi-byte
// sequence, so that a cut never makes valid UTF-8 invalid.
std::string_view CutUtf8(std::string_view text, std::size_t maxBytes);

}  // namespace harmona::util
