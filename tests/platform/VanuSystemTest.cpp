// The system helpers that the equalizer profile lookup and the root tree call (platform/README.md,
// "System configuration, shares and services"): audio.conf lookup, the audio share, service
// status and the CORX string and file helpers, against real files at their fixed paths inside the
// sandbox.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <vector>

#include "platform/system/VanuSystem.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

TEST(SystemConfiguration, ConfGetCopiesTheValueAndReturnsItsLength) {
    WriteFile(kAudioConf, "# comment\naudio_default_equalizer = Rock \n[section]\nother=1\n");
    char buffer[64];
    EXPECT_EQ(VANUAudioConfGet("audio_default_equalizer", buffer, sizeof(buffer)), 4);
    EXPECT_STREQ(buffer, "Rock");
}

TEST(SystemConfiguration, ConfGetReadsOnlyKeysOutsideSections) {
    WriteFile(kAudioConf, "[section]\naudio_default_equalizer=Rock\n");
    char buffer[64] = "keep";
    EXPECT_EQ(VANUAudioConfGet("audio_default_equalizer", buffer, sizeof(buffer)), 0);
    EXPECT_STREQ(buffer, "keep");
}

TEST(SystemConfiguration, ConfGetCutsToTheBufferButReturnsTheFullLength) {
    WriteFile(kAudioConf, "key=\"abcdefghij\"\n");
    char buffer[5];
    EXPECT_EQ(VANUAudioConfGet("key", buffer, sizeof(buffer)), 10);
    EXPECT_STREQ(buffer, "abcd");
    char one[1];
    EXPECT_EQ(VANUAudioConfGet("key", one, 1), 10);
    EXPECT_STREQ(one, "");
}

TEST(SystemConfiguration, ConfGetGivesZeroForAbsentOrEmptyValuesAndAMissingFile) {
    char buffer[16];
    EXPECT_EQ(VANUAudioConfGet("key", buffer, sizeof(buffer)), 0);  // no file
    WriteFile(kAudioConf, "key=\nquoted=\"\"\n");
    EXPECT_EQ(VANUAudioConfGet("key", buffer, sizeof(buffer)), 0);
    EXPECT_EQ(VANUAudioConfGet("quoted", buffer, sizeof(buffer)), 0);
    EXPECT_EQ(VANUAudioConfGet("absent", buffer, sizeof(buffer)), 0);
}

TEST(SystemConfiguration, ConfGetRefusesBadArgumentsAndAnUnreadableFile) {
    WriteFile(kAudioConf, "key=1\n");
    char buffer[16];
    EXPECT_EQ(VANUAudioConfGet(nullptr, buffer, sizeof(buffer)), -1);
    EXPECT_EQ(VANUAudioConfGet("key", nullptr, 16), -1);
    EXPECT_EQ(VANUAudioConfGet("key", buffer, 0), -1);
    EXPECT_EQ(VANUAudioConfGet("key", buffer, -1), -1);
    ASSERT_EQ(std::remove(kAudioConf), 0);
    ASSERT_EQ(mkdir(kAudioConf, 0755), 0);  // a folder where the file should be
    EXPECT_EQ(VANUAudioConfGet("key", buffer, sizeof(buffer)), -1);
}

TEST(SystemConfiguration, ConfGetLastOfTwoEqualKeysCounts) {
    WriteFile(kAudioConf, "\xEF\xBB\xBFkey=first\r\nkey=second\r\n");
    char buffer[16];
    EXPECT_EQ(VANUAudioConfGet("key", buffer, sizeof(buffer)), 6);
    EXPECT_STREQ(buffer, "second");
}

TEST(SystemConfiguration, TrimSpaceRemovesWhiteSpaceAroundInPlace) {
    struct Case {
        const char* text;
        const char* trimmed;
    };
    for (const Case& c : {Case{" \t 1.0 2.0 \r\n", "1.0 2.0"}, Case{" \n\t ", ""}, Case{"", ""},
                          Case{"a  b", "a  b"}}) {
        std::vector<char> text(c.text, c.text + std::strlen(c.text) + 1);
        EXPECT_GE(CORXStrTrimSpace(text.data(), 0), 0) << c.text;
        EXPECT_STREQ(text.data(), c.trimmed);
    }
    EXPECT_LT(CORXStrTrimSpace(nullptr, 0), 0);
}

TEST(SystemConfiguration, FileExistFollowsStat) {
    EXPECT_EQ(CORXFileExist("/tmp/none"), 0);
    EXPECT_EQ(CORXFileExist(nullptr), 0);
    WriteFile("/tmp/some", "x");
    EXPECT_NE(CORXFileExist("/tmp/some"), 0);
    EXPECT_NE(CORXFileExist("/tmp"), 0);
}

TEST(SystemConfiguration, HasShareLooksAtTheDefaultShareFolder) {
    EXPECT_EQ(VANUAudioHasShare(), 0);
    WriteFile("/volume1/music", "a file, not a folder");
    EXPECT_EQ(VANUAudioHasShare(), 0);
    std::remove("/volume1/music");
    MakeDirs("/volume1/music");
    EXPECT_NE(VANUAudioHasShare(), 0);
}

TEST(SystemConfiguration, HasShareFollowsTheConfiguredSharePath) {
    MakeDirs("/volume1/music");
    WriteFile(kAudioConf, "audio_share_path=/volume1/audio\n");
    EXPECT_EQ(VANUAudioHasShare(), 0);
    MakeDirs("/volume1/audio");
    EXPECT_NE(VANUAudioHasShare(), 0);
}

TEST(SystemConfiguration, ServiceStatusReadsThePidFile) {
    EXPECT_EQ(VANUServiceStatusGet(3), 0);  // no pid file
    WriteFile("/run/vanu/service/3.pid", std::to_string(getpid()) + "\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 1);
    WriteFile("/run/vanu/service/64.pid", std::to_string(getpid()));
    EXPECT_EQ(VANUServiceStatusGet(64), 1);
    WriteFile("/run/vanu/service/3.pid", "");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
    WriteFile("/run/vanu/service/3.pid", "abc\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
    WriteFile("/run/vanu/service/3.pid", "0\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
    WriteFile("/run/vanu/service/3.pid", "-1\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
    WriteFile("/run/vanu/service/3.pid", "99999999999999999999\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
}

TEST(SystemConfiguration, ServiceStatusOfAnEndedProcessIsZero) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0)
        _exit(0);
    ASSERT_EQ(waitpid(child, nullptr, 0), child);  // reaped: the pid names no process now
    WriteFile("/run/vanu/service/3.pid", std::to_string(child) + "\n");
    EXPECT_EQ(VANUServiceStatusGet(3), 0);
}

TEST(SystemConfiguration, ServiceStatusOutsideOneToSixtyFourIsMinusOne) {
    EXPECT_EQ(VANUServiceStatusGet(0), -1);
    EXPECT_EQ(VANUServiceStatusGet(65), -1);
    EXPECT_EQ(VANUServiceStatusGet(-3), -1);
}

}  // namespace
