// XML character data and HTML display text (common/util/XmlEscape.h): what each escaper writes
// for markup, white space, control bytes, bytes that are not UTF-8 and non-characters.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include "common/util/XmlEscape.h"

using harmona::util::EscapeMarkup;
using harmona::util::XmlText;

namespace {

const std::string kFffd = "\xEF\xBF\xBD";

// `escaped` parses back to `expected` in an element and in attributes of either quote.
void ExpectParsesBackTo(const std::string& escaped, const std::string& expected) {
    const std::string document = "<v a=\"" + escaped + "\" b='" + escaped + "'>" + escaped + "</v>";
    pugi::xml_document doc;
    ASSERT_TRUE(doc.load_string(document.c_str())) << document;
    EXPECT_EQ(doc.child("v").text().get(), expected);
    EXPECT_EQ(doc.child("v").attribute("a").value(), expected);
    EXPECT_EQ(doc.child("v").attribute("b").value(), expected);
}

TEST(MarkupEscaping, XmlTextEscapesMarkupAndKeepsUtf8) {
    EXPECT_EQ(XmlText("a&b<c>d\"e'f"), "a&amp;b&lt;c&gt;d&quot;e&#39;f");
    EXPECT_EQ(XmlText("Björk – ✓ 𝄞"), "Björk – ✓ 𝄞");
    EXPECT_EQ(XmlText(""), "");
}

TEST(MarkupEscaping, XmlTextWritesTabLineFeedAndCarriageReturnAsCharacterReferences) {
    EXPECT_EQ(XmlText("a\r\nb\tc"), "a&#13;&#10;b&#9;c");
    ExpectParsesBackTo(XmlText("a\r\nb\tc"), "a\r\nb\tc");
}

TEST(MarkupEscaping, XmlTextTurnsOtherControlBytesIntoSpaces) {
    EXPECT_EQ(XmlText(std::string("a\x01"
                                  "b\x1f"
                                  "c\0d",
                                  7)),
              "a b c d");
    EXPECT_EQ(XmlText("a\x7f"
                      "b"),
              "a\x7f"
              "b");  // DEL is a character XML 1.0 allows
}

TEST(MarkupEscaping, XmlTextReplacesEachByteThatStartsNoUtf8Sequence) {
    EXPECT_EQ(XmlText("a\xFF"
                      "b"),
              "a" + kFffd + "b");
    EXPECT_EQ(XmlText("\xC3"), kFffd);                          // truncated
    EXPECT_EQ(XmlText("\xC0\xAF"), kFffd + kFffd);              // overlong
    EXPECT_EQ(XmlText("\xED\xA0\x80"), kFffd + kFffd + kFffd);  // surrogate
}

TEST(MarkupEscaping, XmlTextDropsNonCharacters) {
    EXPECT_EQ(XmlText("a\xEF\xBF\xBE"
                      "b\xEF\xBF\xBF"
                      "c"),
              "abc");  // U+FFFE, U+FFFF
    EXPECT_EQ(XmlText("a\xEF\xB7\x90"
                      "b\xEF\xB7\xAF"
                      "c"),
              "abc");  // U+FDD0, U+FDEF
    EXPECT_EQ(XmlText("a\xF0\x9F\xBF\xBE"
                      "b\xF4\x8F\xBF\xBF"
                      "c"),
              "abc");                                    // U+1FFFE, U+10FFFF
    EXPECT_EQ(XmlText("\xEF\xB7\x8F"), "\xEF\xB7\x8F");  // U+FDCF stays
}

TEST(MarkupEscaping, XmlTextOfAnyBytesIsWellFormedXml) {
    std::string everyByte;
    for (int byte = 0; byte < 256; ++byte)
        everyByte += static_cast<char>(byte);
    const std::string document =
        "<v a=\"" + XmlText(everyByte) + "\">" + XmlText(everyByte) + "</v>";
    pugi::xml_document doc;
    EXPECT_TRUE(doc.load_string(document.c_str())) << document;
}

TEST(MarkupEscaping, EscapeMarkupChangesTheFiveSpecialCharactersOnly) {
    EXPECT_EQ(EscapeMarkup("a&b<c>d\"e'f"), "a&amp;b&lt;c&gt;d&quot;e&#39;f");
    const std::string untouched = std::string("\r\n\t\x01\xFF\xEF\xBF\xBE Björk", 13);
    EXPECT_EQ(EscapeMarkup(untouched), untouched);
    EXPECT_EQ(EscapeMarkup(""), "");
}

}  // namespace
