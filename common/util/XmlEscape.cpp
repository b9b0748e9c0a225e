#include "common/util/XmlEscape.h"

#include "common/util/CleanText.h"

namespace harmona::util {

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

void AppendXmlText(std::string& out, std::string_view text) {
    AppendCleanText(out, text, kXmlCharacterData);
}

std::string XmlText(std::string_view text) {
    return CleanText(text, kXmlCharacterData);
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
