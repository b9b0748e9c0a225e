// Escaping of text for markup: XML 1.0 character data (SOAP bodies, DIDL-Lite, device
// descriptions) and HTML display text.
#pragma once

#include <string>
#include <string_view>

namespace harmona::util {

// Appends `text` as XML 1.0 character data, fit for an element or an attribute in either quote:
// & < > " ' as references, tab, LF and CR as character references (so that an attribute keeps
// them through the receiver's normalisation); bytes that do not start a well-formed UTF-8
// sequence become U+FFFD; the other C0 controls become spaces; the non-characters (U+FFFE,
// U+FFFF, U+FDD0..U+FDEF and the last two code points of every plane) are dropped, since strict
// XML parsers reject them. The result is always well-formed XML text. This is CleanText with the
// policy kXmlCharacterData (CleanText.h).
void AppendXmlText(std::string& out, std::string_view text);
std::string XmlText(std::string_view text);

// The reference of a character that markup gives a meaning to (& < > " ', ' as "&#39;"); nullptr
// for any other.
const char* MarkupReference(char c);

// & < > " ' as references (' as "&#39;", which HTML 4 knows too), every other byte as it is:
// display text for HTML, and markup that must carry its bytes unchanged (a test server that
// sends what a faulty peer would).
std::string EscapeMarkup(std::string_view text);

}  // namespace harmona::util
