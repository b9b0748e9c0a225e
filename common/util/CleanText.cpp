#include "common/util/CleanText.h"

#include <algorithm>
#include <array>

#include "common/util/Utf8.h"
#include "common/util/XmlEscape.h"

namespace harmona::util {
namespace {

// The character reference of a control character that XML keeps (tab, LF, CR); nullptr for any
// other.
const char* WhitespaceReference(char c) {
    switch (c) {
        case '\t':
            return "&#9;";
        case '\n':
            return "&#10;";
        case '\r':
            return "&#13;";
        default:
            return nullptr;
    }
}

// What the ASCII byte text[i] becomes.
std::string_view CleanAscii(std::string_view text, std::size_t i, const TextPolicy& policy) {
    const char c = text[i];
    if (policy.markupReferences) {
        if (const char* reference = MarkupReference(c))
            return reference;
        if (const char* reference = WhitespaceReference(c))
            return reference;
    }
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x20 || (byte == 0x7F && policy.deleteIsControl))
        return " ";
    return text.substr(i, 1);
}

// What the byte text[i], which starts no UTF-8 sequence, becomes.
std::string_view CleanInvalid(std::string_view text, std::size_t i, InvalidUtf8 invalid) {
    switch (invalid) {
        case InvalidUtf8::replace:
            return kReplacementCharacter;
        case InvalidUtf8::space:
            return " ";
        case InvalidUtf8::keep:
            break;
    }
    return text.substr(i, 1);
}

// Which ASCII bytes CleanAscii leaves as they are, by [deleteIsControl][markupReferences].
using AsciiTable = std::array<bool, 0x80>;

constexpr AsciiTable StaysAsIs(bool deleteIsControl, bool markupReferences) {
    AsciiTable table{};
    for (int byte = 0x20; byte < 0x80; ++byte) {
        const bool markup =
            byte == '&' || byte == '<' || byte == '>' || byte == '"' || byte == '\'';
        table[byte] = !(byte == 0x7F && deleteIsControl) && !(markup && markupReferences);
    }
    return table;
}

constexpr AsciiTable kStaysAsIs[2][2] = {{StaysAsIs(false, false), StaysAsIs(false, true)},
                                         {StaysAsIs(true, false), StaysAsIs(true, true)}};

bool IsNonCharacter(char32_t code) {
    return (code >= 0xFDD0 && code <= 0xFDEF) || (code & 0xFFFE) == 0xFFFE;
}

}  // namespace

void AppendCleanText(std::string& out, std::string_view text, const TextPolicy& policy,
                     std::size_t maxBytes) {
    const AsciiTable& staysAsIs = kStaysAsIs[policy.deleteIsControl][policy.markupReferences];
    std::size_t written = 0;
    // Bytes that stay as they are go out in runs, [runStart, i), so that plain text costs one
    // append per run rather than one per character.
    std::size_t runStart = 0;
    std::size_t i = 0;
    while (i < text.size()) {
        const auto byte = static_cast<unsigned char>(text[i]);
        if (byte < 0x80 && staysAsIs[byte]) {  // the common case, in short
            if (written == maxBytes)
                break;
            ++written;
            ++i;
            continue;
        }
        std::size_t length = 1;  // of the input that `clean` stands for
        std::string_view clean;
        if (byte < 0x80) {
            clean = CleanAscii(text, i, policy);
        } else if ((length = Utf8SequenceLength(text, i)) == 0) {
            length = 1;
            clean = CleanInvalid(text, i, policy.invalidUtf8);
        } else if (!policy.dropNonCharacters || !IsNonCharacter(DecodeUtf8(text, i, length))) {
            clean = text.substr(i, length);
        }
        if (clean.size() > maxBytes - written)
            break;
        written += clean.size();
        if (clean.data() != text.data() + i) {  // changed: end the run, write the clean form
            out.append(text, runStart, i - runStart);
            out.append(clean);
            runStart = i + length;
        }
        i += length;
    }
    out.append(text, runStart, i - runStart);
}

std::string CleanText(std::string_view text, const TextPolicy& policy, std::size_t maxBytes) {
    std::string out;
    out.reserve(std::min(text.size(), maxBytes));
    AppendCleanText(out, text, policy, maxBytes);
    return out;
}

}  // namespace harmona::util
