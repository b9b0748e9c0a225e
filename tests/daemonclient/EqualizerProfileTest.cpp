// The equalizer profile lookup, in the test process, with real profile files and a real
// audio.conf at their fixed paths inside the sandbox.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "src/daemonclient/AudioDaemon.h"
#include "tests/daemonclient/DaemonTestSupport.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

constexpr const char* kSystemProfiles = "/var/packages/Harmona/target/etc/equalizer.system";
constexpr const char* kUserProfiles = "/var/packages/Harmona/etc/equalizer.user";
const std::string kSystemFailed =
    "ctrl:603 Failed to open the system EQ profile "
    "[/var/packages/Harmona/target/etc/equalizer.system].";

class EqualizerProfile : public ::testing::Test {
  protected:
    void SetUp() override { TakeLogLines(); }

    // Looks `label` up in a profile file holding `content`.
    int Lookup(const std::string& content, const char* label, int size = 1024) {
        WriteFile("/tmp/profiles", content);
        std::memset(value, 'x', sizeof(value));
        return LoadEqualizerProfile("/tmp/profiles", label, value, size);
    }

    char value[1024];
};

// ---- LoadEqualizerProfile ----

TEST_F(EqualizerProfile, EmptyLineBeforeTheWantedProfileFailsWithTheIllegalMessage) {
    EXPECT_EQ(Lookup("Pop:1 1\n\nRock:1.0 2.0\n", "Rock"), -1);
    EXPECT_EQ(LoggedMessages(),
              std::vector<std::string>{"ctrl:546 The EQ profile [\n] is illegal."});
}

TEST_F(EqualizerProfile, LineWithoutColonIsLoggedAsReadWithItsNewline) {
    EXPECT_EQ(Lookup("Jazz 1 2 3\nRock:1\n", "Rock"), -1);
    EXPECT_EQ(LoggedMessages(),
              std::vector<std::string>{"ctrl:546 The EQ profile [Jazz 1 2 3\n] is illegal."});
}

TEST_F(EqualizerProfile, RockLineYieldsItsValueWithoutTheNewline) {
    EXPECT_EQ(Lookup("Pop:0 0\nRock:1.0 2.0\n", "Rock"), 1);
    EXPECT_STREQ(value, "1.0 2.0");
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, LongerLabelBeginningWithTheLinesLabelMatchesToo) {
    EXPECT_EQ(Lookup("Rock:1.0 2.0\n", "Rockabilly"), 1);
    EXPECT_STREQ(value, "1.0 2.0");
}

TEST_F(EqualizerProfile, ShorterLabelDoesNotMatchALongerLineLabel) {
    EXPECT_EQ(Lookup("Rockabilly:9 9\nRock:1 1\n", "Rock"), 1);
    EXPECT_STREQ(value, "1 1");
    EXPECT_EQ(Lookup("Rockabilly:9 9\n", "Rock"), 0);
}

TEST_F(EqualizerProfile, EmptyLabelOfALineMatchesAnyLabel) {
    EXPECT_EQ(Lookup(":5 5\nRock:1 1\n", "Rock"), 1);
    EXPECT_STREQ(value, "5 5");
}

TEST_F(EqualizerProfile, LabelIsEverythingBeforeTheLastColon) {
    EXPECT_EQ(Lookup("Live:Concert: 3 4 \n", "Live:Concert"), 1);
    EXPECT_STREQ(value, "3 4");
    // "Live" is compared over the line's label "Live:Concert": no match.
    EXPECT_EQ(Lookup("Live:Concert:3 4\n", "Live"), 0);
}

TEST_F(EqualizerProfile, FirstMatchingLineWins) {
    EXPECT_EQ(Lookup("Rock:1\nRock:2\n", "Rock"), 1);
    EXPECT_STREQ(value, "1");
}

TEST_F(EqualizerProfile, LabelNotInTheFileGivesZero) {
    EXPECT_EQ(Lookup("Pop:1\nRock:2", "Jazz"), 0);
    EXPECT_EQ(Lookup("", "Jazz"), 0);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, LastLineWithoutNewlineIsRead) {
    EXPECT_EQ(Lookup("Pop:1\nRock:  7 8", "Rock"), 1);
    EXPECT_STREQ(value, "7 8");
}

TEST_F(EqualizerProfile, MissingFileGivesMinusOneWithoutLogLine) {
    char out[16];
    EXPECT_EQ(LoadEqualizerProfile("/tmp/no-such-file", "Rock", out, sizeof(out)), -1);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, ValueIsCutToTheBufferSizeThenTrimmed) {
    EXPECT_EQ(Lookup("Rock: 1.0 2.0 3.0\n", "Rock", 6), 1);
    EXPECT_STREQ(value, "1.0");  // " 1.0 " cut to 5 characters, then trimmed
    EXPECT_EQ(value[6], 'x');    // nothing written beyond the size
}

