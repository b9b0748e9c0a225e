// The conf line syntax (platform/README.md, "Conf files").
#include <gtest/gtest.h>

#include <fcntl.h>
#include <sys/stat.h>

#include <string>
#include <vector>

#include "platform/conf/ConfFile.h"
#include "tests/harness/Fixtures.h"

using harmona::conf::ConfVisitor;
using harmona::conf::LookupConf;
using harmona::conf::ParseConf;
using harmona::conf::ReadConf;
using harmona::conf::ReadResult;

namespace {

// Records what the reader reports, as "[section]" and "key=value" strings.
class Recorder : public ConfVisitor {
  public:
    void Section(std::string_view name) override {
        events.push_back("[" + std::string(name) + "]");
    }
    void Entry(std::string_view key, std::string_view value) override {
        events.push_back(std::string(key) + "=" + std::string(value));
    }
    std::vector<std::string> events;
};

std::vector<std::string> Parse(std::string_view text) {
    Recorder recorder;
    ParseConf(text, recorder);
    return recorder.events;
}

using Events = std::vector<std::string>;

TEST(ConfSyntax, SectionsAndKeysInFileOrder) {
    EXPECT_EQ(Parse("top=1\n[a]\nx=2\n[b]\ny=3\n"), (Events{"top=1", "[a]", "x=2", "[b]", "y=3"}));
}

TEST(ConfSyntax, SectionNameIsBetweenFirstOpenAndLastCloseBracket) {
    EXPECT_EQ(Parse("[my [odd] name]\n"), (Events{"[my [odd] name]"}));
    EXPECT_EQ(Parse("  [ spaced ]  \n"), (Events{"[ spaced ]"}));
    EXPECT_EQ(Parse("[]\n"), (Events{"[]"}));
}

TEST(ConfSyntax, WhiteSpaceAroundKeyAndValueIsDropped) {
    EXPECT_EQ(Parse("  key  =  some value \t\n"), (Events{"key=some value"}));
}

TEST(ConfSyntax, QuotedValueLosesOnlyTheEnclosingQuotes) {
    EXPECT_EQ(Parse("a=\"quoted \\n \"inner\" \"\n"), (Events{"a=quoted \\n \"inner\" "}));
    EXPECT_EQ(Parse("a=\"\n"), (Events{"a=\""}));
    EXPECT_EQ(Parse("a=\"\"\n"), (Events{"a="}));
    EXPECT_EQ(Parse("a=\"half\n"), (Events{"a=\"half"}));
}

TEST(ConfSyntax, ValueMayHoldEqualsSigns) {
    EXPECT_EQ(Parse("k=a=b\n"), (Events{"k=a=b"}));
}

TEST(ConfSyntax, KeyMayHoldSpaces) {
    EXPECT_EQ(Parse("Could not get the entry=Nope\n"), (Events{"Could not get the entry=Nope"}));
}

TEST(ConfSyntax, CommentsEmptyAndOtherLinesAreIgnored) {
    EXPECT_EQ(Parse("# c\n ; c\n\n   \nno equals here\n=novalue\nk=v\n"), (Events{"k=v"}));
}

TEST(ConfSyntax, LastLineWithoutNewlineCounts) {
    EXPECT_EQ(Parse("a=1\nb=2"), (Events{"a=1", "b=2"}));
}

TEST(ConfSyntax, CrLfLineEnds) {
    EXPECT_EQ(Parse("[s]\r\na=1\r\nb=\"2\"\r\n"), (Events{"[s]", "a=1", "b=2"}));
}

TEST(ConfSyntax, ByteOrderMarkIsSkipped) {
    EXPECT_EQ(Parse("\xEF\xBB\xBF[s]\nk=v\n"), (Events{"[s]", "k=v"}));
    // Only at the start of the file.
    EXPECT_EQ(Parse("k=\xEF\xBB\xBFv\n"), (Events{"k=\xEF\xBB\xBFv"}));
}

TEST(ConfSyntax, OverlongLineIsPassedOverWhole) {
    const std::string longLine = "k=" + std::string(harmona::conf::kMaxLineBytes + 10, 'x');
    EXPECT_EQ(Parse("a=1\n" + longLine + "\nb=2\n"), (Events{"a=1", "b=2"}));
}

TEST(ConfFileRead, MissingUnreadableAndDirectory) {
    Recorder recorder;
    EXPECT_EQ(ReadConf("/tmp/none/such.conf", recorder), ReadResult::missing);
    harmona::test::MakeDirs("/tmp/adir");
    EXPECT_EQ(ReadConf("/tmp/adir", recorder), ReadResult::unreadable);
    EXPECT_EQ(ReadConf(nullptr, recorder), ReadResult::missing);
    EXPECT_TRUE(recorder.events.empty());
}

TEST(ConfFileRead, FifoIsRefusedWithoutBlocking) {
    ASSERT_EQ(mkfifo("/tmp/fifo.conf", 0644), 0);
    Recorder recorder;
    EXPECT_EQ(ReadConf("/tmp/fifo.conf", recorder), ReadResult::unreadable);
}

TEST(ConfFileRead, FileWithBomAndCrLfReadsLikeText) {
    harmona::test::WriteFile("/tmp/a.conf", "\xEF\xBB\xBF[u]\r\npermission=5\r\n");
    Recorder recorder;
    EXPECT_EQ(ReadConf("/tmp/a.conf", recorder), ReadResult::ok);
    EXPECT_EQ(recorder.events, (Events{"[u]", "permission=5"}));
}

TEST(ConfFileRead, OnlyTheFirstBytesOfAHugeFileAreRead) {
    std::string big = "[s]\nfirst=1\n";
    big += std::string(harmona::conf::kMaxConfBytes, '#');
    big += "\nlast=2\n";
    harmona::test::WriteFile("/tmp/big.conf", big);
    EXPECT_EQ(LookupConf("/tmp/big.conf", "s", "first"), "1");
    EXPECT_EQ(LookupConf("/tmp/big.conf", "s", "last"), std::nullopt);
}

TEST(ConfLookup, LastOccurrenceWinsAndSectionsCompareExactly) {
    harmona::test::WriteFile("/tmp/l.conf",
                             "k=global\n[User]\nk=1\n[user]\nk=2\nk=3\n[User]\nk=4\n");
    EXPECT_EQ(LookupConf("/tmp/l.conf", std::nullopt, "k"), "global");
    EXPECT_EQ(LookupConf("/tmp/l.conf", "user", "k"), "3");
    EXPECT_EQ(LookupConf("/tmp/l.conf", "User", "k"), "4");
    EXPECT_EQ(LookupConf("/tmp/l.conf", "USER", "k"), std::nullopt);
    EXPECT_EQ(LookupConf("/tmp/l.conf", "user", "K"), std::nullopt);
}

TEST(ConfFileRead, BinaryGarbageIsSurvived) {
    std::string garbage;
    for (int i = 0; i < 200000; ++i)
        garbage.push_back(static_cast<char>((i * 7919) & 0xff));
    garbage += "\n[s]\nk=v\n";
    harmona::test::WriteFile("/tmp/g.conf", garbage);
    EXPECT_EQ(LookupConf("/tmp/g.conf", "s", "k"), "v");
}

}  // namespace
