// The one cleaner of outside text (common/util/CleanText.h): what each policy makes of control
// bytes, DEL, markup, bytes that are not UTF-8 and non-characters, and where a bounded text stops.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "common/util/CleanText.h"
#include "common/util/XmlEscape.h"

using harmona::util::AppendCleanText;
using harmona::util::CleanText;
using harmona::util::kPrintableUtf8;
using harmona::util::kSingleLine;
using harmona::util::kXmlCharacterData;

namespace {

const std::string kFffd = "\xEF\xBF\xBD";

// One input and what each policy makes of it.
struct Row {
    const char* what;
    std::string input;
    std::string xml;        // kXmlCharacterData
    std::string line;       // kSingleLine
    std::string printable;  // kPrintableUtf8
};

const std::vector<Row>& Table() {
    static const std::vector<Row> rows = {
        {"plain UTF-8", "Björk – ✓ 𝄞", "Björk – ✓ 𝄞", "Björk – ✓ 𝄞", "Björk – ✓ 𝄞"},
        {"empty", "", "", "", ""},
        {"C0 controls and NUL", std::string("a\x01x\x1f y\0z", 8), "a x  y z", "a x  y z",
         "a x  y z"},
        {"tab, LF, CR", "a\tb\nc\rd", "a&#9;b&#10;c&#13;d", "a b c d", "a b c d"},
        {"DEL", "a\x7fz", "a\x7fz", "a z", "a z"},
        {"markup", "a&b<c>d\"e'f", "a&amp;b&lt;c&gt;d&quot;e&#39;f", "a&b<c>d\"e'f",
         "a&b<c>d\"e'f"},
        {"a byte that starts nothing", "a\xFFz", "a" + kFffd + "z", "a\xFFz", "a z"},
        {"truncated sequence", "\xC3", kFffd, "\xC3", " "},
        {"overlong", "\xC0\xAF", kFffd + kFffd, "\xC0\xAF", "  "},
        {"surrogate", "\xED\xA0\x80", kFffd + kFffd + kFffd, "\xED\xA0\x80", "   "},
        {"lone continuation bytes", "\x80\x80", kFffd + kFffd, "\x80\x80", "  "},
        {"non-characters U+FFFE and U+FDD0", "a\xEF\xBF\xBEz\xEF\xB7\x90y", "azy",
         "a\xEF\xBF\xBEz\xEF\xB7\x90y", "a\xEF\xBF\xBEz\xEF\xB7\x90y"},
        {"U+FDCF is a character", "\xEF\xB7\x8F", "\xEF\xB7\x8F", "\xEF\xB7\x8F", "\xEF\xB7\x8F"},
    };
    return rows;
}

TEST(CleanText, EachPolicyCleansTheTableAsItsColumnSays) {
    for (const Row& row : Table()) {
        SCOPED_TRACE(row.what);
        EXPECT_EQ(CleanText(row.input, kXmlCharacterData), row.xml);
        EXPECT_EQ(CleanText(row.input, kSingleLine), row.line);
        EXPECT_EQ(CleanText(row.input, kPrintableUtf8), row.printable);
    }
}

TEST(CleanText, XmlTextIsTheXmlCharacterDataPolicy) {
    for (const Row& row : Table()) {
        SCOPED_TRACE(row.what);
        EXPECT_EQ(harmona::util::XmlText(row.input), row.xml);
        std::string appended = "<";
        harmona::util::AppendXmlText(appended, row.input);
        EXPECT_EQ(appended, "<" + row.xml);
    }
}

TEST(CleanText, ABoundStopsBeforeTheFirstCharacterThatWouldPassIt) {
    const std::string name = "\xC3\xBC\xC3\xBC\xC3\xBC";  // three two-byte characters
    EXPECT_EQ(CleanText(name, kPrintableUtf8, 5), "\xC3\xBC\xC3\xBC");
    EXPECT_EQ(CleanText(name, kPrintableUtf8, 6), name);
    EXPECT_EQ(CleanText(name, kSingleLine, 1), "");
    // The cleaned form counts: a reference or U+FFFD takes its whole length or nothing.
    EXPECT_EQ(CleanText("a&b", kXmlCharacterData, 5), "a");
    EXPECT_EQ(CleanText("a&b", kXmlCharacterData, 6), "a&amp;");
    EXPECT_EQ(CleanText("a\xFF", kXmlCharacterData, 3), "a");
    EXPECT_EQ(CleanText("a\xFF", kXmlCharacterData, 4), "a" + kFffd);
    // A byte that starts nothing is one byte long under the other two policies.
    EXPECT_EQ(CleanText("a\x80\x80", kPrintableUtf8, 2), "a ");
    EXPECT_EQ(CleanText("a\x80\x80", kSingleLine, 2), "a\x80");
    EXPECT_EQ(CleanText("abc", kSingleLine, 0), "");
}

TEST(CleanText, AppendingKeepsWhatTheTextHeldAndBoundsOnlyTheAppendedPart) {
    std::string out = "abcdef";
    AppendCleanText(out, "gh\x01i", kSingleLine, 3);
    EXPECT_EQ(out, "abcdefgh ");
}

}  // namespace
