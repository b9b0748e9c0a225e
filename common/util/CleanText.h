// Text from outside (tags, file names, the network) made fit for where it goes: control bytes
// become spaces, and a policy says what becomes of bytes that are not UTF-8, of DEL, of markup and
// of non-characters. Every cleaner of such text in the code base is this one with its policy.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace harmona::util {

// What becomes of a byte that starts no well-formed UTF-8 sequence (Utf8SequenceLength).
enum class InvalidUtf8 { keep, replace, space };  // replace: U+FFFD

struct TextPolicy {
    InvalidUtf8 invalidUtf8;
    // DEL (0x7F) becomes a space like the C0 controls; else it stays (XML 1.0 allows it).
    bool deleteIsControl;
    // & < > " ' and tab, LF and CR written as references (so that an attribute keeps tab, LF and
    // CR through the receiver's normalisation); else tab, LF and CR become spaces like the other
    // controls, and & < > " ' stay.
    bool markupReferences;
    // The non-characters (U+FFFE, U+FFFF, U+FDD0..U+FDEF and the last two code points of every
    // plane) are dropped, since strict XML parsers reject them.
    bool dropNonCharacters;
};

// XML 1.0 character data, fit for an element or an attribute in either quote: always well-formed.
inline constexpr TextPolicy kXmlCharacterData{InvalidUtf8::replace, false, true, true};
// One line of a text file: no control byte and no DEL, every other byte as it came, UTF-8 or not.
inline constexpr TextPolicy kSingleLine{InvalidUtf8::keep, true, false, false};
// Printable UTF-8: bytes that are not UTF-8, control bytes and DEL all become spaces.
inline constexpr TextPolicy kPrintableUtf8{InvalidUtf8::space, true, false, false};

// Appends `text` cleaned by `policy`, at most `maxBytes` of it: the output stops before the first
// character whose cleaned form would pass that, so it never ends inside a character.
void AppendCleanText(std::string& out, std::string_view text, const TextPolicy& policy,
                     std::size_t maxBytes = std::string_view::npos);
std::string CleanText(std::string_view text, const TextPolicy& policy,
                      std::size_t maxBytes = std::string_view::npos);

}  // namespace harmona::util
