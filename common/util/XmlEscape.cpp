#include "common/util/XmlEscape.h"

#include "common/util/Utf8.h"

namespace harmona::util {
namespace {

// The reference of a character that markup gives a meaning to; nullptr for any other.
const char* MarkupReference(char c) {
    switch (c) {
        case '&':
            return "&amp;";
        case '<':
            return "&lt;";
        case '>':
            return "&gt;";
        case '"':
            return "&quot;";
        case '\'':
            return "&#39;";
        default:
            return nullptr;
    }
}

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

void AppendXmlAscii(std::string& out, char c) {
    if (const char* reference = MarkupReference(c))
        out += reference;
    else if (const char* reference = WhitespaceReference(c))
        out += reference;
    else
        out += static_cast<unsigned char>(c) < 0x20 ? ' ' : c;
}

bool IsNonCharacter(char32_t code) {
    return (code >= 0xFDD0 && code <= 0xFDEF) || (code & 0xFFFE) == 0xFFFE;
}

}  // namespace

void AppendXmlText(std::string& out, std::string_view text) {
    for (std::size_t i = 0; i < text.size();) {
        const char c = text[i];
        if (static_cast<unsigned char>(c) < 0x80) {
            AppendXmlAscii(out, c);
            ++i;
            continue;
        }
        const std::size_t length = Utf8SequenceLength(text, i);
        if (length == 0) {
            out += kReplacementCharacter;
            ++i;
            continue;
        }
        if (!IsNonCharacter(DecodeUtf8(text, i, length)))
            out.append(text.data() + i, length);
        i += length;
    }
}

std::string XmlText(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    AppendXmlText(out, text);
    return out;
}

std::string EscapeMarkup(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        if (const char* reference = MarkupReference(c))
            out += reference;
        else
            out += c;
    }
    return out;
}

}  // namespace harmona::util
