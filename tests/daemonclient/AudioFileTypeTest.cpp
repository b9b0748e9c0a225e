// The audio file type check: the file extensions that each selector accepts (selector 0 accepts
// anything), and paths beginning with "http", which every selector accepts.
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <string>
#include <vector>

#include "src/daemonclient/AudioDaemon.h"

namespace {

TEST(AudioFileType, UpperCaseExtensionIsAcceptedWithSelectorOne) {
    EXPECT_EQ(IsSupportedAudioFile(1, "/volume1/music/Song.MP3"), 1);
}

TEST(AudioFileType, OnlyTheLastDotCounts) {
    EXPECT_EQ(IsSupportedAudioFile(1, "song.mp3.part"), 0);
    // The extension of a.dir/noext is "dir/noext".
    EXPECT_EQ(IsSupportedAudioFile(1, "a.dir/noext"), 0);
    EXPECT_EQ(IsSupportedAudioFile(1, "a.dir/song.flac"), 1);
    EXPECT_EQ(IsSupportedAudioFile(1, "noext"), 0);
    EXPECT_EQ(IsSupportedAudioFile(1, "trailingdot."), 0);
    EXPECT_EQ(IsSupportedAudioFile(1, ""), 0);
}

TEST(AudioFileType, HttpPrefixIsAcceptedWithAnySelector) {
    for (int selector : {1, 2, 3, 7, -1}) {
        EXPECT_EQ(IsSupportedAudioFile(selector, "http://radio.example/stream"), 1) << selector;
        EXPECT_EQ(IsSupportedAudioFile(selector, "https://radio.example/live.pls"), 1);
        EXPECT_EQ(IsSupportedAudioFile(selector, "httpnothing"), 1) << selector;
    }
}

TEST(AudioFileType, UpperCaseHttpPrefixIsJudgedByItsExtension) {
    EXPECT_EQ(IsSupportedAudioFile(1, "HTTP://radio.example/stream"), 0);
    EXPECT_EQ(IsSupportedAudioFile(1, "HTTP://radio.example/a.mp3"), 1);
    EXPECT_EQ(IsSupportedAudioFile(2, "Http://radio.example/a.ogg"), 0);
}

TEST(AudioFileType, SelectorTwoRejectsFlacSelectorThreeAcceptsIt) {
    EXPECT_EQ(IsSupportedAudioFile(2, "x.flac"), 0);
    EXPECT_EQ(IsSupportedAudioFile(3, "x.flac"), 1);
}

TEST(AudioFileType, SelectorZeroAcceptsANullPathAndAnything) {
    EXPECT_EQ(IsSupportedAudioFile(0, nullptr), 1);
    EXPECT_EQ(IsSupportedAudioFile(0, "readme.txt"), 1);
    EXPECT_EQ(IsSupportedAudioFile(1, nullptr), 0);
    EXPECT_EQ(IsSupportedAudioFile(2, nullptr), 0);
}

TEST(AudioFileType, EachSelectorAcceptsExactlyItsList) {
    const std::vector<std::string> all = {"mp3",  "m4a", "m4b", "aac", "aif", "aiff", "ape",
                                          "flac", "ogg", "wav", "wma", "mp1", "mp2",  "mpa",
                                          "ac3",  "ra",  "ram", "m4p", "txt", "mp4",  "m3u"};
    const std::vector<std::string> two = {"mp3", "m4a", "m4b"};
    const std::vector<std::string> three = {"aac", "aif", "aiff", "ape", "flac", "m4a",
                                            "m4b", "mp3", "ogg",  "wav", "wma"};
    const std::vector<std::string> other = {"mp3",  "m4a", "ogg", "aac", "wma", "flac",
                                            "aiff", "aif", "mp1", "mp2", "mpa", "wav",
                                            "ac3",  "ra",  "ram", "m4p", "m4b", "ape"};
    auto in = [](const std::vector<std::string>& list, const std::string& e) {
        return std::find(list.begin(), list.end(), e) != list.end() ? 1 : 0;
    };
    for (const std::string& e : all) {
        std::string upper = e;
        for (char& c : upper)
            c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        for (const std::string& ext : {e, upper}) {
            const std::string path = "/music/track." + ext;
            EXPECT_EQ(IsSupportedAudioFile(2, path.c_str()), in(two, e)) << path;
            EXPECT_EQ(IsSupportedAudioFile(3, path.c_str()), in(three, e)) << path;
            for (int selector : {1, 4, -3})
                EXPECT_EQ(IsSupportedAudioFile(selector, path.c_str()), in(other, e)) << path;
        }
    }
}

}  // namespace
