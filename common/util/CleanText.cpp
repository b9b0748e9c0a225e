#include "common/util/CleanText.h"

#include <algorithm>

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

bool IsNonCharacter(char32_t code) {
    return (code >= 0xFDD0 && code <= 0xFDEF) || (code & 0xFFFE) == 0xFFFE;
}

}  // namespace

void AppendCleanText(std::string& out, std::string_view text, const TextPolicy& policy,
                     std::size_t maxBytes) {
    std::size_t written = 0;
    for (std::size_t i = 0; i < text.size();) {
        std::size_t length = 1;  // of the input that `clean` stands for
        std::string_view clean;
        if (static_cast<unsigned char>(text[i]) < 0x80) {
            clean = CleanAscii(text, i, policy);
        } else if ((length = Utf8SequenceLength(text, i)) == 0) {
            length = 1;
            clean = CleanInvalid(text, i, policy.invalidUtf8);
        } else if (!policy.dropNonCharacters || !IsNonCharacter(DecodeUtf8(text, i, length))) {
            clean = text.substr(i, length);
        }
        if (clean.size() > maxBytes - written)
            break;
        out.append(clean);
        written += clean.size();
        i += length;
    }
}

std::string CleanText(std::string_view text, const TextPolicy& policy, std::size_t maxBytes) {
    std::string out;
    out.reserve(std::min(text.size(), maxBytes));
    AppendCleanText(out, text, policy, maxBytes);
    return out;
}

}  // namespace harmona::util