TEST_F(EqualizerProfile, LinesAreReadIn1023CharacterPieces) {
    // A line longer than the buffer: its first 1023 characters hold no colon, so it is illegal.
    const std::string longLine = std::string(1100, 'a') + ":1\n";
    EXPECT_EQ(Lookup(longLine, "a"), -1);
    const std::vector<std::string> log = LoggedMessages();
    ASSERT_EQ(log.size(), 1u);
    EXPECT_EQ(log[0], "ctrl:546 The EQ profile [" + std::string(1023, 'a') + "] is illegal.");
    // A value at the very end of a 1023-character line is still found.
    const std::string fits = "Rock:" + std::string(1017, 'v') + "\n";
    EXPECT_EQ(Lookup(fits, "Rock"), 1);
    EXPECT_EQ(std::string(value), std::string(1017, 'v'));
}

TEST_F(EqualizerProfile, BadArgumentsFailWithoutTouchingAnything) {
    WriteFile("/tmp/profiles", "Rock:1\n");
    char out[8] = "keep";
    EXPECT_EQ(LoadEqualizerProfile(nullptr, "Rock", out, sizeof(out)), -1);
    EXPECT_EQ(LoadEqualizerProfile("/tmp/profiles", nullptr, out, sizeof(out)), -1);
    EXPECT_EQ(LoadEqualizerProfile("/tmp/profiles", "Rock", nullptr, 8), -1);
    EXPECT_EQ(LoadEqualizerProfile("/tmp/profiles", "Rock", out, 0), -1);
    EXPECT_STREQ(out, "keep");
}

// ---- GetDefaultEqualizerProfile ----

TEST_F(EqualizerProfile, EnableSetToCapitalYesReadsNoProfileAndGivesZero) {
    WriteFile(kAudioConf, "audio_enable_equalizer=Yes\naudio_default_equalizer=Rock\n");
    // No profile file exists: reading the system file would fail and log.
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, EqualizerOffOrUnsetGivesZero) {
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);  // no audio.conf at all
    WriteFile(kAudioConf, "audio_default_equalizer=Rock\n");
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);
    WriteFile(kAudioConf, "audio_enable_equalizer=no\naudio_default_equalizer=Rock\n");
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);
    WriteFile(kAudioConf, "audio_enable_equalizer=yes \n");  // no default label
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, SystemProfileIsFoundAndShadowsTheUserProfile) {
    WriteFile(kAudioConf, "audio_enable_equalizer=yes\naudio_default_equalizer=Rock\n");
    WriteFile(kSystemProfiles, "Pop:0 0\nRock:1 2 3\n");
    WriteFile(kUserProfiles, "Rock:9 9 9\n");
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 1);
    EXPECT_STREQ(out, "1 2 3");
}

TEST_F(EqualizerProfile, UserProfileIsReadWhenTheSystemFileLacksTheLabel) {
    WriteFile(kAudioConf, "audio_enable_equalizer=\"yes\"\naudio_default_equalizer=Mine\n");
    WriteFile(kSystemProfiles, "Pop:0 0\n");
    WriteFile(kUserProfiles, "Other:1\nMine: 4 5 6\n");
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 1);
    EXPECT_STREQ(out, "4 5 6");
    WriteFile(kUserProfiles, "Other:1\n");
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), 0);
    std::remove(kUserProfiles);
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), -1);  // no further log line
    EXPECT_TRUE(LoggedMessages().empty());
}

TEST_F(EqualizerProfile, MissingSystemFileIsLoggedAndTheUserFileIsNotRead) {
    WriteFile(kAudioConf, "audio_enable_equalizer=yes\naudio_default_equalizer=Rock\n");
    WriteFile(kUserProfiles, "Rock:1\n");
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), -1);
    EXPECT_EQ(LoggedMessages(), std::vector<std::string>{kSystemFailed});
}

TEST_F(EqualizerProfile, IllegalSystemFileIsLoggedWithTheSameWords) {
    WriteFile(kAudioConf, "audio_enable_equalizer=yes\naudio_default_equalizer=Rock\n");
    WriteFile(kSystemProfiles, "garbage\n");
    char out[64];
    EXPECT_EQ(GetDefaultEqualizerProfile(out, sizeof(out)), -1);
    EXPECT_EQ(LoggedMessages(),
              (std::vector<std::string>{"ctrl:546 The EQ profile [garbage\n] is illegal.",
                                        kSystemFailed}));
}

}  // namespace
